#include "loader/program/command_line.h"

#include <charconv>
#include <optional>
#include <string_view>

namespace loader {

const char kUsage[] =
    R"(usage: ce_loader --list DLL
       ce_loader --check [OPTION]... DLL

Carries out a DLL for Windows CE in a simulated device.

--list            shows what the DLL says of itself: sections, exports, imports
--check           loads it, finds all its exports, calls IcfgInitialize and IcfgUninitialize,
                  unloads it, and complains of what it leaves behind

--device FOLDER   the device, which is kept (else a fresh one, removed at the end)
--profile FILE    what the device is (else FOLDER/device.profile, or a usual one)
--base ADDRESS    where the DLL goes, such as 0x20040000; 0: anywhere
                  (else where it was linked for; ORVENIX_CE_BASE)
--misaligned      enters the DLL with a stack pointer of 4 modulo 8 (ORVENIX_CE_MISALIGNED=1)

Ends with 0, with 1 when a check fails or the DLL is refused, or with 2 for a wrong command line.
)";

namespace {

std::optional<std::uint32_t> Address(std::string_view text) {
  const bool hexadecimal = text.substr(0, 2) == "0x";
  if (hexadecimal) text.remove_prefix(2);
  std::uint32_t address = 0;
  const char* const end = text.data() + text.size();
  const auto [last, error] = std::from_chars(text.data(), end, address, hexadecimal ? 16 : 10);
  if (error != std::errc() || last != end) return std::nullopt;
  return address;
}

/// Takes options one by one.
class Reader {
 public:
  Reader(CommandLine& command_line, std::string& complaint)
      : command_line_(command_line), complaint_(complaint) {}

  /// @param value  the word behind, null when there is none
  /// @return words taken, 0 with a complaint
  int Take(std::string_view word, const char* value) {
    if (word == "--help") return Flag(command_line_.task, Task::kHelp);
    if (word == "--list") return Flag(command_line_.task, Task::kList);
    if (word == "--check") return Flag(command_line_.task, Task::kCheck);
    if (word == "--misaligned") return Flag(command_line_.options.misaligned, true);
    if (word == "--device") return Path(word, value, command_line_.device);
    if (word == "--profile") return Path(word, value, command_line_.profile);
    if (word == "--base") return Base(value);
    if (word.substr(0, 1) == "-") return Complain("there is no option " + std::string(word));
    if (!command_line_.dll.empty()) return Complain("there are two DLLs");
    command_line_.dll = word;
    return 1;
  }

 private:
  int Complain(std::string text) {
    complaint_ = std::move(text);
    return 0;
  }

  template <typename Value>
  static int Flag(Value& setting, Value value) {
    setting = value;
    return 1;
  }

  int Path(std::string_view option, const char* value, std::filesystem::path& path) {
    if (value == nullptr) return Complain(std::string(option) + " lacks its value");
    path = value;
    return 2;
  }

  int Base(const char* value) {
    command_line_.options.base = value != nullptr ? Address(value) : std::nullopt;
    if (!command_line_.options.base) return Complain("--base needs an address");
    return 2;
  }

  CommandLine& command_line_;
  std::string& complaint_;
};

}  // namespace

bool ReadCommandLine(int argc, const char* const* argv, CommandLine& command_line,
                     std::string& complaint) {
  command_line.options = OptionsFromEnvironment();
  Reader reader(command_line, complaint);
  for (int i = 1; i < argc;) {
    const int taken = reader.Take(argv[i], i + 1 < argc ? argv[i + 1] : nullptr);
    if (taken == 0) return false;
    i += taken;
  }
  if (command_line.task != Task::kHelp && command_line.dll.empty()) {
    complaint = "no DLL is named";
    return false;
  }
  return true;
}

}  // namespace loader

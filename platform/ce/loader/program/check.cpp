#include "loader/program/check.h"

#include <unistd.h>

#include <cstdlib>
#include <ostream>
#include <stdexcept>
#include <string>
#include <system_error>

#include "ce/kernel.h"
#include "device/device.h"
#include "kernel/handle_table.h"
#include "library/library_code.h"
#include "loader/dll.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "profile/profile.h"
#include "text/names.h"
#include "tools/elf2pe/refusal.h"
#include "world/world.h"

namespace loader {
namespace {

namespace fs = std::filesystem;

/// Where the device lies: a folder that stays, or one of this run.
class DeviceFolder {
 public:
  explicit DeviceFolder(const fs::path& kept) : path_(kept) {
    if (!path_.empty()) return;
    std::string pattern = (fs::temp_directory_path() / "ce_loader-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("no temporary folder");
    path_ = passing_ = pattern;
  }
  ~DeviceFolder() {
    std::error_code ignored;  // what cannot be removed hurts nobody
    if (!passing_.empty()) fs::remove_all(passing_, ignored);
  }
  DeviceFolder(const DeviceFolder&) = delete;
  DeviceFolder& operator=(const DeviceFolder&) = delete;

  [[nodiscard]] const fs::path& path() const { return path_; }

 private:
  fs::path path_;
  fs::path passing_;
};

sim::Profile ProfileOf(const CommandLine& command_line) {
  sim::Profile profile;
  fs::path file = command_line.profile;
  if (file.empty() && !command_line.device.empty()) file = command_line.device / "device.profile";
  std::error_code none;
  if (file.empty() || (command_line.profile.empty() && !fs::exists(file, none))) return profile;
  std::string error;
  if (!sim::LoadProfile(file, profile, error)) throw std::runtime_error(error);
  return profile;
}

/// What the device's programs hold.
struct Holdings {
  std::size_t blocks;
  std::size_t handles;
  std::uint64_t bad_frees;
};

Holdings HoldingsOf(const sim::Device& device) {
  const sim::World::Lock lock = device.world().Acquire();
  return {device.memory().live_blocks(), device.handles().open_handles(),
          device.memory().bad_frees()};
}

class Checker {
 public:
  Checker(const sim::Device& device, std::ostream& out) : device_(device), out_(out) {}

  bool Run(const fs::path& file, const std::vector<elf2pe::PeExport>& exports) {
    const Holdings before = HoldingsOf(device_);
    HMODULE const module = LoadLibraryW((u"\\" + file.filename().u16string()).c_str());
    if (!Tell(module != nullptr, "loaded and attached")) return false;
    std::size_t found = 0;
    for (const elf2pe::PeExport& each : exports) {
      const std::u16string name(each.name.begin(), each.name.end());
      if (Tell(GetProcAddressW(module, name.c_str()) != nullptr, "found " + each.name, false)) {
        ++found;
      }
    }
    Tell(found == exports.size(), "found " + std::to_string(found) + " exports");
    CallFunction(module, u"IcfgInitialize");
    CallFunction(module, u"IcfgUninitialize");
    Tell(FreeLibrary(module) != FALSE, "detached and unloaded");
    const Holdings after = HoldingsOf(device_);
    Tell(after.blocks == before.blocks, Left(before.blocks, after.blocks, "blocks of memory"));
    Tell(after.handles == before.handles, Left(before.handles, after.handles, "handles"));
    Tell(after.bad_frees == 0, std::to_string(after.bad_frees) + " wrong frees");
    return good_;
  }

 private:
  bool Tell(bool good, const std::string& what, bool also_good = true) {
    if (!good || also_good) out_ << (good ? "ok      " : "FAILED  ") << what << "\n";
    good_ = good_ && good;
    return good;
  }

  static std::string Left(std::size_t before, std::size_t after, const char* what) {
    const auto left = static_cast<std::ptrdiff_t>(after) - static_cast<std::ptrdiff_t>(before);
    return std::to_string(left) + " " + what + " left behind";
  }

  void CallFunction(HMODULE module, const WCHAR* name) {
    using Call = std::uint32_t (*)();
    const auto function =
        reinterpret_cast<Call>(reinterpret_cast<Function>(GetProcAddressW(module, name)));
    if (function == nullptr) return;
    Tell(function() == ICFG_OK, "called " + sim::ToHostText(name));
  }

  const sim::Device& device_;
  std::ostream& out_;
  bool good_ = true;
};

}  // namespace

bool Check(const CommandLine& command_line, std::ostream& out) {
  const std::string bytes = ReadDllFile(command_line.dll);
  const std::vector<elf2pe::PeExport> exports = elf2pe::ReadPe(bytes).exports;
  const DeviceFolder folder(command_line.device);
  const auto world = sim::World::MakeVirtual();
  fs::create_directories(folder.path() / "storage");
  fs::copy_file(command_line.dll, folder.path() / "storage" / command_line.dll.filename(),
                fs::copy_options::overwrite_existing);
  sim::Device device(*world, ProfileOf(command_line), folder.path());
  const sim::AttachedThread program(device, "ce_loader");
  sim::SetLibraryReader(DllReader(command_line.options));
  return Checker(device, out).Run(command_line.dll, exports);
}

}  // namespace loader

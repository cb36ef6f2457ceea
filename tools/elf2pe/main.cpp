// elf2pe: makes a DLL for Windows CE 5.0 of a linked ELF image, or the import library of one.
#include <cstdint>
#include <cstdio>
#include <exception>
#include <fstream>
#include <iterator>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/convert.h"
#include "tools/elf2pe/import_library.h"
#include "tools/elf2pe/linked_image.h"
#include "tools/elf2pe/pe_reader.h"
#include "tools/elf2pe/refusal.h"

namespace {

using elf2pe::Refusal;

constexpr const char* kUsage =
    "usage: elf2pe INPUT.elf OUTPUT.dll --name NAME.dll --exports FILE [--check OTHER.elf]\n"
    "              [--machine 0x1c0|0x1c2] [--version 1.2.3.4 [--description TEXT]]\n"
    "       elf2pe --import-library OUTPUT.lib --name NAME.dll --exports FILE\n"
    "              [--machine 0x1c0|0x1c2]\n"
    "\n"
    "INPUT.elf   an image for ARM linked with --emit-relocs\n"
    "--exports   names that the DLL exports, one a line\n"
    "--check     the same objects linked at another base: confirms the relocations\n"
    "--version   the DLL gets a version resource\n";

struct UsageError {};

/// What the command line says: options by their name, and the rest.
struct CommandLine {
  std::map<std::string, std::string> options;
  std::vector<std::string> files;

  [[nodiscard]] const std::string& Need(const std::string& option) const {
    const auto found = options.find(option);
    if (found == options.end()) throw UsageError();
    return found->second;
  }
};

CommandLine ReadCommandLine(int argc, char** argv) {
  CommandLine line;
  for (int i = 1; i < argc; ++i) {
    const std::string word = argv[i];
    if (word.substr(0, 2) != "--") {
      line.files.push_back(word);
      continue;
    }
    const bool known = word == "--name" || word == "--exports" || word == "--check" ||
                       word == "--machine" || word == "--import-library" || word == "--version" ||
                       word == "--description";
    if (!known || i + 1 == argc || !line.options.emplace(word, argv[i + 1]).second) {
      throw UsageError();
    }
    ++i;
  }
  return line;
}

std::string ReadFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::string bytes{std::istreambuf_iterator<char>(file), {}};
  if (!file.is_open() || file.bad()) throw Refusal(path + ": cannot be read");
  return bytes;
}

void WriteFile(const std::string& path, const std::string& bytes) {
  std::ofstream file(path, std::ios::binary);
  file.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
  file.close();
  if (file) return;
  std::remove(path.c_str());  // nobody is to take half of it
  throw Refusal(path + ": cannot be written");
}

elf2pe::LinkedImage ReadImage(const std::string& path) {
  const std::string bytes = ReadFile(path);
  try {
    return elf2pe::ReadLinkedImage(bytes);
  } catch (const Refusal& refusal) {
    throw Refusal(path + ": " + refusal.what());
  }
}

elf2pe::DllOptions OptionsOf(const CommandLine& line) {
  elf2pe::DllOptions options;
  options.name = line.Need("--name");
  options.exports = elf2pe::ReadExportList(ReadFile(line.Need("--exports")));
  if (line.options.count("--version") != 0) options.version = line.Need("--version");
  if (line.options.count("--description") != 0) options.description = line.Need("--description");
  const auto machine = line.options.find("--machine");
  if (machine == line.options.end()) return options;
  if (machine->second != "0x1c0" && machine->second != "0x1c2") throw UsageError();
  options.machine =
      machine->second == "0x1c0" ? elf2pe::pe::kMachineArm : elf2pe::pe::kMachineThumb;
  return options;
}

void MakeDll(const CommandLine& line) {
  std::remove(line.files[1].c_str());  // an older one would pass for this one's result
  const elf2pe::DllOptions options = OptionsOf(line);
  const elf2pe::LinkedImage image = ReadImage(line.files[0]);
  const auto check = line.options.find("--check");
  if (check != line.options.end()) {
    elf2pe::ConfirmBySecondLink(image, ReadImage(check->second));
    std::printf("check: %zu relocations confirmed by second link\n", image.words.size());
  }
  const std::string dll = elf2pe::Convert(image, options);
  static_cast<void>(
      elf2pe::ReadPe(dll));  // a DLL that the loader would not take is not left behind
  WriteFile(line.files[1], dll);
}

int Run(const CommandLine& line) {
  const auto library = line.options.find("--import-library");
  if (library != line.options.end()) {
    if (!line.files.empty() || line.options.count("--check") != 0) throw UsageError();
    WriteFile(library->second, elf2pe::MakeImportLibrary(OptionsOf(line)));
    return 0;
  }
  if (line.files.size() != 2) throw UsageError();
  MakeDll(line);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  try {
    return Run(ReadCommandLine(argc, argv));
  } catch (const UsageError&) {
    std::fputs(kUsage, stderr);
    return 2;
  } catch (const std::exception& problem) {
    std::fprintf(stderr, "elf2pe: %s\n", problem.what());
    return 1;
  }
}

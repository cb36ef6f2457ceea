#include "installer/installer.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <memory>
#include <system_error>
#include <utility>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "device/device.h"
#include "locale/code_pages.h"
#include "process/host_program.h"
#include "registry/registry.h"
#include "storage/storage.h"
#include "text/names.h"

namespace sim {
namespace {

namespace fs = std::filesystem;

constexpr DWORD kProtecting =
    FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM;
/// The host needs a fraction of a second; a cabinet may be made to take for ever.
constexpr std::chrono::seconds kUnpackLimit{60};

/// What stands behind the options, without quotes.
std::string PackagePath(std::string_view command_line) {
  while (!command_line.empty()) {
    if (command_line.front() == ' ') {
      command_line.remove_prefix(1);
    } else if (command_line.front() == '/') {
      command_line.remove_prefix(std::min(command_line.find(' '), command_line.size()));
    } else {
      break;
    }
  }
  while (!command_line.empty() && command_line.back() == ' ') command_line.remove_suffix(1);
  if (command_line.size() >= 2 && command_line.front() == '"' && command_line.back() == '"') {
    command_line = command_line.substr(1, command_line.size() - 2);
  }
  return std::string(command_line);
}

std::u16string FromHost(const std::string& text) {
  std::u16string wide;
  return FromHostText(text, wide) ? wide : std::u16string();
}

std::string Content(const fs::path& file) {
  std::ifstream in(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), {}};
}

RegistryValue Number(const char16_t* name, DWORD value) {
  RegistryValue number{name, REG_DWORD, {}};
  for (int shift = 0; shift < 32; shift += 8) {
    number.data.push_back(static_cast<BYTE>(value >> shift & 0xFF));
  }
  return number;
}

RegistryValue Text(const char16_t* name, const std::u16string& value) {
  RegistryValue text{name, REG_SZ, {}};
  for (const char16_t unit : value + u'\0') {
    text.data.push_back(static_cast<BYTE>(unit & 0xFF));
    text.data.push_back(static_cast<BYTE>(unit >> 8));
  }
  return text;
}

HKEY RootKey(std::uint32_t root) {
  return reinterpret_cast<HKEY>(static_cast<std::uintptr_t>(root));
}

}  // namespace

std::uint32_t Installer::Run(std::string_view command_line) {
  folder_ = device_.folder() / "installer";
  std::error_code ignored;
  fs::remove_all(folder_, ignored);
  fs::create_directories(folder_, ignored);
  const std::uint32_t code = Install(PackagePath(command_line));
  fs::remove_all(folder_, ignored);
  return code;
}

std::uint32_t Installer::Install(const std::string& package) {
  PackageSetup setup;
  if (!Unpack(package) || !ReadSetup(setup)) return kNoPackage;
  if (WouldAsk(setup)) return kWouldAsk;
  if (!WriteFiles(setup) || !WriteValues(setup, package)) return kCannotWrite;
  Note("installed " + setup.provider + " " + setup.application + ": " +
       std::to_string(setup.files.size()) + " files, " + std::to_string(setup.values.size()) +
       " values");
  return kInstalled;
}

bool Installer::Unpack(const std::string& package) {
  const auto path = device_.storage().HostPath(FromHost(package).c_str());
  std::error_code failed;
  if (!path || !fs::is_regular_file(*path, failed) ||
      !fs::copy_file(*path, folder_ / "package.cab", failed)) {
    Note("there is no \"" + package + "\"");
    return false;
  }
  // With names of its own, so that no text of the device comes before the host's shell.
  HostCommand command;
  command.command = "exec cabextract --quiet --directory=installer/files installer/package.cab";
  command.device_folder = device_.folder();
  command.limit = kUnpackLimit;
  const auto program = HostProgram::Start(command);
  const std::uint32_t code = program == nullptr ? HostProgram::kTimedOut : program->Wait();
  if (code == 0) return true;
  Note("cabextract does not unpack \"" + package + "\"; it ended with " + std::to_string(code));
  return false;
}

fs::path Installer::Unpacked(std::uint16_t id) const {
  char ending[8];
  std::snprintf(ending, sizeof ending, ".%03u", unsigned{id});
  std::error_code failed;
  for (fs::directory_iterator at(folder_ / "files", failed), end; !failed && at != end;
       at.increment(failed)) {
    if (at->path().extension() == ending && at->is_regular_file(failed)) return at->path();
  }
  return {};
}

bool Installer::ReadSetup(PackageSetup& setup) {
  std::string error;
  const fs::path file = Unpacked(0);
  if (file.empty()) {
    error = "there is none";
  } else if (ReadPackageSetup(Content(file), setup, error)) {
    return true;
  }
  Note("the setup file: " + error);
  return false;
}

bool Installer::WouldAsk(const PackageSetup& setup) {
  HKEY key = nullptr;
  if (device_.registry().Open(HKEY_LOCAL_MACHINE, FromAnsi(setup.key()).c_str(), key) ==
      ERROR_SUCCESS) {
    device_.registry().Close(key);
    Note("would ask: " + setup.application + " is installed already");
    return true;
  }
  for (const PackageFile& file : setup.files) {
    DWORD attributes = 0;
    if (device_.storage().GetAttributes(FromAnsi(file.path).c_str(), attributes) == ERROR_SUCCESS &&
        (attributes & kProtecting) != 0) {
      Note("would ask: " + file.path + " is protected");
      return true;
    }
  }
  return false;
}

bool Installer::WriteFiles(const PackageSetup& setup) {
  for (const PackageFile& file : setup.files) {
    if (!WriteFile(file)) {
      Note("cannot write " + file.path);
      return false;
    }
  }
  return true;
}

bool Installer::WriteFile(const PackageFile& file) {
  const fs::path from = Unpacked(file.id);
  if (from.empty()) return false;
  const std::u16string path = FromAnsi(file.path);
  for (std::size_t at = path.find(u'\\', 1); at != std::u16string::npos;
       at = path.find(u'\\', at + 1)) {
    static_cast<void>(device_.storage().CreateFolder(path.substr(0, at).c_str()));
  }
  Storage::OpenRequest request;
  request.name = path.c_str();
  request.mode.access = GENERIC_WRITE;
  request.disposition = CREATE_ALWAYS;
  request.attributes = FILE_ATTRIBUTE_ARCHIVE;
  std::shared_ptr<OpenFile> to;
  bool existed = false;
  if (device_.storage().Open(request, to, existed) != ERROR_SUCCESS) return false;
  const std::string content = Content(from);
  DWORD written = 0;
  return to->Write(content.data(), static_cast<DWORD>(content.size()), written) == ERROR_SUCCESS;
}

bool Installer::WriteValues(const PackageSetup& setup, const std::string& package) {
  for (const PackageValue& value : setup.values) {
    if (!WriteValue(value)) {
      Note("cannot write a value of " + value.key);
      return false;
    }
  }
  const std::uint32_t root = KeyTree::kRoots[2].handle;
  return WriteValue({root, setup.key(), Number(u"Instl", 1)}) &&
         WriteValue({root, setup.key(), Text(u"InstlDir", FromAnsi(setup.folder))}) &&
         WriteValue({root, setup.key(), Text(u"CabFile", FromHost(package))});
}

bool Installer::WriteValue(const PackageValue& value) {
  HKEY key = nullptr;
  DWORD disposition = 0;
  Registry& registry = device_.registry();
  if (registry.Create(RootKey(value.root), FromAnsi(value.key).c_str(), key, disposition) !=
      ERROR_SUCCESS) {
    return false;
  }
  const DWORD error = registry.Set(key, value.value);
  return registry.Close(key) == ERROR_SUCCESS && error == ERROR_SUCCESS;
}

void Installer::Note(const std::string& what) const {
  std::ofstream log(device_.folder() / "programs.log", std::ios::app);
  log << "wceload.exe: " << what << "\n";
}

}  // namespace sim

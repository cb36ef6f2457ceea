#include "library/libraries.h"

#include <algorithm>
#include <filesystem>
#include <optional>
#include <system_error>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "storage/storage.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr std::u16string_view kFolder = u"\\windows\\";
constexpr std::u16string_view kEnding = u".dll";

/// Modules have numbers of their own, which no handle has, too.
constexpr std::uintptr_t kFirstModule = 0x00F00000;
constexpr std::uintptr_t kModuleStep = 0x10;

/// What `name` stands for among the libraries.
std::u16string KeyOf(std::u16string_view name) {
  std::u16string key = FoldCase(name);
  const std::u16string folder = FoldCase(kFolder);
  if (key.compare(0, folder.size(), folder) == 0) key.erase(0, folder.size());
  const std::u16string ending = FoldCase(kEnding);
  const std::size_t stem = key.size() - std::min(key.size(), ending.size());
  if (key.compare(stem, ending.size(), ending) == 0) key.erase(stem);
  return key;
}

/// The host's path of a library's file, wherever a name may mean it.
std::optional<std::filesystem::path> FileOf(Storage& storage, std::u16string_view name) {
  std::u16string file(name);
  const std::size_t last = name.rfind(u'\\');
  const bool has_folder = last != std::u16string_view::npos;
  if (name.find(u'.', has_folder ? last : 0) == std::u16string_view::npos) file += kEnding;
  std::vector<std::u16string> places = {file};
  if (!has_folder) places = {u"\\Windows\\" + file, u"\\" + file};
  for (const std::u16string& place : places) {
    std::optional<std::filesystem::path> path = storage.HostPath(place.c_str());
    std::error_code none;
    if (path && std::filesystem::is_regular_file(*path, none)) return path;
  }
  return std::nullopt;
}

LibraryReader& Reader() {
  static LibraryReader reader;
  return reader;
}

}  // namespace

void SetLibraryReader(LibraryReader reader) {
  Reader() = std::move(reader);
}

const LibraryReader& GetLibraryReader() {
  return Reader();
}

void Libraries::Install(Library library) {
  std::u16string key = KeyOf(library.name);
  const std::lock_guard<std::mutex> hold(mutex_);
  installed_[std::move(key)] = std::make_shared<const Library>(std::move(library));
}

void Libraries::Remove(std::u16string_view name) {
  const std::lock_guard<std::mutex> hold(mutex_);
  installed_.erase(KeyOf(name));
}

HMODULE Libraries::NumberOf(std::size_t index) {
  return reinterpret_cast<HMODULE>(kFirstModule + index * kModuleStep);
}

const Libraries::Module* Libraries::At(HMODULE module) const {
  const auto number = reinterpret_cast<std::uintptr_t>(module);
  if (number < kFirstModule || (number - kFirstModule) % kModuleStep != 0) return nullptr;
  const std::uintptr_t index = (number - kFirstModule) / kModuleStep;
  return index < loaded_.size() && loaded_[index].uses > 0 ? &loaded_[index] : nullptr;
}

HMODULE Libraries::UseAgain(std::u16string_view key) {
  const auto found = std::find_if(loaded_.begin(), loaded_.end(), [key](const Module& module) {
    return module.uses > 0 && module.key == key;
  });
  if (found == loaded_.end()) return nullptr;
  ++found->uses;
  return NumberOf(static_cast<std::size_t>(found - loaded_.begin()));
}

HMODULE Libraries::Add(Module module) {
  loaded_.push_back(std::move(module));
  return NumberOf(loaded_.size() - 1);
}

HMODULE Libraries::Load(std::u16string_view name, DWORD& error) {
  const std::u16string key = KeyOf(name);
  {
    const std::lock_guard<std::mutex> hold(mutex_);
    if (HMODULE const module = UseAgain(key); module != nullptr) return module;
    if (const auto found = installed_.find(key); found != installed_.end()) {
      return Add({found->second->name, key, found->second, nullptr});
    }
  }
  return LoadFile(name, key, error);
}

HMODULE Libraries::LoadFile(std::u16string_view name, const std::u16string& key, DWORD& error) {
  const auto refuse = [&error](DWORD why) -> HMODULE {
    error = why;
    return nullptr;
  };
  const std::optional<std::filesystem::path> file = FileOf(device_.storage(), name);
  if (!file) return refuse(ERROR_MOD_NOT_FOUND);
  std::shared_ptr<LibraryCode> code;
  if (const LibraryReader& read = GetLibraryReader()) code = read(*file);
  if (code == nullptr) return refuse(ERROR_BAD_EXE_FORMAT);
  HMODULE module = nullptr;
  {
    const std::lock_guard<std::mutex> hold(mutex_);
    // Another thread may have been as quick.
    if (HMODULE const other = UseAgain(key); other != nullptr) return other;
    module = Add({std::u16string(name), key, nullptr, code});
  }
  if (code->Enter(module, DLL_PROCESS_ATTACH)) return module;
  Drop(module);
  return refuse(ERROR_DLL_INIT_FAILED);
}

bool Libraries::Free(HMODULE module) {
  std::shared_ptr<LibraryCode> last;
  {
    const std::lock_guard<std::mutex> hold(mutex_);
    const Module* const found = At(module);
    if (found == nullptr) return false;
    const auto index = static_cast<std::size_t>(found - loaded_.data());
    if (found->uses > 1 || found->code == nullptr) {
      --loaded_[index].uses;
      return true;
    }
    last = found->code;
  }
  static_cast<void>(last->Enter(module, DLL_PROCESS_DETACH));
  Drop(module);
  return true;
}

void Libraries::Drop(HMODULE module) {
  std::shared_ptr<LibraryCode> code;  // ends without the lock
  const std::lock_guard<std::mutex> hold(mutex_);
  if (const Module* const found = At(module); found != nullptr) {
    Module& gone = loaded_[static_cast<std::size_t>(found - loaded_.data())];
    gone.uses = 0;
    code = std::exchange(gone.code, nullptr);
  }
}

FARPROC Libraries::Find(HMODULE module, std::u16string_view name, DWORD& error) const {
  const std::lock_guard<std::mutex> hold(mutex_);
  const Module* const found = At(module);
  if (found == nullptr) {
    error = ERROR_INVALID_HANDLE;
    return nullptr;
  }
  FARPROC function = nullptr;
  if (found->code != nullptr) {
    function = found->code->Find(name);
  } else if (const auto entry = found->installed->entries.find(name);
             entry != found->installed->entries.end()) {
    function = entry->second;
  }
  if (function == nullptr) error = ERROR_PROC_NOT_FOUND;
  return function;
}

std::vector<std::u16string> Libraries::Loaded() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  std::vector<std::u16string> names;
  for (const Module& module : loaded_) names.push_back(module.name);
  return names;
}

}  // namespace sim

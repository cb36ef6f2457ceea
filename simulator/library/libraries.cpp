#include "library/libraries.h"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "text/names.h"

namespace sim {
namespace {

constexpr std::u16string_view kFolder = u"\\windows\\";
constexpr std::u16string_view kEnding = u".dll";

/// Modules have numbers of their own, which no handle has, too.
constexpr std::uintptr_t kFirstModule = 0x00F00000;
constexpr std::uintptr_t kModuleStep = 0x10;

/// What `name` stands for among the installed libraries.
std::u16string KeyOf(std::u16string_view name) {
  std::u16string key = FoldCase(name);
  const std::u16string folder = FoldCase(kFolder);
  if (key.compare(0, folder.size(), folder) == 0) key.erase(0, folder.size());
  const std::u16string ending = FoldCase(kEnding);
  const std::size_t stem = key.size() - std::min(key.size(), ending.size());
  if (key.compare(stem, ending.size(), ending) == 0) key.erase(stem);
  return key;
}

}  // namespace

void Libraries::Install(Library library) {
  std::u16string key = KeyOf(library.name);
  const std::lock_guard<std::mutex> hold(mutex_);
  installed_[std::move(key)] = std::make_shared<const Library>(std::move(library));
}

void Libraries::Remove(std::u16string_view name) {
  const std::lock_guard<std::mutex> hold(mutex_);
  installed_.erase(KeyOf(name));
}

HMODULE Libraries::Load(std::u16string_view name) {
  const std::u16string key = KeyOf(name);
  const std::lock_guard<std::mutex> hold(mutex_);
  auto found = std::find_if(loaded_.begin(), loaded_.end(),
                            [&key](const auto& library) { return KeyOf(library->name) == key; });
  if (found == loaded_.end()) {
    const auto installed = installed_.find(key);
    if (installed == installed_.end()) return nullptr;
    found = loaded_.insert(loaded_.end(), installed->second);
  }
  const auto index = static_cast<std::uintptr_t>(found - loaded_.begin());
  return reinterpret_cast<HMODULE>(kFirstModule + index * kModuleStep);
}

std::shared_ptr<const Library> Libraries::Find(HMODULE module) const {
  const auto number = reinterpret_cast<std::uintptr_t>(module);
  const std::lock_guard<std::mutex> hold(mutex_);
  if (number < kFirstModule || (number - kFirstModule) % kModuleStep != 0) return nullptr;
  const std::uintptr_t index = (number - kFirstModule) / kModuleStep;
  return index < loaded_.size() ? loaded_[index] : nullptr;
}

std::vector<std::u16string> Libraries::Loaded() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  std::vector<std::u16string> names;
  for (const auto& library : loaded_) names.push_back(library->name);
  return names;
}

}  // namespace sim

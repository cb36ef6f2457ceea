#include "registry/registry.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "registry/reg_text.h"
#include "storage/host_text.h"
#include "text/names.h"

namespace sim {
namespace {

// Never the number of another kind of handle, so that a mixed-up one is noticed.
constexpr std::uint32_t kFirstHandle = 0x00800000;
constexpr std::uint32_t kLastHandle = 0x7FFFFFFC;
constexpr std::uint32_t kStep = 4;

/// More than any valid path has: what is longer need not be read to its end.
constexpr std::size_t kMaxPath = (kMaxRegistryName + 1) * kMaxRegistryDepth + 2;

std::uint32_t NumberOf(HKEY key) {
  const auto number = reinterpret_cast<std::uintptr_t>(key);
  return number > UINT32_MAX ? 0 : static_cast<std::uint32_t>(number);
}

std::optional<KeyTree::Path> PathOf(const WCHAR* text) {
  const std::u16string_view path = BoundedView(text, kMaxPath);
  if (path.size() == kMaxPath) return std::nullopt;
  return SplitKeyPath(path);
}

}  // namespace

Registry::Registry(Device& device)
    : file_(device.folder() / "registry.reg"), next_handle_(kFirstHandle) {
  std::string text;
  if (!ReadHostText(file_, text)) {
    throw std::runtime_error("cannot read " + file_.string() + ": " + std::strerror(errno));
  }
  std::string error;
  if (!ParseRegText(text, tree_, error)) throw std::runtime_error(file_.string() + ": " + error);
}

Registry::~Registry() {
  if (!Save()) std::fprintf(stderr, "cesim: cannot write %s\n", file_.c_str());
}

bool Registry::Save() {
  const Hold hold(mutex_);
  return SaveHeld();
}

bool Registry::SaveHeld() {
  if (!changed_) return true;
  if (!ReplaceHostText(file_, FormatRegText(tree_))) return false;
  changed_ = false;
  return true;
}

std::size_t Registry::open_keys() const {
  const Hold hold(mutex_);
  return open_.size();
}

DWORD Registry::FindKey(HKEY handle, std::shared_ptr<RegistryKey>& key) const {
  const std::uint32_t number = NumberOf(handle);
  key = tree_.root(number);
  if (key != nullptr) return ERROR_SUCCESS;
  const auto found = open_.find(number);
  if (found == open_.end()) return ERROR_INVALID_HANDLE;
  key = found->second;
  return key->deleted ? ERROR_KEY_DELETED : ERROR_SUCCESS;
}

DWORD Registry::AddHandle(std::shared_ptr<RegistryKey> key, HKEY& handle) {
  if (next_handle_ > kLastHandle) return ERROR_OUTOFMEMORY;
  open_.emplace(next_handle_, std::move(key));
  handle = reinterpret_cast<HKEY>(static_cast<std::uintptr_t>(next_handle_));
  next_handle_ += kStep;
  return ERROR_SUCCESS;
}

DWORD Registry::Open(HKEY key, const WCHAR* path, HKEY& opened) {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> from;
  if (const DWORD error = FindKey(key, from); error != ERROR_SUCCESS) return error;
  const std::optional<KeyTree::Path> names = PathOf(path);
  std::shared_ptr<RegistryKey> found = names ? KeyTree::Find(from, *names) : nullptr;
  return found == nullptr ? ERROR_FILE_NOT_FOUND : AddHandle(std::move(found), opened);
}

DWORD Registry::Create(HKEY key, const WCHAR* path, HKEY& opened, DWORD& disposition) {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> from;
  if (const DWORD error = FindKey(key, from); error != ERROR_SUCCESS) return error;
  const std::optional<KeyTree::Path> names = PathOf(path);
  if (path == nullptr || !names) return ERROR_INVALID_PARAMETER;
  bool created = false;
  std::shared_ptr<RegistryKey> made = KeyTree::Make(from, *names, created);
  if (made == nullptr) return ERROR_INVALID_PARAMETER;
  changed_ = changed_ || created;
  disposition = created ? REG_CREATED_NEW_KEY : REG_OPENED_EXISTING_KEY;
  return AddHandle(std::move(made), opened);
}

DWORD Registry::Close(HKEY key) {
  const Hold hold(mutex_);
  const std::uint32_t number = NumberOf(key);
  if (tree_.root(number) != nullptr) return ERROR_SUCCESS;  // the roots are always open
  if (open_.erase(number) == 0) return ERROR_INVALID_HANDLE;
  // What the host does not take now is written at the next closing or at the device's end.
  static_cast<void>(SaveHeld());
  return ERROR_SUCCESS;
}

DWORD Registry::Query(HKEY key, const WCHAR* name, RegistryValue& value) const {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> found;
  if (const DWORD error = FindKey(key, found); error != ERROR_SUCCESS) return error;
  const auto entry = found->values.find(FoldCase(BoundedView(name, kMaxRegistryName + 1)));
  if (entry == found->values.end()) return ERROR_FILE_NOT_FOUND;
  value = entry->second;
  return ERROR_SUCCESS;
}

DWORD Registry::Set(HKEY key, RegistryValue value) {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> found;
  if (const DWORD error = FindKey(key, found); error != ERROR_SUCCESS) return error;
  if (!ValidValueName(value.name) || value.data.size() > kMaxRegistryData) {
    return ERROR_INVALID_PARAMETER;
  }
  RegistryValue& entry = found->values[FoldCase(value.name)];
  entry = std::move(value);
  changed_ = true;
  return ERROR_SUCCESS;
}

DWORD Registry::DeleteValue(HKEY key, const WCHAR* name) {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> found;
  if (const DWORD error = FindKey(key, found); error != ERROR_SUCCESS) return error;
  if (found->values.erase(FoldCase(BoundedView(name, kMaxRegistryName + 1))) == 0) {
    return ERROR_FILE_NOT_FOUND;
  }
  changed_ = true;
  return ERROR_SUCCESS;
}

DWORD Registry::DeleteKey(HKEY key, const WCHAR* path) {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> from;
  if (const DWORD error = FindKey(key, from); error != ERROR_SUCCESS) return error;
  const std::optional<KeyTree::Path> names = PathOf(path);
  if (!names) return ERROR_FILE_NOT_FOUND;
  if (names->empty()) return ERROR_INVALID_PARAMETER;
  if (!KeyTree::Delete(from, *names)) return ERROR_FILE_NOT_FOUND;
  changed_ = true;
  return ERROR_SUCCESS;
}

DWORD Registry::EnumKey(HKEY key, DWORD index, std::u16string& name) const {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> found;
  if (const DWORD error = FindKey(key, found); error != ERROR_SUCCESS) return error;
  if (index >= found->children.size()) return ERROR_NO_MORE_ITEMS;
  name = std::next(found->children.begin(), static_cast<std::ptrdiff_t>(index))->second->name;
  return ERROR_SUCCESS;
}

DWORD Registry::EnumValue(HKEY key, DWORD index, RegistryValue& value) const {
  const Hold hold(mutex_);
  std::shared_ptr<RegistryKey> found;
  if (const DWORD error = FindKey(key, found); error != ERROR_SUCCESS) return error;
  if (index >= found->values.size()) return ERROR_NO_MORE_ITEMS;
  value = std::next(found->values.begin(), static_cast<std::ptrdiff_t>(index))->second;
  return ERROR_SUCCESS;
}

}  // namespace sim

#include "registry/key_tree.h"

#include <algorithm>
#include <utility>

#include "text/names.h"

namespace sim {
namespace {

bool HasControl(std::u16string_view name) {
  return std::any_of(name.begin(), name.end(), [](char16_t letter) { return letter < 0x20; });
}

/// For those who still have one of the keys open.
void MarkDeleted(RegistryKey& key) {
  key.deleted = true;
  for (const auto& [name, child] : key.children) MarkDeleted(*child);
}

}  // namespace

std::optional<std::vector<std::u16string>> SplitKeyPath(std::u16string_view path) {
  std::vector<std::u16string> names;
  if (!path.empty() && path.front() == u'\\') path.remove_prefix(1);
  if (!path.empty() && path.back() == u'\\') path.remove_suffix(1);
  while (!path.empty()) {
    const std::u16string_view name = path.substr(0, path.find(u'\\'));
    if (name.empty() || name.size() > kMaxRegistryName || HasControl(name)) return std::nullopt;
    names.emplace_back(name);
    // A backslash that is left over leads to an empty name.
    if (name.size() + 1 == path.size()) return std::nullopt;
    path.remove_prefix(std::min(name.size() + 1, path.size()));
  }
  return names;
}

bool ValidValueName(std::u16string_view name) {
  return name.size() <= kMaxRegistryName && !HasControl(name);
}

KeyTree::KeyTree() {
  for (std::size_t i = 0; i < kRoots.size(); ++i) {
    roots_[i] = std::make_shared<RegistryKey>();
    roots_[i]->name = kRoots[i].name;
  }
}

std::shared_ptr<RegistryKey> KeyTree::root(std::uint32_t handle) const {
  for (std::size_t i = 0; i < kRoots.size(); ++i) {
    if (kRoots[i].handle == handle) return roots_[i];
  }
  return nullptr;
}

std::shared_ptr<RegistryKey> KeyTree::root(std::u16string_view name) const {
  for (std::size_t i = 0; i < kRoots.size(); ++i) {
    if (SameName(kRoots[i].name, name) || SameName(kRoots[i].short_name, name)) return roots_[i];
  }
  return nullptr;
}

std::shared_ptr<RegistryKey> KeyTree::Find(std::shared_ptr<RegistryKey> key, const Path& path) {
  for (const std::u16string& name : path) {
    const auto child = key->children.find(FoldCase(name));
    if (child == key->children.end()) return nullptr;
    key = child->second;
  }
  return key;
}

std::shared_ptr<RegistryKey> KeyTree::Make(std::shared_ptr<RegistryKey> key, const Path& path,
                                           bool& created) {
  created = false;
  if (key->depth + path.size() > kMaxRegistryDepth) return nullptr;
  for (const std::u16string& name : path) {
    std::shared_ptr<RegistryKey>& child = key->children[FoldCase(name)];
    created = child == nullptr;
    if (created) {
      child = std::make_shared<RegistryKey>();
      child->name = name;
      child->depth = key->depth + 1;
    }
    // Through a copy: the reference lives in the key that is let go of here.
    const std::shared_ptr<RegistryKey> next = child;
    key = next;
  }
  return key;
}

bool KeyTree::Delete(const std::shared_ptr<RegistryKey>& key, const Path& path) {
  const std::shared_ptr<RegistryKey> parent = Find(key, {path.begin(), path.end() - 1});
  if (parent == nullptr) return false;
  const auto child = parent->children.find(FoldCase(path.back()));
  if (child == parent->children.end()) return false;
  MarkDeleted(*child->second);
  parent->children.erase(child);
  return true;
}

}  // namespace sim

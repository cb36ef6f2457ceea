// Input: a registry text of any bytes. What is understood must stay the same through writing and
// reading, or a device's registry would change by being saved.
#include "registry/reg_text.h"

#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckKey(const sim::RegistryKey& key) {
  Require(key.depth <= sim::kMaxRegistryDepth && !key.deleted);
  for (const auto& [folded, value] : key.values) {
    Require(sim::ValidValueName(value.name));
    Require(value.data.size() <= sim::kMaxRegistryData);
  }
  for (const auto& [folded, child] : key.children) {
    Require(child->depth == key.depth + 1);
    Require(sim::SplitKeyPath(child->name) == sim::KeyTree::Path{child->name});
    CheckKey(*child);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  sim::KeyTree tree;
  std::string error;
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const bool understood = sim::ParseRegText(text, tree, error);
  Require(understood == error.empty());
  if (!understood) Require(error.rfind("line ", 0) == 0);

  for (const auto& root : sim::KeyTree::kRoots) CheckKey(*tree.root(root.handle));
  const std::string written = sim::FormatRegText(tree);
  sim::KeyTree again;
  Require(sim::ParseRegText(written, again, error));
  Require(sim::FormatRegText(again) == written);
  return 0;
}

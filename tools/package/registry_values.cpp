#include "tools/package/registry_values.h"

#include <string>
#include <string_view>

#include "ce/system.h"
#include "locale/code_pages.h"
#include "registry/key_tree.h"
#include "registry/reg_text.h"
#include "tools/failure.h"
#include "tools/file_text.h"

namespace tools {
namespace {

constexpr std::size_t kMaxValueData = 65000;

/// One read of a registry into a plan.
class Collector {
 public:
  Collector(const std::filesystem::path& file, PackagePlan& plan) : file_(file), plan_(plan) {}

  void Collect(std::size_t root, const sim::RegistryKey& key, const std::string& path) {
    if (!key.values.empty()) {
      if (path.empty()) Refuse("a value of a root key", "put it into a key below");
      plan_.keys.push_back({root, path});
      for (const auto& [name, value] : key.values) Add(value);
    }
    for (const auto& [name, child] : key.children) {
      Collect(root, *child, path + (path.empty() ? "" : "\\") + Ansi(child->name));
    }
  }

 private:
  [[noreturn]] void Refuse(const std::string& what, const std::string& advice) const {
    throw Failure(ExitCode::kBadInput, file_.string(), what, advice);
  }

  [[nodiscard]] std::string Ansi(std::u16string_view text) const {
    bool substituted = false;
    std::string narrow = sim::ToAnsi(text, '?', substituted);
    if (substituted) {
      Refuse("\"" + sim::ToUtf8(text) + "\" has letters that the device's code page lacks",
             "write it with others");
    }
    return narrow;
  }

  void Add(const sim::RegistryValue& from) {
    PackagePlan::Value value;
    value.key = plan_.keys.size() - 1;
    value.name = Ansi(from.name);
    value.type = TypeOf(from);
    const bool is_text =
        value.type == PackagePlan::ValueType::kText || value.type == PackagePlan::ValueType::kTexts;
    value.data = is_text ? Ansi(Wide(from.data)) : std::string(from.data.begin(), from.data.end());
    if (value.type == PackagePlan::ValueType::kText && value.data.empty()) value.data += '\0';
    if (value.data.size() > kMaxValueData) {
      Refuse("\"" + value.name + "\" has " + std::to_string(value.data.size()) + " bytes",
             "a package carries " + std::to_string(kMaxValueData));
    }
    plan_.values.push_back(std::move(value));
  }

  [[nodiscard]] PackagePlan::ValueType TypeOf(const sim::RegistryValue& value) const {
    switch (value.type) {
      case REG_SZ: return PackagePlan::ValueType::kText;
      case REG_BINARY: return PackagePlan::ValueType::kBinary;
      case REG_MULTI_SZ: return PackagePlan::ValueType::kTexts;
      case REG_DWORD: return PackagePlan::ValueType::kNumber;
      default:
        Refuse("\"" + sim::ToUtf8(value.name) + "\" has the type " + std::to_string(value.type),
               "a package carries texts, numbers and bytes");
    }
  }

  static std::u16string Wide(const std::vector<BYTE>& data) {
    std::u16string text;
    for (std::size_t at = 0; at + 1 < data.size(); at += 2) {
      text += static_cast<char16_t>(data[at] | data[at + 1] << 8);
    }
    return text;
  }

  const std::filesystem::path& file_;
  PackagePlan& plan_;
};

}  // namespace

void AddRegistryValues(const std::filesystem::path& file, PackagePlan& plan) {
  sim::KeyTree tree;
  std::string error;
  if (!sim::ParseRegText(ReadWholeFile(file), tree, error)) {
    throw Failure(ExitCode::kBadInput, file.string(), error);
  }
  Collector collector(file, plan);
  for (std::size_t root = 0; root < sim::KeyTree::kRoots.size(); ++root) {
    collector.Collect(root + 1, *tree.root(sim::KeyTree::kRoots.at(root).handle), "");
  }
}

}  // namespace tools

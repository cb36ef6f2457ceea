#include "tools/package/setup_writer.h"

#include <array>

#include "tools/package/little_endian.h"

namespace tools {
namespace {

constexpr std::size_t kHeaderSize = 100;

struct Table {
  std::size_t count = 0;
  std::string entries;
};

/// Zero included.
void AppendText(std::string& bytes, const std::string& text) {
  Append16(bytes, text.size() + 1);
  bytes += text + '\0';
}

/// A path that is one string.
void AppendPath(std::string& bytes, std::size_t string) {
  Append16(bytes, 4);
  Append16(bytes, string);
  Append16(bytes, 0);
}

Table Strings(const PackagePlan& plan) {
  Table table;
  const auto add = [&table](const std::string& text) {
    Append16(table.entries, ++table.count);
    AppendText(table.entries, text);
  };
  for (const std::string& folder : plan.folders) add(folder);
  for (const PackagePlan::Key& key : plan.keys) add(key.path);
  return table;
}

Table Directories(const PackagePlan& plan) {
  Table table;
  for (std::size_t i = 0; i < plan.folders.size(); ++i) {
    Append16(table.entries, ++table.count);
    AppendPath(table.entries, table.count);
  }
  return table;
}

Table Files(const PackagePlan& plan) {
  Table table;
  for (const PackagePlan::File& file : plan.files) {
    Append16(table.entries, ++table.count);
    Append16(table.entries, file.folder + 1);
    Append16(table.entries, table.count);
    Append32(table.entries, 0);  // flags: write it whatever is there
    AppendText(table.entries, file.name);
  }
  return table;
}

Table Hives(const PackagePlan& plan) {
  Table table;
  for (const PackagePlan::Key& key : plan.keys) {
    Append16(table.entries, ++table.count);
    Append16(table.entries, key.root);
    Append16(table.entries, 0);
    AppendPath(table.entries, plan.folders.size() + table.count);
  }
  return table;
}

Table Values(const PackagePlan& plan) {
  Table table;
  for (const PackagePlan::Value& value : plan.values) {
    Append16(table.entries, ++table.count);
    Append16(table.entries, value.key + 1);
    Append16(table.entries, 0);
    Append32(table.entries, static_cast<std::size_t>(value.type));
    Append16(table.entries, value.name.size() + 1 + value.data.size());
    table.entries += value.name + '\0' + value.data;
  }
  return table;
}

}  // namespace

std::string FormatPackageSetup(const PackagePlan& plan) {
  const std::array<Table, 6> tables = {Strings(plan), Directories(plan), Files(plan),
                                       Hives(plan),   Values(plan),      Table{}};
  const std::string names = plan.application + '\0' + plan.provider + '\0';
  std::size_t size = kHeaderSize + names.size();
  std::string counts;
  std::string offsets;
  for (const Table& table : tables) {
    Append16(counts, table.count);
    Append32(offsets, size);
    size += table.entries.size();
  }
  std::string setup = "MSCE";
  Append32(setup, 0);
  Append32(setup, size);
  Append32(setup, 0);
  Append32(setup, 1);
  setup.append(7 * 4, '\0');  // any processor, any version of the system
  setup += counts + offsets;
  Append16(setup, kHeaderSize);
  Append16(setup, plan.application.size() + 1);
  Append16(setup, kHeaderSize + plan.application.size() + 1);
  Append16(setup, plan.provider.size() + 1);
  setup.append(kHeaderSize - setup.size(), '\0');  // for all platforms
  setup += names;
  for (const Table& table : tables) setup += table.entries;
  return setup;
}

}  // namespace tools

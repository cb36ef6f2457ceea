#include "support/cabinets.h"

#include <algorithm>

namespace test {
namespace {

constexpr std::size_t kHeaderSize = 36;
constexpr std::size_t kFolderSize = 8;
constexpr std::uint16_t kReservePresent = 4;

void Add16(std::string& bytes, std::size_t value) {
  bytes += static_cast<char>(value & 0xFF);
  bytes += static_cast<char>(value >> 8 & 0xFF);
}
void Add32(std::string& bytes, std::size_t value) {
  Add16(bytes, value & 0xFFFF);
  Add16(bytes, value >> 16);
}

/// A length in front, the text, and a zero that the length may count.
void AddText(std::string& bytes, const std::string& text, bool counts_zeros) {
  Add16(bytes, text.size() + (counts_zeros ? 1 : 0));
  bytes += text;
  if (counts_zeros) bytes += '\0';
}

void AddName(std::string& bytes, std::size_t field, const std::string& name, bool counts_zeros) {
  Put16(bytes, field, static_cast<std::uint16_t>(bytes.size()));
  Put16(bytes, field + 2, static_cast<std::uint16_t>(name.size() + (counts_zeros ? 1 : 0)));
  bytes += name + '\0';
}

std::uint16_t Claimed(std::optional<std::uint16_t> claim, std::size_t count) {
  return claim.value_or(static_cast<std::uint16_t>(count));
}

/// The data blocks of one folder.
std::string Blocks(const std::string& data, const CabinetPlan& plan, std::size_t& count) {
  std::string blocks;
  count = 0;
  for (std::size_t at = 0; at < data.size(); at += plan.block_size) {
    const std::string part = data.substr(at, plan.block_size);
    Add32(blocks, 0);  // no checksum
    Add16(blocks, part.size());
    Add16(blocks, part.size());
    blocks.append(plan.reserves ? plan.reserves->data : 0, 'd');
    blocks += part;
    ++count;
  }
  return blocks;
}

std::string FileRecords(const CabinetPlan& plan) {
  std::string records;
  std::uint16_t folder = 0;
  std::size_t offset = 0;
  for (const CabinetPlan::File& file : plan.files) {
    if (file.folder != folder) offset = 0;
    folder = file.folder;
    Add32(records, file.data.size());
    Add32(records, offset);
    Add16(records, file.claimed_folder.value_or(file.folder));
    Add16(records, 0x3461);  // 2006-03-01
    Add16(records, 0x70A4);  // 14:05:08
    Add16(records, 0x20);
    records += file.name + '\0';
    offset += file.data.size();
  }
  return records;
}

}  // namespace

void Put16(std::string& bytes, std::size_t at, std::uint16_t value) {
  std::string text;
  Add16(text, value);
  bytes.replace(at, text.size(), text);
}

void Put32(std::string& bytes, std::size_t at, std::uint32_t value) {
  std::string text;
  Add32(text, value);
  bytes.replace(at, text.size(), text);
}

std::string SetupBytes(const SetupPlan& plan) {
  std::string bytes(kSetupHeaderSize, '\0');
  bytes.replace(0, 4, "MSCE");
  Put32(bytes, 16, 1);
  Put16(bytes, kSetupStringCount, Claimed(plan.claimed_strings, plan.strings.size()));
  Put16(bytes, 50, static_cast<std::uint16_t>(plan.strings.size()));  // directories
  Put16(bytes, kSetupFileCount, Claimed(plan.claimed_files, plan.files.size()));
  AddName(bytes, kSetupApplication, plan.application, plan.counts_zeros);
  AddName(bytes, kSetupProvider, plan.provider, plan.counts_zeros);
  Put32(bytes, kSetupStrings, static_cast<std::uint32_t>(bytes.size()));
  for (const SetupPlan::String& string : plan.strings) {
    Add16(bytes, string.id);
    AddText(bytes, string.text, plan.counts_zeros);
  }
  Put32(bytes, 64, static_cast<std::uint32_t>(bytes.size()));
  for (const SetupPlan::String& string : plan.strings) {
    Add16(bytes, string.id);
    Add16(bytes, 4);
    Add16(bytes, string.id);
    Add16(bytes, 0);
  }
  Put32(bytes, kSetupFiles, static_cast<std::uint32_t>(bytes.size()));
  for (const SetupPlan::File& file : plan.files) {
    Add16(bytes, file.id);
    Add16(bytes, file.directory);
    Add16(bytes, file.id);
    Add32(bytes, 0);  // flags
    AddText(bytes, file.name, plan.counts_zeros);
  }
  Put16(bytes, 54, static_cast<std::uint16_t>(plan.keys.size()));
  Put32(bytes, 72, static_cast<std::uint32_t>(bytes.size()));
  for (const SetupPlan::Key& key : plan.keys) {
    for (const std::size_t field : {key.id, key.root, std::uint16_t{0}, std::uint16_t{4}}) {
      Add16(bytes, field);
    }
    Add16(bytes, key.string);
    Add16(bytes, 0);
  }
  Put16(bytes, 56, static_cast<std::uint16_t>(plan.values.size()));
  Put32(bytes, 76, static_cast<std::uint32_t>(bytes.size()));
  for (const SetupPlan::Value& value : plan.values) {
    Add16(bytes, 1);
    Add16(bytes, value.key);
    Add16(bytes, 0);
    Add32(bytes, value.type);
    Add16(bytes, value.data.size());
    bytes += value.data;
  }
  Put32(bytes, 80, static_cast<std::uint32_t>(bytes.size()));  // no shortcuts
  Put32(bytes, 8, static_cast<std::uint32_t>(bytes.size()));
  return bytes;
}

std::string CabinetBytes(const CabinetPlan& plan) {
  const CabinetPlan::Reserves reserves = plan.reserves.value_or(CabinetPlan::Reserves{});
  std::size_t folder_count = 0;
  for (const CabinetPlan::File& file : plan.files) {
    folder_count = std::max<std::size_t>(folder_count, file.folder + std::size_t{1});
  }
  const std::string records = FileRecords(plan);
  std::string bytes(kHeaderSize, '\0');
  bytes.replace(0, 4, "MSCF");
  bytes[24] = 3;
  bytes[25] = 1;
  Put16(bytes, 26, static_cast<std::uint16_t>(folder_count));
  Put16(bytes, kCabinetFileCount, static_cast<std::uint16_t>(plan.files.size()));
  if (plan.reserves) {
    Put16(bytes, 30, kReservePresent);
    Add16(bytes, reserves.header);
    bytes += static_cast<char>(reserves.folder);
    bytes += static_cast<char>(reserves.data);
    bytes.append(reserves.header, 'h');
  }
  const std::size_t files_at = bytes.size() + folder_count * (kFolderSize + reserves.folder);
  Put32(bytes, kCabinetFiles, static_cast<std::uint32_t>(files_at));
  std::string data;
  for (std::size_t folder = 0; folder < folder_count; ++folder) {
    std::string content;
    for (const CabinetPlan::File& file : plan.files) {
      if (file.folder == folder) content += file.data;
    }
    std::size_t block_count = 0;
    const std::string blocks = Blocks(content, plan, block_count);
    Add32(bytes, files_at + records.size() + data.size());
    Add16(bytes, block_count);
    Add16(bytes, plan.method);
    bytes.append(reserves.folder, 'f');
    data += blocks;
  }
  bytes += records + data;
  Put32(bytes, 8, static_cast<std::uint32_t>(bytes.size()));
  return bytes;
}

std::string SmallPackage(const std::string& content) {
  SetupPlan setup;
  setup.strings = {{1, "%CE1%\\Scan"}};
  setup.files = {{1, 1, "scan.exe"}};
  return CabinetBytes({{{kSetupName, SetupBytes(setup)}, {"SCAN.001", content}}, {}, 0, 32768});
}

}  // namespace test

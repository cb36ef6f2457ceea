// Input: a package of any bytes. Checks what preparing it relies on.
#include "upgrade/package/cabinet.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string_view>
#include <vector>

#include "upgrade/package/setup_file.h"

namespace {

using upgrade::PackageResult;

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckKey(const upgrade::SetupFile& setup) {
  constexpr std::string_view kApplications = "SOFTWARE\\Apps\\";
  upgrade::SetupFile::RegistryKey key;
  if (setup.ReadKey(&key) != PackageResult::kDone) return;
  Require(key.view().substr(0, kApplications.size()) == kApplications);
  // Never the key of all applications, and never one beside it.
  Require(key.view().find(' ', kApplications.size()) != std::string_view::npos);
  Require(key.size() <= kApplications.size() + 64 + 1 + 64);
}

void CheckPath(std::string_view path) {
  Require(path.size() < upgrade::InstalledPath::kSize);
  Require(path.find("\\\\") == std::string_view::npos);
  Require(path.find('\0') == std::string_view::npos);
}

void CheckFiles(const upgrade::SetupFile& setup) {
  upgrade::EntryIndex files(setup.stored(), setup.files());
  upgrade::EntryIndex strings(setup.stored(), setup.strings());
  const std::uint32_t count = files.table().count;
  std::vector<std::uint32_t> file_slots(files.SlotsFor(count));
  std::vector<std::uint32_t> string_slots(strings.SlotsFor(0xFFFF));
  Require(file_slots.size() <= count + 1U && string_slots.size() <= 0x10000U);
  files.Build(file_slots.data(), static_cast<std::uint32_t>(file_slots.size()));
  strings.Build(string_slots.data(), static_cast<std::uint32_t>(string_slots.size()));
  // What is claimed beyond what is there has no slot: one number more stands for all of it.
  const auto last = std::min(count, static_cast<std::uint32_t>(file_slots.size()));
  for (std::uint32_t id = 0; id <= last; ++id) {
    upgrade::InstalledPath path;
    std::uint64_t offset = 0;
    const PackageResult result = setup.ReadPath(id, files, strings, &path);
    if (result == PackageResult::kDone) {
      Require(files.Find(id, &offset) == PackageResult::kDone);
      CheckPath(path.view());
    } else {
      Require(path.view().empty());
    }
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  upgrade::StoredFile stored;
  if (upgrade::FindSetupFile(bytes, &stored) != PackageResult::kDone) return 0;
  Require(upgrade::SetupFile::IsOne(stored));
  const upgrade::SetupFile setup(stored);
  CheckKey(setup);
  CheckFiles(setup);
  return 0;
}

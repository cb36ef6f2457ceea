#include "tools/file_check.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <optional>

#include "base/crc32.h"
#include "base/number.h"
#include "base/text.h"
#include "storage/storage.h"
#include "text/names.h"
#include "tools/file_text.h"
#include "upgrade/list_file/list_file.h"
#include "upgrade/list_file/patterns.h"

namespace tools {
namespace {

constexpr std::string_view kRename = ".rename";
constexpr std::string_view kRamFile = "RAM:";

std::optional<std::filesystem::path> OnHost(sim::Storage& storage, std::string_view path) {
  std::u16string name;
  if (!sim::FromHostText(path, name)) return std::nullopt;
  return storage.HostPath(name.c_str());
}

/// A file that is listed as "x.rename" ends up as "x", unless there was an "x" already.
std::optional<std::filesystem::path> FindFile(sim::Storage& storage, std::string_view path) {
  auto found = OnHost(storage, path);
  if (!found && base::EndsWith(path, kRename)) {
    found = OnHost(storage, path.substr(0, path.size() - kRename.size()));
  }
  return found;
}

FileState Check(const std::filesystem::path& file, const upgrade::ListRecord& record) {
  std::ifstream in(file, std::ios::binary);
  std::vector<char> block(std::size_t{1} << 16U);
  base::Crc32 crc;
  std::uint64_t size = 0;
  while (in) {
    in.read(block.data(), static_cast<std::streamsize>(block.size()));
    crc.Update(block.data(), static_cast<std::size_t>(in.gcount()));
    size += static_cast<std::uint64_t>(in.gcount());
  }
  // A CRC of 0 cannot be listed; such a file has 1 in its place.
  const std::uint32_t listed = crc.value() == 0 ? 1 : crc.value();
  const bool right =
      size == base::LeadingNumber(record.size) && listed == base::LeadingNumber(record.crc);
  return right ? FileState::kRight : FileState::kWrong;
}

}  // namespace

bool FileCheck::all_right() const {
  return std::all_of(files.begin(), files.end(), [](const CheckedFile& file) {
    return file.state == FileState::kRight || file.state == FileState::kUnchecked;
  });
}

const char* NameOf(FileState state) {
  switch (state) {
    case FileState::kRight: return "right";
    case FileState::kWrong: return "wrong";
    case FileState::kMissing: return "missing";
    case FileState::kUnchecked: return "unchecked";
  }
  return "";
}

FileCheck CheckFiles(sim::Storage& storage, const Job& job, const std::string& configuration) {
  FileCheck check;
  const std::string list_path = FindField(job, "FileList", "Dest");
  if (list_path.empty()) {
    check.list_found = true;
    return check;
  }
  const auto list_file = OnHost(storage, list_path);
  if (!list_file) return check;
  check.list_found = true;
  const std::string list = ReadWholeFile(*list_file);
  upgrade::ListFileReader reader(list);
  for (upgrade::ListRecord record; reader.Next(&record);) {
    if (!upgrade::AnyListPatternMatches(record.masks, configuration)) continue;
    if (base::StartsWith(record.destination, kRamFile)) continue;  // no file of the storage
    CheckedFile checked{std::string(record.destination), FileState::kMissing};
    if (const auto file = FindFile(storage, record.destination)) {
      checked.state =
          base::LeadingNumber(record.crc) == 0 ? FileState::kUnchecked : Check(*file, record);
    }
    check.files.push_back(std::move(checked));
  }
  return check;
}

}  // namespace tools

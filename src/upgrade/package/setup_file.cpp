#include "upgrade/package/setup_file.h"

#include <cstring>

#include "base/little_endian.h"

namespace upgrade {
namespace {

constexpr std::uint32_t kFileHeadSize = 12;
constexpr std::uint32_t kStringHeadSize = 4;
constexpr std::uint32_t kLongestFileName = 260;
constexpr std::size_t kLongestName = 64;
/// So much of a folder's text is looked at. Only a text made of macros that stand for nothing could
/// say more, and there may be as many files as texts are long.
constexpr std::size_t kLongestFolder = 1024;

// Where the header says what.
constexpr std::size_t kStringCount = 48;
constexpr std::size_t kFileCount = 52;
constexpr std::size_t kStringOffset = 60;
constexpr std::size_t kFileOffset = 68;
constexpr std::size_t kApplication = 84;  ///< offset and length of its name
constexpr std::size_t kProvider = 88;

/// A field's length may or may not count a zero at its end.
template <std::size_t Capacity>
std::string_view TextIn(const char (&bytes)[Capacity], std::size_t size) noexcept {
  const std::string_view text(bytes, size < Capacity ? size : Capacity);
  return base::Part(text, 0, text.find('\0'));
}

}  // namespace

// ---- entries by number ----

/// @return what becomes of a number that the walk has not met.
template <typename Visit>
PackageResult EntryIndex::Walk(const Visit& visit) const noexcept {
  std::uint8_t head[kFileHeadSize];
  std::uint64_t at = table_.offset;
  for (std::uint32_t i = 0; i < table_.count; ++i) {
    const PackageResult result = file_.Read(at, head, table_.head_size);
    if (result != PackageResult::kDone) return result;
    const std::uint32_t length = base::Little16(head + table_.length_at);
    if (length > table_.longest_text) return PackageResult::kNameOrRegistry;
    visit(base::Little16(head), at);
    at += table_.head_size + length;
  }
  return PackageResult::kCannotRead;
}

std::uint32_t EntryIndex::SlotsFor(std::uint32_t largest) const noexcept {
  std::uint32_t slots = 1;
  Walk([&slots, largest](std::uint32_t id, std::uint64_t) noexcept {
    if (id >= slots && id <= largest) slots = id + 1;
  });
  return slots;
}

void EntryIndex::Build(std::uint32_t* slots, std::uint32_t count) noexcept {
  slots_ = slots;
  slot_count_ = count;
  missing_ = Walk([this](std::uint32_t id, std::uint64_t at) noexcept {
    if (id < slot_count_ && slots_[id] == 0) slots_[id] = static_cast<std::uint32_t>(at + 1);
  });
}

PackageResult EntryIndex::Find(std::uint32_t id, std::uint64_t* offset) const noexcept {
  if (id >= slot_count_ || slots_[id] == 0) return missing_;
  *offset = slots_[id] - 1;
  return PackageResult::kDone;
}

// ---- the file ----

bool SetupFile::IsOne(const StoredFile& file) noexcept {
  char header[kHeaderSize];
  return file.Read(0, header, sizeof header) == PackageResult::kDone &&
         std::memcmp(header, "MSCE", 4) == 0;
}

SetupFile::SetupFile(const StoredFile& file) noexcept : file_(file) {
  static_cast<void>(file_.Read(0, header_, sizeof header_));
}

EntryTable SetupFile::files() const noexcept {
  return {base::Little32(header_ + kFileOffset), base::Little16(header_ + kFileCount),
          kFileHeadSize, 10, kLongestFileName};
}

EntryTable SetupFile::strings() const noexcept {
  return {base::Little32(header_ + kStringOffset), base::Little16(header_ + kStringCount),
          kStringHeadSize, 2, 0xFFFF};
}

PackageResult SetupFile::AppendName(std::size_t field, RegistryKey* key) const noexcept {
  const std::size_t size = base::Little16(header_ + field + 2);
  if (size > kLongestName) return PackageResult::kNameOrRegistry;
  char name[kLongestName];
  const PackageResult result = file_.Read(base::Little16(header_ + field), name, size);
  if (result != PackageResult::kDone) return result;
  key->Append(TextIn(name, size));
  return PackageResult::kDone;
}

PackageResult SetupFile::ReadKey(RegistryKey* key) const noexcept {
  constexpr std::string_view kApplications = "SOFTWARE\\Apps\\";
  static_assert(kApplications.size() + 2 * kLongestName + 1 < RegistryKey::capacity());
  key->Assign(kApplications);
  const PackageResult result = AppendName(kProvider, key);
  if (result != PackageResult::kDone) return result;
  key->Append(" ");
  return AppendName(kApplication, key);
}

PackageResult SetupFile::ReadPath(std::uint32_t id, const EntryIndex& files,
                                  const EntryIndex& strings, InstalledPath* path) const noexcept {
  std::uint64_t at = 0;
  PackageResult result = files.Find(id, &at);
  if (result != PackageResult::kDone) return result;
  std::uint8_t head[kFileHeadSize];
  result = file_.Read(at, head, sizeof head);
  if (result != PackageResult::kDone) return result;
  const std::size_t name_size = base::Little16(head + 10);
  char name[kLongestFileName];
  result = file_.Read(at + sizeof head, name, name_size);
  if (result != PackageResult::kDone) return result;
  // KEPT ODDITY: the number of a file's directory is taken for that of a string. Packages have a
  // table of directories between the two; they are prepared when both count alike.
  result = strings.Find(base::Little16(head + 2), &at);
  if (result != PackageResult::kDone) return result;
  result = file_.Read(at, head, kStringHeadSize);
  if (result != PackageResult::kDone) return result;
  const std::size_t length = base::Little16(head + 2);
  const std::size_t folder_size = length < kLongestFolder ? length : kLongestFolder;
  char folder[kLongestFolder];
  result = file_.Read(at + kStringHeadSize, folder, folder_size);
  if (result != PackageResult::kDone) return result;
  path->AddFolder(TextIn(folder, folder_size));
  path->AddText("\\");
  path->AddText(TextIn(name, name_size));
  return PackageResult::kDone;
}

}  // namespace upgrade

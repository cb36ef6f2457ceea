// The setup file of a package: what the package is called and which files it installs.
#pragma once

#include <cstddef>
#include <cstdint>

#include "base/text.h"
#include "upgrade/package/cabinet.h"
#include "upgrade/package/installed_path.h"
#include "upgrade/package/package_result.h"

namespace upgrade {

/// A table of entries that have a number each, a text, and any order.
struct EntryTable {
  std::uint32_t offset = 0;  ///< within the setup file
  std::uint32_t count = 0;
  std::uint8_t head_size = 0;  ///< bytes before an entry's text
  std::uint8_t length_at = 0;  ///< where within them the text's length stands
  std::uint32_t longest_text = 0;
};

/// Finds entries by their numbers, after one walk over the table: the walk that each search would
/// take grows with a count that the file claims. Of entries with the same number the first counts.
/// Ends where an entry cannot be read or is too long: what lies behind it is not found either.
class EntryIndex {
 public:
  EntryIndex(const StoredFile& file, const EntryTable& table) noexcept
      : file_(file), table_(table) {}

  /// How many slots it needs to find every number up to `largest` that the table has.
  [[nodiscard]] std::uint32_t SlotsFor(std::uint32_t largest) const noexcept;
  /// @param slots  zeros, to be kept while entries are looked for
  void Build(std::uint32_t* slots, std::uint32_t count) noexcept;

  /// @param offset  receives where the entry stands within the setup file
  [[nodiscard]] PackageResult Find(std::uint32_t id, std::uint64_t* offset) const noexcept;
  [[nodiscard]] const EntryTable& table() const noexcept { return table_; }

 private:
  template <typename Visit>
  PackageResult Walk(const Visit& visit) const noexcept;

  const StoredFile& file_;
  const EntryTable table_;
  std::uint32_t* slots_ = nullptr;  ///< by number: 1 + the entry's offset, 0 for none
  std::uint32_t slot_count_ = 0;
  PackageResult missing_ = PackageResult::kCannotRead;  ///< for a number that is not there
};

/// Reads a setup file. Its numbers come from the network: every one is checked before it is used.
class SetupFile {
 public:
  using RegistryKey = base::FixedText<260>;

  /// Whether the file begins as a setup file does, and is long enough for one.
  [[nodiscard]] static bool IsOne(const StoredFile& file) noexcept;

  /// @param file  for which IsOne holds
  explicit SetupFile(const StoredFile& file) noexcept;

  /// The key, below HKEY_LOCAL_MACHINE, that says that the package is installed.
  [[nodiscard]] PackageResult ReadKey(RegistryKey* key) const noexcept;

  [[nodiscard]] EntryTable files() const noexcept;
  [[nodiscard]] EntryTable strings() const noexcept;

  /// Where the file with the number `id` goes.
  /// @param files    an index over files()
  /// @param strings  an index over strings()
  [[nodiscard]] PackageResult ReadPath(std::uint32_t id, const EntryIndex& files,
                                       const EntryIndex& strings,
                                       InstalledPath* path) const noexcept;

  [[nodiscard]] const StoredFile& stored() const noexcept { return file_; }

 private:
  static constexpr std::size_t kHeaderSize = 92;

  PackageResult AppendName(std::size_t field, RegistryKey* key) const noexcept;

  StoredFile file_;
  std::uint8_t header_[kHeaderSize] = {};
};

}  // namespace upgrade

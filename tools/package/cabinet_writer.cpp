#include "tools/package/cabinet_writer.h"

#include <algorithm>
#include <array>
#include <ctime>
#include <fstream>
#include <system_error>

#include "tools/failure.h"
#include "tools/package/little_endian.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kHeaderSize = 36;
constexpr std::size_t kFolderSize = 8;
constexpr std::size_t kBlockHeadSize = 8;
constexpr std::size_t kBlockSize = 32768;
constexpr std::size_t kArchive = 0x20;

/// The format's checksum: the words of the data, one over the other, then the rest from its high
/// byte down.
std::uint32_t Checksum(const std::string& bytes, std::uint32_t seed) {
  std::uint32_t sum = seed;
  const auto byte = [&bytes](std::size_t at) {
    return std::uint32_t{static_cast<std::uint8_t>(bytes[at])};
  };
  std::size_t at = 0;
  for (; at + 4 <= bytes.size(); at += 4) {
    sum ^= byte(at) | byte(at + 1) << 8 | byte(at + 2) << 16 | byte(at + 3) << 24;
  }
  std::uint32_t rest = 0;
  for (; at < bytes.size(); ++at) rest = rest << 8 | byte(at);
  return sum ^ rest;
}

/// Date and time as cabinets have them: two seconds a step, years from 1980 on.
std::pair<std::size_t, std::size_t> DateAndTime(std::int64_t seconds) {
  constexpr std::int64_t kFirst = 315532800;  // 1980-01-01
  constexpr std::int64_t kLast = 4354819198;  // 2107-12-31 23:59:58
  const std::time_t time = std::clamp(seconds, kFirst, kLast);
  std::tm at{};
  ::gmtime_r(&time, &at);
  const auto number = [](int value) { return static_cast<std::size_t>(value); };
  return {number(at.tm_year - 80) << 9 | number(at.tm_mon + 1) << 5 | number(at.tm_mday),
          number(at.tm_hour) << 11 | number(at.tm_min) << 5 | number(at.tm_sec) / 2};
}

/// The contents of all entries as one stream.
class Content {
 public:
  explicit Content(const std::vector<CabinetEntry>& entries) : entries_(entries) {}

  /// The next block; empty at the end.
  std::string Next() {
    std::string block;
    while (block.size() < kBlockSize && next_ < entries_.size()) {
      const CabinetEntry& entry = entries_[next_];
      const std::uint64_t left = entry.size - taken_;
      const auto part =
          static_cast<std::size_t>(std::min<std::uint64_t>(left, kBlockSize - block.size()));
      block += Take(entry, part);
      taken_ += part;
      if (taken_ < entry.size) continue;
      CheckEnd(entry);
      ++next_;
      taken_ = 0;
    }
    return block;
  }

 private:
  std::string Take(const CabinetEntry& entry, std::size_t size) {
    if (entry.content) return entry.content->substr(static_cast<std::size_t>(taken_), size);
    if (!in_.is_open()) in_.open(entry.file, std::ios::binary);
    std::string bytes(size, '\0');
    in_.read(bytes.data(), static_cast<std::streamsize>(size));
    if (!in_) Refuse(entry);
    return bytes;
  }
  void CheckEnd(const CabinetEntry& entry) {
    if (entry.content) return;
    if (in_.peek() != std::ifstream::traits_type::eof()) Refuse(entry);
    in_.close();
    in_.clear();
  }
  [[noreturn]] static void Refuse(const CabinetEntry& entry) {
    throw Failure(ExitCode::kBadInput, entry.file.string(),
                  "cannot be read, or has changed meanwhile");
  }

  const std::vector<CabinetEntry>& entries_;
  std::size_t next_ = 0;
  std::uint64_t taken_ = 0;  ///< of the entry that is next
  std::ifstream in_;
};

std::string FileRecords(const std::vector<CabinetEntry>& entries) {
  std::string records;
  std::uint64_t offset = 0;
  for (const CabinetEntry& entry : entries) {
    const auto [date, time] = DateAndTime(entry.time);
    Append32(records, static_cast<std::size_t>(entry.size));
    Append32(records, static_cast<std::size_t>(offset));
    Append16(records, 0);  // the only folder
    Append16(records, date);
    Append16(records, time);
    Append16(records, kArchive);
    records += entry.name + '\0';
    offset += entry.size;
  }
  return records;
}

/// Everything that stands before the data.
std::string Head(const std::vector<CabinetEntry>& entries) {
  std::uint64_t content = 0;
  for (const CabinetEntry& entry : entries) content += entry.size;
  const auto blocks = static_cast<std::size_t>((content + kBlockSize - 1) / kBlockSize);
  const std::string records = FileRecords(entries);
  const std::size_t data = kHeaderSize + kFolderSize + records.size();
  std::string head = "MSCF";
  Append32(head, 0);
  Append32(head, data + static_cast<std::size_t>(content) + blocks * kBlockHeadSize);
  Append32(head, 0);
  Append32(head, kHeaderSize + kFolderSize);
  Append32(head, 0);
  Append16(head, 0x0103);  // version 1.3
  Append16(head, 1);       // folders
  Append16(head, entries.size());
  Append16(head, 0);  // flags
  Append16(head, 0);  // of a set of cabinets
  Append16(head, 0);  // the first of it
  Append32(head, data);
  Append16(head, blocks);
  Append16(head, 0);  // stored
  return head + records;
}

/// A block's head: checksum, and its size twice.
std::string BlockHead(const std::string& block) {
  std::string sizes;
  Append16(sizes, block.size());
  Append16(sizes, block.size());
  std::string head;
  Append32(head, Checksum(sizes, Checksum(block, 0)));
  return head + sizes;
}

}  // namespace

void WriteCabinet(const fs::path& cabinet, const std::vector<CabinetEntry>& entries) {
  const fs::path beside = cabinet.string() + ".new";
  std::error_code error;
  try {
    std::ofstream out(beside, std::ios::binary | std::ios::trunc);
    const std::string head = Head(entries);
    out.write(head.data(), static_cast<std::streamsize>(head.size()));
    Content content(entries);
    for (std::string block = content.Next(); !block.empty() && out; block = content.Next()) {
      block.insert(0, BlockHead(block));
      out.write(block.data(), static_cast<std::streamsize>(block.size()));
    }
    out.close();
    if (out) fs::rename(beside, cabinet, error);
    if (!out || error) {
      throw Failure(ExitCode::kCannotWrite, cabinet.string(), "cannot be written",
                    "is the folder there, writable and not full?");
    }
  } catch (...) {
    fs::remove(beside, error);
    throw;
  }
}

}  // namespace tools

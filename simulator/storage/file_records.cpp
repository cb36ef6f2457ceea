#include "storage/file_records.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <string_view>
#include <utility>
#include <vector>

#include "storage/host_text.h"

namespace sim {
namespace {

/// The file is rewritten when it has this many lines more than twice its records.
constexpr std::size_t kSpareLines = 1024;
constexpr std::size_t kMostGathered = 64;

std::string SetLine(const std::string& path, const FileRecord& record) {
  std::array<char, 96> numbers{};
  const int length =
      std::snprintf(numbers.data(), numbers.size(), "S %x %llx %llx %llx ", record.attributes,
                    static_cast<unsigned long long>(record.created),
                    static_cast<unsigned long long>(record.accessed),
                    static_cast<unsigned long long>(record.written));
  return std::string(numbers.data(), static_cast<std::size_t>(length)) + path + '\n';
}

/// Takes a hexadecimal number and the blank behind it off the front of `text`.
bool TakeNumber(std::string_view& text, std::uint64_t& value) {
  const std::size_t blank = text.find(' ');
  if (blank == 0 || blank > 16) return false;
  value = 0;
  for (const char digit : text.substr(0, blank)) {
    const bool decimal = digit >= '0' && digit <= '9';
    if (!decimal && (digit < 'a' || digit > 'f')) return false;
    value = value << 4U | static_cast<std::uint64_t>(decimal ? digit - '0' : digit - 'a' + 10);
  }
  text.remove_prefix(blank + 1);
  return true;
}

}  // namespace

FileRecords::FileRecords(std::filesystem::path file) : file_(std::move(file)) {
  std::string text;
  if (!ReadHostText(file_, text)) {
    throw std::runtime_error("cannot read " + file_.string() + ": " + std::strerror(errno));
  }
  std::string_view rest = text;
  // What stands behind the last line end was cut off while it was written.
  for (std::size_t end = rest.find('\n'); end != std::string_view::npos; end = rest.find('\n')) {
    ReadLine(rest.substr(0, end));
    rest.remove_prefix(end + 1);
  }
  RewriteOrThrow();
}

FileRecords::~FileRecords() {
  Flush();
}

std::optional<FileRecord> FileRecords::Find(const std::string& path) const {
  const std::lock_guard<std::mutex> hold(mutex_);
  const auto found = records_.find(path);
  if (found == records_.end()) return std::nullopt;
  return found->second;
}

void FileRecords::Set(const std::string& path, const FileRecord& record) {
  const std::lock_guard<std::mutex> hold(mutex_);
  const auto [known, fresh] = records_.emplace(path, record);
  FileRecord& kept = known->second;
  const bool only_times =
      !fresh && kept.attributes == record.attributes && kept.created == record.created;
  kept = record;
  if (!only_times) return Append(SetLine(path, record));
  gathered_.insert(path);
  if (gathered_.size() > kMostGathered) WriteGathered();
}

void FileRecords::Flush() {
  const std::lock_guard<std::mutex> hold(mutex_);
  WriteGathered();
}

void FileRecords::WriteGathered() {
  std::set<std::string> paths;
  paths.swap(gathered_);
  for (const std::string& path : paths) {
    if (const auto record = records_.find(path); record != records_.end()) {
      Append(SetLine(path, record->second));
    }
  }
}

void FileRecords::Erase(const std::string& path) {
  const std::lock_guard<std::mutex> hold(mutex_);
  gathered_.erase(path);
  ApplyErase(path);
  Append("E " + path + '\n');
}

void FileRecords::Rename(const std::string& from, const std::string& to) {
  const std::lock_guard<std::mutex> hold(mutex_);
  WriteGathered();  // under the names that the line before knows
  ApplyRename(from, to);
  Append("R " + from + '\t' + to + '\n');
}

void FileRecords::Prune(const std::function<bool(const std::string&)>& exists) {
  const std::lock_guard<std::mutex> hold(mutex_);
  for (auto record = records_.begin(); record != records_.end();) {
    record = exists(record->first) ? std::next(record) : records_.erase(record);
  }
  RewriteOrThrow();
}

void FileRecords::ReadLine(std::string_view line) {
  if (line.size() < 3 || line[1] != ' ') return;
  std::string_view rest = line.substr(2);
  if (line[0] == 'E') ApplyErase(std::string(rest));
  if (line[0] == 'R') {
    const std::size_t tab = rest.find('\t');
    if (tab == std::string_view::npos) return;
    ApplyRename(std::string(rest.substr(0, tab)), std::string(rest.substr(tab + 1)));
  }
  if (line[0] != 'S') return;
  FileRecord record;
  std::uint64_t attributes = 0;
  const bool whole = TakeNumber(rest, attributes) && TakeNumber(rest, record.created) &&
                     TakeNumber(rest, record.accessed) && TakeNumber(rest, record.written);
  if (!whole || rest.empty()) return;
  record.attributes = static_cast<std::uint32_t>(attributes);
  records_[std::string(rest)] = record;
}

void FileRecords::ApplyErase(const std::string& path) {
  records_.erase(path);
  const std::string below = path + '/';
  auto record = records_.lower_bound(below);
  while (record != records_.end() && record->first.compare(0, below.size(), below) == 0) {
    record = records_.erase(record);
  }
}

void FileRecords::ApplyRename(const std::string& from, const std::string& to) {
  std::vector<std::pair<std::string, FileRecord>> moved;
  const std::string below = from + '/';
  if (const auto own = records_.find(from); own != records_.end())
    moved.emplace_back(to, own->second);
  for (auto record = records_.lower_bound(below);
       record != records_.end() && record->first.compare(0, below.size(), below) == 0; ++record) {
    moved.emplace_back(to + record->first.substr(from.size()), record->second);
  }
  ApplyErase(from);
  for (auto& [path, record] : moved) records_[path] = record;
}

void FileRecords::Append(const std::string& line) {
  ++lines_;
  if (lines_ > 2 * records_.size() + kSpareLines && Rewrite()) return;
  // A full host disk costs the record, not the file: attributes are the lesser loss.
  static_cast<void>(WriteAll(journal_.get(), line));
}

bool FileRecords::Rewrite() {
  // Tried again only after as many lines more, also when it fails.
  lines_ = records_.size();
  std::string text;
  for (const auto& [path, record] : records_) text += SetLine(path, record);
  if (!ReplaceHostText(file_, text)) return false;
  gathered_.clear();
  UniqueFd journal(::open(file_.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC | O_NOFOLLOW));
  if (!journal) return false;
  journal_ = std::move(journal);
  return true;
}

void FileRecords::RewriteOrThrow() {
  if (Rewrite()) return;
  throw std::runtime_error("cannot write " + file_.string() + ": " + std::strerror(errno));
}

}  // namespace sim

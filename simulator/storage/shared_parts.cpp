#include "storage/shared_parts.h"

#include <algorithm>
#include <cstring>
#include <iterator>

namespace sim {

bool SharedParts::Take(std::uint64_t at, const char* bytes, std::size_t size) {
  const std::uint64_t end = at + size;
  if (end <= content_->size() && std::memcmp(content_->data() + at, bytes, size) == 0) {
    Note(at, end);
    return true;
  }
  Forget(at, end);
  return false;
}

void SharedParts::Note(std::uint64_t begin, std::uint64_t end) {
  auto next = parts_.upper_bound(begin);
  if (next != parts_.begin()) {
    const auto before = std::prev(next);
    if (before->second >= begin) {
      begin = before->first;
      end = std::max(end, before->second);
      next = before;
    }
  }
  while (next != parts_.end() && next->first <= end) {
    end = std::max(end, next->second);
    next = parts_.erase(next);
  }
  parts_.emplace_hint(next, begin, end);
}

void SharedParts::Forget(std::uint64_t begin, std::uint64_t end) {
  auto part = parts_.lower_bound(begin);
  if (part != parts_.begin()) {
    const auto before = std::prev(part);
    const std::uint64_t before_end = before->second;
    if (before_end > begin) before->second = begin;
    if (before_end > end) parts_.emplace(end, before_end);
  }
  while (part != parts_.end() && part->first < end) {
    const std::uint64_t part_end = part->second;
    part = parts_.erase(part);
    if (part_end > end) parts_.emplace(end, part_end);
  }
}

void SharedParts::Fill(std::uint64_t at, char* bytes, std::size_t size) const {
  const std::uint64_t end = at + size;
  auto part = parts_.upper_bound(at);
  if (part != parts_.begin()) --part;
  for (; part != parts_.end() && part->first < end; ++part) {
    const std::uint64_t from = std::max(part->first, at);
    const std::uint64_t to = std::min(part->second, end);
    if (from < to) {
      std::memcpy(bytes + (from - at), content_->data() + from,
                  static_cast<std::size_t>(to - from));
    }
  }
}

void SharedParts::ForEach(
    const std::function<void(std::uint64_t, const char*, std::size_t)>& use) const {
  for (const auto& [begin, end] : parts_) {
    use(begin, content_->data() + begin, static_cast<std::size_t>(end - begin));
  }
}

}  // namespace sim

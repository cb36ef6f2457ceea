// Which parts of a file are equal to a content that many devices have, and so need not be kept once
// for each of them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>

namespace sim {

/// Bytes that all devices of a fleet are about to receive.
using SharedContent = std::shared_ptr<const std::string>;

/// Says of one file what of it stands in the shared content, at the same place, instead of on the
/// host. For one thread at a time.
class SharedParts {
 public:
  explicit SharedParts(SharedContent content) : content_(std::move(content)) {}

  /// A write of `size` bytes at `at`. @return true when they are the shared content's: then they
  ///   are noted and must not be written; otherwise whatever was noted there is forgotten.
  bool Take(std::uint64_t at, const char* bytes, std::size_t size);
  /// Puts what is noted into `bytes`, which have been read from the host at `at`.
  void Fill(std::uint64_t at, char* bytes, std::size_t size) const;
  /// The file ends at `size` now.
  void Cut(std::uint64_t size) { Forget(size, UINT64_MAX); }
  /// Tells every part: its place and its bytes.
  void ForEach(const std::function<void(std::uint64_t, const char*, std::size_t)>& use) const;
  [[nodiscard]] bool empty() const { return parts_.empty(); }

 private:
  void Note(std::uint64_t begin, std::uint64_t end);
  void Forget(std::uint64_t begin, std::uint64_t end);

  const SharedContent content_;
  std::map<std::uint64_t, std::uint64_t> parts_;  ///< begin and end; they do not touch
};

}  // namespace sim

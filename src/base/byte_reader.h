// Reading fields in network order out of bytes that somebody else sent.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace base {

/// A cursor over a byte range. The first read that would pass the end fails the reader: that one
/// and every later one give zeros, and ok() stays false. So a parser reads all its fields in a row
/// and asks once. Owns nothing; the bytes must outlive it and every text it gave.
class ByteReader {
 public:
  constexpr ByteReader(const std::uint8_t* bytes, std::size_t size) noexcept
      : next_(bytes), left_(size) {}

  /// Whether everything asked for was there.
  [[nodiscard]] constexpr bool ok() const noexcept { return ok_; }
  /// Bytes not read yet, 0 once failed.
  [[nodiscard]] constexpr std::size_t left() const noexcept { return left_; }

  constexpr std::uint8_t U8() noexcept { return static_cast<std::uint8_t>(Number(1)); }
  constexpr std::uint16_t U16() noexcept { return static_cast<std::uint16_t>(Number(2)); }
  constexpr std::uint32_t U32() noexcept { return Number(4); }

  /// The next `count` bytes, or null when they are not all there.
  constexpr const std::uint8_t* Bytes(std::size_t count) noexcept {
    if (count > left_) {
      ok_ = false;
      left_ = 0;
    }
    if (!ok_) return nullptr;
    const std::uint8_t* bytes = next_;
    next_ += count;
    left_ -= count;
    return bytes;
  }
  constexpr void Skip(std::size_t count) noexcept { static_cast<void>(Bytes(count)); }

  /// Text up to the next zero, which is skipped. Fails when no zero is left.
  std::string_view Text() noexcept {
    const std::size_t size = TextSize(left_);
    return View(Bytes(size + 1), size);
  }

  /// Text up to the next zero, or all that is left; never fails.
  std::string_view RestAsText() noexcept {
    const std::size_t size = TextSize(left_);
    return View(Bytes(left_), size);
  }

  /// A field of `width` bytes that holds a text, padded with zeros.
  std::string_view PaddedText(std::size_t width) noexcept {
    const std::size_t size = TextSize(width < left_ ? width : left_);
    return View(Bytes(width), size);
  }

 private:
  constexpr std::uint32_t Number(std::size_t width) noexcept {
    const std::uint8_t* bytes = Bytes(width);
    std::uint32_t value = 0;
    for (std::size_t i = 0; bytes != nullptr && i < width; ++i) value = value << 8 | bytes[i];
    return value;
  }

  [[nodiscard]] std::size_t TextSize(std::size_t at_most) const noexcept {
    if (at_most == 0) return 0;  // the bytes may be null then
    const void* end = std::memchr(next_, 0, at_most);
    if (end == nullptr) return at_most;
    return static_cast<std::size_t>(static_cast<const std::uint8_t*>(end) - next_);
  }

  static std::string_view View(const std::uint8_t* bytes, std::size_t size) noexcept {
    if (bytes == nullptr) return {};
    return {reinterpret_cast<const char*>(bytes), size};
  }

  const std::uint8_t* next_;
  std::size_t left_;
  bool ok_ = true;
};

}  // namespace base

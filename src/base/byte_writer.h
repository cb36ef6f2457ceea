// Writing fields in network order into a buffer of fixed size.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace base {

/// The counterpart of ByteReader: the first write that would pass the end fails the writer, nothing
/// is written from then on, and the caller asks once.
class ByteWriter {
 public:
  constexpr ByteWriter(std::uint8_t* out, std::size_t capacity) noexcept
      : out_(out), capacity_(capacity) {}

  /// Bytes written, or 0 when not everything fitted.
  [[nodiscard]] constexpr std::size_t length() const noexcept { return ok_ ? length_ : 0; }

  constexpr void U8(std::uint8_t value) noexcept { Number(value, 1); }
  constexpr void U16(std::uint16_t value) noexcept { Number(value, 2); }
  constexpr void U32(std::uint32_t value) noexcept { Number(value, 4); }

  /// `bytes` may overlap the place where they go, and be null when there are none.
  void Bytes(const void* bytes, std::size_t count) noexcept {
    std::uint8_t* to = Take(count);
    if (to != nullptr && count > 0) std::memmove(to, bytes, count);
  }

  void Zeros(std::size_t count) noexcept {
    std::uint8_t* to = Take(count);
    if (to != nullptr && count > 0) std::memset(to, 0, count);
  }

  /// The text and a terminating zero.
  void Text(std::string_view text) noexcept {
    Bytes(text.data(), text.size());
    U8(0);
  }

  /// A field of `width` bytes: the text, cut if need be, padded with zeros.
  void PaddedText(std::string_view text, std::size_t width) noexcept {
    const std::size_t taken = text.size() < width ? text.size() : width;
    Bytes(text.data(), taken);
    Zeros(width - taken);
  }

 private:
  constexpr std::uint8_t* Take(std::size_t count) noexcept {
    if (count > capacity_ - length_) ok_ = false;
    if (!ok_) return nullptr;
    std::uint8_t* place = out_ + length_;
    length_ += count;
    return place;
  }

  constexpr void Number(std::uint32_t value, std::size_t width) noexcept {
    std::uint8_t* to = Take(width);
    for (std::size_t i = 0; to != nullptr && i < width; ++i) {
      to[i] = static_cast<std::uint8_t>(value >> (8 * (width - 1 - i)));
    }
  }

  std::uint8_t* out_;
  std::size_t capacity_;
  std::size_t length_ = 0;
  bool ok_ = true;
};

}  // namespace base

// Bounded copies, comparisons and fixed text fields. Everything that writes text into a buffer of
// fixed size goes through CopyText.
#pragma once

#include <cstddef>
#include <cstring>
#include <string_view>
#include <type_traits>

namespace base {

/// The platform's 16-bit text unit, known here without the platform's header.
using WideChar = std::conditional_t<sizeof(wchar_t) == 2, wchar_t, char16_t>;
using WideView = std::basic_string_view<WideChar>;

/// Copies `text` into `out`, cut to `capacity` - 1 characters and always terminated; the one way
/// into a fixed buffer. A capacity of 0 writes nothing. `text` may overlap `out`.
/// @return false when the text was cut.
template <typename Char>
bool CopyText(Char* out, std::size_t capacity, std::basic_string_view<Char> text) noexcept {
  if (capacity == 0) return false;
  const std::size_t room = capacity - 1;
  const std::size_t taken = text.size() < room ? text.size() : room;
  if (taken > 0) std::memmove(out, text.data(), taken * sizeof(Char));
  out[taken] = Char{};
  return taken == text.size();
}

template <std::size_t Capacity>
bool CopyText(char (&out)[Capacity], std::string_view text) noexcept {
  return CopyText<char>(out, Capacity, text);
}

/// The text as a view; a null pointer is an empty text.
[[nodiscard]] constexpr std::string_view View(const char* text) noexcept {
  return text == nullptr ? std::string_view{} : std::string_view{text};
}

/// The part of `text` from `from` on, at most `count` characters of it; empty where the text has
/// none. Unlike substr it has no error to throw, for which the device's library has no run time.
template <typename Char>
[[nodiscard]] constexpr std::basic_string_view<Char> Part(
    std::basic_string_view<Char> text, std::size_t from,
    std::size_t count = std::basic_string_view<Char>::npos) noexcept {
  if (from >= text.size()) return {};
  const std::size_t left = text.size() - from;
  return {text.data() + from, count < left ? count : left};
}

/// A text field of a fixed-size record, which a stranger may have left without its terminator.
template <std::size_t Capacity>
[[nodiscard]] std::string_view FieldView(const char (&field)[Capacity]) noexcept {
  const void* end = std::memchr(field, 0, Capacity);
  return {field, end == nullptr ? Capacity
                                : static_cast<std::size_t>(static_cast<const char*>(end) - field)};
}

/// ASCII only, whatever the device's locale: names of the interface are ASCII.
[[nodiscard]] constexpr char LowerAscii(char letter) noexcept {
  return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

[[nodiscard]] constexpr bool EqualIgnoringCase(std::string_view a, std::string_view b) noexcept {
  if (a.size() != b.size()) return false;
  for (std::size_t i = 0; i < a.size(); ++i) {
    if (LowerAscii(a[i]) != LowerAscii(b[i])) return false;
  }
  return true;
}

template <typename Char>
[[nodiscard]] constexpr bool StartsWith(std::basic_string_view<Char> text,
                                        std::basic_string_view<Char> start) noexcept {
  return Part(text, 0, start.size()) == start;
}
[[nodiscard]] constexpr bool StartsWith(std::string_view text, std::string_view start) noexcept {
  return Part(text, 0, start.size()) == start;
}

[[nodiscard]] constexpr bool EndsWith(std::string_view text, std::string_view end) noexcept {
  return text.size() >= end.size() && Part(text, text.size() - end.size()) == end;
}

/// A zero-terminated text of exactly `Capacity` characters of storage, at most `Capacity` - 1 of
/// them text. Always terminated; never writes outside itself.
template <typename Char, std::size_t Capacity>
class BasicFixedText {
  static_assert(Capacity > 0, "room for the terminating zero");

 public:
  using ViewType = std::basic_string_view<Char>;

  constexpr BasicFixedText() noexcept = default;
  explicit BasicFixedText(ViewType text) noexcept {
    static_cast<void>(CopyText<Char>(chars_, Capacity, text));
  }

  /// Replaces the text. @return false when it was cut to fit; what fits is kept.
  bool Assign(ViewType text) noexcept { return CopyText<Char>(chars_, Capacity, text); }

  /// Adds at the end, with the same rule. `text` must not point into this object.
  bool Append(ViewType text) noexcept {
    const std::size_t used = size();
    return CopyText<Char>(chars_ + used, Capacity - used, text);
  }

  constexpr void Clear() noexcept { chars_[0] = Char{}; }

  [[nodiscard]] constexpr const Char* c_str() const noexcept { return chars_; }
  /// The storage itself, for calls that fill it; whoever writes keeps it terminated.
  [[nodiscard]] constexpr Char* data() noexcept { return chars_; }
  [[nodiscard]] static constexpr std::size_t capacity() noexcept { return Capacity; }
  [[nodiscard]] constexpr std::size_t size() const noexcept {
    std::size_t length = 0;
    while (length < Capacity - 1 && chars_[length] != Char{}) ++length;
    return length;
  }
  [[nodiscard]] constexpr ViewType view() const noexcept { return {chars_, size()}; }
  [[nodiscard]] constexpr bool empty() const noexcept { return chars_[0] == Char{}; }

 private:
  Char chars_[Capacity] = {};
};

template <std::size_t Capacity>
using FixedText = BasicFixedText<char, Capacity>;
template <std::size_t Capacity>
using WideFixedText = BasicFixedText<WideChar, Capacity>;

static_assert(sizeof(FixedText<24>) == 24, "a record keeps its declared sizes");

}  // namespace base

// Between the product's 8-bit texts and the platform's 16-bit ones.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <string_view>

#include "base/text.h"

namespace device {

/// Converts `text` with the device's code page into `out`, cut to `capacity` - 1 units and always
/// terminated. A capacity of 0 writes nothing.
/// @return false when the text was cut.
bool ToWide(std::string_view text, WCHAR* out, std::size_t capacity) noexcept;
/// The same the other way. Characters that the code page lacks become '?'.
bool ToNarrow(std::basic_string_view<WCHAR> text, char* out, std::size_t capacity) noexcept;

/// A 16-bit text made from 8-bit ones, for the arguments of platform calls:
/// `DeleteFileW(device::WideText<>(path).c_str())`.
template <std::size_t Capacity = 300>
class WideText : public base::WideFixedText<Capacity> {
  using Base = base::WideFixedText<Capacity>;

 public:
  using Base::Append;
  using Base::Assign;

  WideText() noexcept = default;
  /// Null is an empty text.
  explicit WideText(const char* text) noexcept { Assign(text); }
  explicit WideText(std::string_view text) noexcept { Assign(text); }

  /// @return false when the text was cut to fit.
  bool Assign(std::string_view text) noexcept { return ToWide(text, Base::data(), Capacity); }
  bool Assign(const char* text) noexcept { return Assign(base::View(text)); }
  bool Append(std::string_view text) noexcept {
    const std::size_t used = Base::size();
    return ToWide(text, Base::data() + used, Capacity - used);
  }
  bool Append(const char* text) noexcept { return Append(base::View(text)); }
};

/// An 8-bit text made from 16-bit ones.
template <std::size_t Capacity = 300>
class NarrowText : public base::FixedText<Capacity> {
  using Base = base::FixedText<Capacity>;

 public:
  using Base::Append;
  using Base::Assign;

  NarrowText() noexcept = default;
  /// Null is an empty text.
  explicit NarrowText(const WCHAR* text) noexcept { Assign(text); }
  explicit NarrowText(std::basic_string_view<WCHAR> text) noexcept { Assign(text); }

  /// @return false when the text was cut to fit.
  bool Assign(std::basic_string_view<WCHAR> text) noexcept {
    return ToNarrow(text, Base::data(), Capacity);
  }
  bool Assign(const WCHAR* text) noexcept {
    return Assign(text == nullptr ? std::basic_string_view<WCHAR>{}
                                  : std::basic_string_view<WCHAR>{text});
  }
  bool Append(std::basic_string_view<WCHAR> text) noexcept {
    const std::size_t used = Base::size();
    return ToNarrow(text, Base::data() + used, Capacity - used);
  }
};

}  // namespace device

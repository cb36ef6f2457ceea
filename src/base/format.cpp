#include "base/format.h"

#include <cstdint>
#include <cstring>

namespace base {
namespace {

/// Takes characters as long as there is room and drops the rest.
class Sink {
 public:
  Sink(char* out, std::size_t capacity) noexcept : out_(out), room_(capacity - 1) {}

  void Put(char c) noexcept {
    if (used_ < room_) out_[used_++] = c;
  }
  void Put(const char* text, std::size_t length) noexcept {
    for (std::size_t i = 0; i < length && used_ < room_; ++i) out_[used_++] = text[i];
  }
  void Fill(char c, std::size_t count) noexcept {
    for (std::size_t i = 0; i < count && used_ < room_; ++i) out_[used_++] = c;
  }
  std::size_t Finish() noexcept {
    out_[used_] = '\0';
    return used_;
  }

 private:
  char* out_;
  std::size_t room_;
  std::size_t used_ = 0;
};

constexpr const char* kLower = "0123456789abcdef";
constexpr const char* kUpper = "0123456789ABCDEF";

/// What stands between a '%' and its letter.
struct Conversion {
  bool left = false;
  bool zeros = false;
  std::size_t width = 0;
  bool has_precision = false;
  std::size_t precision = 0;
};

void PutPadded(Sink& sink, const Conversion& how, const char* sign, const char* text,
               std::size_t length) noexcept {
  const std::size_t sign_length = std::strlen(sign);
  const std::size_t total = length + sign_length;
  const std::size_t padding = how.width > total ? how.width - total : 0;
  if (!how.left && !how.zeros) sink.Fill(' ', padding);
  sink.Put(sign, sign_length);
  if (!how.left && how.zeros) sink.Fill('0', padding);
  sink.Put(text, length);
  if (how.left) sink.Fill(' ', padding);
}

void PutNumber(Sink& sink, const Conversion& how, std::uint32_t value, unsigned base,
               const char* digits, bool negative) noexcept {
  char text[10];  // 4294967295
  std::size_t at = sizeof text;
  do {
    text[--at] = digits[value % base];
    value /= base;
  } while (value != 0);
  PutPadded(sink, how, negative ? "-" : "", text + at, sizeof text - at);
}

void PutText(Sink& sink, const Conversion& how, const char* text) noexcept {
  std::size_t length = 0;
  if (text != nullptr) {
    while ((!how.has_precision || length < how.precision) && text[length] != '\0') ++length;
  }
  Conversion blank_padded = how;
  blank_padded.zeros = false;
  PutPadded(sink, blank_padded, "", text == nullptr ? "" : text, length);
}

const char* ReadSize(const char* at, std::size_t& value) noexcept {
  value = 0;
  for (; *at >= '0' && *at <= '9'; ++at) {
    if (value < 100000) value = value * 10 + static_cast<std::size_t>(*at - '0');
  }
  return at;
}

const char* ReadWidth(const char* at, Conversion& how, va_list* arguments) noexcept {
  if (*at != '*') return ReadSize(at, how.width);
  const int width = va_arg(*arguments, int);
  how.left = how.left || width < 0;
  how.width = width < 0 ? 0U - static_cast<unsigned>(width) : static_cast<unsigned>(width);
  return at + 1;
}

const char* ReadPrecision(const char* at, Conversion& how, va_list* arguments) noexcept {
  if (*at != '.') return at;
  how.has_precision = true;
  if (*++at != '*') return ReadSize(at, how.precision);
  const int precision = va_arg(*arguments, int);
  how.has_precision = precision >= 0;
  how.precision = precision < 0 ? 0 : static_cast<std::size_t>(precision);
  return at + 1;
}

/// Reads what stands between a '%' and its letter. @return the letter's place.
const char* ReadConversion(const char* at, Conversion& how, va_list* arguments) noexcept {
  for (; *at == '-' || *at == '0'; ++at) (*at == '-' ? how.left : how.zeros) = true;
  at = ReadWidth(at, how, arguments);
  at = ReadPrecision(at, how, arguments);
  while (*at == 'l' || *at == 'h') ++at;
  return at;
}

void PutSigned(Sink& sink, const Conversion& how, std::int32_t value) noexcept {
  const auto bits = static_cast<std::uint32_t>(value);
  PutNumber(sink, how, value < 0 ? 0U - bits : bits, 10, kLower, value < 0);
}

/// @return false, with no argument taken, when the letter is unknown.
bool PutConversion(Sink& sink, const Conversion& how, char letter, va_list* arguments) noexcept {
  switch (letter) {
    case 'd':
    case 'i': PutSigned(sink, how, va_arg(*arguments, std::int32_t)); return true;
    case 'u':
      PutNumber(sink, how, va_arg(*arguments, std::uint32_t), 10, kLower, false);
      return true;
    case 'x':
      PutNumber(sink, how, va_arg(*arguments, std::uint32_t), 16, kLower, false);
      return true;
    case 'X':
      PutNumber(sink, how, va_arg(*arguments, std::uint32_t), 16, kUpper, false);
      return true;
    case 's': PutText(sink, how, va_arg(*arguments, const char*)); return true;
    case 'c': {
      const char c = static_cast<char>(va_arg(*arguments, int));
      PutPadded(sink, how, "", &c, 1);
      return true;
    }
    case '%': sink.Put('%'); return true;
    default: return false;
  }
}

}  // namespace

std::size_t FormatV(char* out, std::size_t capacity, const char* format,
                    va_list arguments) noexcept {
  if (capacity == 0) return 0;
  va_list rest;  // functions share one walk over it; `arguments` itself may be an array's address
  va_copy(rest, arguments);
  Sink sink(out, capacity);
  for (const char* at = format; *at != '\0'; ++at) {
    if (*at != '%') {
      sink.Put(*at);
      continue;
    }
    const char* const start = at;
    Conversion how;
    at = ReadConversion(start + 1, how, &rest);
    if (PutConversion(sink, how, *at, &rest)) continue;
    if (*at == '\0') --at;
    sink.Put(start, static_cast<std::size_t>(at - start) + 1);
  }
  va_end(rest);
  return sink.Finish();
}

std::size_t Format(char* out, std::size_t capacity, const char* format, ...) noexcept {
  va_list arguments;
  va_start(arguments, format);
  const std::size_t length = FormatV(out, capacity, format, arguments);
  va_end(arguments);
  return length;
}

}  // namespace base

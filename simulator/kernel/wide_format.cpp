#include "kernel/wide_format.h"

#include <algorithm>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>

#include "locale/code_pages.h"

namespace sim {
namespace {

/// No width or precision makes a text larger than this: a damaged format must not eat the memory.
constexpr int kLongestField = 4096;

struct Directive {
  bool left = false;
  bool plus = false;
  bool blank = false;
  bool zeros = false;
  bool alternate = false;
  int width = 0;
  std::optional<int> precision;
  char16_t length = 0;
  char16_t conversion = 0;
};

/// Reads a format, taking arguments as it goes.
class Formatter {
 public:
  Formatter(const WCHAR* format, std::va_list arguments) : at_(format) {
    va_copy(arguments_, arguments);
  }
  ~Formatter() { va_end(arguments_); }
  Formatter(const Formatter&) = delete;
  Formatter& operator=(const Formatter&) = delete;

  std::u16string Run() {
    while (*at_ != 0) {
      if (*at_ != u'%') {
        out_ += *at_++;
      } else {
        Convert();
      }
    }
    return std::move(out_);
  }

 private:
  void Convert() {
    const WCHAR* start = at_++;
    const Directive d = Read();
    switch (d.conversion) {
      case u'%': out_ += u'%'; return;
      case u'd':
      case u'i': AddSigned(d, va_arg(arguments_, std::int32_t)); return;
      case u'u': AddNumber(d, va_arg(arguments_, std::uint32_t), 10, u""); return;
      case u'o':
        AddNumber(d, va_arg(arguments_, std::uint32_t), 8, d.alternate ? u"0" : u"");
        return;
      case u'x':
        AddNumber(d, va_arg(arguments_, std::uint32_t), 16, d.alternate ? u"0x" : u"");
        return;
      case u'X':
        AddNumber(d, va_arg(arguments_, std::uint32_t), 16, d.alternate ? u"0X" : u"");
        return;
      case u'p': AddPointer(d); return;
      case u'c':
      case u'C': Pad(d, std::u16string(1, static_cast<char16_t>(va_arg(arguments_, int)))); return;
      case u's':
      case u'S': AddText(d); return;
      default: out_.append(start, at_); return;
    }
  }

  Directive Read() {
    Directive d;
    ReadFlags(d);
    d.width = ReadNumber();
    if (d.width < 0) {
      d.left = true;
      d.width = -d.width;
    }
    if (*at_ == u'.') {
      ++at_;
      const int precision = ReadNumber();
      if (precision >= 0) d.precision = precision;
    }
    while (*at_ == u'l' || *at_ == u'h' || *at_ == u'w') d.length = *at_++;
    if (*at_ != 0) d.conversion = *at_++;
    return d;
  }

  void ReadFlags(Directive& d) {
    for (;; ++at_) {
      switch (*at_) {
        case u'-': d.left = true; break;
        case u'+': d.plus = true; break;
        case u' ': d.blank = true; break;
        case u'0': d.zeros = true; break;
        case u'#': d.alternate = true; break;
        default: return;
      }
    }
  }

  int ReadNumber() {
    if (*at_ == u'*') {
      ++at_;
      return std::clamp(va_arg(arguments_, int), -kLongestField, kLongestField);
    }
    int number = 0;
    for (; *at_ >= u'0' && *at_ <= u'9'; ++at_) {
      number = std::min(number * 10 + (*at_ - u'0'), kLongestField);
    }
    return number;
  }

  void AddSigned(const Directive& d, std::int32_t value) {
    const auto bits = static_cast<std::uint32_t>(value);
    if (value < 0) {
      AddNumber(d, 0U - bits, 10, u"-");
    } else {
      AddNumber(d, bits, 10, d.plus ? u"+" : d.blank ? u" " : u"");
    }
  }

  void AddPointer(Directive d) {
    d.precision = static_cast<int>(2 * sizeof(void*));
    AddNumber(d, reinterpret_cast<std::uintptr_t>(va_arg(arguments_, void*)), 16, u"");
  }

  void AddNumber(const Directive& d, std::uint64_t value, unsigned base, const char16_t* prefix) {
    const char16_t* symbols = d.conversion == u'x' ? u"0123456789abcdef" : u"0123456789ABCDEF";
    std::u16string digits;
    for (std::uint64_t left = value; left != 0; left /= base) digits += symbols[left % base];
    const auto wanted = static_cast<std::size_t>(d.precision.value_or(1));
    if (digits.size() < wanted) digits.append(wanted - digits.size(), u'0');
    std::reverse(digits.begin(), digits.end());
    const std::u16string sign = value == 0 && d.alternate ? u"" : prefix;
    const std::size_t used = sign.size() + digits.size();
    const auto width = static_cast<std::size_t>(d.width);
    if (d.zeros && !d.left && !d.precision && used < width) digits.insert(0, width - used, u'0');
    Pad(d, sign + digits);
  }

  void AddText(const Directive& d) {
    const bool narrow = d.length == u'h' || (d.conversion == u'S' && d.length == 0);
    const std::size_t limit =
        d.precision ? static_cast<std::size_t>(*d.precision) : static_cast<std::size_t>(-1);
    std::u16string text;
    if (narrow) {
      const char* from = va_arg(arguments_, const char*);
      if (from == nullptr) from = "(null)";
      std::size_t size = 0;
      while (size < limit && from[size] != 0) ++size;
      text = FromAnsi(std::string_view(from, size));
    } else {
      const WCHAR* from = va_arg(arguments_, const WCHAR*);
      if (from == nullptr) from = u"(null)";
      while (text.size() < limit && *from != 0) text += *from++;
    }
    Pad(d, text);
  }

  void Pad(const Directive& d, const std::u16string& text) {
    const auto width = static_cast<std::size_t>(d.width);
    const std::size_t blanks = text.size() < width ? width - text.size() : 0;
    if (!d.left) out_.append(blanks, u' ');
    out_ += text;
    if (d.left) out_.append(blanks, u' ');
  }

  const WCHAR* at_;
  std::va_list arguments_;
  std::u16string out_;
};

}  // namespace

std::u16string FormatWide(const WCHAR* format, std::va_list arguments) {
  return Formatter(format, arguments).Run();
}

}  // namespace sim

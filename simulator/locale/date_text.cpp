#include "locale/date_text.h"

#include <algorithm>
#include <optional>

namespace sim {
namespace {

constexpr std::u16string_view kDays[] = {u"Sunday",   u"Monday", u"Tuesday", u"Wednesday",
                                         u"Thursday", u"Friday", u"Saturday"};
constexpr std::u16string_view kMonths[] = {u"January",   u"February", u"March",    u"April",
                                           u"May",       u"June",     u"July",     u"August",
                                           u"September", u"October",  u"November", u"December"};

std::u16string Digits(unsigned value, std::size_t width) {
  const std::string plain = std::to_string(value);
  std::u16string text(width > plain.size() ? width - plain.size() : 0, u'0');
  text.append(plain.begin(), plain.end());
  return text;
}

/// The day's or month's number with one or two letters, its short name with three, else the long.
std::u16string NumberOrName(unsigned number, std::u16string_view name, std::size_t letters) {
  if (letters <= 2) return Digits(number, letters);
  return std::u16string(letters == 3 ? name.substr(0, 3) : name);
}

/// Writes a picture string; `element` answers for a run of equal letters, or with nothing when the
/// letter has no meaning.
template <typename Element>
std::u16string Write(std::u16string_view picture, Element element) {
  std::u16string out;
  bool quoted = false;
  for (std::size_t at = 0; at < picture.size();) {
    const char16_t letter = picture[at];
    if (letter == u'\'') {
      const bool doubled = at + 1 < picture.size() && picture[at + 1] == u'\'';
      if (doubled) out += letter;
      if (!doubled) quoted = !quoted;
      at += doubled ? 2 : 1;
      continue;
    }
    std::size_t end = at + 1;
    while (!quoted && end < picture.size() && picture[end] == letter) ++end;
    const std::optional<std::u16string> text = quoted ? std::nullopt : element(letter, end - at);
    out += text ? *text : std::u16string(picture.substr(at, end - at));
    at = end;
  }
  return out;
}

}  // namespace

std::u16string DateText(const SYSTEMTIME& date, std::u16string_view picture) {
  const auto element = [&date](char16_t letter,
                               std::size_t count) -> std::optional<std::u16string> {
    switch (letter) {
      case u'd':
        return NumberOrName(date.wDay, count > 2 ? kDays[date.wDayOfWeek % 7] : u"", count);
      case u'M': return NumberOrName(date.wMonth, kMonths[(date.wMonth + 11U) % 12], count);
      case u'y': return count <= 2 ? Digits(date.wYear % 100U, count) : Digits(date.wYear, 4);
      case u'g': return std::u16string(u"A.D.");
      default: return std::nullopt;
    }
  };
  return Write(picture, element);
}

std::u16string TimeText(const SYSTEMTIME& time, std::u16string_view picture, TimeStyle style) {
  const auto element = [&time, style](char16_t letter,
                                      std::size_t count) -> std::optional<std::u16string> {
    const std::size_t width = std::min<std::size_t>(count, 2);
    const unsigned half_day_hour = time.wHour % 12 == 0 ? 12U : time.wHour % 12U;
    switch (letter) {
      case u'h': return Digits(style.force_24_hours ? time.wHour : half_day_hour, width);
      case u'H': return Digits(time.wHour, width);
      case u'm': return Digits(time.wMinute, width);
      case u's': return Digits(time.wSecond, width);
      case u't': {
        const std::u16string_view marker = time.wHour < 12 ? u"AM" : u"PM";
        return std::u16string(style.no_marker ? u"" : marker.substr(0, width));
      }
      default: return std::nullopt;
    }
  };
  return Write(picture, element);
}

}  // namespace sim

// GetDateFormatW and GetTimeFormatW.
#include <algorithm>
#include <optional>
#include <string>

#include "ce/errors.h"
#include "ce/system.h"
#include "faults/api_call.h"
#include "locale/clock.h"
#include "locale/date_text.h"

namespace {

constexpr std::u16string_view kShortDate = u"M/d/yyyy";
constexpr std::u16string_view kLongDate = u"dddd, MMMM dd, yyyy";

std::u16string_view DefaultTimePicture(DWORD flags) {
  const bool hour_24 = (flags & TIME_FORCE24HOURFORMAT) != 0;
  const bool marker = !hour_24 && (flags & TIME_NOTIMEMARKER) == 0;
  if ((flags & TIME_NOMINUTESORSECONDS) != 0) return hour_24 ? u"HH" : marker ? u"h tt" : u"h";
  if ((flags & TIME_NOSECONDS) != 0) return hour_24 ? u"HH:mm" : marker ? u"h:mm tt" : u"h:mm";
  return hour_24 ? u"HH:mm:ss" : marker ? u"h:mm:ss tt" : u"h:mm:ss";
}

/// A null time means now. @return nothing when the given one does not exist.
std::optional<SYSTEMTIME> TimeOrNow(const sim::ApiCall& call, const SYSTEMTIME* given) {
  if (given == nullptr) {
    return sim::ToCalendar(sim::ToLocalTicks(call.device(), sim::SystemTicks(call.device())));
  }
  const std::optional<sim::FileTicks> ticks = sim::FromCalendar(*given);
  return ticks ? sim::ToCalendar(*ticks) : std::nullopt;
}

/// @return units with the terminating zero; 0 when they do not fit.
int Deliver(sim::ApiCall& call, const std::u16string& result, WCHAR* text, int size) {
  const int needed = static_cast<int>(result.size()) + 1;
  if (size == 0) return call.Return(needed);
  if (needed > size) return call.Fail(ERROR_INSUFFICIENT_BUFFER, 0);
  std::copy_n(result.c_str(), needed, text);
  return call.Return(needed);
}

}  // namespace

extern "C" int GetDateFormatW(LCID locale, DWORD flags, const SYSTEMTIME* date, const WCHAR* format,
                              WCHAR* text, int size) {
  sim::ApiCall call("GetDateFormatW", ERROR_INVALID_PARAMETER);
  call.Argument("locale", locale);
  if (call.failed()) return call.Return(0);
  if (size < 0 || (size > 0 && text == nullptr)) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  if (flags != 0 && (format != nullptr || (flags != DATE_SHORTDATE && flags != DATE_LONGDATE))) {
    return call.Fail(ERROR_INVALID_FLAGS, 0);
  }
  const std::optional<SYSTEMTIME> when = TimeOrNow(call, date);
  if (!when) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  const std::u16string_view picture = format != nullptr        ? format
                                      : flags == DATE_LONGDATE ? kLongDate
                                                               : kShortDate;
  return Deliver(call, sim::DateText(*when, picture), text, size);
}

extern "C" int GetTimeFormatW(LCID locale, DWORD flags, const SYSTEMTIME* time, const WCHAR* format,
                              WCHAR* text, int size) {
  sim::ApiCall call("GetTimeFormatW", ERROR_INVALID_PARAMETER);
  call.Argument("locale", locale);
  if (call.failed()) return call.Return(0);
  if (size < 0 || (size > 0 && text == nullptr)) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  constexpr DWORD kCuts = TIME_NOMINUTESORSECONDS | TIME_NOSECONDS;
  constexpr DWORD kKnown = kCuts | TIME_NOTIMEMARKER | TIME_FORCE24HOURFORMAT;
  // Taking minutes or seconds out of a caller's own picture is not supplied.
  if ((flags & ~kKnown) != 0 || (format != nullptr && (flags & kCuts) != 0)) {
    return call.Fail(ERROR_INVALID_FLAGS, 0);
  }
  // Only the time of day counts: a date that does not exist is no reason to fail.
  SYSTEMTIME time_of_day = {};
  if (time != nullptr) {
    time_of_day = *time;
    time_of_day.wYear = 2000;
    time_of_day.wMonth = 1;
    time_of_day.wDay = 1;
  }
  const std::optional<SYSTEMTIME> when = TimeOrNow(call, time != nullptr ? &time_of_day : nullptr);
  if (!when) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  const sim::TimeStyle style = {(flags & TIME_FORCE24HOURFORMAT) != 0,
                                (flags & TIME_NOTIMEMARKER) != 0};
  const std::u16string_view picture = format != nullptr ? format : DefaultTimePicture(flags);
  return Deliver(call, sim::TimeText(*when, picture, style), text, size);
}

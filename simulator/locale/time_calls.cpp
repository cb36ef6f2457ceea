// The calls that tell and convert times.
#include <cstdint>
#include <optional>

#include "ce/errors.h"
#include "ce/system.h"
#include "faults/api_call.h"
#include "locale/clock.h"

namespace {

SYSTEMTIME CalendarOf(sim::FileTicks ticks) {
  return sim::ToCalendar(ticks).value_or(SYSTEMTIME{});
}

/// Both directions between UTC and local file times.
BOOL Shift(const char* name, const FILETIME* from, FILETIME* to,
           sim::FileTicks (*shift)(const sim::Device&, sim::FileTicks)) {
  sim::ApiCall call(name, ERROR_INVALID_PARAMETER);
  if (call.failed()) return call.Return(FALSE);
  if (from == nullptr || to == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  *to = sim::ToFileTime(shift(call.device(), sim::ToTicks(*from)));
  return call.Return(TRUE);
}

}  // namespace

extern "C" void GetLocalTime(SYSTEMTIME* time) {
  sim::ApiCall call("GetLocalTime", sim::kCannotFail);
  *time = CalendarOf(sim::ToLocalTicks(call.device(), sim::SystemTicks(call.device())));
}

extern "C" void GetSystemTime(SYSTEMTIME* time) {
  sim::ApiCall call("GetSystemTime", sim::kCannotFail);
  *time = CalendarOf(sim::SystemTicks(call.device()));
}

extern "C" BOOL FileTimeToSystemTime(const FILETIME* file_time, SYSTEMTIME* system_time) {
  sim::ApiCall call("FileTimeToSystemTime", ERROR_INVALID_PARAMETER);
  if (call.failed()) return call.Return(FALSE);
  if (file_time == nullptr || system_time == nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::optional<SYSTEMTIME> time = sim::ToCalendar(sim::ToTicks(*file_time));
  if (!time) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  *system_time = *time;
  return call.Return(TRUE);
}

extern "C" BOOL SystemTimeToFileTime(const SYSTEMTIME* system_time, FILETIME* file_time) {
  sim::ApiCall call("SystemTimeToFileTime", ERROR_INVALID_PARAMETER);
  if (call.failed()) return call.Return(FALSE);
  if (file_time == nullptr || system_time == nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::optional<sim::FileTicks> ticks = sim::FromCalendar(*system_time);
  if (!ticks) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  *file_time = sim::ToFileTime(*ticks);
  return call.Return(TRUE);
}

extern "C" BOOL FileTimeToLocalFileTime(const FILETIME* file_time, FILETIME* local) {
  return Shift("FileTimeToLocalFileTime", file_time, local, sim::ToLocalTicks);
}

extern "C" BOOL LocalFileTimeToFileTime(const FILETIME* local, FILETIME* file_time) {
  return Shift("LocalFileTimeToFileTime", local, file_time, sim::ToSystemTicks);
}

extern "C" LONG CompareFileTime(const FILETIME* first, const FILETIME* second) {
  sim::ApiCall call("CompareFileTime", sim::kCannotFail);
  const sim::FileTicks a = sim::ToTicks(*first);
  const sim::FileTicks b = sim::ToTicks(*second);
  return call.Return(a < b ? -1 : a > b ? 1 : 0);
}

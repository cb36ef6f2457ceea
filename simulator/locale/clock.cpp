#include "locale/clock.h"

#include <array>
#include <chrono>

#include "device/device.h"
#include "world/world.h"

namespace sim {
namespace {

/// From 1601-01-01 to 1970-01-01.
constexpr FileTicks kUnixEpoch = 116'444'736'000'000'000ULL;
constexpr FileTicks kEndOfCalendar = 0x8000'0000'0000'0000ULL;
constexpr std::uint32_t kFirstYear = 1601;
constexpr std::uint32_t kLastYear = 30827;
constexpr std::uint32_t kDaysPer400Years = 146'097;

bool IsLeapYear(std::uint32_t year) {
  return year % 4 == 0 && (year % 100 != 0 || year % 400 == 0);
}

std::uint32_t DaysInMonth(std::uint32_t year, std::uint32_t month) {
  constexpr std::array<std::uint8_t, 12> kDays = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  return month == 2 && IsLeapYear(year) ? 29 : kDays[month - 1];
}

std::uint32_t DaysBeforeYear(std::uint32_t year) {
  const std::uint32_t past = year - kFirstYear;
  return past * 365 + past / 4 - past / 100 + past / 400;
}

FileTicks OffsetTicks(std::int32_t minutes) {
  return static_cast<FileTicks>(std::int64_t{minutes} * 60 *
                                static_cast<std::int64_t>(kTicksPerSecond));
}

}  // namespace

FileTicks SystemTicks(const Device& device) {
  using std::chrono::duration_cast;
  using Ticks = std::chrono::duration<std::int64_t, std::ratio<1, 10'000'000>>;
  if (!device.world().is_virtual()) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    return kUnixEpoch + static_cast<FileTicks>(duration_cast<Ticks>(now).count());
  }
  const auto passed = duration_cast<Ticks>(device.world().now()).count();
  return device.start_ticks() + static_cast<FileTicks>(passed);
}

FileTicks StartTicks(const Profile& profile) {
  // A profile that was not read from a file may hold any text here; the device then starts in 2006.
  constexpr std::string_view kFallback = "2006-03-01 00:00:00";
  const std::optional<FileTicks> given = ParseTime(profile.start_time);
  return (given ? *given : *ParseTime(kFallback)) - OffsetTicks(profile.utc_offset_minutes);
}

FileTicks ToLocalTicks(const Device& device, FileTicks utc) {
  return utc + OffsetTicks(device.profile().utc_offset_minutes);
}

FileTicks ToSystemTicks(const Device& device, FileTicks local) {
  return local - OffsetTicks(device.profile().utc_offset_minutes);
}

FILETIME ToFileTime(FileTicks ticks) {
  return {static_cast<DWORD>(ticks), static_cast<DWORD>(ticks >> 32)};
}

FileTicks ToTicks(const FILETIME& time) {
  return FileTicks{time.dwHighDateTime} << 32 | time.dwLowDateTime;
}

std::optional<SYSTEMTIME> ToCalendar(FileTicks ticks) {
  if (ticks >= kEndOfCalendar) return std::nullopt;
  auto days = static_cast<std::uint32_t>(ticks / kTicksPerDay);
  auto milliseconds = static_cast<std::uint32_t>(ticks % kTicksPerDay / kTicksPerMillisecond);
  SYSTEMTIME time = {};
  time.wDayOfWeek = static_cast<WORD>((days + 1) % 7);  // 1601-01-01 was a Monday
  std::uint32_t year = kFirstYear + days / kDaysPer400Years * 400;
  days %= kDaysPer400Years;
  for (; days >= (IsLeapYear(year) ? 366U : 365U); ++year) days -= IsLeapYear(year) ? 366U : 365U;
  std::uint32_t month = 1;
  for (; days >= DaysInMonth(year, month); ++month) days -= DaysInMonth(year, month);
  time.wYear = static_cast<WORD>(year);
  time.wMonth = static_cast<WORD>(month);
  time.wDay = static_cast<WORD>(days + 1);
  time.wMilliseconds = static_cast<WORD>(milliseconds % 1000);
  milliseconds /= 1000;
  time.wSecond = static_cast<WORD>(milliseconds % 60);
  time.wMinute = static_cast<WORD>(milliseconds / 60 % 60);
  time.wHour = static_cast<WORD>(milliseconds / 3600);
  return time;
}

std::optional<FileTicks> FromCalendar(const SYSTEMTIME& time) {
  if (time.wYear < kFirstYear || time.wYear > kLastYear) return std::nullopt;
  if (time.wMonth < 1 || time.wMonth > 12 || time.wDay < 1) return std::nullopt;
  if (time.wDay > DaysInMonth(time.wYear, time.wMonth)) return std::nullopt;
  if (time.wHour > 23 || time.wMinute > 59 || time.wSecond > 59 || time.wMilliseconds > 999) {
    return std::nullopt;
  }
  FileTicks days = DaysBeforeYear(time.wYear) + time.wDay - 1U;
  for (std::uint32_t month = 1; month < time.wMonth; ++month) {
    days += DaysInMonth(time.wYear, month);
  }
  const std::uint32_t seconds = time.wHour * 3600U + time.wMinute * 60U + time.wSecond;
  return days * kTicksPerDay + seconds * kTicksPerSecond +
         time.wMilliseconds * kTicksPerMillisecond;
}

std::optional<FileTicks> ParseTime(std::string_view text) {
  constexpr std::string_view kPattern = "dddd-dd-dd dd:dd:dd";
  if (text.size() != kPattern.size()) return std::nullopt;
  WORD numbers[6] = {};
  std::size_t number = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (kPattern[i] != 'd') {
      if (text[i] != kPattern[i]) return std::nullopt;
      ++number;
      continue;
    }
    if (text[i] < '0' || text[i] > '9') return std::nullopt;
    numbers[number] = static_cast<WORD>(numbers[number] * 10 + (text[i] - '0'));
  }
  SYSTEMTIME time = {};
  time.wYear = numbers[0];
  time.wMonth = numbers[1];
  time.wDay = numbers[2];
  time.wHour = numbers[3];
  time.wMinute = numbers[4];
  time.wSecond = numbers[5];
  return FromCalendar(time);
}

}  // namespace sim

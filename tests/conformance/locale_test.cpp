// Text conversion, dates and times, seen through the platform alone.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "conformance/differences.h"
#include "coredll.h"

namespace {

using conformance::Difference;
using conformance::Differs;

constexpr WCHAR kUntouched = 0xBDBD;

std::string Shown(const WCHAR* text) {
  std::string shown;
  for (; *text != 0; ++text) shown += *text < 0x80 ? static_cast<char>(*text) : '#';
  return shown;
}

// ---- MultiByteToWideChar ----

TEST(MultiByteToWideCharTest, CountsTheTerminatorWhenTheLengthIsLeftToIt) {
  std::array<WCHAR, 8> wide;
  wide.fill(kUntouched);

  EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, "MR41", -1, wide.data(), 8), 5);

  EXPECT_EQ(Shown(wide.data()), "MR41");
  EXPECT_EQ(wide[5], kUntouched) << "nothing behind the terminator";
}

TEST(MultiByteToWideCharTest, AddsNoTerminatorToACountedText) {
  std::array<WCHAR, 8> wide;
  wide.fill(kUntouched);

  EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, "MR41", 4, wide.data(), 8), 4);

  EXPECT_EQ(wide[3], WCHAR{'1'});
  EXPECT_EQ(wide[4], kUntouched);
}

TEST(MultiByteToWideCharTest, OnlyCountsWhenNoRoomIsOffered) {
  EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, "MR41", -1, nullptr, 0), 5);
  EXPECT_EQ(MultiByteToWideChar(CP_UTF8, 0, "\xE2\x82\xAC", 3, nullptr, 0), 1) << "a euro sign";
}

TEST(MultiByteToWideCharTest, RefusesTooLittleRoomAndWritesNothingBehindIt) {
  std::array<WCHAR, 8> wide;
  wide.fill(kUntouched);
  SetLastError(0xDEADBEEF);

  EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, "MR41", -1, wide.data(), 4), 0);

  EXPECT_EQ(GetLastError(), DWORD{ERROR_INSUFFICIENT_BUFFER});
  for (std::size_t i = 4; i < wide.size(); ++i) EXPECT_EQ(wide[i], kUntouched) << i;
}

TEST(MultiByteToWideCharTest, RefusesWrongArguments) {
  std::array<WCHAR, 8> wide;
  char text[] = "x";
  struct Case {
    const char* text;
    int length;
    WCHAR* out;
    int size;
    const char* why;
  };
  const Case cases[] = {
      {nullptr, -1, wide.data(), 8, "no text"},
      {text, 0, wide.data(), 8, "no length"},
      {text, -1, nullptr, 8, "room without a buffer"},
      {text, -1, wide.data(), -1, "a negative size"},
  };
  for (const Case& c : cases) {
    SetLastError(0);
    EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, c.text, c.length, c.out, c.size), 0) << c.why;
    EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_PARAMETER}) << c.why;
  }
}

TEST(MultiByteToWideCharTest, ReadsEveryByteOfWindows1252) {
  struct Case {
    unsigned char byte;
    WCHAR wide;
  };
  static constexpr Case kCases[] = {{0x41, 0x41},   {0x7F, 0x7F},   {0x80, 0x20AC}, {0x81, 0x81},
                                    {0x8A, 0x0160}, {0x99, 0x2122}, {0x9F, 0x0178}, {0xA0, 0xA0},
                                    {0xE4, 0xE4},   {0xFF, 0xFF}};
  for (const Case& c : kCases) {
    const char text = static_cast<char>(c.byte);
    WCHAR wide = 0;
    EXPECT_EQ(MultiByteToWideChar(CP_ACP, 0, &text, 1, &wide, 1), 1);
    EXPECT_EQ(wide, c.wide) << int{c.byte};
  }
}

TEST(MultiByteToWideCharTest, TellsMalformedUtf8OnlyWhenAsked) {
  std::array<WCHAR, 8> wide = {};
  EXPECT_GT(MultiByteToWideChar(CP_UTF8, 0, "a\xFF", 2, wide.data(), 8), 0);

  SetLastError(0);
  EXPECT_EQ(MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, "a\xFF", 2, wide.data(), 8), 0);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NO_UNICODE_TRANSLATION});
}

// ---- CharLowerBuffW ----

TEST(CharLowerBuffWTest, LowersLettersOfAllAlphabetsAndNothingBehindThem) {
  WCHAR text[] = {'A', 'z', '1', '\\', 0xC4, 0xD7, 0x0416, 0, 'B', 'C'};

  EXPECT_EQ(CharLowerBuffW(text, 9), 9U);

  const WCHAR expected[] = {'a', 'z', '1', '\\', 0xE4, 0xD7, 0x0436, 0, 'b', 'C'};
  for (std::size_t i = 0; i < 10; ++i) EXPECT_EQ(text[i], expected[i]) << i;
}

TEST(CharLowerBuffWTest, DoesNothingToNoCharacters) {
  WCHAR text[] = {'A', 0};
  EXPECT_EQ(CharLowerBuffW(text, 0), 0U);
  EXPECT_EQ(text[0], WCHAR{'A'});
}

// ---- WideCharToMultiByte ----

TEST(WideCharToMultiByteTest, PutsAQuestionMarkForWhatTheCodePageLacks) {
  const WCHAR wide[] = {'A', 0x4E2D, 0x20AC, 0};
  std::array<char, 8> text;
  text.fill('\xBD');
  BOOL substituted = FALSE;

  EXPECT_EQ(WideCharToMultiByte(CP_ACP, 0, wide, -1, text.data(), 8, nullptr, &substituted), 4);

  EXPECT_STREQ(text.data(), "A?\x80");
  EXPECT_TRUE(substituted);
  EXPECT_EQ(text[4], '\xBD');
}

TEST(WideCharToMultiByteTest, TakesTheCallersOwnSubstitute) {
  const WCHAR wide[] = {0x4E2D, 'B', 0};
  std::array<char, 8> text = {};
  BOOL substituted = FALSE;

  EXPECT_EQ(WideCharToMultiByte(CP_ACP, 0, wide, -1, text.data(), 8, "*", &substituted), 3);

  EXPECT_STREQ(text.data(), "*B");
  EXPECT_TRUE(substituted);
}

TEST(WideCharToMultiByteTest, SaysThatNothingWasSubstituted) {
  std::array<char, 8> text = {};
  BOOL substituted = TRUE;

  EXPECT_EQ(WideCharToMultiByte(CP_ACP, 0, TEXT("ok"), -1, text.data(), 8, nullptr, &substituted),
            3);

  EXPECT_FALSE(substituted);
}

TEST(WideCharToMultiByteTest, RefusesTooLittleRoomAndWritesNothingBehindIt) {
  std::array<char, 8> text;
  text.fill('\xBD');
  SetLastError(0);

  EXPECT_EQ(WideCharToMultiByte(CP_ACP, 0, TEXT("MR41"), -1, text.data(), 4, nullptr, nullptr), 0);

  EXPECT_EQ(GetLastError(), DWORD{ERROR_INSUFFICIENT_BUFFER});
  for (std::size_t i = 4; i < text.size(); ++i) EXPECT_EQ(text[i], '\xBD') << i;
}

TEST(WideCharToMultiByteTest, WritesUtf8AndTakesNoSubstituteThere) {
  const WCHAR wide[] = {0x20AC, 0xD83D, 0xDE00, 0};  // a euro sign and a pair of surrogates
  std::array<char, 16> text = {};

  EXPECT_EQ(WideCharToMultiByte(CP_UTF8, 0, wide, -1, text.data(), 16, nullptr, nullptr), 8);
  EXPECT_STREQ(text.data(), "\xE2\x82\xAC\xF0\x9F\x98\x80");

  if (Differs(Difference::kUtf8)) return;
  SetLastError(0);
  EXPECT_EQ(WideCharToMultiByte(CP_UTF8, 0, wide, -1, text.data(), 16, "?", nullptr), 0);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_PARAMETER});
}

// ---- times ----

SYSTEMTIME At(WORD year, WORD month, WORD day, WORD hour, WORD minute, WORD second) {
  SYSTEMTIME time = {};
  time.wYear = year;
  time.wMonth = month;
  time.wDay = day;
  time.wHour = hour;
  time.wMinute = minute;
  time.wSecond = second;
  return time;
}

std::uint64_t Ticks(const FILETIME& time) {
  return static_cast<std::uint64_t>(time.dwHighDateTime) << 32 | time.dwLowDateTime;
}

TEST(SystemTimeToFileTimeTest, CountsFromTheYear1601) {
  struct Case {
    SYSTEMTIME time;
    std::uint64_t ticks;
  };
  const Case cases[] = {
      {At(1601, 1, 1, 0, 0, 0), 0},
      {At(1970, 1, 1, 0, 0, 0), 116444736000000000ULL},
      {At(2006, 3, 1, 14, 5, 9), 127856955090000000ULL},  // 1141221909 s after 1970
  };
  for (const Case& c : cases) {
    FILETIME file_time = {0xBDBDBDBD, 0xBDBDBDBD};
    EXPECT_TRUE(SystemTimeToFileTime(&c.time, &file_time));
    EXPECT_EQ(Ticks(file_time), c.ticks) << c.time.wYear;
  }
}

TEST(SystemTimeToFileTimeTest, RefusesTimesThatDoNotExist) {
  const SYSTEMTIME cases[] = {At(1600, 12, 31, 0, 0, 0), At(2006, 0, 1, 0, 0, 0),
                              At(2006, 13, 1, 0, 0, 0),  At(2006, 2, 29, 0, 0, 0),
                              At(1900, 2, 29, 0, 0, 0),  At(2006, 4, 31, 0, 0, 0),
                              At(2006, 4, 0, 0, 0, 0),   At(2006, 4, 1, 24, 0, 0),
                              At(2006, 4, 1, 0, 60, 0),  At(2006, 4, 1, 0, 0, 60)};
  for (const SYSTEMTIME& time : cases) {
    if (time.wMonth == 2 && Differs(Difference::kCalendar)) continue;
    FILETIME file_time = {};
    EXPECT_FALSE(SystemTimeToFileTime(&time, &file_time))
        << time.wYear << '-' << time.wMonth << '-' << time.wDay;
  }
}

TEST(FileTimeToSystemTimeTest, UndoesTheOtherDirectionAndKnowsTheDayOfTheWeek) {
  const SYSTEMTIME cases[] = {At(1601, 1, 1, 0, 0, 0), At(2000, 2, 29, 23, 59, 59),
                              At(2006, 3, 1, 14, 5, 9), At(2100, 12, 31, 0, 0, 1),
                              At(9999, 12, 31, 23, 59, 59)};
  const WORD days[] = {1, 2, 3, 5, 5};  // Monday, Tuesday, Wednesday, Friday, Friday
  for (std::size_t i = 0; i < std::size(cases); ++i) {
    FILETIME file_time = {};
    SYSTEMTIME back = {};
    ASSERT_TRUE(SystemTimeToFileTime(&cases[i], &file_time));
    ASSERT_TRUE(FileTimeToSystemTime(&file_time, &back));
    EXPECT_EQ(back.wDayOfWeek, days[i]) << cases[i].wYear;
    back.wDayOfWeek = 0;
    EXPECT_EQ(std::memcmp(&back, &cases[i], sizeof back), 0) << cases[i].wYear;
  }
}

TEST(FileTimeToSystemTimeTest, RefusesTimesBeyondTheCalendar) {
  const FILETIME file_time = {0, 0x80000000U};
  SYSTEMTIME time = {};

  EXPECT_FALSE(FileTimeToSystemTime(&file_time, &time));
}

TEST(LocalFileTimeTest, GoesThereAndBack) {
  const FILETIME utc = {0x12345678, 0x01C63D37};
  FILETIME local = {};
  FILETIME back = {};

  ASSERT_TRUE(FileTimeToLocalFileTime(&utc, &local));
  ASSERT_TRUE(LocalFileTimeToFileTime(&local, &back));

  EXPECT_EQ(Ticks(back), Ticks(utc));
}

TEST(CompareFileTimeTest, OrdersByBothHalves) {
  const FILETIME early = {9, 1};
  const FILETIME late = {1, 2};

  EXPECT_EQ(CompareFileTime(&early, &late), -1);
  EXPECT_EQ(CompareFileTime(&late, &early), 1);
  EXPECT_EQ(CompareFileTime(&late, &late), 0);
}

TEST(GetLocalTimeTest, IsATimeThatExists) {
  SYSTEMTIME time;
  std::memset(&time, 0xBD, sizeof time);

  GetLocalTime(&time);

  FILETIME file_time = {};
  EXPECT_TRUE(SystemTimeToFileTime(&time, &file_time));
}

// ---- formats ----

struct PictureCase {
  SYSTEMTIME time;
  const WCHAR* picture;
  const char* text;
};

using Formatter = int (*)(LCID, DWORD, const SYSTEMTIME*, const WCHAR*, WCHAR*, int);

template <std::size_t Count>
void ExpectPictures(Formatter format, const PictureCase (&cases)[Count]) {
  for (const PictureCase& c : cases) {
    WCHAR text[64] = {};
    const int length = format(LOCALE_USER_DEFAULT, 0, &c.time, c.picture, text, 64);
    EXPECT_EQ(Shown(text), c.text);
    EXPECT_EQ(length, static_cast<int>(std::strlen(c.text)) + 1);
  }
}

TEST(GetTimeFormatWTest, WritesPictures) {
  const PictureCase cases[] = {
      {At(2006, 3, 1, 14, 5, 9), TEXT("hh:mm:ss tt"), "02:05:09 PM"},
      {At(2006, 3, 1, 0, 5, 9), TEXT("hh:mm:ss tt"), "12:05:09 AM"},
      {At(2006, 3, 1, 12, 0, 0), TEXT("h:m:s t"), "12:0:0 P"},
      {At(2006, 3, 1, 14, 5, 9), TEXT("HH:mm:ss"), "14:05:09"},
      {At(2006, 3, 1, 4, 5, 9), TEXT("H'h'mm"), "4h05"},
      {At(2006, 3, 1, 4, 5, 9), TEXT("'at 'HH"), "at 04"},
  };
  ExpectPictures(GetTimeFormatW, cases);
}

TEST(GetTimeFormatWTest, CountsTo24WhenTold) {
  const SYSTEMTIME time = At(2006, 3, 1, 14, 5, 9);
  WCHAR text[32] = {};

  EXPECT_EQ(GetTimeFormatW(LOCALE_USER_DEFAULT, TIME_FORCE24HOURFORMAT, &time, TEXT("hh:mm:ss"),
                           text, 32),
            9);

  EXPECT_EQ(Shown(text), "14:05:09");
}

TEST(GetDateFormatWTest, WritesPictures) {
  const PictureCase cases[] = {
      {At(2006, 3, 1, 0, 0, 0), TEXT("yyyy/MM/dd"), "2006/03/01"},
      {At(2006, 3, 1, 0, 0, 0), TEXT("M/d/yy"), "3/1/06"},
      {At(2006, 3, 1, 0, 0, 0), TEXT("dddd, d MMMM yyyy"), "Wednesday, 1 March 2006"},
      {At(2006, 3, 1, 0, 0, 0), TEXT("ddd MMM dd"), "Wed Mar 01"},
      {At(2006, 3, 1, 0, 0, 0), TEXT("'day 'd"), "day 1"},
  };
  ExpectPictures(GetDateFormatW, cases);
}

TEST(GetDateFormatWTest, CountsAndRefusesLikeItsSister) {
  const SYSTEMTIME date = At(2006, 3, 1, 0, 0, 0);
  const SYSTEMTIME impossible = At(2006, 2, 30, 0, 0, 0);
  WCHAR text[64] = {};

  EXPECT_EQ(GetDateFormatW(LOCALE_USER_DEFAULT, 0, &date, TEXT("yyyy/MM/dd"), nullptr, 0), 11);
  SetLastError(0);
  EXPECT_EQ(GetDateFormatW(LOCALE_USER_DEFAULT, 0, &date, TEXT("yyyy/MM/dd"), text, 10), 0);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INSUFFICIENT_BUFFER});
  SetLastError(0);
  EXPECT_EQ(GetDateFormatW(LOCALE_USER_DEFAULT, 0, &impossible, TEXT("d"), text, 64), 0);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_PARAMETER});
  SetLastError(0);
  EXPECT_EQ(GetDateFormatW(LOCALE_USER_DEFAULT, DATE_LONGDATE, &date, TEXT("d"), text, 64), 0);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INVALID_FLAGS});
}

}  // namespace

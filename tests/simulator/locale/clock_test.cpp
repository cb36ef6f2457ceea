#include "locale/clock.h"

#include <gtest/gtest.h>

#include "ce/kernel.h"
#include "ce/system.h"
#include "support/device_test.h"

namespace {

sim::Profile EastOfGreenwich() {
  sim::Profile profile;
  profile.start_time = "2006-02-28 23:59:58";
  profile.utc_offset_minutes = 90;
  return profile;
}

class ClockTest : public DeviceTest {
 protected:
  ClockTest() : DeviceTest(EastOfGreenwich()) {}
};

TEST_F(ClockTest, BeginsAtTheProfilesLocalTimeAndGoesOnWithTheWorld) {
  SYSTEMTIME time = {};
  GetLocalTime(&time);
  EXPECT_EQ(time.wDay, 28);
  EXPECT_EQ(time.wHour, 23);
  EXPECT_EQ(time.wSecond, 58);

  Sleep(2500);

  GetLocalTime(&time);
  EXPECT_EQ(time.wMonth, 3);
  EXPECT_EQ(time.wDay, 1);
  EXPECT_EQ(time.wHour, 0);
  EXPECT_EQ(time.wSecond, 0);
  EXPECT_EQ(time.wMilliseconds, 500);
}

TEST_F(ClockTest, KeepsLocalTimeAheadOfSystemTimeByTheOffset) {
  SYSTEMTIME system = {};
  GetSystemTime(&system);
  EXPECT_EQ(system.wHour, 22);
  EXPECT_EQ(system.wMinute, 29);  // 23:59:58 less an hour and a half

  FILETIME utc = {};
  FILETIME local = {};
  ASSERT_TRUE(SystemTimeToFileTime(&system, &utc));
  ASSERT_TRUE(FileTimeToLocalFileTime(&utc, &local));
  EXPECT_EQ(sim::ToTicks(local) - sim::ToTicks(utc), 90 * 60 * sim::kTicksPerSecond);
}

TEST_F(ClockTest, WritesTheUsualFormats) {
  WCHAR text[64] = {};

  EXPECT_EQ(GetDateFormatW(LOCALE_USER_DEFAULT, 0, nullptr, nullptr, text, 64), 10);
  EXPECT_EQ(std::u16string(text), u"2/28/2006");
  EXPECT_GT(GetDateFormatW(LOCALE_USER_DEFAULT, DATE_LONGDATE, nullptr, nullptr, text, 64), 0);
  EXPECT_EQ(std::u16string(text), u"Tuesday, February 28, 2006");
  EXPECT_GT(GetTimeFormatW(LOCALE_USER_DEFAULT, 0, nullptr, nullptr, text, 64), 0);
  EXPECT_EQ(std::u16string(text), u"11:59:58 PM");
  EXPECT_GT(GetTimeFormatW(LOCALE_USER_DEFAULT, TIME_NOSECONDS, nullptr, nullptr, text, 64), 0);
  EXPECT_EQ(std::u16string(text), u"11:59 PM");
  EXPECT_GT(GetTimeFormatW(LOCALE_USER_DEFAULT, TIME_FORCE24HOURFORMAT, nullptr, nullptr, text, 64),
            0);
  EXPECT_EQ(std::u16string(text), u"23:59:58");
}

TEST(ParseTimeTest, TakesOneShapeOnly) {
  EXPECT_TRUE(sim::ParseTime("2006-03-01 14:05:09"));
  for (const char* text :
       {"", "2006-03-01", "2006-3-1 14:05:09", "2006-02-30 14:05:09", "2006-03-01 24:05:09",
        "2006-03-01T14:05:09", "2006-03-01 14:05:0x", "2006-03-01 14:05:09 "}) {
    EXPECT_FALSE(sim::ParseTime(text)) << text;
  }
}

TEST(CalendarTest, EveryDayOf1200YearsComesBack) {
  sim::FileTicks last = 0;
  for (sim::FileTicks day = 0; day < 3 * 146097; ++day) {
    const sim::FileTicks ticks = day * sim::kTicksPerDay + 12345 * sim::kTicksPerMillisecond;
    const auto time = sim::ToCalendar(ticks);
    ASSERT_TRUE(time);
    ASSERT_EQ(sim::FromCalendar(*time), ticks) << "day " << day;
    last = ticks;
  }
  EXPECT_EQ(sim::ToCalendar(last)->wYear, 2800);
}

}  // namespace

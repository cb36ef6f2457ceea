#include "kernel/debug.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ce/kernel.h"
#include "kernel/wide_format.h"
#include "support/device_test.h"

namespace {

using DebugTest = DeviceTest;

std::u16string Format(const WCHAR* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  std::u16string text = sim::FormatWide(format, arguments);
  va_end(arguments);
  return text;
}

TEST_F(DebugTest, KeepsTheTwoRoutesApart) {
  OutputDebugStringW(u"to the debugger\r\n");
  Sleep(2);
  NKDbgPrintfW(u"to the console %d\r\n", 5);
  EXPECT_EQ(device().debug().OutputText(), "to the debugger\r\n");
  EXPECT_EQ(device().debug().KernelText(), "to the console 5\r\n");
  ASSERT_EQ(device().debug().KernelRecords().size(), 1U);
  EXPECT_EQ(device().debug().KernelRecords()[0].at, std::chrono::milliseconds(2));
  EXPECT_EQ(device().debug().OutputRecords()[0].thread, GetCurrentThreadId());
  device().debug().Clear();
  EXPECT_EQ(device().debug().OutputText() + device().debug().KernelText(), "");
}

TEST_F(DebugTest, TellsAListenerEveryOutputAsItComes) {
  std::vector<std::string> heard;
  device().debug().SetListener([&](std::string_view text) { heard.emplace_back(text); });
  OutputDebugStringW(u"gr\u00FC\u00DFe");
  NKDbgPrintfW(u"not this");
  device().debug().SetListener(nullptr);
  OutputDebugStringW(u"nor this");
  EXPECT_EQ(heard, std::vector<std::string>{"gr\xC3\xBC\xC3\x9F"
                                            "e"});
}

TEST_F(DebugTest, MissingTextsAreNoText) {
  OutputDebugStringW(nullptr);
  NKDbgPrintfW(nullptr);
  EXPECT_TRUE(device().debug().OutputRecords().empty());
  EXPECT_TRUE(device().debug().KernelRecords().empty());
}

TEST_F(DebugTest, TextsForTheDebuggerAreNoFormats) {
  OutputDebugStringW(u"100 %s %n");
  EXPECT_EQ(device().debug().OutputText(), "100 %s %n");
}

TEST(WideFormat, SmallSIsWideAndLargeSIsNarrow) {
  EXPECT_EQ(Format(u"[%s] [%S]", u"wide", "narrow"), u"[wide] [narrow]");
  EXPECT_EQ(Format(u"[%hs] [%ls] [%lS]", "narrow", u"wide", u"wide"), u"[narrow] [wide] [wide]");
  EXPECT_EQ(Format(u"%S", "\xE4\x80"), u"\u00E4\u20AC") << "the device's code page";
  EXPECT_EQ(Format(u"%s %S", nullptr, nullptr), u"(null) (null)");
}

TEST(WideFormat, NumbersAreThirtyTwoBitsWide) {
  EXPECT_EQ(Format(u"%d %i %u", -1, 2147483647, 4294967295U), u"-1 2147483647 4294967295");
  EXPECT_EQ(Format(u"%x %X %o", 0xBEEFU, 0xBEEFU, 8U), u"beef BEEF 10");
  EXPECT_EQ(Format(u"%ld %lu %hd", static_cast<LONG>(0x80000000U), DWORD{3}, 7),
            u"-2147483648 3 7");
}

TEST(WideFormat, KnowsFlagsWidthAndPrecision) {
  EXPECT_EQ(Format(u"[%5d] [%-5d] [%05d] [%+d] [% d]", 42, 42, -42, 42, 42),
            u"[   42] [42   ] [-0042] [+42] [ 42]");
  EXPECT_EQ(Format(u"[%.3d] [%8.3d] [%08.3d] [%.0d]", 7, 7, 7, 0),
            u"[007] [     007] [     007] []");
  EXPECT_EQ(Format(u"[%#x] [%#X] [%#x] [%#o]", 255U, 255U, 0U, 8U), u"[0xff] [0XFF] [0] [010]");
  EXPECT_EQ(Format(u"[%#06x]", 255U), u"[0x00ff]");
  EXPECT_EQ(Format(u"[%6s] [%-6s] [%.2s] [%.2S]", u"abc", u"abc", u"abc", "abc"),
            u"[   abc] [abc   ] [ab] [ab]");
  EXPECT_EQ(Format(u"[%*d] [%-*d] [%*d] [%.*s]", 4, 1, 4, 1, -4, 1, 2, u"abc"),
            u"[   1] [1   ] [1   ] [ab]");
}

TEST(WideFormat, ReadsNoMoreOfATextThanThePrecisionAllows) {
  const char unterminated[] = {'a', 'b', 'c'};
  EXPECT_EQ(Format(u"%.3S", unterminated), u"abc");
}

TEST(WideFormat, CharactersAndPercentSigns) {
  EXPECT_EQ(Format(u"%c%C 100%% %3c|", u'x', u'y', u'z'), u"xy 100%   z|");
}

TEST(WideFormat, UnknownAndUnfinishedConversionsStandAsTheyAre) {
  EXPECT_EQ(Format(u"a %k b %5.2", 0), u"a %k b %5.2");
  EXPECT_EQ(Format(u"%"), u"%");
  EXPECT_EQ(Format(u""), u"");
}

TEST(WideFormat, AbsurdWidthsAreCut) {
  EXPECT_EQ(Format(u"%99999999999d", 1).size(), 4096U);
  EXPECT_EQ(Format(u"%.*d", 2147483647, 1).size(), 4096U);
}

}  // namespace

#include "trace/trace.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <vector>

#include "ce/kernel.h"
#include "faults/api_call.h"
#include "faults/faults.h"
#include "support/device_test.h"
#include "world/sim_thread.h"

namespace {

class TraceTest : public DeviceTest {
 protected:
  TraceTest() {
    device().trace().SetSink([this](std::string_view line) { lines_.emplace_back(line); });
  }
  ~TraceTest() override { device().trace().SetSink(nullptr); }

  /// The line that `call` should make, by this thread.
  [[nodiscard]] std::string Line(long long us, const std::string& rest) const {
    return "{\"us\":" + std::to_string(us) +
           ",\"thread\":" + std::to_string(sim::World::Current()->id) + ',' + rest + '}';
  }

  std::vector<std::string> lines_;
};

TEST_F(TraceTest, EveryCallIsOneLineWithTimeThreadArgumentsResultAndError) {
  SetLastError(7);
  Sleep(2);
  HANDLE event = CreateEventW(nullptr, TRUE, FALSE, u"a \"name\"\n\u00E4");
  CloseHandle(event);
  CloseHandle(event);
  const std::string number = std::to_string(reinterpret_cast<std::uintptr_t>(event));
  ASSERT_EQ(lines_.size(), 5U);
  EXPECT_EQ(lines_[0], Line(0, "\"call\":\"SetLastError\",\"args\":{\"error\":7},\"error\":7"));
  EXPECT_EQ(lines_[1], Line(2000, "\"call\":\"Sleep\",\"args\":{\"ms\":2},\"error\":7"));
  EXPECT_EQ(lines_[2], Line(2000,
                            "\"call\":\"CreateEventW\",\"args\":{\"manual\":1,\"set\":0,\"name\":"
                            "\"a \\\"name\\\"\\n\\u00e4\"},\"result\":" +
                                number + ",\"error\":0"));
  EXPECT_EQ(lines_[4], Line(2000, "\"call\":\"CloseHandle\",\"args\":{\"handle\":" + number +
                                      "},\"result\":0,\"error\":6"));
}

TEST_F(TraceTest, AnInjectedFailureIsMarked) {
  device().faults().Add({"SetEvent", 1, 1, 5});
  SetEvent(nullptr);
  ASSERT_EQ(lines_.size(), 1U);
  EXPECT_EQ(lines_[0], Line(0,
                            "\"call\":\"SetEvent\",\"args\":{\"handle\":0},\"result\":0,"
                            "\"error\":5,\"fault\":true"));
}

TEST_F(TraceTest, ACallThatAThreadDidNotComeBackFromIsMarked) {
  HANDLE thread = CreateThread(
      nullptr, 0,
      [](void*) -> DWORD {
        Sleep(INFINITE);
        return 0;
      },
      nullptr, 0, nullptr);
  Sleep(1);
  TerminateThread(thread, 0);
  lines_.clear();
  Sleep(1);
  ASSERT_EQ(lines_.size(), 2U);
  EXPECT_NE(lines_[0].find("\"call\":\"Sleep\",\"args\":{\"ms\":4294967295},\"ended\":true}"),
            std::string::npos)
      << lines_[0];
}

TEST_F(TraceTest, AddressesAreNotShown) {
  const int local = 0;
  {
    sim::ApiCall call("Example");
    call.Argument("small", reinterpret_cast<const void*>(std::uintptr_t{20}));
    call.Argument("invalid", INVALID_HANDLE_VALUE);
    call.Argument("root", reinterpret_cast<const void*>(std::uintptr_t{0x80000002U}));
    call.Argument("place", static_cast<const void*>(&local));
    call.Argument("none", static_cast<const char*>(nullptr));
    call.Argument("text", "t\x7F");
    call.Return(&local);
  }
  ASSERT_EQ(lines_.size(), 1U);
  EXPECT_EQ(lines_[0], Line(0,
                            "\"call\":\"Example\",\"args\":{\"small\":20,\"invalid\":-1,"
                            "\"root\":2147483650,\"place\":\"address\",\"none\":null,"
                            "\"text\":\"t\\u007f\"},\"result\":\"address\",\"error\":0"));
}

TEST_F(TraceTest, NothingIsWrittenOnceTheTraceIsOff) {
  EXPECT_TRUE(device().trace().on());
  device().trace().SetSink(nullptr);
  EXPECT_FALSE(device().trace().on());
  Sleep(1);
  EXPECT_TRUE(lines_.empty());
}

TEST(JsonText, EscapesEverythingButPrintableAscii) {
  std::string out;
  sim::AppendJsonText(out, std::string_view("q\" b\\ t\t r\r n\n z\0 h\xE9", 20));
  EXPECT_EQ(out, "\"q\\\" b\\\\ t\\t r\\r n\\n z\\u0000 h\\u00e9\"");
  out.clear();
  sim::AppendJsonText(out, std::u16string_view(u"\u20AC\xD800"));
  EXPECT_EQ(out, "\"\\u20ac\\ud800\"");
}

}  // namespace

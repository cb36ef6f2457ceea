// How the multicast client's progress reaches the window, from honest and from hostile senders.
#include "upgrade/multicast_status.h"

#include <gmock/gmock.h>

#include <memory>
#include <random>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/winsock.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "net/virtual/virtual_server.h"
#include "product_support/host.h"
#include "product_support/log_lines.h"
#include "report/window/window_state.h"
#include "support/device_test.h"
#include "upgrade/progress.h"

namespace upgrade {
namespace {

using report::kBarUnits;
using test::LogLines;
using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr std::uint32_t kMegabyte = 1000000;

/// A report as the client sends it.
std::string Report(std::uint32_t percent, std::uint32_t size, const std::string& name) {
  std::string bytes = {1, 0, static_cast<char>(percent >> 8U), static_cast<char>(percent)};
  bytes += "\x11\x22\x33\x44";
  for (const unsigned shift : {24U, 16U, 8U, 0U}) bytes += static_cast<char>(size >> shift);
  return bytes + name + '\0';
}

/// A listener on the test's device, and a sender somewhere else.
class StatusListenerTest : public DeviceTest {
 protected:
  StatusListenerTest()
      : sender_(world(), {0x0A000002, 7001},
                [](sim::VirtualPort&, const sim::Endpoint&, std::string_view) {}) {
    report::window_state.lines.Clear();
    report::SetFileProgress(0);
    report::SetOverallProgress(0);
    BeginReceiving(10 * kMegabyte);
    before_ = test::HoldingsOf(device());
  }
  ~StatusListenerTest() override {
    listener_.Stop();
    report::window_state.lines.Clear();
    EXPECT_EQ(test::HoldingsOf(device()), before_);
    EXPECT_EQ(device().kernel().LiveThreads(), 1U);
  }

  void Start() { ASSERT_TRUE(listener_.Start()); }
  /// Sends to the listener, and gives it time to look.
  void Send(const std::string& bytes, std::uint16_t port = 5655) {
    sender_.Send({sim::kLocalHost, port}, bytes);
    Sleep(50);
  }

  static std::vector<std::string> ShownLines() {
    std::vector<std::string> lines;
    report::LineList::Line line;
    for (int i = 0; report::window_state.lines.Copy(i, line); ++i) {
      lines.emplace_back(line.view().begin(), line.view().end());
    }
    return lines;
  }
  static int FileBar() { return report::window_state.file_value.get(); }
  static int OverallBar() { return report::window_state.overall_value.get(); }
  static int Units(int percent) { return kBarUnits * percent / 100; }

  StatusListener listener_;

  sim::VirtualPort sender_;

 private:
  test::Holdings before_;
};

TEST_F(StatusListenerTest, ListensOnPort5655) {
  Start();
  EXPECT_EQ(listener_.port(), 5655);
  Send(Report(50, kMegabyte, "\\Temp\\a.bin"));
  EXPECT_THAT(ShownLines(), ElementsAre("\\Temp\\a.bin"));
  EXPECT_EQ(FileBar(), Units(50));
}

TEST_F(StatusListenerTest, TakesTheNextFreePort) {
  mcftp::SocketLibrary library;
  ASSERT_TRUE(library.Start());
  std::vector<std::unique_ptr<mcftp::UdpEndpoint>> others;
  for (const std::uint16_t port : {5655, 5656, 5657}) {
    others.push_back(std::make_unique<mcftp::UdpEndpoint>());
    ASSERT_TRUE(others.back()->Create());
    ASSERT_TRUE(others.back()->Bind(port));
  }
  Start();
  EXPECT_EQ(listener_.port(), 5658);
  Send(Report(10, 1, "name"), 5658);
  EXPECT_THAT(ShownLines(), ElementsAre("name"));
  listener_.Stop();
}

TEST_F(StatusListenerTest, GivesUpBehindTheLastPort) {
  device().faults().Add({"bind", 1, 0, WSAEADDRINUSE});
  EXPECT_FALSE(listener_.Start());
  EXPECT_EQ(device().faults().Count("bind"), 65535U - 5655 + 1);
}

TEST_F(StatusListenerTest, GivesUpWithoutSocketsASocketOrAThread) {
  for (const char* call : {"WSAStartup", "socket", "CreateThread"}) {
    device().faults().Add({call, 1, 1, WSAENETDOWN});
    EXPECT_FALSE(listener_.Start()) << call;
    device().faults().Clear();
  }
  EXPECT_THAT(LogLines(), IsEmpty());
}

TEST_F(StatusListenerTest, EndsWhenItsSocketIsClosed) {
  Start();
  Sleep(1000);
  listener_.Stop();
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - MCStatusThread, select error"));
  listener_.Stop();
}

TEST_F(StatusListenerTest, EndsWhenReceivingFails) {
  Start();
  device().faults().Add({"recvfrom", 1, 1, WSAENETDOWN});
  Send(Report(50, kMegabyte, "lost"));
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - MCStatusThread - recvfrom got error"));
  EXPECT_THAT(ShownLines(), IsEmpty());
}

TEST_F(StatusListenerTest, ShowsNothingWithoutMemory) {
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  Start();
  Send(Report(50, kMegabyte, "lost"));
  EXPECT_THAT(ShownLines(), IsEmpty());
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
}

TEST_F(StatusListenerTest, ShowsEachNewNameOnceWithAnEmptyBarBefore) {
  Start();
  device().kernel().ForgetSleeps();
  Send(Report(30, kMegabyte, "one"));
  Send(Report(60, kMegabyte, "one"));
  Send(Report(10, kMegabyte, "two"));
  Send(Report(20, kMegabyte, "one"));
  EXPECT_THAT(ShownLines(), ElementsAre("one", "two", "one"));
  EXPECT_EQ(FileBar(), Units(20));
  std::size_t pauses = 0;
  for (const sim::SleepRecord& sleep : device().kernel().Sleeps()) pauses += sleep.length_ms == 10;
  EXPECT_EQ(pauses, 3U);
}

TEST_F(StatusListenerTest, ShowsAFullBarForMoreThanAHundredPercent) {
  Start();
  Send(Report(101, kMegabyte, "a"));
  EXPECT_EQ(FileBar(), kBarUnits);
  Send(Report(65535, kMegabyte, "a"));
  EXPECT_EQ(FileBar(), kBarUnits);
  EXPECT_EQ(OverallBar(), 0) << "only a hundred exactly completes a file";
}

TEST_F(StatusListenerTest, CountsAFileAtAHundredPercent) {
  Start();
  Send(Report(99, 4 * kMegabyte, "a"));
  EXPECT_EQ(OverallBar(), 0);
  Send(Report(100, 4 * kMegabyte, "a"));
  EXPECT_EQ(OverallBar(), Units(40));
  Send(Report(100, 1, "b"));
  EXPECT_EQ(OverallBar(), Units(40));
}

TEST_F(StatusListenerTest, ShowsFivePercentAtLeast) {
  Start();
  Send(Report(100, 0, "empty"));
  EXPECT_EQ(OverallBar(), Units(5));
}

TEST_F(StatusListenerTest, CountsAFileAgainEachTimeItIsReportedComplete) {
  Start();
  for (const int percent : {40, 80, 100, 100}) {
    Send(Report(100, 4 * kMegabyte, "a"));
    EXPECT_EQ(OverallBar(), Units(percent));
  }
}

TEST_F(StatusListenerTest, CountsBeyondFourGigabytes) {
  BeginReceiving(0xFFFFFFFFU);
  Start();
  Send(Report(100, 0x80000000U, "a"));
  EXPECT_EQ(OverallBar(), Units(50));
  for (int i = 0; i < 3; ++i) {
    Send(Report(100, 0x80000000U, "b"));
    EXPECT_EQ(OverallBar(), kBarUnits) << "a total of 32 bits would begin anew";
  }
}

TEST_F(StatusListenerTest, IgnoresDatagramsThatAreTooShort) {
  Start();
  const std::string report = Report(50, kMegabyte, "name");
  for (std::size_t length = 0; length < 12; ++length) Send(report.substr(0, length));
  EXPECT_THAT(ShownLines(), IsEmpty());
  EXPECT_EQ(FileBar(), 0);
  Send(report);
  EXPECT_THAT(ShownLines(), ElementsAre("name"));
}

TEST_F(StatusListenerTest, CutsNamesThatAreTooLong) {
  Start();
  for (const std::size_t length : {259U, 260U, 2035U, 2036U, 2037U, 60000U}) {
    Send(Report(50, kMegabyte, std::string(length, 'n')));
  }
  ASSERT_THAT(ShownLines(), SizeIs(1)) << "cut, they are the same name";
  EXPECT_THAT(ShownLines()[0], ::testing::StartsWith("nnnnnnnnnnnnnnnn"));
  EXPECT_EQ(FileBar(), Units(50));
}

TEST_F(StatusListenerTest, TakesNamesAsTextsAndNotAsFormats) {
  Start();
  Send(Report(50, kMegabyte, "%s%n%d%08x"));
  EXPECT_THAT(ShownLines(), ElementsAre("%s%n%d%08x"));
}

TEST_F(StatusListenerTest, ShowsAnEmptyNameOnlyBehindAnother) {
  Start();
  Send(Report(50, kMegabyte, ""));
  EXPECT_THAT(ShownLines(), IsEmpty());
  EXPECT_EQ(FileBar(), Units(50));
}

TEST_F(StatusListenerTest, SurvivesWhateverComes) {
  Start();
  std::mt19937 random(7);
  for (int i = 0; i < 2000; ++i) {
    std::string bytes(random() % (i % 10 == 0 ? 5000 : 400), '\0');
    for (char& byte : bytes) byte = static_cast<char>(random());
    Send(bytes);
  }
  report::window_state.lines.Clear();
  Send(Report(70, kMegabyte, "right"));
  EXPECT_THAT(ShownLines(), ElementsAre("right"));
  EXPECT_EQ(FileBar(), Units(70));
  EXPECT_THAT(LogLines(), IsEmpty());
}

TEST_F(StatusListenerTest, EndsInTheMiddleOfAFlood) {
  Start();
  sim::VirtualNetwork network(world());
  for (int i = 0; i < 3000; ++i) {
    network.At(world().now() + sim::Micros(i * 1000), [this, i] {
      sender_.Send({sim::kLocalHost, 5655}, Report(50, 1, "name " + std::to_string(i)));
    });
  }
  Sleep(1000);
  listener_.Stop();
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
  EXPECT_THAT(LogLines(), ElementsAre(AnyOf("Orvenix - MCStatusThread, select error",
                                            "Orvenix - MCStatusThread - recvfrom got error")));
  Sleep(3000);
}

}  // namespace
}  // namespace upgrade

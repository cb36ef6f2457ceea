// How a job's multicast client is started and what is around it.
#include "upgrade/multicast_launch.h"

#include <gmock/gmock.h>

#include <memory>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "mcftp/udp_socket/udp_socket.h"
#include "memory/memory.h"
#include "product_support/host.h"
#include "product_support/log_lines.h"
#include "support/device_test.h"

namespace upgrade {
namespace {

using test::LogLines;
using test::LogLinesWith;
using ::testing::AnyOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr char kClientLine[] = "-A=239.1.1.1 -P=7000";

class MulticastLaunchTest : public DeviceTest {
 protected:
  MulticastLaunchTest() : job_(std::make_unique<UpgradeConfig>()) {
    before_ = test::HoldingsOf(device());
  }
  ~MulticastLaunchTest() override {
    EXPECT_EQ(test::HoldingsOf(device()), before_);
    EXPECT_EQ(device().kernel().LiveThreads(), 1U);
    EXPECT_EQ(device().memory().bad_frees(), 0U);
  }

  void Run(const std::string& parameters) {
    job_->SetMCProcessParms(parameters.c_str());
    RunMulticastTransfer(*job_);
  }
  /// The one line that says what the client was started with.
  static std::string StartLine() {
    const std::vector<std::string> lines = LogLinesWith("mc.Start");
    EXPECT_THAT(lines, SizeIs(1));
    return lines.empty() ? "" : lines[0];
  }

 private:
  std::unique_ptr<UpgradeConfig> job_;
  test::Holdings before_;
};

TEST_F(MulticastLaunchTest, DoesNothingWithoutACommandLine) {
  Run("");
  EXPECT_THAT(LogLines(), IsEmpty());
}

TEST_F(MulticastLaunchTest, WaitsFiveMinutesForAServer) {
  Run(kClientLine);
  EXPECT_GE(world().now(), std::chrono::minutes(5));
  EXPECT_LT(world().now(), std::chrono::seconds(302));
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - StartMulticastClient - mc.Start, "
                                      "!-A=239.1.1.1 -P=7000 -UA=127.0.0.1 -UP=5655!",
                                      AnyOf("Orvenix - MCStatusThread, select error",
                                            "Orvenix - MCStatusThread - recvfrom got error"),
                                      "Orvenix - StartMulticastClient - Exiting"));
}

TEST_F(MulticastLaunchTest, NamesThePortThatItsListenerHas) {
  mcftp::SocketLibrary library;
  mcftp::UdpEndpoint other;
  ASSERT_TRUE(library.Start());
  ASSERT_TRUE(other.Create());
  ASSERT_TRUE(other.Bind(5655));
  Run(kClientLine);
  EXPECT_THAT(StartLine(), HasSubstr(" -UA=127.0.0.1 -UP=5656!"));
}

TEST_F(MulticastLaunchTest, RunsTheClientWithoutAListener) {
  device().faults().Add({"bind", 1, 65535 - 5655 + 1, ERROR_ACCESS_DENIED});
  Run(kClientLine);
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - StartMulticastClient - mc.Start, "
                                      "!-A=239.1.1.1 -P=7000!",
                                      "Orvenix - StartMulticastClient - Exiting"));
  EXPECT_GE(world().now(), std::chrono::minutes(5)) << "the client ran";
}

TEST_F(MulticastLaunchTest, EndsAtOnceWhenTheCommandLineIsWrong) {
  Run("-X=1");
  EXPECT_LT(world().now(), std::chrono::seconds(3));
  EXPECT_THAT(StartLine(), HasSubstr("!-X=1 -UA=127.0.0.1 -UP=5655!"));
  EXPECT_THAT(LogLines(), Contains("Orvenix - StartMulticastClient - Exiting"));
}

TEST_F(MulticastLaunchTest, HandsOverTheLongestCommandLineWhole) {
  const std::string blanks(259 - sizeof kClientLine + 1, ' ');
  Run(blanks + kClientLine);
  EXPECT_THAT(StartLine(), HasSubstr('!' + blanks + kClientLine + " -UA=127.0.0.1 -UP=5655!"));
  EXPECT_GE(world().now(), std::chrono::minutes(5)) << "the last option was read, too";
}

TEST_F(MulticastLaunchTest, TakesTheCommandLineAsATextAndNotAsAFormat) {
  Run("-X=%s%n%d");
  EXPECT_THAT(StartLine(), HasSubstr("!-X=%s%n%d -UA="));
}

TEST_F(MulticastLaunchTest, RunsAgainAndAgain) {
  for (int i = 0; i < 3; ++i) Run("-X=1");
  EXPECT_THAT(LogLinesWith("-UP=5655!"), SizeIs(3));
}

}  // namespace
}  // namespace upgrade

// From the command line to the waiting client, step by step, and every way not to get there.
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "mcftp/client/client_test.h"
#include "memory/memory.h"
#include "net/network.h"

namespace {

using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;

class StartUpTest : public MulticastTest {
 protected:
  std::int32_t StartAndEnd(const std::string& options) {
    Start(options, /*keep_lines=*/true);
    return End();
  }
  /// The log's last lines.
  Lines LogEnd(std::size_t count) {
    Lines lines = Log();
    if (lines.size() > count) {
      lines.erase(lines.begin(), lines.end() - static_cast<std::ptrdiff_t>(count));
    }
    return lines;
  }
};

TEST_F(StartUpTest, SaysEachStepAndEndsFiveMinutesLaterWithoutAServer) {
  Start(test::kOptions, true);

  EXPECT_THAT(
      McastLog(),
      ElementsAre("Command line parsed and multicast client instantiated", "Initializing callbacks",
                  "Starting the client protocol engine (state machine)",
                  "Registry - creating keys and loading values", "Registry updated",
                  "Initializing the multicast client", "Socket API initialized",
                  "Creating state machine thread", "State machine thread created"));
  EXPECT_THAT(Log(),
              ElementsAre("Instantiating blowfish object", "Blowfish object instantiated",
                          "Initialize the socket API", "Socket API initialized",
                          "Create socket for communication with local UI (FT configlet)",
                          "Local UI (127.0.0.1:5655)",
                          "Create socket for communication with remote UI (Upgrade Monitor)",
                          "Create multicast socket", "Allow reuse of the local address",
                          "Bind socket to port/interface", "Socket bound to 0.0.0.0",
                          "Join the public multicast group where file transfers will be announced",
                          "Public multicast group 239.1.1.1 joined", "Initialization successful",
                          StartsWith("Multicast File Transfer Client (Built: "), "Host Name: mr7",
                          "FQDN: mr7", "IP Address: 10.0.0.1", "State Machine v1.0", "Protocol v3",
                          "Receive Timeout: 32000", "Overrun Threshold: 85",
                          "Minimum blocks before overrun: 100", "Initialization complete",
                          "McftpClient::StateMachineThread started", test::kWaiting));
  const milliseconds begin = Now();
  EXPECT_EQ(End(), 0);
  EXPECT_NEAR(static_cast<double>((Now() - begin).count()), 300000, 260);
  EXPECT_THAT(Log(), ElementsAre("WRQ Timeout", "Client shutting down...",
                                 "McftpClient::StateMachineThread stopping"));
  EXPECT_EQ(stops(), 1);
  EXPECT_THAT(McastLog(), IsEmpty());
}

TEST_F(StartUpTest, EndsItsLogLinesWithALineFeedAlone) {
  EXPECT_EQ(StartAndEnd("-A=10.0.0.9 -P=7000"), -1);

  EXPECT_THAT(test::GetFile("\\mcast.log").value_or(""),
              StartsWith("Command line parsed and multicast client instantiated\n"
                         "Initializing callbacks\n"));
}

TEST_F(StartUpTest, OpensAndClosesTheLogForEveryLine) {
  Start();

  EXPECT_EQ(device().faults().Count("fopen"), 9U);
  EXPECT_EQ(device().faults().Count("fclose"), 9U);
  EXPECT_EQ(End(), 0);
}

TEST_F(StartUpTest, RefusesAnEmptyLineWithoutMakingAClient) {
  EXPECT_EQ(mcftp::StartMulticastClient(""), -1);
  EXPECT_EQ(mcftp::StartMulticastClient(nullptr), -1);
  EXPECT_EQ(mcftp::StartMulticastClient("-A=239.1.1.1 -P=7000 -X=1"), -1);

  EXPECT_FALSE(test::Exists("\\mcast.log"));
  EXPECT_EQ(device().faults().Count("LocalAlloc"), 0U);
}

TEST_F(StartUpTest, ALineOfBlanksFailsAtTheJoin) {
  EXPECT_EQ(StartAndEnd("   "), -1);

  EXPECT_THAT(LogEnd(3),
              ElementsAre("Socket bound to 0.0.0.0",
                          "Join the public multicast group where file transfers will be announced",
                          "Add membership failed!"));
}

TEST_F(StartUpTest, RunsForAnOwnerThatWantsToKnowNothing) {
  EXPECT_EQ(mcftp::StartMulticastClient(test::kOptions), 0);
}

TEST_F(StartUpTest, DoesNotLoadWhenItIsConfiguredNotTo) {
  SetSetting("LoadClient", 0);

  EXPECT_EQ(StartAndEnd(test::kOptions), -1);

  EXPECT_THAT(McastLog(), ElementsAre("Command line parsed and multicast client instantiated",
                                      "Initializing callbacks",
                                      "Starting the client protocol engine (state machine)",
                                      "Registry - creating keys and loading values",
                                      "Registry updated", "Client configured NOT to load!"));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_EQ(device().faults().Count("socket"), 0U);
  EXPECT_EQ(stops(), 0);
}

TEST_F(StartUpTest, FailsWithTheLinesOfTheStepThatFailed) {
  const struct {
    const char* call;
    std::uint64_t nth;
    Lines lines;
  } cases[] = {
      {"WSAStartup", 1, {"Initialize the socket API", "Socket API initialization failed!"}},
      {"socket",
       3,
       {"Create multicast socket", "CreateMulticast() failed",
        "Failed to create multicast socket!"}},
      {"setsockopt",
       1,
       {"Allow reuse of the local address", "ReuseAddress() failed",
        "Failed to allow reuse of the local address"}},
      {"bind",
       1,
       {"Bind socket to port/interface", "Bind() failed",
        "Failed to bind socket to port/interface"}},
      {"setsockopt",
       2,
       {"Join the public multicast group where file transfers will be announced",
        "Add membership failed!"}},
  };
  for (const auto& c : cases) {
    device().faults().Add({c.call, c.nth});
    EXPECT_EQ(StartAndEnd(test::kOptions), -1) << c.call;
    device().faults().Clear();
    EXPECT_EQ(LogEnd(c.lines.size()), c.lines);
    const Lines log = McastLog();
    ASSERT_FALSE(log.empty());
    EXPECT_EQ(log.back(), "Failed to initialize the multicast client!");
    EXPECT_EQ(device().network().open_sockets(), 0U) << c.call;
  }
}

TEST_F(StartUpTest, FailsWithoutMemoryForTheCipher) {
  device().faults().Add({"LocalAlloc", 2});  // the first is the client's own

  EXPECT_EQ(StartAndEnd(test::kOptions), -1);

  EXPECT_THAT(Log(), ElementsAre("Instantiating blowfish object",
                                 "Failed to instantiate blowfish object!"));
}

TEST_F(StartUpTest, FailsWithoutMemoryForTheClient) {
  device().faults().Add({"LocalAlloc"});

  EXPECT_EQ(StartAndEnd(test::kOptions), -1);

  EXPECT_FALSE(test::Exists("\\mcast.log"));
}

TEST_F(StartUpTest, FailsWithoutAThread) {
  Start("-A=239.1.1.1 -P=7000");
  EXPECT_EQ(End(), 0);
  McastLog();
  for (const char* call : {"CreateThread", "CreateEventW"}) {
    // The test's own thread is the first.
    device().faults().Add({call, call[6] == 'T' ? 2U : 1U});
    EXPECT_EQ(StartAndEnd(test::kOptions), -1);
    device().faults().Clear();
    const Lines log = McastLog();
    ASSERT_GE(log.size(), 2U);
    EXPECT_EQ(log[log.size() - 2], "Creating state machine thread");
    EXPECT_EQ(log.back(), "Failed to create state machine thread!");
    EXPECT_EQ(device().network().open_sockets(), 0U);
  }
}

TEST_F(StartUpTest, GoesOnWithoutTheSocketsForUserInterfaces) {
  device().faults().Add({"socket", 1, 3});
  Start("-A=239.1.1.1 -P=7000 -UA=127.0.0.1 -UP=5655 -DA=10.0.0.3 -DP=514", true);

  const Lines lines = Log();
  EXPECT_THAT(Lines(lines.begin() + 4, lines.begin() + 13),
              ElementsAre("Create socket for communication with remote UI (syslog server)",
                          "Failed to create UDP socket (syslog server)",
                          "Create socket for communication with local UI (FT configlet)",
                          "Failed to create UDP socket (local UI)",
                          "Failed to create UDP socket for communication with local UI",
                          "Create socket for communication with remote UI (Upgrade Monitor)",
                          "Failed to create UDP socket (remote UI)",
                          "Failed to create UDP socket for communication with remote UI",
                          "Create multicast socket"));
  test::Offer offer;
  offer.header = "00 21";
  offer.size = 0;
  ToPublic(test::Announcement(offer));
  EXPECT_THAT(Status(), IsEmpty());
  EXPECT_EQ(End(), 0);
}

TEST_F(StartUpTest, MakesNoSocketForHalfAnEndpoint) {
  Start("-A=239.1.1.1 -P=7000 -UP=5655 -DA=10.0.0.3", true);
  EXPECT_EQ(Log()[4], "Create socket for communication with remote UI (Upgrade Monitor)");
  EXPECT_EQ(End(), 0);
  Log();
  Start("-A=239.1.1.1 -P=7000 -UA=127.0.0.1 -DA=nowhere -DP=514", true);
  EXPECT_EQ(Log()[4], "Create socket for communication with remote UI (Upgrade Monitor)");
  EXPECT_EQ(End(), 0);
}

TEST_F(StartUpTest, LeavesNothingBehind) {
  Start();
  EXPECT_EQ(End(), 0);
  const std::size_t blocks = device().memory().live_blocks();
  const std::size_t handles = device().kernel().OpenHandles();

  Start();
  Establish();
  EXPECT_EQ(End(), 0);

  EXPECT_EQ(device().memory().live_blocks(), blocks);
  EXPECT_EQ(device().kernel().OpenHandles(), handles);
  EXPECT_EQ(device().kernel().CriticalSections(), 0U);
  EXPECT_EQ(device().network().open_sockets(), 0U);
  EXPECT_EQ(device().network().started(), 0U);
}

/// Whatever fails first, a client either runs to its end or says no, and leaves nothing behind.
TEST_F(StartUpTest, SurvivesTheFailureOfAnyCall) {
  Start();
  EXPECT_EQ(End(), 0);
  const std::size_t blocks = device().memory().live_blocks();
  std::size_t handles = device().kernel().OpenHandles();
  for (std::uint64_t nth = 1;; ++nth) {
    const std::uint64_t fired = device().faults().fired();
    device().faults().Add({"*", nth});
    const std::int32_t result = mcftp::StartMulticastClient(test::kOptions);
    device().faults().Clear();
    EXPECT_TRUE(result == 0 || result == -1);
    if (device().faults().fired() > fired && device().faults().last_fired() == "CloseHandle") {
      ++handles;  // nobody can help that
    }
    EXPECT_EQ(device().memory().live_blocks(), blocks) << nth;
    EXPECT_EQ(device().kernel().OpenHandles(), handles) << nth;
    EXPECT_EQ(device().network().open_sockets(), 0U) << nth;
    if (device().faults().fired() == fired) {
      EXPECT_EQ(result, 0);
      break;
    }
  }
}

TEST_F(StartUpTest, ShowsTheSettingsThatItRunsWith) {
  SetSetting("ReceiveTimeout", 1234);
  SetSetting("OverrunPercentThreshold", 50);
  SetSetting("RxBlocksBeforeOverrun", 7);
  Start(test::kOptions, true);

  EXPECT_THAT(LogEnd(6), ElementsAre("Receive Timeout: 1234", "Overrun Threshold: 50",
                                     "Minimum blocks before overrun: 7", "Initialization complete",
                                     "McftpClient::StateMachineThread started", test::kWaiting));
  EXPECT_EQ(End(), 0);
}

// ---- the lines' other way ----

class RemoteDebugTest : public StartUpTest {
 protected:
  RemoteDebugTest()
      : syslog_(world(), {0x0A000003, 514},
                [this](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                  datagrams_.emplace_back(bytes);
                }) {}
  Lines Datagrams() {
    const auto lock = network().Enter();
    return std::exchange(datagrams_, {});
  }

 private:
  Lines datagrams_;
  sim::VirtualPort syslog_;
};

TEST_F(RemoteDebugTest, SendsEachLineWithPriorityDateAndTime) {
  Start(std::string(test::kOptions) + " -DA=10.0.0.3 -DP=514", true);

  EXPECT_THAT(Log(), ElementsAre("Instantiating blowfish object", "Blowfish object instantiated",
                                 "Initialize the socket API", "Socket API initialized",
                                 "Create socket for communication with remote UI (syslog server)"))
      << "before there is a socket the owner gets the lines";
  const Lines datagrams = Datagrams();
  ASSERT_GT(datagrams.size(), 10U);
  EXPECT_EQ(datagrams[0], "< 14>2006-03-01 14:05:09 Remote debug (10.0.0.3:514)");
  EXPECT_EQ(datagrams.back(),
            "< 14>2006-03-01 14:05:09 Waiting for a Multicast MCFTP Server to announce a file...");
  EXPECT_EQ(End(), 0);
  Wait(milliseconds(1));
  EXPECT_THAT(Log(), IsEmpty());
  EXPECT_EQ(Datagrams().back(),
            "< 14>2006-03-01 14:10:09 McftpClient::StateMachineThread stopping");
}

TEST_F(RemoteDebugTest, CutsALineAt2048Characters) {
  Start("-A=239.1.1.1 -P=7000 -HV=MR41 -DA=10.0.0.3 -DP=514");
  Datagrams();
  test::Offer offer;
  offer.masks = std::string(5000, 'X');

  ToPublic(test::Announcement(offer));

  const Lines datagrams = Datagrams();
  ASSERT_GE(datagrams.size(), 3U);
  EXPECT_EQ(datagrams[1].size(), std::string("< 14>2006-03-01 14:05:09 ").size() + 2048);
  EXPECT_EQ(End(), 0);
}

TEST_F(RemoteDebugTest, HandsTheOwnerAtMost2048Characters) {
  Start("-A=239.1.1.1 -P=7000 -HV=MR41");
  test::Offer offer;
  offer.masks = std::string(5000, 'X');

  ToPublic(test::Announcement(offer));

  const Lines lines = Log();
  EXPECT_EQ(lines[1].size(), 2048U);
  EXPECT_EQ(End(), 0);
}

/// The stop callback comes before the thread's last act, and the client stays until that is done.
TEST_F(StartUpTest, ReturnsOnlyWhenTheClientsThreadHasDoneItsLastAct) {
  struct Watch {
    bool stopped = false;
    bool stopped_first = false;
    bool at_the_end = false;
  } watch;
  mcftp::ClientOwner owner;
  owner.context = &watch;
  owner.stopped = [](void* context) { static_cast<Watch*>(context)->stopped = true; };
  owner.log = [](void* context, const WCHAR* line) {
    auto& seen = *static_cast<Watch*>(context);
    const std::u16string_view text(line);
    if (text != u"McftpClient::StateMachineThread stopping") return;
    seen.stopped_first = seen.stopped;
    Sleep(5000);  // the starter has looked at its mark many times meanwhile
    seen.at_the_end = true;
  };

  EXPECT_EQ(mcftp::StartMulticastClient(test::kOptions, &owner), 0);

  EXPECT_TRUE(watch.stopped_first);
  EXPECT_TRUE(watch.at_the_end);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

}  // namespace

// What the management system hears of whole upgrades.
#include "product_support/messages.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "ce/kernel.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "library/libraries.h"
#include "library/management_queue.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_config.h"
#include "orvenix/upgrade_thread.h"
#include "power/power.h"
#include "product_support/jobs.h"
#include "scenario/scenario_test.h"

namespace {

using std::chrono::seconds;
using test::EventText;
using test::HostJob;
using test::kNow;
using test::LogLinesWith;
using test::ReadLog;
using test::StatusText;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::SizeIs;

constexpr const char* kUniqueId = "TQ52MR700123";  // of the device that tests have by default
constexpr const char* kToClient = "TW_CLIENT: ";
constexpr const char* kToEvents = "TW_Event_DB@~MASTERKX: ";
constexpr const char* kToHost = "host: ";

class MessagesTest : public test::ScenarioTest {
 protected:
  MessagesTest() : MessagesTest(sim::Profile{}) {}
  explicit MessagesTest(const sim::Profile& profile) : ScenarioTest(profile), record_(device()) {
    job_.files = {{"files/a.txt", "\\a.txt", "*", server().Put("files/a.txt", "content")}};
  }

  void Run() {
    EXPECT_EQ(Start(job_), ICFG_OK);
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  }

  [[nodiscard]] HostJob& job() { return job_; }
  [[nodiscard]] test::MessageRecord& record() { return record_; }
  [[nodiscard]] std::vector<std::string> Sent() const { return record_.Lines(); }

  [[nodiscard]] static std::string Status(const char* to, int state, const std::string& reason) {
    return to + StatusText(state, reason);
  }
  [[nodiscard]] static std::string Event(std::uint32_t code, const std::string& text = "") {
    return kToEvents + EventText(kNow, kUniqueId, code, text);
  }

  [[nodiscard]] static test::HostTest FailingTest(const std::string& message) {
    return {"No\\Such\\Key", "Name", "REG_SZ", "EQ", "value", message};
  }

 private:
  HostJob job_;
  test::MessageRecord record_;
};

TEST_F(MessagesTest, TellTheWholeUpgradeThroughTheQueue) {
  Run();
  EXPECT_THAT(Sent(), ElementsAre(Status(kToClient, 4, "Device Upgrading"), Event(205181),
                                  Event(205182), Status(kToClient, 1, "Upgrade Complete")));
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
}

TEST_F(MessagesTest, TellStatusesToAHostThatTakesThemAndEventsToTheQueue) {
  record().TakeStatuses();
  Run();
  EXPECT_THAT(Sent(), ElementsAre(Status(kToHost, 4, "Device Upgrading"), Event(205181),
                                  Event(205182), Status(kToHost, 1, "Upgrade Complete")));
}

TEST_F(MessagesTest, AreSentAtTheseTimes) {
  std::vector<sim::Micros> times;
  const std::size_t listener = device().messages().Listen(
      [this, &times](const sim::QueuedMessage&) { times.push_back(world().now()); });
  Run();
  device().messages().StopListening(listener);
  ASSERT_EQ(times.size(), 4U);
  EXPECT_EQ(times[1], times[0]) << "first the status, then the event";
  EXPECT_EQ(times[3] - times[2], seconds(2)) << "first the event, then the status";
  EXPECT_GE(world().now() - times[3], seconds(6)) << "a pause before the end";
}

TEST_F(MessagesTest, AreLoggedAroundTheSteps) {
  Run();
  const std::string log = ReadLog();
  const std::string id = kUniqueId;
  const auto event = [&id](const std::string& time, std::uint32_t code) {
    return "Orvenix - SendDeviceEvent - entering\r\n" + time +
           "Orvenix - SendDeviceEvent - send msg\r\n" + EventText(time, id, code) + "\r\n";
  };
  const auto time_at = [&log](std::size_t from) {
    const std::string head = "Orvenix - SendDeviceEvent - entering\r\n";
    return log.substr(log.find(head, from) + head.size(), 19);
  };
  // The first event's time is behind the lines that start the link, which the status has started.
  EXPECT_THAT(log, HasSubstr("CretaeUpgradeInProgressEvent - Success\r\n"
                             "Orvenix - SetRWIStatus - entering\r\n"
                             "Orvenix - InitKXTransfer - LoadLibrary\r\n"
                             "Orvenix - InitKXTransfer - GetHandles\r\n"
                             "Orvenix - InitKXTransfer - open\r\n"
                             "Orvenix - SetRWIStatus - send msg\r\n"
                             "Orvenix - SetRWIStatus - send msg lapi write\r\n" +
                             event(time_at(0), 205181) + "Orvenix - UpgradeThread - InitRAM\r\n"));
  const std::size_t end = log.find("Orvenix - UpgradeThread - Exiting\r\n");
  EXPECT_EQ(log.substr(end), "Orvenix - UpgradeThread - Exiting\r\n" + event(time_at(end), 205182) +
                                 "Orvenix - SetRWIStatus - entering\r\n"
                                 "Orvenix - SetRWIStatus - send msg\r\n"
                                 "Orvenix - SetRWIStatus - send msg lapi write\r\n"
                                 "Orvenix - DeleteUpgradeInProgressEvent\r\n"
                                 "CloseTransferHandle");
}

struct TextCase {
  const char* begin;
  const char* end;
  const char* first;
  const char* last;
};

TEST_F(MessagesTest, TakeTheJobsOwnTextsWhenItHasABeginText) {
  static constexpr TextCase kCases[] = {
      {"Please wait <&>", "All done", "Please wait <&>", "All done"},
      {"Please wait", "", "Please wait", ""},
      {"", "All done", "Device Upgrading", "Upgrade Complete"},
  };
  for (const TextCase& c : kCases) {
    const std::size_t before = Sent().size();
    job().begin_text = c.begin;
    job().end_text = c.end;
    Run();
    const std::vector<std::string> sent = Sent();
    ASSERT_EQ(sent.size(), before + 4);
    EXPECT_EQ(sent[before], Status(kToClient, 4, c.first));
    EXPECT_EQ(sent[before + 3], Status(kToClient, 1, c.last));
  }
}

TEST_F(MessagesTest, OpenAnotherConnectionForTheNextJob) {
  const test::Holdings before = test::HoldingsOf(device());
  Run();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  Run();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_THAT(Sent(), SizeIs(8));
  EXPECT_EQ(device().faults().Count("lapi_open"), 2U);
  EXPECT_EQ(device().faults().Count("lapi_close"), 2U);
  EXPECT_EQ(device().faults().Count("LoadLibraryW"), 1U);
  EXPECT_EQ(device().messages().bad_uses(), 0U);
}

TEST_F(MessagesTest, TellOfAnUpgradeThatAnOutsideProgramStarts) {
  auto* const job = new UpgradeConfig;
  job->SetBaseURL(test::kServerUrl);
  HANDLE const thread = StartUpgradeThread(job, 1);
  ASSERT_NE(thread, nullptr);
  CloseHandle(thread);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(Sent(), ElementsAre(Status(kToClient, 4, "Device Upgrading"), Event(205181),
                                  Event(205182), Status(kToClient, 1, "Upgrade Complete")));
}

TEST_F(MessagesTest, TellWhyAnOutsideProgramsUpgradeFailed) {
  auto* const job = new UpgradeConfig;
  job->SetBaseURL(test::kServerUrl);
  const test::HostTest test = FailingTest("Wrong model");
  test::AddTest(*job, {"HKEY_LOCAL_MACHINE", test.key, test.value_name, test.type, test.operation,
                       test.value, test.message});
  HANDLE const thread = StartUpgradeThread(job, 1);
  ASSERT_NE(thread, nullptr);
  CloseHandle(thread);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(Sent(), ElementsAre(Status(kToClient, 4, "Device Upgrading"), Event(205181),
                                  Event(205180, "Wrong model"),
                                  Status(kToClient, 1, "Upgrade Failed: Wrong model")));
}

TEST_F(MessagesTest, TellOfAFailedTestInAnOutsideProgramsUpgradeHoweverLongItsTextIs) {
  const std::string longest(255, 'm');
  for (const std::string& message : {std::string(), longest}) {
    auto* const job = new UpgradeConfig;
    job->SetBaseURL(test::kServerUrl);
    test::AddTest(
        *job, {"HKEY_LOCAL_MACHINE", "No\\Such\\Key", "Name", "REG_SZ", "EQ", "value", message});
    const std::size_t before = Sent().size();
    CloseHandle(StartUpgradeThread(job, 1));
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
    const std::vector<std::string> sent = Sent();
    ASSERT_EQ(sent.size(), before + 4);
    EXPECT_EQ(sent[before + 2], Event(205180, message));
    EXPECT_EQ(sent[before + 3],
              Status(kToClient, 1, ("Upgrade Failed: " + message).substr(0, 255)));
  }
}

/// A host that walks its next job from inside the callback of every status.
struct EagerHost {
  IcfgCallbacks callbacks{};
  std::vector<std::string> heard;
  std::vector<std::uint32_t> results;

  static int Take(std::uintptr_t context, const char* text, std::int32_t, const IcfgCallbacks*) {
    auto& host = *reinterpret_cast<EagerHost*>(context);
    host.heard.emplace_back(text);
    host.results.push_back(IcfgBeginGroup("Upgrade", 0, 0));
    IcfgSetField("BeginText", 0, "too late");
    IcfgSetCallbacks(context, &host.callbacks);
    return 0;
  }
};

TEST_F(MessagesTest, MayMakeTheHostCallBackFromTheUpgradesOwnThread) {
  EagerHost host;
  host.callbacks.set_data = &EagerHost::Take;
  IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(&host), &host.callbacks);
  Run();
  EXPECT_THAT(host.heard,
              ElementsAre(StatusText(4, "Device Upgrading"), StatusText(1, "Upgrade Complete")));
  EXPECT_THAT(host.results, ElementsAre(ICFG_UPGRADE_RUNNING, ICFG_UPGRADE_RUNNING));
  EXPECT_THAT(test::GetFile("\\a.txt"), ::testing::Optional(std::string("content")));
  IcfgSetCallbacks(0, nullptr);
}

// ---- refusals ----

TEST_F(MessagesTest, TellWhyAnUpgradeDoesNotStart) {
  device().power().SetStatus(0, 4, 1);
  EXPECT_EQ(Start(job()), ICFG_NO_POWER);
  test::DropKeptJob();
  device().power().SetStatus(1, 1, 100);
  job().required_space = "2000000000";
  EXPECT_EQ(Start(job()), ICFG_NO_SPACE);
  EXPECT_THAT(Sent(), ElementsAre(Event(205180, "Power requirement not met"),
                                  Event(205180, "No space available")))
      << "an event each, and no status";
  EXPECT_EQ(device().messages().open_connections(), 0U);
}

TEST_F(MessagesTest, TellOfAFailedTestByAStatusAndAnEvent) {
  job().tests = {FailingTest("Wrong model <&>")};
  EXPECT_EQ(Start(job()), ICFG_TEST_FAILED);
  test::DropKeptJob();
  record().TakeStatuses();
  EXPECT_EQ(Start(job()), ICFG_TEST_FAILED);
  const std::string event = Event(205180, "Wrong model &lt;&amp;&gt;");
  const std::string words = "Upgrade Failed: Wrong model <&>";
  EXPECT_THAT(Sent(),
              ElementsAre(Status(kToClient, 1, words), event, Status(kToHost, 1, words), event));
}

TEST_F(MessagesTest, CutTheWordsOfAFailedTestInTheStatus) {
  const std::string message(255, 'm');
  job().tests = {FailingTest(message)};
  EXPECT_EQ(Start(job()), ICFG_TEST_FAILED);
  EXPECT_THAT(Sent(),
              ElementsAre(Status(kToClient, 1, ("Upgrade Failed: " + message).substr(0, 255)),
                          Event(205180, message)));
}

TEST_F(MessagesTest, EndTheConnectionThreeSecondsAfterARefusal) {
  job().required_space = "2000000000";
  std::size_t open_before = 0;
  After(seconds(2), [&] { open_before = device().messages().open_connections(); });
  EXPECT_EQ(Start(job()), ICFG_NO_SPACE);
  EXPECT_EQ(open_before, 1U);
  EXPECT_EQ(device().messages().open_connections(), 0U);
  EXPECT_THAT(ReadLog(), ::testing::EndsWith("\r\nCloseTransferHandle"));
}

TEST_F(MessagesTest, OfARunningUpgradeGoOnAfterARefusalOfAnother) {
  server().Remove("files/a.txt");
  After(seconds(60), [this] { server().Put("files/a.txt", "content"); });
  Start(job());
  Sleep(5000);
  HostJob second = job();
  second.required_space = "2000000000";
  EXPECT_EQ(Start(second), ICFG_NO_SPACE);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(Sent(), ElementsAre(Status(kToClient, 4, "Device Upgrading"), Event(205181),
                                  Event(205180, "No space available"), Event(205182),
                                  Status(kToClient, 1, "Upgrade Complete")));
  EXPECT_EQ(device().messages().bad_uses(), 0U);
  EXPECT_EQ(device().messages().open_connections(), 0U);
}

// ---- without a queue ----

TEST_F(MessagesTest, AreAllThatIsLostWithoutTheLibrary) {
  device().libraries().Remove(sim::kQueueLibrary);
  Run();
  EXPECT_THAT(test::GetFile("\\a.txt"), ::testing::Optional(std::string("content")));
  EXPECT_EQ(server().Device().reports, 1U);
  EXPECT_THAT(Sent(), SizeIs(0));
  EXPECT_THAT(LogLinesWith("InitKXTransfer - LoadLibrary"), SizeIs(4)) << "once for each message";
}

TEST_F(MessagesTest, AreAllThatIsLostWhenTheQueueRefuses) {
  device().messages().SetOpens(false);
  Run();
  EXPECT_THAT(test::GetFile("\\a.txt"), ::testing::Optional(std::string("content")));
  EXPECT_THAT(Sent(), SizeIs(0));
  EXPECT_THAT(LogLinesWith("InitKXTransfer - open"), SizeIs(4));
}

TEST_F(MessagesTest, GoThroughALibraryOfTheOldName) {
  device().libraries().Remove(sim::kQueueLibrary);
  device().libraries().Install(sim::MakeQueueLibrary(sim::kOldQueueLibrary));
  const test::Holdings before = test::HoldingsOf(device());
  Run();
  EXPECT_THAT(Sent(), SizeIs(4));
  EXPECT_EQ(test::HoldingsOf(device()), before);
}

TEST_F(MessagesTest, AreAllThatIsLostWithoutAFunctionToWrite) {
  device().libraries().Install(sim::MakeQueueLibrary(sim::kQueueLibrary, u"lapi_write"));
  const test::Holdings before = test::HoldingsOf(device());
  Run();
  EXPECT_THAT(test::GetFile("\\a.txt"), ::testing::Optional(std::string("content")));
  EXPECT_THAT(Sent(), SizeIs(0));
  EXPECT_EQ(test::HoldingsOf(device()), before);
}

TEST_F(MessagesTest, OfAllJobsGoThroughOneConnectionThatCannotBeClosed) {
  device().libraries().Install(sim::MakeQueueLibrary(sim::kQueueLibrary, u"lapi_close"));
  test::Holdings before = test::HoldingsOf(device());
  ++before.queue_connections;
  Run();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  Run();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_THAT(Sent(), SizeIs(8));
}

TEST_F(MessagesTest, StillReachTheHostWithoutTheLibrary) {
  device().libraries().Remove(sim::kQueueLibrary);
  record().TakeStatuses();
  Run();
  EXPECT_THAT(Sent(), ElementsAre(Status(kToHost, 4, "Device Upgrading"),
                                  Status(kToHost, 1, "Upgrade Complete")));
}

}  // namespace

#include "report/messages/message_link.h"

#include <gmock/gmock.h>

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "library/libraries.h"
#include "library/management_queue.h"
#include "orvenix/configlet.h"
#include "product_support/log_lines.h"
#include "product_support/messages.h"
#include "support/device_test.h"
#include "trace/trace.h"

namespace report {
namespace {

using test::EventText;
using test::kNow;
using test::ReadLog;
using test::StatusText;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr const char* kTime = "2006/03/01:14:05:09";  // at which a virtual world begins

constexpr const char* kLoad = "Orvenix - InitKXTransfer - LoadLibrary\r\n";
constexpr const char* kFind = "Orvenix - InitKXTransfer - GetHandles\r\n";
constexpr const char* kOpen = "Orvenix - InitKXTransfer - open\r\n";
const std::string kStart = std::string(kLoad) + kFind + kOpen;
constexpr const char* kStatusEntered = "Orvenix - SetRWIStatus - entering\r\n";
constexpr const char* kStatusSent =
    "Orvenix - SetRWIStatus - send msg\r\nOrvenix - SetRWIStatus - send msg lapi write\r\n";
constexpr const char* kEventEntered = "Orvenix - SendDeviceEvent - entering\r\n";

/// Each test runs in a process of its own: the link lives as long as its process.
class MessageLinkTest : public DeviceTest {
 protected:
  MessageLinkTest() { Restart({}); }
  ~MessageLinkTest() override { device().trace().SetSink(nullptr); }

  void Restart(const sim::Profile& profile) {
    record_.reset();
    DeviceTest::Restart(profile);
    record_ = std::make_unique<test::MessageRecord>(device());
    device().trace().SetSink([this](std::string_view line) { trace_.emplace_back(line); });
  }
  void RestartWith(const char* library, const char* lacks, bool opens = true) {
    sim::Profile profile;
    profile.message_library = library;
    profile.message_library_lacks = lacks;
    profile.message_queue_opens = opens;
    Restart(profile);
  }

  [[nodiscard]] test::MessageRecord& record() { return *record_; }
  [[nodiscard]] std::vector<std::string> Sent() const { return record_->Lines(); }
  std::uint64_t Calls(const char* call) { return device().faults().Count(call); }

  /// The trace of all calls of that name, from their arguments to their results; the last error,
  /// which the library leaves alone, is left out.
  [[nodiscard]] std::vector<std::string> Traced(const std::string& call) const {
    std::vector<std::string> found;
    for (const std::string& line : trace_) {
      const std::size_t at = line.find("\"call\":\"" + call + "\",");
      if (at == std::string::npos) continue;
      const std::size_t from = line.find("\"args\"");
      found.push_back(line.substr(from, line.rfind(",\"error\"") - from));
    }
    return found;
  }

 private:
  std::unique_ptr<test::MessageRecord> record_;
  std::vector<std::string> trace_;
};

// ---- status ----

TEST_F(MessageLinkTest, SendsAStatusToTheClientsQueue) {
  SetRWIStatus(4, "Device Upgrading");
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(4, "Device Upgrading")));
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent);
}

TEST_F(MessageLinkTest, HandsAStatusToAHostThatAsksForItAndLoadsNothing) {
  record().TakeStatuses();
  SetRWIStatus(1, "Upgrade Complete");
  EXPECT_THAT(Sent(), ElementsAre("host: " + StatusText(1, "Upgrade Complete")));
  EXPECT_EQ(ReadLog(), kStatusEntered);
  EXPECT_THAT(device().libraries().Loaded(), IsEmpty());
  EXPECT_THAT(device().kernel().NamedObjects(), IsEmpty()) << "not even the mutex";
  EXPECT_EQ(Calls("LoadLibraryW"), 0U);
}

TEST_F(MessageLinkTest, SendsNothingAnywhereForAHostWithoutTheFifthEntry) {
  const IcfgCallbacks empty = {};
  IcfgSetCallbacks(1, &empty);
  SetRWIStatus(1, "lost");
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(ReadLog(), kStatusEntered);
}

TEST_F(MessageLinkTest, GoesBackToTheQueueWhenTheHostTakesItsTableAway) {
  record().TakeStatuses();
  SetRWIStatus(1, "one");
  test::MessageRecord::LeaveStatuses();
  SetRWIStatus(1, "two");
  EXPECT_THAT(Sent(),
              ElementsAre("host: " + StatusText(1, "one"), "TW_CLIENT: " + StatusText(1, "two")));
}

// A host that calls the configlet from inside its callback.
struct BusyHost {
  IcfgCallbacks callbacks{};
  int depth = 0;
  std::vector<std::string> heard;

  static int Take(std::uintptr_t context, const char* text, std::int32_t, const IcfgCallbacks*) {
    auto& host = *reinterpret_cast<BusyHost*>(context);
    host.heard.emplace_back(text);
    if (++host.depth > 1) return 0;
    char version[16];
    std::uint32_t length = 0;
    EXPECT_EQ(IcfgGetField("Protocol Version", 0, 0, version, &length), ICFG_OK);
    EXPECT_EQ(IcfgSetCallbacks(context, &host.callbacks), ICFG_OK);
    EXPECT_EQ(IcfgBeginGroup("Syslog", 0, 0), ICFG_OK);
    SetRWIStatus(4, "inner");
    SendDeviceEvent("id", 7, "inner");
    CloseTransferHandle();
    return 0;
  }
};

TEST_F(MessageLinkTest, MayBeUsedByTheHostFromInsideItsCallback) {
  BusyHost host;
  host.callbacks.set_data = &BusyHost::Take;
  IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(&host), &host.callbacks);
  SetRWIStatus(4, "outer");
  EXPECT_THAT(host.heard, ElementsAre(StatusText(4, "outer"), StatusText(4, "inner")));
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 7, "inner")));
}

// ---- events ----

TEST_F(MessageLinkTest, SendsAnEventToTheMastersEventDatabase) {
  SendDeviceEvent("MR41A-7", kEventUpgradeFailed, "No space available");
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " +
                                  EventText(kNow, "MR41A-7", 205180, "No space available")));
  EXPECT_EQ(ReadLog(), kEventEntered + kStart + kTime + "Orvenix - SendDeviceEvent - send msg\r\n" +
                           EventText(kTime, "MR41A-7", 205180, "No space available") + "\r\n");
}

TEST_F(MessageLinkTest, SendsEventsToTheQueueThoughTheHostTakesStatuses) {
  record().TakeStatuses();
  SendDeviceEvent("id", kEventUpgradeStarted, nullptr);
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 205181)));
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
}

TEST_F(MessageLinkTest, TellsTheTimeInTwentyFourHours) {
  for (const auto& [start, told] : {std::pair{"2006-12-31 00:00:00", "2006/12/31:00:00:00"},
                                    std::pair{"2007-01-02 12:34:56", "2007/01/02:12:34:56"},
                                    std::pair{"2007-01-02 23:59:59", "2007/01/02:23:59:59"}}) {
    sim::Profile profile;
    profile.start_time = start;
    Restart(profile);
    CloseTransferHandle();  // of the device that was there before
    SendDeviceEvent("", 1, nullptr);
    ASSERT_EQ(device().messages().Messages().size(), 1U);
    EXPECT_EQ(device().messages().Messages()[0].text, EventText(told, "", 1));
  }
}

TEST_F(MessageLinkTest, SendsAnEventThatIsLongerThanALogLine) {
  const std::string text(3000, 'e');
  SendDeviceEvent("id", 1, text.c_str());
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 1, text)));
  EXPECT_THAT(ReadLog(), HasSubstr(EventText(kTime, "id", 1, text).substr(0, 1024) + "\r\n"));
}

TEST_F(MessageLinkTest, SendsNoEventWithoutMemoryForIt) {
  InitKXTransfer();
  device().faults().Add({"LocalAlloc", 1, 0, 0});
  SendDeviceEvent("id", 1, "x");
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_THAT(ReadLog(), Not(HasSubstr("SendDeviceEvent - send msg")));
  device().faults().Clear();
  SendDeviceEvent("id", 1, "y");
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 1, "y")));
}

// ---- the library's functions ----

TEST_F(MessageLinkTest, CallsTheLibraryWithExactlyTheseArguments) {
  SetRWIStatus(1, "x");
  SendDeviceEvent("id", 1, nullptr);
  CloseTransferHandle();
  EXPECT_THAT(Traced("lapi_open"),
              ElementsAre("\"args\":{\"host\":\"127.0.0.1\",\"queue\":\"UPG_KX_QUEUE\","
                          "\"numbers\":\"0 1 0 0 1 1\"},\"result\":0"));
  const auto written = [](std::size_t length, const char* to, const char* master) {
    return "\"args\":{\"connection\":14680065,\"numbers\":\"60 1 248 0 0 1 0 0 1\",\"length\":" +
           std::to_string(length) + ",\"destination\":\"" + to + "\",\"master\":\"" + master +
           "\",\"source\":\"\"},\"result\":0";
  };
  EXPECT_THAT(
      Traced("lapi_write"),
      ElementsAre(written(StatusText(1, "x").size() + 1, "TW_CLIENT", ""),
                  written(EventText(kTime, "id", 1).size() + 1, "TW_Event_DB", "~MASTERKX")));
  EXPECT_THAT(Traced("lapi_close"), ElementsAre("\"args\":{\"connection\":14680065},\"result\":0"));
}

TEST_F(MessageLinkTest, LooksPastResults) {
  device().faults().Add({"lapi_write", 1, 1, 0});
  SetRWIStatus(1, "lost");
  SetRWIStatus(1, "sent");
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(1, "sent")));
  EXPECT_EQ(Calls("lapi_open"), 1U);
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + kStatusEntered + kStatusSent);
}

// ---- the link ----

TEST_F(MessageLinkTest, StartsOnceAndSaysSo) {
  InitKXTransfer();
  InitKXTransfer();
  EXPECT_EQ(ReadLog(), kStart);
  EXPECT_EQ(device().messages().open_connections(), 1U);
}

TEST_F(MessageLinkTest, KeepsOneHandleOfTheMutexThatMarksTheClient) {
  const std::size_t before = device().kernel().OpenHandles();
  for (int i = 0; i < 5; ++i) InitKXTransfer();
  EXPECT_EQ(Calls("CreateMutexW"), 5U) << "at every start";
  EXPECT_EQ(device().kernel().OpenHandles(), before + 1);
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  CloseTransferHandle();
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  HANDLE const other = CreateMutexW(nullptr, FALSE, TEXT("UPGRADE_CLIENT"));
  EXPECT_EQ(WaitForSingleObject(other, 0), WAIT_OBJECT_0) << "nobody owns it";
  ReleaseMutex(other);
  CloseHandle(other);
}

TEST_F(MessageLinkTest, KeepsTheMutexWhenItCannotBeMadeAgain) {
  InitKXTransfer();
  device().faults().Add({"CreateMutexW", 1, 0, 0});
  SetRWIStatus(1, "x");
  EXPECT_THAT(device().kernel().NamedObjects(), ElementsAre("UPGRADE_CLIENT"));
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(1, "x")));
}

TEST_F(MessageLinkTest, EndsOnlyWhatIsOpen) {
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), "");
  InitKXTransfer();
  CloseTransferHandle();
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), kStart + "CloseTransferHandle") << "without a line end";
  EXPECT_EQ(device().messages().open_connections(), 0U);
  EXPECT_EQ(device().messages().bad_uses(), 0U);
}

TEST_F(MessageLinkTest, OpensAnotherConnectionAfterTheEndOfTheFirst) {
  SetRWIStatus(1, "first");
  CloseTransferHandle();
  SetRWIStatus(1, "second");
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + "CloseTransferHandle" +
                           kStatusEntered + kOpen + kStatusSent)
      << "the library stays loaded";
  EXPECT_EQ(Sent().size(), 2U);
  EXPECT_EQ(Calls("LoadLibraryW"), 1U);
}

TEST_F(MessageLinkTest, TakesTheOldNameOfTheLibrary) {
  RestartWith("kx_lapi_c_wrapper", "");
  SetRWIStatus(1, "x");
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent);
  EXPECT_THAT(Traced("LoadLibraryW"), ElementsAre(HasSubstr("\"name\":\"kx_clapi_dll\"}"),
                                                  HasSubstr("\"name\":\"kx_lapi_c_wrapper\"}")));
  EXPECT_EQ(Sent().size(), 1U);
}

// ---- what may be missing ----

TEST_F(MessageLinkTest, LooksForAMissingLibraryWithEveryMessage) {
  RestartWith("", "");
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), std::string(kStatusEntered) + kLoad + kEventEntered + kLoad)
      << "neither a time nor a document";
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(Calls("LoadLibraryW"), 4U) << "both names each time";

  device().libraries().Install(sim::MakeQueueLibrary(sim::kQueueLibrary));
  SetRWIStatus(1, "there");
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(1, "there")));
}

TEST_F(MessageLinkTest, StillReachesTheHostWithoutALibrary) {
  RestartWith("", "");
  record().TakeStatuses();
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  EXPECT_THAT(Sent(), ElementsAre("host: " + StatusText(4, "x")));
}

TEST_F(MessageLinkTest, LooksForAMissingOpenWithEveryMessage) {
  RestartWith("kx_clapi_dll", "lapi_open");
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  EXPECT_EQ(ReadLog(), std::string(kStatusEntered) + kLoad + kFind + kEventEntered + kFind);
  EXPECT_THAT(Sent(), IsEmpty());
}

TEST_F(MessageLinkTest, LosesMessagesWithoutAWriteAndNothingElse) {
  RestartWith("kx_clapi_dll", "lapi_write");
  SetRWIStatus(4, "x");
  SendDeviceEvent("id", 1, "x");
  CloseTransferHandle();
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_EQ(device().messages().open_connections(), 0U);
}

TEST_F(MessageLinkTest, KeepsItsConnectionWithoutAClose) {
  RestartWith("kx_clapi_dll", "lapi_close");
  SetRWIStatus(4, "x");
  CloseTransferHandle();
  SetRWIStatus(1, "y");
  EXPECT_EQ(Sent().size(), 2U);
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent + kStatusEntered + kStatusSent);
  EXPECT_EQ(device().messages().open_connections(), 1U);
}

TEST_F(MessageLinkTest, AsksAgainForAConnectionThatWasRefused) {
  RestartWith("kx_clapi_dll", "", false);
  SetRWIStatus(4, "lost");
  SendDeviceEvent("id", 1, "lost");
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kEventEntered + kOpen);
  device().messages().SetOpens(true);
  SendDeviceEvent("id", 1, "sent");
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 1, "sent")));
}

// ---- from several threads ----

class MessageLinkThreadsTest : public RealDeviceTest {};

TEST_F(MessageLinkThreadsTest, SendsEveryMessageWholeWhileOthersCloseTheConnection) {
  constexpr int kMessages = 40;
  test::MessageRecord record(device());
  const auto work = [](void* text) -> DWORD {
    const auto* const name = static_cast<const char*>(text);
    for (int i = 0; i < kMessages; ++i) {
      SetRWIStatus(i, name);
      SendDeviceEvent(name, static_cast<std::uint32_t>(i), name);
      if (i % 8 == 7) CloseTransferHandle();
    }
    return 0;
  };
  char names[][8] = {"one", "two"};
  HANDLE threads[2];
  for (int i = 0; i < 2; ++i) {
    threads[i] = CreateThread(nullptr, 0, work, names[i], 0, nullptr);
    ASSERT_NE(threads[i], nullptr);
  }
  for (HANDLE thread : threads) {
    EXPECT_EQ(WaitForSingleObject(thread, INFINITE), WAIT_OBJECT_0);
    CloseHandle(thread);
  }
  const std::vector<std::string> lines = record.Lines();
  EXPECT_EQ(lines.size(), 4U * kMessages);
  EXPECT_EQ(device().messages().bad_uses(), 0U) << "nobody closed it under another's message";
  for (const char* name : names) {
    for (int i = 0; i < kMessages; ++i)
      EXPECT_THAT(lines, Contains("TW_CLIENT: " + StatusText(i, name)));
  }
}

TEST_F(MessageLinkThreadsTest, GivesTheHostContextAndTableAsTheyWereSetTogether) {
  struct Host {
    IcfgCallbacks callbacks{};
    std::atomic<int> heard{0};
    static int Take(std::uintptr_t context, const char*, std::int32_t, const IcfgCallbacks* table) {
      auto& host = *reinterpret_cast<Host*>(context);
      EXPECT_EQ(table, &host.callbacks);
      ++host.heard;
      return 0;
    }
  };
  static Host hosts[2];
  for (Host& host : hosts) host.callbacks.set_data = &Host::Take;
  IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(&hosts[0]), &hosts[0].callbacks);
  HANDLE const thread = CreateThread(
      nullptr, 0,
      [](void*) -> DWORD {
        for (int i = 0; i < 200; ++i) {
          Host& host = hosts[i % 2];
          IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(&host), &host.callbacks);
        }
        return 0;
      },
      nullptr, 0, nullptr);
  for (int i = 0; i < 50; ++i) SetRWIStatus(4, "x");
  WaitForSingleObject(thread, INFINITE);
  CloseHandle(thread);
  EXPECT_EQ(hosts[0].heard + hosts[1].heard, 50);
}

}  // namespace
}  // namespace report

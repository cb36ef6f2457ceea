#include "report/messages/message_link_test.h"

#include "ce/errors.h"
#include "ce/kernel.h"
#include "kernel/kernel.h"
#include "library/libraries.h"
#include "memory/memory.h"
#include "net/virtual/virtual_server.h"
#include "orvenix/configlet.h"
#include "report/log/log.h"

namespace report {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

/// Everything that is no letter, and "%" in forms that would read or write as a format.
std::string HostileText() {
  std::string text;
  for (int byte = 1; byte < 256; ++byte) text += static_cast<char>(byte);
  return text + "\r\n%s%n%1000000d%%";
}

/// As it stands within a document.
std::string Escaped(const std::string& text) {
  std::string escaped;
  for (const char letter : text) {
    switch (letter) {
      case '<': escaped += "&lt;"; break;
      case '>': escaped += "&gt;"; break;
      case '&': escaped += "&amp;"; break;
      case '"': escaped += "&quot;"; break;
      case '\'': escaped += "&apos;"; break;
      default: escaped += letter;
    }
  }
  return escaped;
}

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

TEST_F(MessageLinkTest, LogsAnEventToSyslogInFourDatagramsMore) {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  Restart(profile);
  std::vector<std::string> received;
  const sim::VirtualPort syslog(world(), {0x0A000005, 514},
                                [&](sim::VirtualPort&, const sim::Endpoint&,
                                    std::string_view bytes) { received.emplace_back(bytes); });
  InitKXTransfer();
  SetSyslogTarget(514, "10.0.0.5");
  const std::string text(1500, 'e');
  SendDeviceEvent("id", 1, text.c_str());
  Sleep(10);
  SetSyslogTarget(0, "");
  const std::string head = "< 14>2006-03-01 14:05:09 ";
  EXPECT_THAT(received,
              ElementsAre(head + kEventEntered, head + kTime,
                          head + "Orvenix - SendDeviceEvent - send msg\r\n",
                          head + EventText(kTime, "id", 1, text).substr(0, 1024), head + "\r\n"));
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 1, text)));
}

TEST_F(MessageLinkTest, PassesEveryByteOfAReasonAsItStands) {
  SetRWIStatus(4, HostileText().c_str());
  ASSERT_EQ(device().messages().Messages().size(), 1U);
  EXPECT_EQ(device().messages().Messages()[0].text, StatusText(4, HostileText()));
  EXPECT_EQ(ReadLog(), kStatusEntered + kStart + kStatusSent) << "the log has no word of it";
}

TEST_F(MessageLinkTest, EscapesNothingButFiveLettersInEvents) {
  InitKXTransfer();
  SendDeviceEvent(HostileText().c_str(), 7, HostileText().c_str());
  const std::string text = Escaped(HostileText());
  ASSERT_EQ(device().messages().Messages().size(), 1U);
  EXPECT_EQ(device().messages().Messages()[0].text, EventText(kTime, text, 7, text));
  EXPECT_EQ(ReadLog(), kStart + kEventEntered + kTime + "Orvenix - SendDeviceEvent - send msg\r\n" +
                           EventText(kTime, text, 7, text).substr(0, 1024) + "\r\n");
}

TEST_F(MessageLinkTest, TakesNullForNothing) {
  SetRWIStatus(4, nullptr);
  SendDeviceEvent(nullptr, 1, nullptr);
  EXPECT_THAT(Sent(), ElementsAre("TW_CLIENT: " + StatusText(4, ""),
                                  "TW_Event_DB@~MASTERKX: " + EventText(kNow, "", 1)));
}

TEST_F(MessageLinkTest, SendsNoEventWithoutMemoryForIt) {
  InitKXTransfer();
  const std::size_t blocks = device().memory().live_blocks();
  device().faults().Add({"LocalAlloc", 1, 0, 0});
  SendDeviceEvent("id", 1, "x");
  EXPECT_THAT(Sent(), IsEmpty());
  EXPECT_THAT(ReadLog(), Not(HasSubstr("SendDeviceEvent - send msg")));
  EXPECT_EQ(device().memory().live_blocks(), blocks);
  device().faults().Clear();
  SendDeviceEvent("id", 1, "y");
  EXPECT_THAT(Sent(), ElementsAre("TW_Event_DB@~MASTERKX: " + EventText(kNow, "id", 1, "y")));
}

}  // namespace
}  // namespace report

// The texts of status and event.
#include <gtest/gtest.h>

#include <climits>
#include <cstring>
#include <string>

#include "faults/faults.h"
#include "memory/memory.h"
#include "product_support/messages.h"
#include "support/device_test.h"

// The platform's own names come last.
#include "report/messages/documents.h"

namespace report {
namespace {

using test::EventText;
using test::StatusText;

std::string Status(int state, const char* reason) {
  char text[kStatusSize];
  std::memset(text, 'x', sizeof text);
  const std::size_t length = FormatStatus(text, state, reason);
  EXPECT_EQ(std::strlen(text), length);
  return text;
}

TEST(StatusDocumentTest, IsOneLineWithExactlyTheseTabsAndBlanks) {
  EXPECT_EQ(Status(4, "Device Upgrading"),
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\t\t\t\t\t\t\t<DevInfo Action=\"Set\">"
            "\t\t\t\t\t\t\t   <Subsystem Name=\"TW_Client\">                        "
            "\t\t   <Group Name=\"Ready-to-Work\">\t\t\t                        "
            "<Field Name=\"State\">4</Field>\t\t\t                        "
            "<Field Name=\"Reason\">Device Upgrading</Field>                        "
            "\t\t   </Group>                           \t   </Subsystem>"
            "\t\t\t\t\t\t\t   </DevInfo>");
  EXPECT_EQ(Status(4, "Device Upgrading"), StatusText(4, "Device Upgrading"));
  EXPECT_EQ(Status(4, "Device Upgrading").size(), 373U + 1 + 16);
}

TEST(StatusDocumentTest, TakesTheReasonAsItIs) {
  EXPECT_EQ(Status(1, "<b> & \"c\" %s %d"), StatusText(1, "<b> & \"c\" %s %d"));
  EXPECT_EQ(Status(1, ""), StatusText(1, ""));
  EXPECT_EQ(Status(1, nullptr), StatusText(1, ""));
}

TEST(StatusDocumentTest, TakesAnyState) {
  EXPECT_EQ(Status(INT_MIN, "x"), StatusText(INT_MIN, "x"));
  EXPECT_EQ(Status(INT_MAX, "x"), StatusText(INT_MAX, "x"));
}

TEST(StatusDocumentTest, CutsALongReasonAndNeverTheDocument) {
  const std::string fits(1600, 'r');
  EXPECT_EQ(Status(INT_MIN, fits.c_str()), StatusText(INT_MIN, fits));
  EXPECT_EQ(Status(INT_MIN, (fits + "s").c_str()), StatusText(INT_MIN, fits));
  EXPECT_EQ(Status(1, std::string(100000, 'r').c_str()), StatusText(1, fits));
}

// ---- the time ----

TEST(EventTimestampTest, HasColonsAndTwentyFourHours) {
  EXPECT_STREQ(EventTimestamp({2006, 3, 3, 1, 14, 5, 9, 700}).c_str(), "2006/03/01:14:05:09");
  EXPECT_STREQ(EventTimestamp({2006, 3, 3, 1, 0, 0, 0, 0}).c_str(), "2006/03/01:00:00:00");
  EXPECT_STREQ(EventTimestamp({2024, 12, 2, 31, 23, 59, 59, 999}).c_str(), "2024/12/31:23:59:59");
  EXPECT_STREQ(EventTimestamp({987, 1, 2, 3, 4, 5, 6, 0}).c_str(), "0987/01/03:04:05:06");
}

TEST(EventTimestampTest, IsEmptyFrom33CharactersOn) {
  EXPECT_STREQ(EventTimestamp({10000, 10000, 0, 10000, 10000, 10000, 99, 0}).c_str(),
               "10000/10000/10000:10000:10000:99");
  EXPECT_STREQ(EventTimestamp({10000, 10000, 0, 10000, 10000, 10000, 100, 0}).c_str(), "");
  EXPECT_STREQ(EventTimestamp({65535, 65535, 0, 65535, 65535, 65535, 65535, 0}).c_str(), "");
}

// ---- the event ----

class EventDocumentTest : public DeviceTest {
 protected:
  static std::string Write(const DeviceEvent& event) {
    xml::XmlDocument document;
    std::uint32_t length = 0;
    const char* const text = WriteEvent(document, event, &length);
    if (text == nullptr) return "(no memory)";
    EXPECT_EQ(std::strlen(text), length);
    return text;
  }
};

TEST_F(EventDocumentTest, IsOneLineOfTheseFieldsInThisOrder) {
  EXPECT_EQ(Write({"2006/03/01:14:05:09", "MR41A-7", 205180, "No space available"}),
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?><DevInfo Action=\"Notify\">"
            "<Subsystem Name=\"TW_EVENT_DB\"><Group Name=\"errorLogMsg\">"
            "<Field Name=\"timestampString\">2006/03/01:14:05:09</Field>"
            "<Field Name=\"system\">20</Field>"
            "<Field Name=\"subsystem\">TW_UPGD_SRVR</Field>"
            "<Field Name=\"uniqueId\">MR41A-7</Field>"
            "<Field Name=\"msgNum\">205180</Field>"
            "<Field Name=\"fcnName\">SendDeviceEvent</Field>"
            "<Field Name=\"severity\">3</Field>"
            "<Field Name=\"lineNum\">1</Field>"
            "<Field Name=\"optArgArrayElement\">No space available</Field>"
            "<Field Name=\"systemRc\">0</Field>"
            "</Group></Subsystem></DevInfo>");
}

TEST_F(EventDocumentTest, HasAnotherFieldWithoutATime) {
  EXPECT_EQ(Write({"", "id", 1, "x"}), EventText("", "id", 1, "x"));
  EXPECT_NE(Write({"", "id", 1, "x"}).find("<Field Name=\"timestamp\">0</Field>"),
            std::string::npos);
}

TEST_F(EventDocumentTest, WritesEmptyTextsAsEmptyFields) {
  EXPECT_EQ(Write({"t", nullptr, 205181, nullptr}), EventText("t", "", 205181));
  EXPECT_EQ(Write({"t", "", 205181, ""}), EventText("t", "", 205181));
  EXPECT_NE(Write({"t", "", 1, ""}).find("<Field Name=\"optArgArrayElement\"/>"),
            std::string::npos);
}

TEST_F(EventDocumentTest, EscapesWhatComesFromOutside) {
  EXPECT_EQ(Write({"t", "<&>", 1, "a \"b\" 'c' %s"}),
            EventText("t", "&lt;&amp;&gt;", 1, "a &quot;b&quot; &apos;c&apos; %s"));
}

TEST_F(EventDocumentTest, HasNoSign) {
  EXPECT_EQ(Write({"t", "i", 4294967295U, ""}), EventText("t", "i", 4294967295U));
}

TEST_F(EventDocumentTest, TakesLongTexts) {
  const std::string text(20000, 'e');
  EXPECT_EQ(Write({"t", "i", 1, text.c_str()}), EventText("t", "i", 1, text));
}

TEST_F(EventDocumentTest, IsNothingWhenThereIsNoMemory) {
  const std::string whole = EventText("t", "i", 1, "x");
  int failed = 0;
  for (std::uint64_t nth = 1;; ++nth) {
    device().faults().Clear();
    device().faults().Add({"LocalAlloc", nth, 0, 0});
    const std::string text = Write({"t", "i", 1, "x"});
    if (text == whole) break;
    EXPECT_EQ(text, "(no memory)");
    ++failed;
  }
  EXPECT_GT(failed, 1) << "the tree and the text";
  EXPECT_EQ(device().memory().live_blocks(), 0U);
}

}  // namespace
}  // namespace report

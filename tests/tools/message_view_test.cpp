#include "tools/message_view.h"

#include <gtest/gtest.h>

namespace tools {
namespace {

Message Status(const std::string& state, const std::string& reason) {
  return {"TW_CLIENT",
          "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\t<DevInfo Action=\"Set\">\t"
          "<Subsystem Name=\"TW_Client\">\t<Group Name=\"Ready-to-Work\">\t<Field "
          "Name=\"State\">" +
              state + "</Field>\t<Field Name=\"Reason\">" + reason +
              "</Field>  </Group> </Subsystem> </DevInfo>"};
}

Message Event(const std::string& detail) {
  return {"TW_Event_DB@~MASTERKX",
          "<?xml version=\"1.0\" encoding=\"UTF-8\"?><DevInfo Action=\"Notify\"><Subsystem "
          "Name=\"TW_EVENT_DB\"><Group Name=\"errorLogMsg\"><Field Name=\"timestampString\">"
          "2006/03/01:14:05:09</Field><Field Name=\"uniqueId\">a&amp;b</Field><Field "
          "Name=\"msgNum\">205180</Field>" +
              detail + "</Group></Subsystem></DevInfo>"};
}

TEST(DescribeMessageTest, TellsStateAndReasonOfAStatus) {
  EXPECT_EQ(DescribeMessage(Status("4", "Device Upgrading")),
            "status 4 to TW_CLIENT: Device Upgrading");
  EXPECT_EQ(DescribeMessage(Status("1", "")), "status 1 to TW_CLIENT: ");
}

TEST(DescribeMessageTest, TakesAReasonThatNoParserTakes) {
  EXPECT_EQ(DescribeMessage(Status("1", "a < b & </Field> c")),
            "status 1 to TW_CLIENT: a < b & </Field> c");
}

TEST(DescribeMessageTest, TellsCodeAndDetailOfAnEvent) {
  EXPECT_EQ(DescribeMessage(Event("<Field Name=\"optArgArrayElement\">No &lt;space&gt;</Field>")),
            "event 205180 to TW_Event_DB@~MASTERKX: No <space>");
  EXPECT_EQ(DescribeMessage(Event("<Field Name=\"optArgArrayElement\"/>")),
            "event 205180 to TW_Event_DB@~MASTERKX");
}

TEST(DescribeMessageTest, ShowsAnythingElseAsItStands) {
  EXPECT_EQ(DescribeMessage({"X", "no document"}), "message to X: no document");
  EXPECT_EQ(DescribeMessage({"X", ""}), "message to X: ");
  EXPECT_EQ(DescribeMessage({"X", "<Subsystem Name=\"TW_EVENT_DB\">"}),
            "message to X: <Subsystem Name=\"TW_EVENT_DB\">");
  EXPECT_EQ(DescribeMessage({"X", "<Subsystem Name=\"TW_Client\"></Field>"}),
            "message to X: <Subsystem Name=\"TW_Client\"></Field>");
}

TEST(DescribeMessageTest, KeepsBlanksAndLineEndsOfADetail) {
  const auto members = MessageMembers(Event("<Field Name=\"optArgArrayElement\"> \r\n </Field>"));
  EXPECT_EQ(members["detail"], " \r\n ");
  EXPECT_EQ(DescribeMessage(Event("<Field Name=\"optArgArrayElement\">  </Field>")),
            "event 205180 to TW_Event_DB@~MASTERKX:   ");
}

TEST(MessageMembersTest, CountsAStateThatIsNoNumberAsZero) {
  EXPECT_EQ(MessageMembers(Status("99999999999999999999", ""))["state"], 0);
  EXPECT_EQ(MessageMembers(Status("x", ""))["state"], 0);
  EXPECT_EQ(MessageMembers(Status("-2147483648", ""))["state"], -2147483648LL);
}

TEST(MessageMembersTest, NameWhatAMessageSays) {
  EXPECT_EQ(MessageMembers(Status("4", "<b>")).dump(),
            R"({"kind":"status","to":"TW_CLIENT","state":4,"reason":"<b>"})");
  EXPECT_EQ(MessageMembers(Event("<Field Name=\"optArgArrayElement\">x</Field>")).dump(),
            R"({"kind":"device-event","to":"TW_Event_DB@~MASTERKX","code":205180,)"
            R"("time":"2006/03/01:14:05:09","unique_id":"a&b","detail":"x"})");
  EXPECT_EQ(MessageMembers({"X", "?"}).dump(), R"({"kind":"other","to":"X"})");
}

}  // namespace
}  // namespace tools

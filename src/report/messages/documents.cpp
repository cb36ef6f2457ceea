#include "report/messages/documents.h"

#include <string_view>

#include "base/format.h"
#include "xml/writer.h"

namespace report {
namespace {

constexpr int kMaxReason = 1600;

// KEPT ODDITY: the tabs and runs of blanks between the elements are part of the text, and so is
// "TW_Client", whose case differs from the queue's "TW_CLIENT". The reason stands in it as it is,
// not escaped: "<" and "&" in a job's message make a document that no parser takes.
constexpr const char* kStatusFormat =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\t\t\t\t\t\t\t<DevInfo Action=\"Set\">"
    "\t\t\t\t\t\t\t   <Subsystem Name=\"TW_Client\">"
    "                        \t\t   <Group Name=\"Ready-to-Work\">"
    "\t\t\t                        <Field Name=\"State\">%d</Field>"
    "\t\t\t                        <Field Name=\"Reason\">%.*s</Field>"
    "                        \t\t   </Group>"
    "                           \t   </Subsystem>"
    "\t\t\t\t\t\t\t   </DevInfo>";

constexpr std::size_t kStatusFrame = std::string_view(kStatusFormat).size() - 6;
static_assert(kStatusFrame == 373, "besides state and reason");
static_assert(kStatusFrame + 11 + kMaxReason < kStatusSize, "every state and reason fit");

struct Field {
  const char* name;
  const char* value;
};

bool AddField(xml::XmlCursor group, const Field& field) noexcept {
  return group.AddElement("Field", xml::Place::kLastChild) &&
         group.SetAttribute("Name", field.name) != nullptr && group.SetText(field.value) != nullptr;
}

/// Adds a child to the current element and moves to it.
bool AddNamed(xml::XmlCursor& cursor, const char* element, const char* name) noexcept {
  return cursor.AddElement(element, xml::Place::kLastChild) &&
         cursor.SetAttribute("Name", name) != nullptr;
}

/// Makes all but the fields. @return false when there is no memory.
bool MakeFrame(xml::XmlDocument& document, xml::XmlCursor& cursor) noexcept {
  return document.NewDocument("DevInfo") != nullptr && cursor.Attach(&document) &&
         cursor.SetAttribute("Action", "Notify") != nullptr &&
         AddNamed(cursor, "Subsystem", "TW_EVENT_DB") && AddNamed(cursor, "Group", "errorLogMsg");
}

/// KEPT ODDITY: without a time the field has another name, not only another value.
Field TimeField(const char* timestamp) noexcept {
  if (timestamp[0] == '\0') return {"timestamp", "0"};
  return {"timestampString", timestamp};
}

}  // namespace

std::size_t FormatStatus(char (&out)[kStatusSize], int state, const char* reason) noexcept {
  return base::Format(out, kStatusSize, kStatusFormat, state, kMaxReason, reason);
}

base::FixedText<33> EventTimestamp(const SYSTEMTIME& time) noexcept {
  char text[48];
  // KEPT ODDITY: a colon stands between date and time, too.
  base::Format(text, sizeof text, "%04d/%02d/%02d:%02d:%02d:%02d", time.wYear, time.wMonth,
               time.wDay, time.wHour, time.wMinute, time.wSecond);
  base::FixedText<33> timestamp;
  if (!timestamp.Assign(text)) timestamp.Clear();
  return timestamp;
}

const char* WriteEvent(xml::XmlDocument& document, const DeviceEvent& event,
                       std::uint32_t* length) noexcept {
  char code[12];
  base::Format(code, sizeof code, "%u", event.code);
  const Field fields[] = {TimeField(event.timestamp),
                          {"system", "20"},
                          {"subsystem", "TW_UPGD_SRVR"},
                          {"uniqueId", event.unique_id},
                          {"msgNum", code},
                          {"fcnName", "SendDeviceEvent"},
                          {"severity", "3"},
                          {"lineNum", "1"},
                          {"optArgArrayElement", event.text},
                          {"systemRc", "0"}};
  xml::XmlCursor group;
  if (!MakeFrame(document, group)) return nullptr;
  for (const Field& field : fields) {
    if (!AddField(group, field)) return nullptr;
  }
  return xml::Serialize(document, length);
}

}  // namespace report

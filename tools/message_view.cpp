#include "tools/message_view.h"

#include <charconv>
#include <cstdint>
#include <optional>
#include <pugixml.hpp>

namespace tools {
namespace {

constexpr const char* kStatusMark = "<Subsystem Name=\"TW_Client\">";
constexpr const char* kEventMark = "<Subsystem Name=\"TW_EVENT_DB\">";

/// Between `begin` and `end`, nothing when one of them is missing. A status' reason is not escaped
/// and may hold anything, so no parser reads it: its end is searched from the document's.
std::optional<std::string> Between(const std::string& text, const std::string& begin,
                                   const std::string& end) {
  const std::size_t from = text.find(begin);
  const std::size_t to = text.rfind(end);
  if (from == std::string::npos || to == std::string::npos) return std::nullopt;
  const std::size_t start = from + begin.size();
  return to < start ? std::nullopt : std::optional(text.substr(start, to - start));
}

struct Status {
  std::string state;
  std::string reason;
};

std::optional<Status> ReadStatus(const std::string& document) {
  if (document.find(kStatusMark) == std::string::npos) return std::nullopt;
  const auto fields = Between(document, "<Field Name=\"State\">", "</Field>");
  if (!fields) return std::nullopt;
  const auto reason = Between(*fields, "<Field Name=\"Reason\">", "");
  if (!reason) return std::nullopt;
  return Status{fields->substr(0, fields->find('<')), *reason};
}

std::optional<pugi::xml_document> ReadEvent(const std::string& document) {
  if (document.find(kEventMark) == std::string::npos) return std::nullopt;
  pugi::xml_document parsed;
  // A detail is what the job says, to the last blank and line end.
  constexpr unsigned kAsItStands =
      (pugi::parse_default | pugi::parse_ws_pcdata_single) & ~pugi::parse_eol;
  if (!parsed.load_string(document.c_str(), kAsItStands)) return std::nullopt;
  return parsed;
}

std::string FieldOf(const pugi::xml_document& event, const char* name) {
  const pugi::xml_node group = event.child("DevInfo").child("Subsystem").child("Group");
  return group.find_child_by_attribute("Field", "Name", name).text().get();
}

/// 0 for what is no number.
template <typename Number>
Number NumberIn(const std::string& text) {
  Number number = 0;
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

}  // namespace

std::string DescribeMessage(const Message& message) {
  if (const auto status = ReadStatus(message.document)) {
    return "status " + status->state + " to " + message.to + ": " + status->reason;
  }
  if (const auto event = ReadEvent(message.document)) {
    const std::string detail = FieldOf(*event, "optArgArrayElement");
    return "event " + FieldOf(*event, "msgNum") + " to " + message.to +
           (detail.empty() ? "" : ": " + detail);
  }
  return "message to " + message.to + ": " + message.document;
}

nlohmann::ordered_json MessageMembers(const Message& message) {
  nlohmann::ordered_json members{{"kind", "other"}, {"to", message.to}};
  if (const auto status = ReadStatus(message.document)) {
    members["kind"] = "status";
    members["state"] = NumberIn<std::int32_t>(status->state);
    members["reason"] = status->reason;
  } else if (const auto event = ReadEvent(message.document)) {
    members["kind"] = "device-event";
    members["code"] = NumberIn<std::uint32_t>(FieldOf(*event, "msgNum"));
    members["time"] = FieldOf(*event, "timestampString");
    members["unique_id"] = FieldOf(*event, "uniqueId");
    members["detail"] = FieldOf(*event, "optArgArrayElement");
  }
  return members;
}

bool IsFailure(const Message& message) {
  constexpr std::uint32_t kUpgradeFailed = 205180;
  const auto event = ReadEvent(message.document);
  return event && NumberIn<std::uint32_t>(FieldOf(*event, "msgNum")) == kUpgradeFailed;
}

}  // namespace tools

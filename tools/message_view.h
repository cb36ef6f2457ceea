// The messages of an upgrade to its management system, read for people and for JSON.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

namespace tools {

/// One message as it was delivered.
struct Message {
  std::string to;        ///< "host", or the receiver at the message queue: NAME or NAME@MASTER
  std::string document;  ///< as it stands
};

/// "status 4 to TW_CLIENT: Device Upgrading", "event 205181 to TW_Event_DB@~MASTERKX"; any other
/// document as it stands.
[[nodiscard]] std::string DescribeMessage(const Message& message);

/// The members that an event "document" has besides its text: "kind" ("status", "device-event" or
/// "other"), "to", and of a status "state" and "reason", of a device event "code", "time",
/// "unique_id" and "detail".
[[nodiscard]] nlohmann::ordered_json MessageMembers(const Message& message);

/// Whether it is the device event of a failed upgrade.
[[nodiscard]] bool IsFailure(const Message& message);

}  // namespace tools

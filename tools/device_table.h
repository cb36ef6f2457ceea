// The devices of a server, as JSON and as a table for people.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

#include "server/ledger.h"

namespace tools {

/// All that a ledger knows of one device.
[[nodiscard]] nlohmann::ordered_json ToJson(const server::DeviceRecord& device);

/// One event as one object; `start` is the moment that counts as 0 seconds.
[[nodiscard]] nlohmann::ordered_json ToJson(const server::Event& event, server::Time start);

/// One event as one line for people.
[[nodiscard]] std::string ToLine(const server::Event& event, server::Time start);

/// A table with a head line and a line a device, `rows` devices at most: those seen last.
[[nodiscard]] std::string FormatTable(const server::DeviceLedger& ledger, std::size_t rows);

/// "40.0 MiB", "512 B": at most four digits.
[[nodiscard]] std::string FormatBytes(std::uint64_t bytes);

}  // namespace tools

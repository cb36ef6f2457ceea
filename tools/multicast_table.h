// A multicast run as JSON, as lines and as a table for people.
#pragma once

#include <cstdint>
#include <nlohmann/json.hpp>
#include <string>

#include "server/multicast_figures.h"
#include "server/multicast_options.h"

namespace tools {

/// All that is known of a run: each of its files with each of its devices.
[[nodiscard]] nlohmann::ordered_json ToJson(const server::MulticastFigures& figures);

/// One event as one object; `start` is the moment that counts as 0 seconds.
[[nodiscard]] nlohmann::ordered_json ToJson(const server::MulticastEvent& event,
                                            server::Micros start);
/// One event as one line for people.
[[nodiscard]] std::string ToLine(const server::MulticastEvent& event, server::Micros start);

/// What a run looks like now: the file under way, how far it is, and its devices, `rows` of them at
/// most, those that are not settled first.
/// @param sessions  files of all rounds
/// @param measured  bits per second on the wire
[[nodiscard]] std::string FormatMulticast(const server::MulticastFigures& figures,
                                          std::size_t sessions, std::uint64_t measured,
                                          std::size_t rows);

/// How far the file under way is; null, or an empty line, when no blocks are sent.
[[nodiscard]] nlohmann::ordered_json MulticastProgressJson(const server::MulticastFigures& figures,
                                                           std::uint64_t measured);
[[nodiscard]] std::string MulticastProgressLine(const server::MulticastFigures& figures,
                                                std::uint64_t measured);

/// How it ended: a line a file, and a line for each device that has not proved that it has all.
[[nodiscard]] std::string FormatMulticastReport(const server::MulticastFigures& figures);

/// "10M", "1.5G", "800k", "64000": bits per second; 0 is no limit. Throws Failure kUsage, also for
/// a rate at which devices would give up.
[[nodiscard]] std::uint64_t ParseRate(const std::string& text);
/// "10.0 Mbit/s", "no limit" for 0
[[nodiscard]] std::string FormatRate(std::uint64_t bits_per_second);

/// Bits per second of a growing number of bytes, over about the last second.
class RateMeter {
 public:
  void See(std::uint64_t bytes, server::Micros now);
  [[nodiscard]] std::uint64_t bits_per_second() const { return rate_; }

 private:
  std::uint64_t bytes_ = 0;
  server::Micros when_{0};
  std::uint64_t rate_ = 0;
};

}  // namespace tools

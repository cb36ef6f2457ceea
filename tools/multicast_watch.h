// What a device's multicast client does, read from the frames that it sends and receives.
#pragma once

#include <cstdint>
#include <mutex>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "mcftp/cipher/blowfish.h"
#include "mcftp/wire/frames.h"
#include "net/socket.h"

namespace tools {

enum class ReceptionStep : std::uint8_t {
  kAnnounced,  ///< a file is offered for the first time
  kRequested,  ///< the device wants it
  kRole,       ///< the server gave the device another role
  kReceived,   ///< the device has said that it has every block
  kRefused,    ///< it has told the server of an error
};

/// Where the file is that a device receives.
struct Reception {
  std::string file;   ///< its path on the device; empty: none yet
  std::string masks;  ///< of the devices that it is for
  std::uint32_t size = 0;
  std::uint32_t blocks = 0;  ///< of the whole file
  std::uint32_t held = 0;    ///< blocks that have come, each counted once
  std::uint64_t twice = 0;   ///< blocks that came although they were there
  mcftp::Role role = mcftp::Role::kPassive;
  bool under_way = false;  ///< blocks may come
  /// A character for every part of the file, the same for all parts: "." nothing of it is there,
  /// "-" less than half, "+" more, "#" all.
  std::string map;
};

struct ReceptionEvent {
  ReceptionStep step{};
  Reception reception;
  std::string detail;  ///< of kRefused
};

/// All files that came whole.
struct ReceptionTotals {
  std::uint32_t files = 0;
  std::uint64_t blocks = 0;
  std::uint64_t twice = 0;
};

/// Follows a device's datagrams from beside, so that nothing in the device has to tell of itself.
/// Whatever is no frame of a client or of a server is passed over. Any thread.
class MulticastWatch {
 public:
  MulticastWatch();

  /// One datagram of the device, in the order in which its programs send and receive.
  void See(const sim::SeenDatagram& datagram);

  /// What has happened since the last call.
  [[nodiscard]] std::vector<ReceptionEvent> TakeEvents();
  [[nodiscard]] Reception reception() const;
  [[nodiscard]] ReceptionTotals totals() const;

 private:
  void Sent(const mcftp::Header& header);
  void Received(const mcftp::Header& header);
  void OnAnnouncement();
  void OnRequest();
  void OnRole(const mcftp::Header& header);
  void OnBlock();
  void OnWhole(std::uint32_t block);
  void Note(ReceptionStep step, std::string detail = {});
  [[nodiscard]] Reception Now() const;

  mutable std::mutex mutex_;
  const mcftp::Blowfish cipher_;
  std::vector<std::uint8_t> frame_;  ///< the datagram, deciphered
  Reception offered_;                ///< as announced last
  std::uint16_t offered_block_size_ = 0;
  Reception state_;
  std::uint16_t block_size_ = 0;
  std::vector<bool> has_;
  ReceptionTotals totals_;
  std::vector<ReceptionEvent> events_;
};

/// "passive", "ack master", "nak master"
[[nodiscard]] const char* NameOf(mcftp::Role role);
/// "announced", "requested", "role", "received", "refused"
[[nodiscard]] const char* NameOf(ReceptionStep step);

[[nodiscard]] nlohmann::ordered_json ToJson(const ReceptionEvent& event);
/// One line for people.
[[nodiscard]] std::string ToLine(const ReceptionEvent& event);
/// "ack master [####+...] 120/200"
[[nodiscard]] std::string FormatBlocks(const Reception& state);

}  // namespace tools

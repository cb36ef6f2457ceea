// What is about to be sent.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <vector>

#include "mcftp/cipher/blowfish.h"
#include "mcftp/wire/frames.h"
#include "server/multicast_run.h"
#include "server/peer.h"

namespace server {

/// Encodes frames, enciphers them when the run does, and keeps those that were not asked for one by
/// one. Holds at most kMaxQueued frames; what comes on top is dropped, as a network might do it.
class Outbox {
 public:
  static constexpr std::size_t kMaxQueued = 65536;

  enum class Kind : std::uint8_t { kAnnouncement, kControl, kData };

  explicit Outbox(bool encrypt);

  void Announce(const Peer& to, const mcftp::Announcement& announcement);
  void GiveRole(const Peer& to, mcftp::Role role, const Peer& private_group);
  void SendError(const Peer& to, std::uint16_t code);

  /// The oldest frame that was put here; null when there is none. Valid until the next call of this
  /// or MakeData.
  [[nodiscard]] const Outgoing* Next();
  [[nodiscard]] bool empty() const { return queue_.empty(); }
  /// Of the frame that Next or MakeData has just given.
  [[nodiscard]] Kind kind() const { return kind_; }

  /// Where the bytes of a block are to be written, before MakeData.
  [[nodiscard]] std::uint8_t* data_place() { return data_.data() + mcftp::kDataOffset; }
  /// Makes a frame of what stands at data_place.
  [[nodiscard]] const Outgoing* MakeData(const Peer& to, std::uint16_t block, std::uint16_t length);

  /// Deciphers a received frame in place when its header says that it is enciphered.
  [[nodiscard]] bool Open(std::uint8_t* frame, std::size_t length) const;

 private:
  struct Waiting {
    Peer to;
    Kind kind;
    std::string bytes;
  };

  void Queue(const Peer& to, Kind kind, std::size_t length);
  [[nodiscard]] std::size_t Seal(std::vector<std::uint8_t>& frame, std::size_t length) const;

  const std::unique_ptr<const mcftp::Blowfish> cipher_;
  const bool encrypt_;
  std::vector<std::uint8_t> data_;     ///< a block's frame; stands until the next one is made
  std::vector<std::uint8_t> control_;  ///< where any other frame is made
  std::deque<Waiting> queue_;
  std::string handed_out_;
  Outgoing outgoing_;
  Kind kind_ = Kind::kControl;
};

}  // namespace server

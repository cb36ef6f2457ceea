// What stands between a multicast session and the ways to bring a file to its devices.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>

#include "mcftp/wire/frames.h"
#include "server/moment.h"
#include "server/multicast/round_trip.h"
#include "server/multicast_figures.h"
#include "server/multicast_options.h"

namespace server {

/// A device that has asked for the file under way.
struct Device {
  explicit Device(DeviceFigures& its_figures) : figures(its_figures) {}

  DeviceFigures& figures;
  mcftp::Role role = mcftp::Role::kPassive;  ///< given last
  Micros joined_at{0};                       ///< its latest request
  Micros first_joined_at{0};                 ///< its first
  Micros spoken_to_at{0};                    ///< the latest frame to it alone
  Micros heard_at{0};                        ///< the latest frame from it
  RoundTrip round_trip;

  /// Every block below this one is known to have arrived. Never falls; 0: nothing is known.
  std::uint32_t position = 0;
  Micros named_at{0};          ///< the latest NAK that named it
  std::uint32_t sends = 0;     ///< of that block, since it was named first
  bool may_have_gaps = false;  ///< was made master in the middle, and has named nothing since
  bool deaf = false;           ///< answers roles, and no blocks
  bool in_group = false;       ///< is being asked what it lacks
  std::uint32_t election = 0;  ///< the latest one in which it was offered the mastership
  /// It has every block but those that are held back for the end.
  bool whole = false;

  // The device is being asked something:
  Micros asked_at{0};
  std::uint32_t tries = 0;     ///< questions since its latest answer
  Micros unanswered_since{0};  ///< the first of them

  // How it is doing with repairs:
  std::uint32_t run = 0;    ///< gaps next to each other that it has named in a row
  std::uint32_t ahead = 0;  ///< blocks up to here have been looked at for it
  std::uint64_t alone = 0;  ///< repairs that went out for it alone
  std::uint32_t gaps = 0;   ///< blocks that it has named

  // The end of the file:
  enum class Closing : std::uint8_t {
    kAsked,      ///< was offered the role in which it acknowledges
    kReady,      ///< has taken it
    kHasGuard,   ///< lacks the last block only
    kUncertain,  ///< was sent the last block
    kLacksLast,  ///< and did not get it
    kClosed,     ///< says that it has closed the file, and is asked whether with every block
  };
  Closing closing = Closing::kAsked;
  bool deferred = false;   ///< it did not answer while others did
  bool has_guard = false;  ///< has acknowledged the block before the last
  bool recalled = false;   ///< known from an earlier server, to which it may have said so

  bool changed = false;  ///< since it was last stored

  [[nodiscard]] bool settled() const { return figures.state != DeviceState::kJoined; }
};

/// What a session does for the way its file is sent.
class TransferDesk {
 public:
  virtual ~TransferDesk() = default;

  [[nodiscard]] virtual const MulticastOptions& options() const = 0;
  [[nodiscard]] virtual std::uint32_t block_count() const = 0;
  [[nodiscard]] virtual std::uint16_t block_size() const = 0;
  /// In the order in which they asked. References stay valid for the session.
  [[nodiscard]] virtual std::deque<Device>& devices() = 0;
  [[nodiscard]] virtual FileFigures& figures() = 0;

  /// Sends an OACK; it goes out before any block that is handed out later.
  virtual void GiveRole(Device& device, mcftp::Role role, Micros now) = 0;
  virtual void SetProven(Device& device, Micros now) = 0;
  /// Makes it passive; it is asked no more.
  virtual void SetDead(Device& device, const std::string& why, Micros now) = 0;
  virtual void SetReleased(Device& device, const std::string& why, Micros now) = 0;
  virtual void SetPhase(FilePhase phase, Micros now) = 0;
  /// Something has changed that a restarted server has to know of the device.
  virtual void Changed(Device& device) = 0;
  virtual void TellMaster(const Device& device, Micros now) = 0;
};

/// A way to bring a file of at least one block to the devices that have asked for it. Frames have
/// been checked; the device is one of the desk's.
class Transfer {
 public:
  Transfer() = default;
  virtual ~Transfer() = default;
  Transfer(const Transfer&) = delete;
  Transfer& operator=(const Transfer&) = delete;

  virtual void Begin(Micros now) = 0;
  /// Goes on where another server has stopped: all blocks below `first_unsent` have gone out, with
  /// `last_sent` the last one too. Devices that were whole are so still.
  virtual void Resume(std::uint32_t first_unsent, bool last_sent, Micros now) = 0;
  /// A device has asked for the first time, or again: then it may have begun anew and have nothing.
  virtual void OnJoin(Device& device, Micros now) = 0;
  virtual void OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) = 0;
  virtual void OnNak(Device& device, std::uint16_t block, Micros now) = 0;
  /// @param percent_x100  6750 for 67.50 %
  virtual void OnOverrun(Device& device, std::uint16_t percent_x100, std::uint16_t block,
                         Micros now) = 0;
  /// The device has given the file up; it is dead already.
  virtual void OnGivenUp(Device& device, Micros now) = 0;
  /// Another rate is allowed: how fast devices were before says nothing any more.
  virtual void OnRate(Micros /*now*/) {}
  virtual void OnTime(Micros now) = 0;

  /// Whether a block could go out now.
  [[nodiscard]] virtual bool HasBlock(Micros now) = 0;
  /// The number of the block that goes out now. HasBlock has just held.
  virtual std::uint32_t TakeBlock(Micros now) = 0;
  /// Whether devices may still join: not when the file is being closed, nor for ever before that.
  [[nodiscard]] virtual bool takes_devices(Micros now) const = 0;
  [[nodiscard]] virtual std::optional<Micros> deadline(Micros now) = 0;
  [[nodiscard]] virtual bool done() const = 0;
};

/// A block that has gone out so often since a device named it, and is still named, does not reach
/// it.
inline constexpr std::uint32_t kMostSends = 24;
/// Frames of an overrun report: a share in hundredths of a percent.
inline constexpr std::uint16_t kWholePercent = 10000;

/// The earlier of two moments that may not exist.
[[nodiscard]] inline std::optional<Micros> Earlier(std::optional<Micros> a,
                                                   std::optional<Micros> b) {
  if (!a) return b;
  if (!b) return a;
  return *a < *b ? a : b;
}

}  // namespace server

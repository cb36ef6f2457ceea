// How a multicast run behaves.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>

#include "server/moment.h"
#include "server/peer.h"

namespace server {

/// When the announcing of a file ends and its blocks begin to flow.
///
/// With `expected` set: as soon as so many devices have asked (from the second file of a round on:
/// as many as are known and alive, whatever `expected` says). Without: when `announce_max` copies
/// have gone out, or `announce_min` copies and no new device asked during the last interval.
/// In both cases not before `minimum` devices have asked, until `longest_wait` has passed; then
/// with whoever is there. A file nobody asked for is given up at that point.
struct StartPolicy {
  std::uint32_t expected = 0;  ///< devices; 0: not known
  std::uint32_t minimum = 0;   ///< devices
  Micros longest_wait{0};      ///< from a file's first announcement; 0: announce_max decides
};

struct MulticastOptions {
  // ---- where ----

  /// Where files are announced. The private groups have the same port: a client listens on one.
  Peer public_group{0xEF010101, 7000};
  /// Where blocks go, the same for every file of a run.
  std::uint32_t private_group = 0xEF010102;

  // ---- announcing ----

  Micros announce_interval = std::chrono::milliseconds(2000);  ///< longer than oack_wait
  std::uint32_t announce_min = 3;                              ///< copies
  std::uint32_t announce_max = 10;
  /// What clients are told to wait for the answer to a request. Never 0, which would be for ever.
  Micros oack_wait = std::chrono::milliseconds(1000);
  StartPolicy start;
  /// Passes over the list of files. Each ends with the last-file flag, on which every device that
  /// took part goes; the next one is for those that came later, and nobody else is left to hear it.
  std::uint32_t rounds = 1;

  // ---- blocks ----

  /// Bytes; raised for files of more than 65,535 blocks. 1,400 and its headers fit one Ethernet
  /// frame, enciphered or not.
  std::uint16_t block_size = 1400;
  std::uint8_t step_percent = 5;  ///< how often clients report their progress; 0: do not
  std::uint16_t step_kib = 0;
  bool encrypt = false;

  // ---- pace ----

  /// Blocks in flight at most. 1 is lock-step: one block, its acknowledgement, the next block, and
  /// one device polled after the other. More is a window that adapts itself below this limit.
  std::uint32_t window = 64;
  /// Bits per second on the wire, headers included; 0: as fast as the devices take it.
  std::uint64_t rate = 0;

  // ---- patience ----

  Micros ack_wait = std::chrono::milliseconds(500);  ///< before a round trip has been measured
  Micros ack_wait_min = std::chrono::milliseconds(200);
  Micros ack_wait_max = std::chrono::milliseconds(2000);
  std::uint32_t ack_tries = 10;
  Micros elect_wait = std::chrono::milliseconds(500);
  std::uint32_t elect_tries = 5;
  Micros nak_wait = std::chrono::milliseconds(500);
  std::uint32_t nak_tries = 5;
  /// A device that answers nothing for so long, though it was asked again and again, is dead. A
  /// roaming device is deaf for seconds. Lock-step counts tries instead.
  Micros silence_limit = std::chrono::seconds(10);
  /// Waiting devices hear something at least so often: they give up after 32 s.
  Micros keepalive = std::chrono::seconds(10);
  Micros linger = std::chrono::milliseconds(500);  ///< between two files
  /// A device that needs more repairs for itself alone than this share of the file is left to HTTP,
  double release_share = 1.25;
  /// ... or so long, when it is the last one that is repaired.
  Micros release_after = std::chrono::seconds(60);

  // ---- bounds ----

  std::size_t max_devices = 16384;  ///< kept apart; requests of others are not answered
  std::uint32_t poll_group = 32;    ///< devices that say what they miss at one time

  // ---- memory ----

  /// Where the run's state is kept, so that a server started again goes on; empty: nowhere.
  std::filesystem::path session_file;
  /// The transfer identifier of the first file, counted up from there; 0: chosen at random for
  /// each, as it should be wherever frames of an earlier run may still be about.
  std::uint32_t first_transfer_id = 0;
  /// Decides what is random; 0: taken from the system.
  std::uint64_t seed = 0;
};

}  // namespace server

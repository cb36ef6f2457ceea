// Many devices and one multicast server in a virtual world: the product's own client on each
// device, the server's own engine, and a network between them that loses what it is told to.
//
//   fleet::Plan plan;
//   plan.devices = 20;
//   plan.link.loss = 0.05;
//   plan.files = {{"\\Temp\\a.bin", "", fleet::Noise(60000, plan.seed)}};
//   const fleet::Outcome outcome = fleet::Run(plan);
//
// Equal plans have equal outcomes.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "net/virtual/frame.h"
#include "net/virtual/link.h"
#include "server/multicast_figures.h"
#include "server/multicast_options.h"

namespace fleet {

/// What is sent, and where each device is to have it.
struct File {
  std::string device_path;
  std::string masks;  ///< as in an announcement; empty: for all
  std::string content;
};

/// A device that hears nothing and is not heard.
struct Absence {
  std::uint32_t device = 0;  ///< from 0
  sim::Micros begin{0};      ///< after the first block of the first file
  sim::Micros length{0};     ///< 0: for ever, it has died
};

struct Plan {
  std::uint32_t devices = 20;
  std::uint64_t seed = 1;
  std::vector<File> files;
  /// Between server and devices, both ways. Frames of a link without a rate would all arrive at
  /// once, and few of them find room.
  sim::LinkProfile link = DefaultLink();
  std::vector<Absence> absences;
  /// `expected` and `seed` are set by Run when they are 0.
  server::MulticastOptions server;
  std::string configuration =
      "TQ52-A1";              ///< of every device; its first four characters are its MCT
  bool light_threads = true;  ///< false: threads of the host, for few devices
  bool capture = false;       ///< keep all frames
  /// In the world's time; devices that have not ended by then are given up.
  std::chrono::seconds limit{7200};

  /// 100 Mbit/s, half a millisecond away.
  static sim::LinkProfile DefaultLink();
};

/// What became of a file on a device.
enum class FileFate : std::uint8_t { kRight, kWrong, kMissing };

struct DeviceOutcome {
  sim::Address address = 0;
  bool absent_for_ever = false;
  bool ended = false;       ///< the client has come to its end
  std::int32_t result = 0;  ///< of its start entry
  sim::Micros ended_at{0};
  std::vector<FileFate> files;  ///< as in the plan
};

struct Outcome {
  server::MulticastFigures figures;  ///< as the server has them
  std::vector<DeviceOutcome> devices;
  bool run_finished = false;  ///< the server came to its end
  sim::Micros run_began{0};   ///< the server's start
  sim::Micros run_ended{0};
  std::vector<sim::Frame> frames;  ///< when asked for

  /// Every device that was not absent for ever holds every file that is meant for it.
  [[nodiscard]] bool all_right() const;
  /// Files that are as in `fate`, over all devices.
  [[nodiscard]] std::size_t Count(FileFate fate) const;
};

/// Runs the plan to its end, in a folder of its own that is gone afterwards. Throws
/// std::invalid_argument for a plan that cannot be, std::runtime_error when the host refuses.
[[nodiscard]] Outcome Run(const Plan& plan);

/// Bytes without a pattern; equal for equal arguments.
[[nodiscard]] std::string Noise(std::size_t size, std::uint64_t seed);

/// Blocks that must be sent for each block of a file until each of `devices` has it, when every
/// frame is lost with probability `loss` on the way to each: what no server can do better than.
[[nodiscard]] double IdealFrames(std::uint32_t devices, double loss);

}  // namespace fleet

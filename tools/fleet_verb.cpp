#include <sys/resource.h>

#include <chrono>
#include <cstdio>
#include <iostream>
#include <memory>
#include <nlohmann/json.hpp>
#include <stdexcept>
#include <string>

#include "server/capture.h"
#include "tools/cli.h"
#include "tools/failure.h"
#include "tools/fleet/fleet.h"
#include "tools/fleet/fleet_report.h"

namespace tools {
namespace {

constexpr char kFileOnDevice[] = "\\Temp\\fleet.bin";
/// Host files that a device of a fleet keeps open, with room to spare.
constexpr rlim_t kFilesPerDevice = 12;

struct FleetOptions {
  fleet::Plan plan;
  std::uint32_t size = 1024 * 1024;
  double link_mbit = 100;
  double rate_mbit = 0;
  std::uint32_t delay_us = 500;
  std::uint32_t die = 0;
  std::uint32_t roam = 0;
  std::uint32_t seeds = 1;
  std::string pcap;
  bool json = false;
};

/// Lets the process open as many files as the fleet needs.
void RaiseFileLimit(std::uint32_t devices) {
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  const rlim_t wanted = 256 + kFilesPerDevice * devices;
  if (limit.rlim_cur >= wanted) return;
  if (limit.rlim_max < wanted) {
    throw Failure(ExitCode::kUsage, "--devices",
                  "so many devices need " + std::to_string(wanted) + " open files, the limit is " +
                      std::to_string(limit.rlim_max),
                  "raise it with ulimit -Hn, or take fewer devices");
  }
  limit.rlim_cur = wanted;
  setrlimit(RLIMIT_NOFILE, &limit);
}

/// The last devices die, those before them are away for three seconds, one after the other.
void AddAbsences(const FleetOptions& options, fleet::Plan& plan) {
  constexpr auto kStep = std::chrono::milliseconds(100);
  constexpr auto kRoaming = std::chrono::seconds(3);
  for (std::uint32_t i = 0; i < options.die + options.roam; ++i) {
    const bool dies = i < options.die;
    plan.absences.push_back(
        {plan.devices - 1 - i, kStep * (i + 1), dies ? sim::Micros{0} : sim::Micros{kRoaming}});
  }
}

fleet::Plan PlanOf(const FleetOptions& options, std::uint64_t seed) {
  fleet::Plan plan = options.plan;
  if (options.die + options.roam > plan.devices) {
    throw Failure(ExitCode::kUsage, "--die, --roam", "more devices than there are",
                  "raise --devices");
  }
  plan.seed = seed;
  plan.capture = !options.pcap.empty();
  plan.link.bytes_per_second = static_cast<std::uint64_t>(options.link_mbit * 125000);
  plan.link.delay = sim::Micros(options.delay_us);
  plan.server.rate = static_cast<std::uint64_t>(options.rate_mbit * 1e6);
  plan.files = {{kFileOnDevice, "", fleet::Noise(options.size, seed)}};
  AddAbsences(options, plan);
  return plan;
}

/// Each frame once, as it was sent, whoever received it.
void WriteCapture(const std::string& file, const fleet::Outcome& outcome) {
  try {
    server::CaptureFile capture(file);
    for (const sim::Frame& frame : outcome.frames) {
      if (frame.kind != sim::FrameKind::kDatagram) continue;
      capture.Add(frame.when, {frame.from.address, frame.from.port},
                  {frame.to.address, frame.to.port}, frame.bytes);
    }
    capture.Flush();
    if (capture.good()) return;
  } catch (const std::runtime_error& error) {
    throw Failure(ExitCode::kCannotWrite, file, error.what());
  }
  throw Failure(ExitCode::kCannotWrite, file, "not all of it could be written", "make room");
}

/// @return whether every device has what it should.
bool RunOne(const FleetOptions& options, std::uint64_t seed) {
  using Clock = std::chrono::steady_clock;
  const fleet::Plan plan = PlanOf(options, seed);
  const Clock::time_point began = Clock::now();
  const fleet::Outcome outcome = fleet::Run(plan);
  const std::chrono::duration<double> took = Clock::now() - began;
  if (plan.capture) WriteCapture(options.pcap, outcome);
  if (options.json) {
    std::cout << fleet::JsonReport(plan, outcome).dump() << std::endl;
  } else if (options.seeds == 1 || !outcome.all_right()) {
    std::cout << fleet::TextReport(plan, outcome);
    std::printf("real time  %.1f s\n", took.count());
  }
  return outcome.all_right();
}

ExitCode RunFleet(const FleetOptions& options) {
  RaiseFileLimit(options.plan.devices);
  std::uint32_t right = 0;
  for (std::uint32_t i = 0; i < options.seeds; ++i) right += RunOne(options, options.plan.seed + i);
  if (options.seeds > 1 && !options.json) {
    std::cout << right << " of " << options.seeds << " seeds: every device has its file\n";
  }
  return right == options.seeds ? ExitCode::kOk : ExitCode::kFilesWrong;
}

void AddNetworkOptions(CLI::App& verb, FleetOptions& options) {
  sim::LinkProfile& link = options.plan.link;
  const CLI::Range probability(0.0, 1.0);
  verb.add_option("--loss", link.loss, "share of the frames that a link loses, 0 to 1")
      ->capture_default_str()
      ->check(probability);
  verb.add_option("--burst-begin", link.burst_begin, "chance that a frame begins a burst of losses")
      ->check(probability);
  verb.add_option("--burst-end", link.burst_end, "chance that a frame of a burst ends it")
      ->check(probability);
  verb.add_option("--burst-loss", link.burst_loss, "share of frames lost in a burst (default: all)")
      ->check(probability);
  verb.add_option("--duplicate", link.duplicate, "share of frames that arrive twice")
      ->check(probability);
  verb.add_option("--reorder", link.reorder, "share of frames that later ones overtake")
      ->check(probability);
  verb.add_option("--link", options.link_mbit,
                  "megabits a second of each device's link; 0: no limit")
      ->capture_default_str();
  verb.add_option("--delay", options.delay_us, "microseconds one way")->capture_default_str();
}

}  // namespace

void AddFleetVerb(CLI::App& app, Action& action) {
  CLI::App* verb = app.add_subcommand(
      "fleet", "Send a file to many simulated devices, with real clients and the real server");
  auto options = std::make_shared<FleetOptions>();
  verb->add_option("--devices", options->plan.devices, "how many")->capture_default_str();
  verb->add_option("--seed", options->plan.seed, "equal seeds give equal runs")
      ->capture_default_str();
  verb->add_option("--seeds", options->seeds, "runs with so many seeds, from --seed on")
      ->capture_default_str();
  verb->add_option("--size", options->size, "bytes of the file")->capture_default_str();
  AddNetworkOptions(*verb, *options);
  verb->add_option("--rate", options->rate_mbit,
                   "megabits a second that the server may send; 0: all")
      ->capture_default_str();
  verb->add_option("--window", options->plan.server.window, "blocks in flight at most")
      ->capture_default_str();
  verb->add_flag("--encrypt", options->plan.server.encrypt, "encipher every frame");
  verb->add_option("--die", options->die, "so many devices die soon after the first block");
  verb->add_option("--roam", options->roam, "so many devices are away for three seconds");
  verb->add_option("--pcap", options->pcap, "write every datagram to this file; of the last run");
  AddJsonOption(*verb, options->json, "print one JSON object a run; equal runs print equal bytes");
  verb->footer("Example:\n  orvenix fleet --devices 1000 --loss 0.02 --size 10485760 --seed 7");
  verb->callback([options, &action] { action = [options] { return RunFleet(*options); }; });
}

}  // namespace tools

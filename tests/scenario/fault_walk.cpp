#include "scenario/fault_walk.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string_view>
#include <unordered_set>
#include <utility>

#include "device/flash/ram_file.h"
#include "driver/drivers.h"
#include "faults/faults.h"
#include "http/job_client.h"
#include "memory/memory.h"
#include "support/own_process.h"
#include "upgrade/run_state/run_state.h"

namespace test {
namespace {

/// Far more than a job takes whose every wait runs into its limit, in seconds.
constexpr std::uint32_t kLimit = 900;

/// Of the calls from places that a plain run has tried already, every so many is tried as well.
constexpr std::uint64_t kSampleStep = 61;

using Numbers = std::vector<std::uint64_t>;

/// Most of a run's time would go into painting, which is the simulator's.
sim::Profile WithSmallScreen(sim::Profile profile) {
  profile.screen_width = 24;
  profile.screen_height = 32;
  return profile;
}

bool WalksAll() {
  const char* const wanted = std::getenv("ORVENIX_WALK");
  return wanted != nullptr && std::string_view(wanted) == "all";
}

/// Makes the run without a failure. @return the places of its calls.
Numbers Survey(Walk::Maker make) {
  const TemporaryFolder folder;
  const auto file = folder.path() / "places";
  EXPECT_TRUE(InOwnProcess([make, &file] {
    const std::unique_ptr<Walk> walk = make();
    walk->Run(0);
    walk->Check();
    std::ofstream out(file);
    for (const std::uint64_t place : walk->places()) out << place << '\n';
  })) << "the run without a failure";
  std::ifstream in(file);
  return {std::istream_iterator<std::uint64_t>(in), {}};
}

bool Try(Walk::Maker make, std::uint64_t nth) {
  return InOwnProcess([make, nth] {
    const std::unique_ptr<Walk> walk = make();
    walk->Run(nth);
    SCOPED_TRACE("call " + std::to_string(nth) + " failed: " + walk->call());
    EXPECT_NE(walk->call(), "") << "the run makes other calls than the one before it";
    walk->Check();
  });
}

}  // namespace

Walk::Walk(sim::Profile profile)
    : world_(sim::World::MakeVirtual(1, sim::ThreadKind::kLight)),
      device_(std::make_unique<sim::Device>(*world_, WithSmallScreen(std::move(profile)),
                                            folder_.path() / "device")),
      host_(std::make_unique<sim::AttachedThread>(*device_, "host")),
      server_(std::make_unique<UpgradeServer>(*world_)) {}

Walk::~Walk() {
  server_.reset();
  host_.reset();
  device_.reset();
}

void Walk::Run(std::uint64_t nth) {
  before_ = HoldingsOf(*device_);
  PrepareJob();
  if (nth == 0) {
    device_->faults().NotePlaces();
  } else {
    device_->faults().Add({"*", nth, 1, 0});
  }
  RunJob();
  ended_ = AwaitEndOfJobs(*device_, kLimit);
  call_ = device_->faults().last_fired();
  places_ = device_->faults().places();
  device_->faults().Clear();
}

bool Walk::release_failed() const {
  return IsRelease(call_);
}

std::string Walk::Flashed(const std::string& name) const {
  std::ifstream file(device_->folder() / "flash" / name, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

void Walk::Check() {
  EXPECT_EQ(device_->memory().bad_frees(), 0U);
  if (!release_failed()) CheckHoldings();
  CheckResult();
}

void Walk::CheckHoldings() {
  EXPECT_TRUE(ended_) << "a thread hangs";
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_EQ(http::JobClient(), nullptr);
  DropKeptJob();
  device::FreeRAMStore();
  // A driver whose handle could not be kept or read stays loaded.
  const std::vector<std::string> drivers = device_->drivers().Names();
  if (std::find(drivers.begin(), drivers.end(), "EFL1:") != drivers.end()) {
    EXPECT_TRUE(call_ == "RegSetValueExW" || call_ == "RegQueryValueExW") << call_;
    ++before_.handles;
  }
  Holdings after = HoldingsOf(*device_);
  // The queue's functions are looked for once; without lapi_close the connection stays open.
  if (call_ == "GetProcAddressW") after.queue_connections = before_.queue_connections;
  EXPECT_EQ(after, before_);
}

void Walker::LeaveOut(Walk::Maker other) {
  if (WalksAll()) return;
  const Numbers places = Survey(other);
  left_out_.insert(left_out_.end(), places.begin(), places.end());
}

/// @return the numbers of the calls to try, the number of all calls behind them.
Numbers Walker::Choose() const {
  const Numbers places = Survey(make_);
  std::unordered_set<std::uint64_t> known(left_out_.begin(), left_out_.end());
  Numbers chosen;
  for (std::uint64_t i = 0; i < places.size(); ++i) {
    const bool is_new = known.insert(places[i]).second;
    if (is_new || i % kSampleStep == 0 || WalksAll()) chosen.push_back(i + 1);
  }
  chosen.push_back(places.size());
  return chosen;
}

void Walker::Go(std::size_t first, std::size_t step) {
  Numbers chosen = Choose();
  const std::uint64_t all = chosen.back();
  chosen.pop_back();
  // Collected first: a process inherits the failures that were noted before it began.
  Numbers failed;
  for (std::size_t i = first; i < chosen.size(); i += step) {
    if (!Try(make_, chosen[i])) failed.push_back(chosen[i]);
  }
  EXPECT_THAT(failed, ::testing::IsEmpty());
  std::cout << "tried " << chosen.size() << " of " << all << " calls, in " << step << " parts";
  if (!WalksAll()) {
    std::cout << ": the first from each place of the program and some of the others; all of them "
                 "with ORVENIX_WALK=all in the environment";
  }
  std::cout << '\n';
}

}  // namespace test

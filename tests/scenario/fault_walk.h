// Walks: a job in which every call of the API that can fail does so, one call a run.
//
// A job makes thousands of calls, and most of them from places of the program that have made the
// same call before: every line of the log, every block of a file. A plain run of the tests lets the
// first call of each place fail, and some of the others; ORVENIX_WALK=all lets each fail.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "device/device.h"
#include "product_support/host.h"
#include "product_support/upgrade_server.h"
#include "support/device_test.h"
#include "world/world.h"

namespace test {

/// One run of a job on a fresh device of a fresh world. Derived classes say what the job is and
/// what it must have come to.
class Walk {
 public:
  using Maker = std::unique_ptr<Walk> (*)();

  virtual ~Walk();
  Walk(const Walk&) = delete;
  Walk& operator=(const Walk&) = delete;

  /// @param nth  which of the calls that can fail does so, from 1 on; 0: none
  void Run(std::uint64_t nth);
  /// Whatever has failed: the program must not have hung, must keep nothing, and the job's own
  /// conditions hold.
  void Check();
  /// The call that failed, empty when none did.
  [[nodiscard]] const std::string& call() const { return call_; }
  /// Of a run without a failure: the place of each call.
  [[nodiscard]] const std::vector<std::uint64_t>& places() const { return places_; }

 protected:
  explicit Walk(sim::Profile profile = {});

  virtual void PrepareJob() = 0;
  virtual void RunJob() = 0;
  virtual void CheckResult() = 0;

  [[nodiscard]] sim::World& world() { return *world_; }
  [[nodiscard]] sim::Device& device() { return *device_; }
  [[nodiscard]] UpgradeServer& server() { return *server_; }
  [[nodiscard]] bool failed() const { return !call_.empty(); }
  /// A release failed: what it should have given back is kept (a file that cannot be closed stays
  /// open, and is asked for again and again), and no program could do anything about it.
  [[nodiscard]] bool release_failed() const;
  /// What was written into the flash under this name, empty for nothing.
  [[nodiscard]] std::string Flashed(const std::string& name) const;

 private:
  void CheckHoldings();

  TemporaryFolder folder_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  std::unique_ptr<sim::AttachedThread> host_;
  std::unique_ptr<UpgradeServer> server_;
  Holdings before_;
  bool ended_ = false;
  std::string call_;
  std::vector<std::uint64_t> places_;
};

/// Files that come by HTTP: a registry test, a program to end, a folder to empty but for one file,
/// a list file that is not there, a right file, a damaged one.
std::unique_ptr<Walk> MakeFilesWalk();
/// Firmware that comes by HTTP into the flash driver's store, and three loader images.
std::unique_ptr<Walk> MakeFirmwareWalk();
/// The same firmware, when it comes by multicast.
std::unique_ptr<Walk> MakeMulticastWalk();
/// What an outside program starts: packages of two passes, an INF file, and other files.
std::unique_ptr<Walk> MakeClientWalk();

/// Lets the calls of a job fail in turn, each run in a process of its own, so that one which goes
/// wrong spoils no other. A failure names the call; its number is enough to repeat the run.
class Walker {
 public:
  explicit Walker(Walk::Maker make) : make_(make) {}

  /// Leaves out the calls from places from which this job makes calls, too.
  void LeaveOut(Walk::Maker other);
  /// Does every `step`th of the runs to do, from the `first` on, and says how many of how many
  /// calls it has tried.
  void Go(std::size_t first, std::size_t step);

 private:
  [[nodiscard]] std::vector<std::uint64_t> Choose() const;

  Walk::Maker make_;
  std::vector<std::uint64_t> left_out_;  ///< places
};

}  // namespace test

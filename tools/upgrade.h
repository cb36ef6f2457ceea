// What `orvenix run` hands to a device, and what the device must have afterwards.
#pragma once

#include <memory>
#include <string>

#include "tools/file_check.h"
#include "tools/lint/finding.h"
#include "tools/run.h"
#include "tools/run_view.h"

namespace sim {
class Device;
}

namespace tools {

/// A job, on one of the two roads into the library. Outlives the device: its threads use the
/// library to their end.
class Upgrade {
 public:
  virtual ~Upgrade() = default;

  /// What speaks against it.
  [[nodiscard]] virtual Findings Lint() const = 0;
  /// Hands it over on a thread of the device. Throws Failure when the device refuses it.
  virtual void Start(sim::Device& device) = 0;
  /// When the upgrade is over, or was given up.
  virtual void Finish() {}
  /// The files that the device should have now.
  [[nodiscard]] virtual FileCheck Check(sim::Device& device) const = 0;
  /// The server it is for, as "http://127.0.0.2:8080".
  [[nodiscard]] virtual std::string Server() const = 0;
};

/// A job that a management host walks through the configlet, showing each call. Throws Failure
/// kBadInput.
[[nodiscard]] std::unique_ptr<Upgrade> MakeConfigletUpgrade(const RunOptions& options,
                                                            RunView& view);

/// A configuration file that a program of the device loads and starts in upgrade-client mode.
/// Throws Failure kBadInput.
[[nodiscard]] std::unique_ptr<Upgrade> MakeClientUpgrade(const RunOptions& options, RunView& view);

}  // namespace tools

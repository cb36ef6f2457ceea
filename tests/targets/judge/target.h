// The targets of the product, as the management client is started on each.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace targets {

/// A place where the client runs.
class Target {
 public:
  virtual ~Target() = default;

  [[nodiscard]] virtual std::string name() const = 0;
  /// What is missing for it; empty when nothing is.
  [[nodiscard]] virtual std::string WhyNot() const = 0;
  /// To be done once before any run, in the network of this machine. Throws std::runtime_error.
  virtual void Prepare() const {}
  /// Makes `run` ready, whose folder device/storage is the device's root.
  /// @return the client's program and its arguments
  [[nodiscard]] virtual std::vector<std::string> Command(
      const std::filesystem::path& run) const = 0;
  /// Puts everything where the other targets have it.
  virtual void TidyUp(const std::filesystem::path& /*run*/) const {}
};

/// The one that the others are compared with: Linux, with sanitizers.
[[nodiscard]] const Target& LinuxTarget();
/// The device's own binary on the device's processor, emulated.
[[nodiscard]] const Target& DeviceTarget();
/// The library for desktop Windows under Wine.
[[nodiscard]] const Target& WindowsTarget();

}  // namespace targets

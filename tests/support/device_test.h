// The fixture of all tests on a simulated device.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>

#include "device/device.h"
#include "profile/profile.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace test {

/// A folder of its own under the machine's temporary folder, removed with all content at the end.
class TemporaryFolder {
 public:
  TemporaryFolder();
  ~TemporaryFolder();
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;
  [[nodiscard]] const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

/// Runs `program` as a program of `device` on a thread of its own and waits for it.
/// @return its exit code. The caller may be attached to the device's world or to none.
std::uint32_t RunProgram(sim::Device& device, std::function<std::uint32_t()> program,
                         std::string name = "program");

enum class WorldKind { kVirtual, kReal };

/// A fresh device in a fresh folder and a world of its own, a virtual one if not said otherwise,
/// with the test's own thread attached to it: the test is a program of the device. Handles and
/// other leftovers are the test's business.
class DeviceTest : public ::testing::Test {
 protected:
  /// @param profile  what the device is
  /// @param seed  of a virtual world
  explicit DeviceTest(sim::Profile profile = {}, std::uint64_t seed = 1);
  explicit DeviceTest(WorldKind kind, sim::Profile profile = {}, std::uint64_t seed = 1);
  ~DeviceTest() override;

  [[nodiscard]] sim::Device& device() { return *device_; }
  [[nodiscard]] sim::World& world() { return *world_; }
  [[nodiscard]] const std::filesystem::path& folder() const { return folder_.path(); }

  /// The device loses its power and starts again on the same folder, in the same world: threads
  /// and handles are gone, files and registry stay.
  void Restart();

  /// Makes a different device of it, with the same folder.
  void Restart(sim::Profile profile);

 private:
  TemporaryFolder folder_;
  std::unique_ptr<sim::World> world_;
  sim::Profile profile_;
  std::unique_ptr<sim::Device> device_;
  std::unique_ptr<sim::AttachedThread> host_;
};

/// The same in the real world: for sockets and threads as the host has them.
class RealDeviceTest : public DeviceTest {
 protected:
  explicit RealDeviceTest(sim::Profile profile = {});
};

}  // namespace test

// Tests name their fixture without its namespace.
using test::DeviceTest;      // NOLINT(google-global-names-in-headers)
using test::RealDeviceTest;  // NOLINT(google-global-names-in-headers)

// A simulated handheld: what a test or tool holds in hand.
//
//   auto world = sim::World::MakeVirtual(/*seed=*/7);
//   sim::Device device(*world, sim::Profile{}, folder);
//   sim::AttachedThread host(device);     // this thread is now a program of the device
//   HANDLE file = CreateFileW(TEXT("\\a.txt"), ...);
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>

#include "profile/profile.h"

namespace sim {

class World;
class Faults;
class Trace;
class HandleTable;
class Kernel;   // threads and named objects
class Storage;  // files and volumes
class Registry;
class Memory;  // LocalAlloc, and the division between store and program memory
class Power;
class Processes;
class Screen;           // windows and what they show
class Network;          // the device's sockets
class Debug;            // OutputDebugStringW, NKDbgPrintfW
class Libraries;        // what programs load at run time
class Drivers;          // what CreateFileW opens as "EFL1:"
class ManagementQueue;  // where they leave messages for the management system

/// Every part is made with the device and lives as long. `folder` is the device on disk:
/// `storage/` is its file system, `registry.reg` its registry, `device.profile` its profile,
/// `messages/` what it has sent to its message queue, `flash/` what was written into its flash.
class Device {
 public:
  Device(World& world, Profile profile, std::filesystem::path folder);
  /// Ends the device's threads at their next blocking call and saves its registry.
  ~Device();
  Device(const Device&) = delete;
  Device& operator=(const Device&) = delete;

  [[nodiscard]] World& world() const { return world_; }
  [[nodiscard]] const Profile& profile() const { return profile_; }
  [[nodiscard]] const std::filesystem::path& folder() const { return folder_; }
  /// The device's UTC time when a virtual world begins, in the unit of file times.
  [[nodiscard]] std::uint64_t start_ticks() const { return start_ticks_; }
  [[nodiscard]] Faults& faults() const { return *faults_; }
  [[nodiscard]] Trace& trace() const { return *trace_; }
  [[nodiscard]] HandleTable& handles() const { return *handles_; }
  [[nodiscard]] Kernel& kernel() const { return *kernel_; }
  [[nodiscard]] Storage& storage() const { return *storage_; }
  [[nodiscard]] Registry& registry() const { return *registry_; }
  [[nodiscard]] Memory& memory() const { return *memory_; }
  [[nodiscard]] Power& power() const { return *power_; }
  [[nodiscard]] Processes& processes() const { return *processes_; }
  [[nodiscard]] Screen& screen() const { return *screen_; }
  [[nodiscard]] Network& network() const { return *network_; }
  [[nodiscard]] Debug& debug() const { return *debug_; }
  [[nodiscard]] Libraries& libraries() const { return *libraries_; }
  [[nodiscard]] Drivers& drivers() const { return *drivers_; }
  [[nodiscard]] ManagementQueue& messages() const { return *messages_; }

  /// The device of the calling thread; ends the program with `what` when there is none.
  static Device& Current(const char* what);

 private:
  World& world_;
  Profile profile_;
  std::filesystem::path folder_;
  const std::uint64_t start_ticks_;
  std::unique_ptr<Faults> faults_;
  std::unique_ptr<Trace> trace_;
  std::unique_ptr<HandleTable> handles_;
  std::unique_ptr<Debug> debug_;
  std::unique_ptr<Kernel> kernel_;
  std::unique_ptr<Memory> memory_;
  std::unique_ptr<Storage> storage_;
  std::unique_ptr<Registry> registry_;
  std::unique_ptr<Power> power_;
  std::unique_ptr<Processes> processes_;
  std::unique_ptr<Network> network_;
  std::unique_ptr<Screen> screen_;
  std::unique_ptr<Libraries> libraries_;
  std::unique_ptr<ManagementQueue> messages_;
  std::unique_ptr<Drivers> drivers_;
};

}  // namespace sim

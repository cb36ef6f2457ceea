// A device's drivers: what programs load with ActivateDevice, open with CreateFileW under a name
// such as "EFL1:", and ask with DeviceIoControl.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "ce/types.h"
#include "kernel/handle_table.h"
#include "world/world.h"

namespace sim {

class Device;

/// One request to a driver. The buffers are the caller's; a driver may answer through either.
struct DriverRequest {
  DWORD code = 0;
  void* input = nullptr;
  DWORD input_size = 0;
  void* output = nullptr;
  DWORD output_size = 0;
  DWORD returned = 0;  ///< bytes that the driver has put into `output`
};

/// A driver in memory. Used by any thread; it guards itself.
class StreamDriver {
 public:
  virtual ~StreamDriver() = default;
  /// @return an error number, 0 for success.
  virtual DWORD Control(DriverRequest& request) = 0;
};

class Drivers {
 public:
  using Factory = std::function<std::shared_ptr<StreamDriver>(Device&)>;

  /// Knows "eflashdrv.dll", the flash driver, but does not load it; has loaded the disk "DSK0:" if
  /// the device has one.
  explicit Drivers(Device& device);
  ~Drivers();
  Drivers(const Drivers&) = delete;
  Drivers& operator=(const Drivers&) = delete;

  // ---- for tests, tools and drivers; these take the world's lock themselves ----

  /// What ActivateDevice loads for the library `dll` from now on; an empty function: there is no
  /// such library.
  void SetLibrary(std::u16string_view dll, Factory factory);
  /// A driver that the system itself has loaded, opened under `name` ("DSK0:").
  void AddBuiltIn(std::u16string_view name, std::shared_ptr<StreamDriver> driver);
  /// Names of the devices that can be opened, in their order.
  [[nodiscard]] std::vector<std::string> Names() const;

  /// For a driver that restarts the device: notes it and never returns, as nothing does then.
  /// Everything else goes on until whoever runs the device ends it and starts it anew.
  void Restart();
  /// Whether the device waits to be started anew.
  [[nodiscard]] bool restart_requested() const;

  // ---- for the API functions; error numbers, 0 for success ----

  /// Whether CreateFileW means a device: three letters or digits, a digit and a colon.
  [[nodiscard]] static bool IsDeviceName(const WCHAR* name);
  /// Loads what the key below HKEY_LOCAL_MACHINE names in "Dll", as "Prefix" and "Index" say, or
  /// the first free number from 1 on.
  DWORD Activate(const WCHAR* key, HANDLE& handle);
  /// Handles of the device that are open answer ERROR_INVALID_HANDLE from then on.
  DWORD Deactivate(HANDLE handle);
  DWORD Open(const WCHAR* name, HANDLE& opened);
  DWORD Control(HANDLE opened, DriverRequest& request);

 private:
  struct Loaded {
    std::u16string name;  ///< "EFL1:", in capitals
    std::shared_ptr<StreamDriver> driver;
  };
  class Opened;
  struct Description {
    std::u16string prefix;
    std::u16string dll;
    std::int32_t index = -1;  ///< -1: any
  };

  DWORD Describe(const WCHAR* key, Description& description) const;
  // With the world's lock held:
  [[nodiscard]] std::shared_ptr<Loaded> Find(std::u16string_view name) const;
  [[nodiscard]] std::u16string FreeName(const Description& description) const;

  Device& device_;
  std::map<std::u16string, Factory> libraries_;  ///< by name in capitals
  std::vector<std::shared_ptr<Loaded>> built_in_;
  std::map<HANDLE, std::shared_ptr<Loaded>> activated_;
  bool restart_requested_ = false;
  WaitQueue end_;  ///< never notified
};

}  // namespace sim

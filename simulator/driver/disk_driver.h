// The driver of the device's own disk, "DSK0:", as far as programs ask it about the flash chip
// behind it.
#pragma once

#include <cstdint>

#include "driver/drivers.h"

namespace sim {

/// Answers one request, 3000, with 64 bytes: the chip's capacity in bytes at offset 16, the code of
/// its generation at 24, and zeros. Refused are other requests and less room than that.
class DiskDriver final : public StreamDriver {
 public:
  DiskDriver(std::uint8_t generation, std::uint32_t capacity)
      : generation_(generation), capacity_(capacity) {}

  DWORD Control(DriverRequest& request) override;

 private:
  const std::uint8_t generation_;
  const std::uint32_t capacity_;
};

}  // namespace sim

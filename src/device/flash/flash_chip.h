// The flash chip behind the device's own disk.
#pragma once

#include <cstdint>

namespace device {

/// Asks the disk "DSK0:" which generation its chip is of.
/// @param generation  receives the chip's code; unchanged on failure
/// @return false when there is no such disk, or its driver does not answer.
bool GetFlashChipGeneration(std::uint8_t* generation) noexcept;

}  // namespace device

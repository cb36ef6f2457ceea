// What a device of a fleet runs: the product's own code.
#pragma once

#include <cstdint>
#include <string>

namespace fleet {

/// Runs one multicast client with this command line to its end. Called on a thread of a device.
/// @return its result, 0 or -1.
std::int32_t RunClient(std::string command_line);

/// The CRC-32 of a file of the device, as the product computes it. @return false when it cannot.
bool FileCrc(const std::string& device_path, std::uint32_t& crc);

}  // namespace fleet

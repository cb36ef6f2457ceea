// Captures of what went over a virtual network.
#pragma once

#include <filesystem>
#include <optional>
#include <vector>

#include "net/virtual/frame.h"

namespace tools {

/// Writes the datagrams among `frames` into a capture file; TCP is left out. Time counts from the
/// beginning of the world.
/// @param ear  a host of that network: what it heard, when it heard it, in that order. Nobody: what
///   was sent, lost or not, when it was sent.
/// @throws std::runtime_error when the file cannot be written
void WriteCapture(const std::filesystem::path& file, const std::vector<sim::Frame>& frames,
                  std::optional<sim::Address> ear = std::nullopt);

}  // namespace tools

// What a server and its devices must agree on before files can go to a group.
#pragma once

#include <cstdint>
#include <string>

namespace tools {

/// The one place that both sides take it from: a bundle's manifest for the server, the bundle's job
/// for the devices.
struct MulticastSetup {
  std::string group = "239.1.1.1";          ///< where files are announced
  std::uint16_t port = 7000;                ///< of both groups
  std::string private_group = "239.1.1.2";  ///< where their blocks go
  std::uint32_t block_size = 1400;          ///< bytes; larger for files of more than 65,535 blocks
  /// What devices compare the masks of an announcement with; empty: they take every file.
  std::string device_text;
  bool encrypt = false;
};

/// Reads "239.1.1.1:7000"; the private group becomes the address after it. Throws Failure kUsage.
[[nodiscard]] MulticastSetup ParseMulticastSetup(const std::string& option);

/// Throws Failure kUsage for what devices could not work with.
void CheckMulticastSetup(const MulticastSetup& setup);

/// Whether `address` is a dotted IPv4 address of a group.
[[nodiscard]] bool IsGroupAddress(const std::string& address);

/// The command line of the device's multicast client.
[[nodiscard]] std::string ClientParameters(const MulticastSetup& setup);

/// Why `text` cannot be a device text; empty when it can. Blanks, "-" and "/" divide options.
[[nodiscard]] std::string DeviceTextComplaint(const std::string& text);

}  // namespace tools

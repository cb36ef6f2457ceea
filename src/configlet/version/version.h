// The version that the configlet shows to the management client.
#pragma once

namespace configlet {

/// Of the configlet and of the multicast client that it carries.
inline constexpr char kVersionText[] = "3.44";

/// Writes "Orvenix.ini" and "MCFTP.ini" into the client's subsystem folder, which the registry
/// names and which must exist. Each file that could be made gives a line in the transfer log; one
/// that could not is passed over in silence. Any thread.
void WriteVersionFiles() noexcept;

}  // namespace configlet

// The start-up log of multicast clients.
#pragma once

namespace mcftp {

/// Appends `line` and a line feed to "\mcast.log", which is opened for it and closed again, so that
/// a reset of the device loses one line at most. What cannot be written is dropped without a word.
/// Any thread; a line is written in one piece.
void AppendToMcastLog(const char* line) noexcept;

}  // namespace mcftp

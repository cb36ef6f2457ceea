// A management client as it could stand on any device: it knows the device's API and the library's
// header, and nothing else. The same sources run on Linux, on the device's processor and on
// Windows.
#pragma once

namespace host {

/// What the client reads and writes on its device.
inline constexpr char kWalkFile[] = "\\host.walk";             ///< what it has to do
inline constexpr char kTraceFile[] = "\\host.trace";           ///< what came of it, line by line
inline constexpr char kDocumentsFile[] = "\\documents.trace";  ///< the statuses that it was handed

enum class Outcome {
  kAsExpected = 0,
  kNotAsExpected = 1,  ///< the trace has lines that begin with "FAILED"
  kNotWalked = 2,      ///< the library or the walk is missing or makes no sense; see the trace
};

/// Loads the library "\orvenix.dll" and does what the walk says. Called by a thread of the device,
/// once a process.
Outcome RunHost();

}  // namespace host

// The checks of a job, one subject each. Each adds what it finds; none throws for a bad job.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "tools/lint/device_job.h"
#include "tools/lint/finding.h"

namespace server {
class Site;
}

namespace tools {

/// A job and where its findings go.
struct JobCheck {
  const DeviceJob& job;
  const std::string& name;  ///< of the file
  Findings& findings;

  void Add(Rule rule, int line, std::string found) const {
    findings.Add(rule, name + ":" + std::to_string(line), std::move(found));
  }
};

void CheckStorage(const JobCheck& check);
void CheckTests(const JobCheck& check);
void CheckMessages(const JobCheck& check);
void CheckServer(const JobCheck& check);
void CheckCleanup(const JobCheck& check);
void CheckProcesses(const JobCheck& check);
void CheckMulticast(const JobCheck& check);

/// The files that the job names itself, and those of its list file where the server is at hand.
/// @param site      the served folder, or null
/// @param unlisted  whether served files that the list does not name are worth a note
void CheckFiles(const JobCheck& check, server::Site* site, bool unlisted);

/// Whether a file with this destination is the package that the job's program installs.
[[nodiscard]] bool IsInstalledPackage(const DeviceJob& job, std::string_view destination);
/// What a device can prepare of a package.
/// @param bytes  of the cabinet, as the server has it
void CheckCabinet(const JobCheck& check, const std::string& where, std::string_view destination,
                  std::string_view bytes);

// ---- helpers of the checks ----

/// In quotes, and cut where it is long.
[[nodiscard]] std::string Quoted(std::string_view text);
[[nodiscard]] bool IsDotted(std::string_view address);
/// Whether the device keeps the text whole (`limit` characters, 0: it is a number or a word), and
/// as it is meant. `what` is its name in the findings, `name` the file's.
void CheckTextOf(const Setting& setting, std::string_view what, std::size_t limit,
                 const std::string& name, Findings& findings);
/// All digits, and not above `largest`.
[[nodiscard]] bool IsNumber(std::string_view text, std::uint64_t largest);
/// Small letters, and "/" as "\": two paths with the same key are one file to a device.
[[nodiscard]] std::string PathKey(std::string_view path);

}  // namespace tools

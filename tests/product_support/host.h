// The management client of a device, as tests play it: it walks a job through the exported
// functions, waits, and looks at what the device has left.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/device.h"

namespace test {

struct HostFile {
  std::string source;
  std::string destination;
  std::string masks = "*";
  std::string crc = "0";
};

struct HostTest {
  std::string key;
  std::string value_name;
  std::string type;
  std::string operation;
  std::string value;
  std::string message;
};

/// One job as a host sends it. Empty texts are not sent.
struct HostJob {
  std::string base_url = "http://127.0.0.2";
  std::vector<HostFile> files;
  std::optional<HostFile> list;
  std::string store = "\\";
  std::string required_space = "1000";
  std::string multicast;  ///< the multicast client's command line
  std::string syslog_port;
  std::string syslog_address;
  std::string begin_text;
  std::string end_text;
  bool show_gui = true;
  std::vector<HostTest> tests;
  std::vector<std::string> stop;     ///< programs
  std::vector<std::string> cleared;  ///< files and folders
  std::vector<std::string> saved;
  std::string program;     ///< started at the end,
  std::string parameters;  ///< with these,
  std::string wait;        ///< and waited for unless this is "false"
};

/// Walks all groups but "Upgrade"'s end. @return the result of beginning "Upgrade".
std::uint32_t WalkJob(const HostJob& job);
/// Ends "Upgrade" and "Orvenix". @return the result of the first.
std::uint32_t EndJob();

/// Waits in the device's time until no thread but the caller's is left.
/// @return false when that has not come about after `limit_s` seconds
bool AwaitEndOfJobs(sim::Device& device, std::uint32_t limit_s = 3600);

/// What a program of the device may hold too much of. The handle of the mutex that marks the
/// upgrade client, which is kept from the first message on, does not count.
struct Holdings {
  std::size_t handles = 0;
  std::size_t sockets = 0;
  std::size_t blocks = 0;
  std::size_t gdi_objects = 0;
  std::size_t device_contexts = 0;
  std::size_t power_requirements = 0;
  std::size_t windows = 0;
  std::size_t queue_connections = 0;
  unsigned sockets_started = 0;

  friend bool operator==(const Holdings& a, const Holdings& b) {
    return a.handles == b.handles && a.sockets == b.sockets && a.blocks == b.blocks &&
           a.gdi_objects == b.gdi_objects && a.device_contexts == b.device_contexts &&
           a.power_requirements == b.power_requirements && a.windows == b.windows &&
           a.queue_connections == b.queue_connections && a.sockets_started == b.sockets_started;
  }
};
Holdings HoldingsOf(sim::Device& device);

/// Whether a call of this name gives something back or ends a thread: where it fails, what it was
/// to give back is kept.
bool IsRelease(std::string_view call);
void PrintTo(const Holdings& holdings, std::ostream* out);

/// Frees the job, and the records for one, that the configlet still keeps because no thread has
/// taken them over.
void DropKeptJob();

}  // namespace test

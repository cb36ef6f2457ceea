// A job as the configlet understands it, with the lines that its settings came from.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "tools/job_file.h"
#include "tools/lint/finding.h"

namespace tools {

/// One text as the device keeps it.
struct Setting {
  std::string text;
  int line = 0;  ///< 0: the job does not say

  [[nodiscard]] bool given() const { return line > 0; }
};

struct DownloadSettings {
  Setting source, destination, crc, masks;
  int line = 0;  ///< of the group
};

struct StoreSettings {
  Setting name, space;
  int line = 0;
};

struct TestSettings {
  Setting root, key, value_name, type, operation, value, message;
  int line = 0;
};

/// A firmware package, which only configuration files have.
struct PackageSettings {
  Setting hardware, flash, source, base, destination, count, command_line, options;
  int line = 0;
};

/// What the walk leaves behind. Lists are in the order in which the device has them.
struct DeviceJob {
  Setting syslog_address, syslog_port;
  Setting http_address, http_port, base_url;
  Setting multicast_address, multicast_key, multicast_port, multicast_block, multicast_parameters;
  Setting program, parameters, wait, show_window;
  Setting begin_text, end_text;
  std::optional<DownloadSettings> list;
  std::vector<DownloadSettings> downloads;
  std::vector<StoreSettings> stores;
  std::vector<TestSettings> tests;
  std::vector<Setting> deletes, saves, stops;
  std::vector<PackageSettings> packages;
  Setting inf;
  int upgrade_line = 0;           ///< of the group whose end starts the job; 0: there is none
  bool is_configuration = false;  ///< from a configuration file: an upgrade client runs it
};

/// Walks `job` by the configlet's rules: names by their leading parts, the first field in its
/// order, the group begun last. What the walk itself shows goes to `findings`; `name` stands for
/// the file.
[[nodiscard]] DeviceJob ReadAsDevice(const Job& job, const std::string& name, Findings& findings);

}  // namespace tools

// One scenario on one target, in a process and a network of its own.
#pragma once

#include <sys/types.h>

#include <filesystem>
#include <map>
#include <string>

#include "targets/judge/scenario.h"
#include "targets/judge/target.h"

namespace targets {

/// What a run has left: the device's files and what the server heard, by name, as
/// Comparable() has it. Folders have names that end with "/".
using Record = std::map<std::string, std::string>;

class Run {
 public:
  /// @param folder  emptied at the start; what the run leaves stays in it for whoever looks
  Run(const Scenario& scenario, const Target& target, std::filesystem::path folder);

  /// Forks; the calling process must have no other threads. Throws std::runtime_error.
  void Start();
  /// @return whether the run has ended, in which case it is over for good
  [[nodiscard]] bool PollEnd();
  [[nodiscard]] const std::filesystem::path& folder() const { return folder_; }
  /// Why nothing can be concluded from the run; empty when the client went its whole way.
  [[nodiscard]] std::string Complaint() const;
  /// Whether its network could not be made, for which the run is not to blame.
  [[nodiscard]] bool has_no_network() const { return has_no_network_; }
  [[nodiscard]] Record ReadRecord() const;

 private:
  [[nodiscard]] int CarryOut() const;

  const Scenario& scenario_;
  const Target& target_;
  const std::filesystem::path folder_;
  pid_t process_ = 0;
  int status_ = 0;
  bool has_no_network_ = false;
};

}  // namespace targets

// The command line of the device's multicast client, as the client reads it.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tools {

struct MulticastLine {
  bool refused = false;  ///< some option begins with a letter that no option has
  std::optional<std::string> group, port, text;
  bool has_status = false;           ///< -UA or -UP, which the device adds itself
  std::vector<std::string> ignored;  ///< options that are passed over
  std::string cut_off;               ///< what a "-" or "/" has cut off the text, with it
};

/// Options are divided by blanks, "/" and "-"; the last of two with the same name counts.
[[nodiscard]] MulticastLine ReadMulticastLine(std::string_view line);

}  // namespace tools

#include "tools/lint/multicast_line.h"

#include <algorithm>

#include "base/text.h"

namespace tools {
namespace {

constexpr std::string_view kDividers = " /-";
constexpr std::string_view kFirstLetters = "APUDHapudh";

/// Puts one option where it belongs. @return false when the device passes it over.
bool Take(std::string_view name, std::string_view value, MulticastLine& line) {
  const auto is = [name](std::string_view option) { return base::EqualIgnoringCase(name, option); };
  if (is("UA") || is("UP")) {
    line.has_status = true;
  } else if (is("A")) {
    line.group = value;
  } else if (is("P")) {
    line.port = value;
  } else if (is("HV")) {
    line.text = value;
  } else {
    return is("DA") || is("DP");
  }
  return true;
}

}  // namespace

MulticastLine ReadMulticastLine(std::string_view line) {
  MulticastLine read;
  bool behind_text = false;  // no blank stands between the text and this option
  for (std::size_t at = line.find_first_not_of(kDividers); at != std::string_view::npos;) {
    const std::size_t end = std::min(line.find_first_of(kDividers, at), line.size());
    const std::string_view option = line.substr(at, end - at);
    const std::size_t equals = option.find('=');
    if (kFirstLetters.find(option.front()) == std::string_view::npos) read.refused = true;
    if (behind_text && equals == std::string_view::npos) {
      read.cut_off = line.substr(at - 1, end - at + 1);
    } else if (equals == std::string_view::npos ||
               !Take(option.substr(0, equals), option.substr(equals + 1), read)) {
      read.ignored.emplace_back(option);
    }
    behind_text =
        equals != std::string_view::npos && end < line.size() && line[end] != ' ' &&
        base::EqualIgnoringCase(option.substr(0, equals), "HV") &&
        kDividers.find(line[std::min(end + 1, line.size() - 1)]) == std::string_view::npos;
    at = line.find_first_not_of(kDividers, end);
  }
  return read;
}

}  // namespace tools

#include "upgrade_config/selection/package_selection.h"

#include <cstddef>

#include "base/text.h"

namespace orvenix {
namespace {

constexpr std::size_t kComparedCharacters = 63;

/// What of a text is compared.
std::string_view Compared(std::string_view text) noexcept {
  const std::string_view beginning = base::Part(text, 0, kComparedCharacters);
  return base::Part(beginning, 0, beginning.find_first_of("\r\n"));
}

}  // namespace

bool CompareCfgStr(std::string_view pattern, std::string_view device) noexcept {
  const std::string_view wanted = Compared(pattern);
  const std::string_view text = Compared(device);
  for (std::size_t at = 0; at < wanted.size() && at < text.size(); ++at) {
    if (wanted[at] == '*') return true;
    if (wanted[at] != '?' && wanted[at] != text[at]) return false;
  }
  return true;
}

bool SelectsDevice(std::string_view patterns, std::string_view device) noexcept {
  // An empty piece is no pattern: as one it would select every device.
  for (std::size_t from = patterns.find_first_not_of(','); from != std::string_view::npos;) {
    const std::string_view rest = base::Part(patterns, from);
    const std::string_view pattern = base::Part(rest, 0, rest.find(','));
    if (CompareCfgStr(pattern, device)) return true;
    from = patterns.find_first_not_of(',', from + pattern.size());
  }
  return false;
}

}  // namespace orvenix

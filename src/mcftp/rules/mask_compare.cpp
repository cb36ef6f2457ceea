#include "mcftp/rules/mask_compare.h"

#include <cstddef>

#include "base/text.h"

namespace mcftp {
namespace {

constexpr std::string_view kSeparators = " ;";

/// Whether `text` has ended at `at`.
constexpr bool Ends(std::string_view text, std::size_t at) noexcept {
  return at >= text.size() || text[at] == '\0' || text[at] == '\r' || text[at] == '\n';
}

}  // namespace

bool MaskMatches(std::string_view mask, std::string_view mct) noexcept {
  std::size_t at = 0;
  while (!Ends(mask, at) && !Ends(mct, at) && mask[at] != '*') {
    if (mask[at] != '?' && mask[at] != mct[at]) return false;
    ++at;
  }
  return true;
}

std::string_view NextMask(std::string_view& list) noexcept {
  list = base::Part(list, list.find_first_not_of(kSeparators));
  const std::string_view mask = base::Part(list, 0, list.find_first_of(kSeparators));
  list = base::Part(list, mask.size());
  return mask;
}

}  // namespace mcftp

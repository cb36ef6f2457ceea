#include "storage/device_path.h"

#include <cstddef>

#include "ce/errors.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr std::u16string_view kRefused = u"\"*/:<>?|\\";

bool ValidPattern(std::u16string_view pattern) {
  std::u16string plain(pattern);
  for (char16_t& letter : plain) {
    if (letter == u'*' || letter == u'?') letter = u'x';
  }
  return ValidName(plain);
}

}  // namespace

bool ValidName(std::u16string_view name) {
  if (name.empty() || name == u"." || name == u"..") return false;
  for (const char16_t letter : name) {
    if (letter < 0x20 || kRefused.find(letter) != std::u16string_view::npos) return false;
  }
  return true;
}

DWORD ParsePath(const WCHAR* text, bool wild, DevicePath& path) {
  path = {};
  if (text == nullptr) return ERROR_INVALID_PARAMETER;
  std::u16string_view rest = BoundedView(text, MAX_PATH);
  if (rest.empty()) return ERROR_PATH_NOT_FOUND;
  if (rest.size() >= MAX_PATH) return ERROR_FILENAME_EXCED_RANGE;
  path.closed = rest.back() == u'\\';
  while (!rest.empty()) {
    const std::u16string_view name = rest.substr(0, rest.find(u'\\'));
    rest.remove_prefix(name.size() < rest.size() ? name.size() + 1 : rest.size());
    if (!name.empty()) path.names.emplace_back(name);
  }
  for (std::size_t i = 0; i < path.names.size(); ++i) {
    const bool pattern = wild && !path.closed && i + 1 == path.names.size();
    if (!(pattern ? ValidPattern(path.names[i]) : ValidName(path.names[i]))) {
      return ERROR_INVALID_NAME;
    }
  }
  return ERROR_SUCCESS;
}

bool MatchesWildCards(std::u16string_view name, std::u16string_view pattern) {
  if (pattern == u"*.*") return true;
  // Greedy: only the last star ever has to take one character more.
  std::size_t at = 0;
  std::size_t next = 0;
  std::size_t star = std::u16string_view::npos;
  std::size_t taken = 0;
  while (at < name.size()) {
    const bool more = next < pattern.size();
    if (more && pattern[next] == u'*') {
      star = next++;
      taken = at;
    } else if (more && (pattern[next] == u'?' || FoldCase(pattern[next]) == FoldCase(name[at]))) {
      ++next;
      ++at;
    } else if (star != std::u16string_view::npos) {
      next = star + 1;
      at = ++taken;
    } else {
      return false;
    }
  }
  while (next < pattern.size() && pattern[next] == u'*') ++next;
  return next == pattern.size();
}

}  // namespace sim

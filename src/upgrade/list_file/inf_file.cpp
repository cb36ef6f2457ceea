#include "upgrade/list_file/inf_file.h"

#include "base/text.h"

namespace upgrade {
namespace {

constexpr std::string_view kLineEnds = "\r\n";

/// Takes the next quoted text off `line`. @return false when there is none that could be used.
bool TakeQuoted(std::string_view* line, std::string_view* text) noexcept {
  const std::size_t open = line->find('"');
  if (open == std::string_view::npos) return false;
  line->remove_prefix(open + 1);
  const std::size_t close = line->find('"');
  if (close == std::string_view::npos) return false;
  *text = base::Part(*line, 0, close);
  line->remove_prefix(close + 1);
  return text->size() <= InfFileReader::kLongestText && text->find('\0') == std::string_view::npos;
}

bool ParseLine(std::string_view line, InfEntry* entry) noexcept {
  const std::size_t first = line.find_first_not_of(" \t");
  if (first == std::string_view::npos || line[first] != '"') return false;
  return TakeQuoted(&line, &entry->pattern) && TakeQuoted(&line, &entry->source) &&
         TakeQuoted(&line, &entry->destination);
}

}  // namespace

bool InfFileReader::Next(InfEntry* entry) noexcept {
  while (!rest_.empty()) {
    const std::string_view line = base::Part(rest_, 0, rest_.find_first_of(kLineEnds));
    rest_.remove_prefix(line.size() < rest_.size() ? line.size() + 1 : line.size());
    if (ParseLine(line, entry)) return true;
  }
  return false;
}

}  // namespace upgrade

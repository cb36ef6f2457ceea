#include "tools/explain/text_match.h"

#include <algorithm>

#include "base/number.h"
#include "base/text.h"

namespace tools {
namespace {

constexpr char kNumber = '\0';
constexpr std::string_view kProgram = "Orvenix - ";
constexpr std::size_t kNowhere = std::string_view::npos;

bool IsDigit(char letter) {
  return letter >= '0' && letter <= '9';
}

std::size_t KeyOf(std::string_view text) {
  const bool named = base::StartsWith(text, kProgram) && text.size() > kProgram.size();
  if (text.empty()) return 0;
  return static_cast<unsigned char>(text[named ? kProgram.size() : 0]) + (named ? 256U : 0U);
}

std::size_t NumberEnd(std::string_view line, std::size_t at) {
  std::size_t end = at < line.size() && line[at] == '-' ? at + 1 : at;
  const std::size_t digits = end;
  while (end < line.size() && IsDigit(line[end])) ++end;
  return end == digits ? kNowhere : end;
}

/// Where `segment` ends if it stands at `at`; kNowhere if it does not.
std::size_t EndOfSegment(std::string_view segment, std::string_view line, std::size_t at,
                         std::optional<std::uint32_t>& number) {
  for (const char letter : segment) {
    if (letter == kNumber) {
      const std::size_t end = NumberEnd(line, at);
      if (end == kNowhere) return kNowhere;
      number = base::LeadingNumber(line.substr(at, end - at));
      at = end;
    } else {
      if (at >= line.size() || line[at] != letter) return kNowhere;
      ++at;
    }
  }
  return at;
}

/// Every "0" of the shape stands for a digit.
bool HasShape(std::string_view text, std::string_view shape) {
  return text.size() >= shape.size() &&
         std::equal(shape.begin(), shape.end(), text.begin(), [](char wanted, char letter) {
           return wanted == '0' ? IsDigit(letter) : wanted == letter;
         });
}

}  // namespace

TextMatcher::TextMatcher(bool on_screen, TextRows rows) {
  for (const TextRow& row : rows) {
    if (row.on_screen != on_screen) continue;
    Pattern pattern = Compile(row);
    // What is nothing but a text from elsewhere matches every line and so tells nothing.
    if (std::all_of(pattern.segments.begin(), pattern.segments.end(),
                    [](const Segment& segment) { return segment.empty(); })) {
      continue;
    }
    patterns_[KeyOf(pattern.segments.front())].push_back(std::move(pattern));
  }
}

TextMatcher::Pattern TextMatcher::Compile(const TextRow& row) {
  Pattern pattern;
  pattern.row = &row;
  std::string_view format = row.format;
  const std::size_t text = format.find_last_not_of("\r\n");
  pattern.ends_line = row.on_screen || text + 1 < format.size();
  format = format.substr(0, text + 1);
  pattern.segments.emplace_back();
  for (std::size_t i = 0; i < format.size(); ++i) {
    if (format[i] != '%' || i + 1 == format.size()) {
      pattern.segments.back() += format[i];
      continue;
    }
    i = std::min(format.find_first_not_of("0123456789.*", i + 1), format.size() - 1);
    if (format[i] == 's' || format[i] == 'f') {
      pattern.segments.emplace_back();
    } else {
      pattern.segments.back() += format[i] == '%' ? '%' : kNumber;
    }
  }
  return pattern;
}

bool TextMatcher::Matches(const Pattern& pattern, std::string_view line, TextMatch& match) {
  std::optional<std::uint32_t> number;
  std::size_t at = EndOfSegment(pattern.segments.front(), line, 0, number);
  for (std::size_t i = 1; i < pattern.segments.size() && at != kNowhere; ++i) {
    const bool to_the_end = i + 1 == pattern.segments.size() && pattern.ends_line;
    const Segment& segment = pattern.segments[i];
    if (segment.empty()) {
      at = line.size();
      continue;
    }
    std::size_t end = kNowhere;
    for (; at <= line.size() && end == kNowhere; ++at) {
      end = EndOfSegment(segment, line, at, number);
      if (to_the_end && end != line.size()) end = kNowhere;
    }
    at = end;
  }
  if (at == kNowhere || (pattern.ends_line && at != line.size())) return false;
  match = {pattern.row, number, line.substr(at)};
  return true;
}

TextMatch TextMatcher::Find(std::string_view line) const {
  TextMatch match;
  if (line.empty()) return match;
  for (const Pattern& pattern : patterns_[KeyOf(line)]) {
    if (Matches(pattern, line, match)) break;
  }
  return match;
}

StampedLine SplitStamp(std::string_view line) {
  // As syslog lines have it, and as the device writes the time of an event into its log.
  static constexpr std::string_view kShapes[] = {"0000-00-00 00:00:00 ", "0000/00/00:00:00:00"};
  constexpr std::size_t kSearched = 80;
  for (std::size_t at = 0; at < kSearched && at < line.size(); ++at) {
    for (const std::string_view shape : kShapes) {
      if (!HasShape(line.substr(at), shape)) continue;
      const std::size_t end = shape.find_last_of('0') + 1;
      return {line.substr(at, end), line.substr(at + shape.size())};
    }
  }
  return {{}, line};
}

}  // namespace tools

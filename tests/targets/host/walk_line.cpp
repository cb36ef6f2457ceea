#include "targets/host/walk_line.h"

#include <charconv>

namespace host {
namespace {

constexpr std::size_t kMostRepeats = 1'000'000;

class Reader {
 public:
  explicit Reader(std::string_view text) : rest_(text) {}

  /// @return whether there is a further word
  bool Begin() {
    const std::size_t begin = rest_.find_first_not_of(" \t\r");
    rest_.remove_prefix(begin == std::string_view::npos ? rest_.size() : begin);
    return !rest_.empty() && rest_[0] != '#';
  }

  [[nodiscard]] bool at_quote() const { return rest_[0] == '"'; }

  bool Read(Word& word) {
    if (at_quote()) return ReadQuoted(word);
    const std::size_t end = rest_.find_first_of(" \t\r");
    word.text = rest_.substr(0, end);
    word.is_null = word.text == "null";
    rest_.remove_prefix(word.text.size());
    return true;
  }

 private:
  bool ReadQuoted(Word& word) {
    const std::size_t end = rest_.find('"', 1);
    if (end == std::string_view::npos) return false;
    const std::string_view once = rest_.substr(1, end - 1);
    rest_.remove_prefix(end + 1);
    std::size_t count = 1;
    if (!rest_.empty() && rest_[0] == '*' && !ReadCount(count)) return false;
    for (std::size_t i = 0; i < count; ++i) word.text += once;
    return true;
  }

  bool ReadCount(std::size_t& count) {
    const char* const begin = rest_.data() + 1;
    const auto [end, error] = std::from_chars(begin, rest_.data() + rest_.size(), count);
    rest_.remove_prefix(static_cast<std::size_t>(end - rest_.data()));
    return error == std::errc() && count <= kMostRepeats;
  }

  std::string_view rest_;
};

}  // namespace

bool ReadWalkLine(std::string_view text, WalkLine& line) {
  line = {};
  Reader reader(text);
  while (reader.Begin()) {
    Word word;
    const bool quoted = reader.at_quote();
    if (!reader.Read(word)) return false;
    if (line.verb.empty()) {
      line.verb = word.text;
    } else if (line.expected) {
      line.expected->push_back(word.text);
    } else if (word.text == "=" && !quoted) {
      line.expected.emplace();
    } else {
      line.arguments.push_back(word);
    }
  }
  return true;
}

}  // namespace host

// Reading the registry from a text.
#include <cstdint>
#include <optional>

#include "ce/system.h"
#include "registry/reg_text.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr std::string_view kBlanks = " \t";

std::string_view Trim(std::string_view text) {
  const std::size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

bool SkipPrefix(std::string_view& text, std::string_view prefix) {
  if (text.substr(0, prefix.size()) != prefix) return false;
  text.remove_prefix(prefix.size());
  return true;
}

/// One to `most` hexadecimal digits at the front of `text`, taken off it.
std::optional<std::uint32_t> TakeHex(std::string_view& text, std::size_t most) {
  std::uint32_t value = 0;
  std::size_t digits = 0;
  for (; digits < text.size(); ++digits) {
    const char digit = text[digits];
    const bool decimal = digit >= '0' && digit <= '9';
    const char lower = static_cast<char>(digit | 0x20);
    if (!decimal && (lower < 'a' || lower > 'f')) break;
    if (digits == most) return std::nullopt;
    value = value << 4U | static_cast<std::uint32_t>(decimal ? digit - '0' : lower - 'a' + 10);
  }
  if (digits == 0) return std::nullopt;
  text.remove_prefix(digits);
  return value;
}

/// A text in quotes at the front of `text`, taken off it; \\ and \" are the only escapes.
std::optional<std::string> TakeQuoted(std::string_view& text) {
  if (!SkipPrefix(text, "\"")) return std::nullopt;
  std::string plain;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '"') {
      text.remove_prefix(i + 1);
      return plain;
    }
    if (text[i] == '\\') {
      ++i;
      if (i == text.size() || (text[i] != '\\' && text[i] != '"')) return std::nullopt;
    }
    plain += text[i];
  }
  return std::nullopt;
}

std::vector<BYTE> TextBytes(std::u16string_view text) {
  std::vector<BYTE> data;
  data.reserve(text.size() * 2 + 2);
  for (const char16_t letter : text) {
    data.push_back(static_cast<BYTE>(letter & 0xFFU));
    data.push_back(static_cast<BYTE>(letter >> 8U));
  }
  data.insert(data.end(), 2, 0);
  return data;
}

/// @return empty on success, otherwise what is wrong.
std::string_view ParseBytes(std::string_view text, std::vector<BYTE>& data) {
  for (text = Trim(text); !text.empty();) {
    const std::optional<std::uint32_t> byte = TakeHex(text, 2);
    if (!byte) return "bytes are two hexadecimal digits each, with commas between";
    data.push_back(static_cast<BYTE>(*byte));
    text = Trim(text);
    if (text.empty()) break;
    if (!SkipPrefix(text, ",")) return "bytes are two hexadecimal digits each, with commas between";
    text = Trim(text);
  }
  return {};
}

std::string_view ParseHex(std::string_view text, RegistryValue& value) {
  value.type = REG_BINARY;
  if (SkipPrefix(text, "(")) {
    const std::optional<std::uint32_t> type = TakeHex(text, 8);
    if (!type || !SkipPrefix(text, ")")) return "the type in hex(...) is a hexadecimal number";
    value.type = *type;
  }
  if (!SkipPrefix(text, ":")) return "\":\" is missing behind hex";
  return ParseBytes(text, value.data);
}

std::string_view ParseData(std::string_view text, RegistryValue& value) {
  if (SkipPrefix(text, "dword:")) {
    const std::optional<std::uint32_t> number = TakeHex(text, 8);
    if (!number || !text.empty()) return "a dword has up to eight hexadecimal digits";
    value.type = REG_DWORD;
    for (unsigned shift = 0; shift < 32; shift += 8) {
      value.data.push_back(static_cast<BYTE>(*number >> shift & 0xFFU));
    }
    return {};
  }
  if (SkipPrefix(text, "hex")) return ParseHex(text, value);
  std::u16string wide;
  const std::optional<std::string> quoted = TakeQuoted(text);
  if (!quoted || !text.empty() || !FromHostText(*quoted, wide)) {
    return "a value is a text in quotes, dword:, hex: or hex(...):";
  }
  value.type = REG_SZ;
  value.data = TextBytes(wide);
  return {};
}

/// Reads a text line by line into a tree.
class Parser {
 public:
  Parser(std::string_view text, KeyTree& tree) : rest_(text), tree_(tree) {}

  bool Run(std::string& error) {
    if (Trim(rest_).empty()) return true;
    std::string line;
    bool headed = false;
    while (NextLine(line)) {
      const std::string_view text = Trim(line);
      if (text.empty() || text[0] == ';') continue;
      const std::string_view wrong = headed ? TakeLine(text) : TakeHeader(text);
      headed = true;
      if (wrong.empty()) continue;
      error = "line " + std::to_string(first_line_) + ": ";
      error += wrong;
      return false;
    }
    return true;
  }

 private:
  /// The next line, with those that continue it behind a backslash.
  bool NextLine(std::string& line) {
    if (rest_.empty()) return false;
    first_line_ = next_line_;
    line.clear();
    do {
      if (!line.empty()) line.pop_back();  // the backslash
      const std::size_t end = rest_.find('\n');
      std::string_view part = rest_.substr(0, end);
      rest_.remove_prefix(end == std::string_view::npos ? rest_.size() : end + 1);
      ++next_line_;
      if (!part.empty() && part.back() == '\r') part.remove_suffix(1);
      line += Trim(part);
    } while (Continues(line) && !rest_.empty());
    return true;
  }

  /// A value's line can be continued; a key or a comment may end in a backslash.
  static bool Continues(const std::string& line) {
    return line.size() > 1 && line.back() == '\\' && line[0] != '[' && line[0] != ';';
  }

  static std::string_view TakeHeader(std::string_view line) {
    if (line == "REGEDIT4" || line == "Windows Registry Editor Version 5.00") return {};
    return "the first line is not \"Windows Registry Editor Version 5.00\" or \"REGEDIT4\"";
  }

  std::string_view TakeLine(std::string_view line) {
    if (line[0] == '[') return TakeKey(line);
    if (line[0] == '"' || line[0] == '@') return TakeValue(line);
    return "neither a [key], a \"name\"=value nor a ; comment";
  }

  std::string_view TakeKey(std::string_view line) {
    if (line.back() != ']') return "\"]\" is missing at the end of the key";
    line = line.substr(1, line.size() - 2);
    const bool deletes = SkipPrefix(line, "-");
    std::u16string wide;
    if (!FromHostText(line, wide)) return "the key's name is no UTF-8";
    const std::size_t root_end = wide.find(u'\\');
    const std::shared_ptr<RegistryKey> root =
        tree_.root(std::u16string_view(wide).substr(0, root_end));
    if (root == nullptr) return "the key begins with no known root (HKEY_LOCAL_MACHINE, ...)";
    const auto path =
        SplitKeyPath(root_end == std::u16string::npos ? std::u16string_view()
                                                      : std::u16string_view(wide).substr(root_end));
    if (!path)
      return "the key's path holds an empty name, one that is too long or a control character";
    if (deletes) {
      key_ = nullptr;
      if (path->empty()) return "a root cannot be deleted";
      static_cast<void>(KeyTree::Delete(root, *path));
      return {};
    }
    bool created = false;
    key_ = KeyTree::Make(root, *path, created);
    return key_ == nullptr ? "the key lies too deep" : "";
  }

  std::string_view TakeValue(std::string_view line) {
    if (key_ == nullptr) return "a value before the first [key]";
    RegistryValue value;
    if (!SkipPrefix(line, "@")) {
      const std::optional<std::string> name = TakeQuoted(line);
      if (!name)
        return "the value's name does not end, or holds an escape other than \\\\ and \\\"";
      if (!FromHostText(*name, value.name)) return "the value's name is no UTF-8";
      if (!ValidValueName(value.name)) return "the value's name is too long";
    }
    line = Trim(line);
    if (!SkipPrefix(line, "=")) return "\"=\" is missing behind the value's name";
    line = Trim(line);
    const std::u16string folded = FoldCase(value.name);
    if (line == "-") {
      key_->values.erase(folded);
      return {};
    }
    const std::string_view wrong = ParseData(line, value);
    if (!wrong.empty()) return wrong;
    if (value.data.size() > kMaxRegistryData) return "the value's data are too long";
    key_->values[folded] = std::move(value);
    return {};
  }

  std::string_view rest_;
  KeyTree& tree_;
  std::shared_ptr<RegistryKey> key_;
  std::size_t next_line_ = 1;
  std::size_t first_line_ = 1;
};

/// UTF-16 behind its byte order mark as UTF-8; any other text without its mark.
std::string Normalised(std::string_view text) {
  if (SkipPrefix(text, "\xEF\xBB\xBF")) return std::string(text);
  if (!SkipPrefix(text, "\xFF\xFE")) return std::string(text);
  std::u16string wide;
  for (std::size_t i = 0; i + 1 < text.size(); i += 2) {
    wide.push_back(static_cast<char16_t>(static_cast<unsigned char>(text[i]) |
                                         static_cast<unsigned char>(text[i + 1]) << 8));
  }
  return ToHostText(wide);
}

}  // namespace

bool ParseRegText(std::string_view text, KeyTree& tree, std::string& error) {
  const std::string plain = Normalised(text);
  return Parser(plain, tree).Run(error);
}

}  // namespace sim

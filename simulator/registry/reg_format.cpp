// Writing the registry as a text.
#include <array>
#include <cstdio>

#include "ce/system.h"
#include "registry/reg_text.h"
#include "text/names.h"

namespace sim {
namespace {

constexpr std::size_t kBytesPerLine = 24;

void AppendQuoted(std::string& out, std::u16string_view text) {
  out += '"';
  for (const char letter : ToHostText(text)) {
    if (letter == '"' || letter == '\\') out += '\\';
    out += letter;
  }
  out += '"';
}

/// The text of a value that can stand in quotes: whole characters, one zero, which is the last.
bool PlainText(const RegistryValue& value, std::u16string& text) {
  if (value.type != REG_SZ || value.data.size() < 2 || value.data.size() % 2 != 0) return false;
  text.clear();
  for (std::size_t i = 0; i < value.data.size(); i += 2) {
    text.push_back(static_cast<char16_t>(value.data[i] | value.data[i + 1] << 8));
  }
  if (text.back() != 0) return false;
  text.pop_back();
  for (const char16_t letter : text) {
    if (letter < 0x20) return false;
  }
  return true;
}

/// At least `width` hexadecimal digits.
std::string Hex(DWORD number, int width) {
  std::array<char, 16> text{};
  std::snprintf(text.data(), text.size(), "%0*x", width, number);
  return text.data();
}

void AppendBytes(std::string& out, const std::vector<BYTE>& data) {
  for (std::size_t i = 0; i < data.size(); ++i) {
    if (i != 0) out += i % kBytesPerLine == 0 ? ",\\\n  " : ",";
    out += Hex(data[i], 2);
  }
}

void AppendData(std::string& out, const RegistryValue& value) {
  std::u16string text;
  if (PlainText(value, text)) {
    AppendQuoted(out, text);
  } else if (value.type == REG_DWORD && value.data.size() == sizeof(DWORD)) {
    DWORD number = 0;
    for (std::size_t i = 0; i < sizeof number; ++i) {
      number |= static_cast<DWORD>(value.data[i]) << (8 * i);
    }
    out += "dword:" + Hex(number, 8);
  } else {
    out += value.type == REG_BINARY ? "hex:" : "hex(" + Hex(value.type, 1) + "):";
    AppendBytes(out, value.data);
  }
}

void AppendKey(std::string& out, const std::string& path, const RegistryKey& key) {
  if (key.depth != 0 || !key.values.empty()) {
    out += "\n[" + path + "]\n";
    for (const auto& [folded, value] : key.values) {
      if (value.name.empty()) {
        out += '@';
      } else {
        AppendQuoted(out, value.name);
      }
      out += '=';
      AppendData(out, value);
      out += '\n';
    }
  }
  for (const auto& [folded, child] : key.children) {
    AppendKey(out, path + '\\' + ToHostText(child->name), *child);
  }
}

}  // namespace

std::string FormatRegText(const KeyTree& tree) {
  std::string out = "Windows Registry Editor Version 5.00\n";
  for (const KeyTree::Root& root : KeyTree::kRoots) {
    AppendKey(out, ToHostText(root.name), *tree.root(root.handle));
  }
  return out;
}

}  // namespace sim

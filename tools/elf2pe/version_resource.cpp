#include "tools/elf2pe/version_resource.h"

#include <algorithm>
#include <cstddef>
#include <initializer_list>

#include "tools/elf2pe/fields.h"
#include "tools/elf2pe/refusal.h"

namespace elf2pe {
namespace {

constexpr std::uint32_t kVersionType = 16;
constexpr std::uint32_t kResourceName = 1;
constexpr std::uint32_t kEnglish = 0x0409;
constexpr std::uint32_t kUnicode = 0x04B0;
constexpr std::uint32_t kSubdirectory = 0x80000000;
constexpr std::uint32_t kDirectorySize = 24;  // with its one entry
constexpr std::uint32_t kDataEntrySize = 16;

void Word(std::string& out, std::uint32_t word) {
  FieldWriter{out}(word);
}

void Half(std::string& out, std::size_t half) {
  FieldWriter{out}(static_cast<std::uint16_t>(half));
}

void Align(std::string& out) {
  out.resize(RoundUp(static_cast<std::uint32_t>(out.size()), 4));
}

/// ASCII as UTF-16, with a closing zero.
std::string Wide(std::string_view text) {
  std::string wide;
  for (const char letter : text) Half(wide, static_cast<unsigned char>(letter));
  Half(wide, 0);
  return wide;
}

enum class Kind : std::uint16_t { kBinary = 0, kText = 1 };

/// Every part of the resource is such a node. Nodes, and values within them, are aligned to 4
/// bytes.
std::string Node(Kind kind, std::string_view key, const std::string& value,
                 std::initializer_list<std::string> children = {}) {
  std::string body = Wide(key);
  body.insert(0, 2, '\0');  // the header's last two bytes, for the alignment
  Align(body);
  body += value;
  for (const std::string& child : children) {
    Align(body);
    body += child;
  }
  std::string node;
  Half(node, 4 + body.size());
  Half(node, kind == Kind::kText ? value.size() / 2 : value.size());
  Half(node, static_cast<std::uint16_t>(kind));
  return node + body.substr(2);
}

std::string Text(std::string_view key, std::string_view text) {
  return Node(Kind::kText, key, Wide(text));
}

std::string FixedPart(const std::array<std::uint16_t, 4>& version) {
  const std::uint32_t upper = std::uint32_t{version[0]} << 16 | version[1];
  const std::uint32_t lower = std::uint32_t{version[2]} << 16 | version[3];
  constexpr std::uint32_t kSignature = 0xFEEF04BD;
  constexpr std::uint32_t kLayout = 0x00010000;
  constexpr std::uint32_t kFlagsMask = 0x3F;
  constexpr std::uint32_t kWindows32 = 4;
  constexpr std::uint32_t kDll = 2;
  std::string fixed;
  for (const std::uint32_t word : {kSignature, kLayout, upper, lower, upper, lower, kFlagsMask, 0U,
                                   kWindows32, kDll, 0U, 0U, 0U}) {
    Word(fixed, word);
  }
  return fixed;
}

std::string Resource(const VersionTexts& texts) {
  const std::string table =
      Node(Kind::kText, "040904B0", "",
           {Text("FileDescription", texts.description), Text("FileVersion", texts.version),
            Text("OriginalFilename", texts.dll_name), Text("ProductVersion", texts.version)});
  std::string translation;
  Half(translation, kEnglish);
  Half(translation, kUnicode);
  return Node(
      Kind::kBinary, "VS_VERSION_INFO", FixedPart(VersionNumbers(texts.version)),
      {Node(Kind::kText, "StringFileInfo", "", {table}),
       Node(Kind::kText, "VarFileInfo", "", {Node(Kind::kBinary, "Translation", translation)})});
}

/// A directory with one entry, known by its number.
void Directory(std::string& out, std::uint32_t number, std::uint32_t leads_to) {
  Word(out, 0);  // characteristics
  Word(out, 0);  // time stamp
  Word(out, 0);  // version
  Half(out, 0);  // entries with names
  Half(out, 1);
  Word(out, number);
  Word(out, leads_to);
}

}  // namespace

std::array<std::uint16_t, 4> VersionNumbers(std::string_view version) {
  const Refusal refusal("no version is written " + Shown(version));
  std::array<std::uint16_t, 4> numbers{};
  std::string_view left = version;
  for (std::uint16_t& number : numbers) {
    const std::string_view digits = left.substr(0, left.find('.'));
    std::uint32_t value = 0;
    for (const char digit : digits) {
      if (digit < '0' || digit > '9' || digits.size() > 5) throw Refusal(refusal);
      value = 10 * value + static_cast<std::uint32_t>(digit - '0');
    }
    if (digits.empty() || value > 0xFFFF) throw Refusal(refusal);
    number = static_cast<std::uint16_t>(value);
    if (digits.size() == left.size()) return numbers;
    left.remove_prefix(digits.size() + 1);
  }
  throw Refusal(refusal);
}

std::string VersionSection(std::uint32_t rva, const VersionTexts& texts) {
  const bool is_ascii = std::all_of(texts.description.begin(), texts.description.end(),
                                    [](char c) { return c >= ' ' && c <= '~'; });
  if (!is_ascii) throw Refusal("the description is not in ASCII");
  const std::string resource = Resource(texts);
  // Types, names of that type, languages of that name; then what the last one leads to.
  std::string section;
  Directory(section, kVersionType, kSubdirectory | kDirectorySize);
  Directory(section, kResourceName, kSubdirectory | (2 * kDirectorySize));
  Directory(section, kEnglish, 3 * kDirectorySize);
  Word(section, rva + 3 * kDirectorySize + kDataEntrySize);
  Word(section, static_cast<std::uint32_t>(resource.size()));
  Word(section, 0);  // code page
  Word(section, 0);
  return section + resource;
}

}  // namespace elf2pe

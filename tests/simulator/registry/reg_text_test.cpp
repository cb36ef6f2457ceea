#include "registry/reg_text.h"

#include <gtest/gtest.h>

#include <string>

#include "ce/system.h"
#include "text/names.h"

namespace {

using sim::FormatRegText;
using sim::KeyTree;
using sim::ParseRegText;
using sim::RegistryKey;
using sim::RegistryValue;

constexpr const char* kHeader = "Windows Registry Editor Version 5.00\n";
constexpr std::uint32_t kMachine = 0x80000002U;

const RegistryValue* FindValue(const KeyTree& tree, const KeyTree::Path& path,
                               std::u16string_view name) {
  const auto key = KeyTree::Find(tree.root(kMachine), path);
  if (key == nullptr) return nullptr;
  const auto value = key->values.find(sim::FoldCase(name));
  return value == key->values.end() ? nullptr : &value->second;
}

TEST(ParseRegTextTest, ReadsEveryKindOfValue) {
  KeyTree tree;
  std::string error;
  const std::string text = std::string(kHeader) +
                           "; a comment\n"
                           "\n"
                           "[HKEY_LOCAL_MACHINE\\Software\\Test]\n"
                           "@=\"default\"\n"
                           "\"Path\"=\"\\\\Program \\\"Files\\\"\"\n"
                           "\"Port\" = dword:0000fffE\n"
                           "\"Bytes\"=hex:01,a2,\\\n"
                           "  FF\n"
                           "\"Names\"=hex(7):41,00,00,00,00,00\n";

  ASSERT_TRUE(ParseRegText(text, tree, error)) << error;

  const KeyTree::Path path = {u"software", u"TEST"};
  EXPECT_EQ(FindValue(tree, path, u"")->type, REG_SZ);
  const RegistryValue* value = FindValue(tree, path, u"path");
  ASSERT_NE(value, nullptr);
  EXPECT_EQ(value->data.size(), 2 * sizeof(u"\\Program \"Files\"") / 2);
  value = FindValue(tree, path, u"port");
  EXPECT_EQ(value->type, REG_DWORD);
  EXPECT_EQ(value->data, (std::vector<BYTE>{0xFE, 0xFF, 0, 0}));
  value = FindValue(tree, path, u"bytes");
  EXPECT_EQ(value->type, REG_BINARY);
  EXPECT_EQ(value->data, (std::vector<BYTE>{0x01, 0xA2, 0xFF}));
  EXPECT_EQ(FindValue(tree, path, u"names")->type, REG_MULTI_SZ);
}

TEST(ParseRegTextTest, ReadsTheOlderHeaderOtherLineEndsAndUtf16) {
  const std::string text = "REGEDIT4\r\n\r\n[HKLM\\A]\r\n\"v\"=dword:1\r\n";
  std::string wide = "\xFF\xFE";
  for (const char letter : text) {
    wide += letter;
    wide += '\0';
  }
  for (const std::string& input : {text, "\xEF\xBB\xBF" + text, wide}) {
    KeyTree tree;
    std::string error;
    EXPECT_TRUE(ParseRegText(input, tree, error)) << error;
    EXPECT_NE(FindValue(tree, {u"A"}, u"v"), nullptr);
  }
}

TEST(ParseRegTextTest, DeletesKeysAndValues) {
  KeyTree tree;
  std::string error;
  const std::string text = std::string(kHeader) +
                           "[HKLM\\A]\n\"gone\"=dword:1\n\"kept\"=dword:1\n[HKLM\\B\\C]\n"
                           "[HKLM\\A]\n\"gone\"=-\n[-HKLM\\B]\n";

  ASSERT_TRUE(ParseRegText(text, tree, error)) << error;

  EXPECT_EQ(FindValue(tree, {u"A"}, u"gone"), nullptr);
  EXPECT_NE(FindValue(tree, {u"A"}, u"kept"), nullptr);
  EXPECT_EQ(KeyTree::Find(tree.root(kMachine), {u"B"}), nullptr);
}

TEST(ParseRegTextTest, NamesTheLineThatItDoesNotUnderstand) {
  const struct {
    const char* text;
    const char* line;
  } kCases[] = {
      {"no header\n", "line 1:"},
      {"REGEDIT4\n\nrubbish\n", "line 3:"},
      {"REGEDIT4\n\"v\"=dword:1\n", "line 2:"},  // before any key
      {"REGEDIT4\n[HKLM\\A\n", "line 2:"},       // no bracket
      {"REGEDIT4\n[HKEY_NOWHERE\\A]\n", "line 2:"},
      {"REGEDIT4\n[HKLM\\A\\\\B]\n", "line 2:"},  // an empty name
      {"REGEDIT4\n[-HKLM]\n", "line 2:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v=dword:1\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"dword:1\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=dword:\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=dword:123456789\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=dword:12x\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=\"open\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=\"a\\n\"\n", "line 3:"},  // no such escape
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=\"a\" b\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=hex(:00\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=hex:0102\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=hex:01;02\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=hex:01,\\", "line 3:"},  // cut off
      {"REGEDIT4\n[HKLM\\A]\n\"v\"=hex:01,\\\n  zz\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\A]\n\"\xFF\"=dword:1\n", "line 3:"},
      {"REGEDIT4\n[HKLM\\\xFF]\n", "line 2:"},
  };
  for (const auto& c : kCases) {
    KeyTree tree;
    std::string error;
    EXPECT_FALSE(ParseRegText(c.text, tree, error)) << c.text;
    EXPECT_EQ(error.rfind(c.line, 0), 0U) << c.text << " gives " << error;
  }
}

TEST(ParseRegTextTest, RefusesKeysThatLieTooDeepAndNamesThatAreTooLong) {
  std::string deep = std::string(kHeader) + "[HKLM";
  for (unsigned i = 0; i <= sim::kMaxRegistryDepth; ++i) deep += "\\k";
  KeyTree tree;
  std::string error;
  EXPECT_FALSE(ParseRegText(deep + "]\n", tree, error));
  const std::string name(sim::kMaxRegistryName + 1, 'n');
  EXPECT_FALSE(ParseRegText(std::string(kHeader) + "[HKLM\\" + name + "]\n", tree, error));
  EXPECT_FALSE(
      ParseRegText(std::string(kHeader) + "[HKLM\\A]\n\"" + name + "\"=dword:1\n", tree, error));
}

TEST(FormatRegTextTest, GivesATextThatReadsBackAsTheSameTree) {
  KeyTree tree;
  bool created = false;
  const auto key = KeyTree::Make(tree.root(kMachine), {u"Software", u"A]b \x3B1\xD800"}, created);
  const auto add = [&key](std::u16string name, DWORD type, std::vector<BYTE> data) {
    key->values[sim::FoldCase(name)] = {name, type, std::move(data)};
  };
  add(u"", REG_SZ, {'x', 0, 0, 0});
  add(u"quote\"back\\slash", REG_SZ, {'"', 0, '\\', 0, 0, 0});
  add(u"no zero", REG_SZ, {'x', 0});
  add(u"two zeros", REG_SZ, {0, 0, 0, 0});
  add(u"line end", REG_SZ, {'\n', 0, 0, 0});
  add(u"half a pair", REG_SZ, {0x00, 0xD8, 0, 0});
  add(u"odd", REG_SZ, {1});
  add(u"empty", REG_SZ, {});
  add(u"short dword", REG_DWORD, {1, 2});
  add(u"dword", REG_DWORD, {1, 2, 3, 4});
  add(u"strange type", 0xFFFFFFFF, {9});
  add(u"long", REG_BINARY, std::vector<BYTE>(100, 0xAB));
  static_cast<void>(KeyTree::Make(tree.root(kMachine), {u"Empty Key"}, created));

  const std::string text = FormatRegText(tree);
  KeyTree again;
  std::string error;
  ASSERT_TRUE(ParseRegText(text, again, error)) << error << '\n' << text;

  EXPECT_EQ(FormatRegText(again), text);
  for (const auto& [folded, value] : key->values) {
    const RegistryValue* read = FindValue(again, {u"software", key->name}, value.name);
    ASSERT_NE(read, nullptr) << sim::ToHostText(value.name);
    EXPECT_EQ(read->name, value.name);
    EXPECT_EQ(read->type, value.type) << sim::ToHostText(value.name);
    EXPECT_EQ(read->data, value.data) << sim::ToHostText(value.name);
  }
  EXPECT_NE(KeyTree::Find(again.root(kMachine), {u"EMPTY KEY"}), nullptr);
}

TEST(SplitKeyPathTest, IgnoresOneBackslashAtEitherEndAndRefusesMore) {
  EXPECT_EQ(sim::SplitKeyPath(u"\\A\\B\\"), (KeyTree::Path{u"A", u"B"}));
  EXPECT_EQ(sim::SplitKeyPath(u""), KeyTree::Path{});
  EXPECT_EQ(sim::SplitKeyPath(u"\\"), KeyTree::Path{});
  EXPECT_FALSE(sim::SplitKeyPath(u"\\\\A"));
  EXPECT_FALSE(sim::SplitKeyPath(u"A\\\\B"));
  EXPECT_FALSE(sim::SplitKeyPath(u"A\\\\"));
  EXPECT_FALSE(sim::SplitKeyPath(u"A\nB"));
}

}  // namespace

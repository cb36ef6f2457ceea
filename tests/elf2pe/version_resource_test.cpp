#include "tools/elf2pe/version_resource.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <optional>
#include <string>

#include "elf2pe/elf_file.h"
#include "tools/elf2pe/convert.h"
#include "tools/elf2pe/fields.h"
#include "tools/elf2pe/pe_reader.h"

namespace elf2pe {
namespace {

using ::testing::ElementsAre;

/// A node of the resource, found by its path of keys; "*" stands for any key.
struct Node {
  std::string value;
  std::uint32_t value_length = 0;
  std::uint32_t kind = 0;
};

std::uint32_t Half(const std::string& bytes, std::size_t at) {
  return WordAt(bytes + std::string(4, '\0'), at).value() & 0xFFFF;
}

std::string Narrow(const std::string& bytes, std::size_t at, std::size_t count) {
  std::string text;
  for (std::size_t i = 0; i < count; ++i) {
    text.push_back(static_cast<char>(Half(bytes, at + 2 * i)));
  }
  return text;
}

/// Reads as the system does: lengths lead from node to node.
std::optional<Node> Find(const std::string& bytes, std::size_t begin, std::size_t end,
                         const std::vector<std::string>& path, std::size_t depth = 0) {
  for (std::size_t at = begin; at + 6 <= end; at = RoundUp(static_cast<std::uint32_t>(at), 4)) {
    const std::size_t length = Half(bytes, at);
    EXPECT_GE(length, 6U);
    EXPECT_LE(at + length, end);
    if (length < 6 || at + length > end) return std::nullopt;
    Node node{"", Half(bytes, at + 2), Half(bytes, at + 4)};
    std::size_t key_length = 0;
    while (Half(bytes, at + 6 + 2 * key_length) != 0) ++key_length;
    const std::string key = Narrow(bytes, at + 6, key_length);
    const std::size_t value = RoundUp(static_cast<std::uint32_t>(at + 8 + 2 * key_length), 4);
    const std::size_t value_size = node.value_length * (node.kind == 1 ? 2 : 1);
    if (key == path[depth]) {
      node.value = bytes.substr(value, value_size);
      if (depth + 1 == path.size()) return node;
      return Find(bytes, RoundUp(static_cast<std::uint32_t>(value + value_size), 4), at + length,
                  path, depth + 1);
    }
    at += length;
  }
  return std::nullopt;
}

std::string Resource() {
  const std::string section = VersionSection(0x5000, {"3.44", "What it is", "toy.dll"});
  return section.substr(WordAt(section, 72).value() - 0x5000);
}

std::string TextAt(const std::vector<std::string>& path) {
  const std::string resource = Resource();
  const std::optional<Node> node = Find(resource, 0, resource.size(), path);
  if (!node) return "(nothing)";
  EXPECT_EQ(node->kind, 1U);
  return Narrow(node->value, 0, node->value_length - 1);
}

TEST(VersionSectionTest, LeadsThroughThreeDirectoriesToOneResource) {
  const std::string section = VersionSection(0x5000, {"3.44", "What it is", "toy.dll"});
  const auto word = [&section](std::size_t at) { return WordAt(section, at).value(); };
  EXPECT_EQ(word(12), 0x00010000U) << "one entry, with a number";
  EXPECT_EQ(word(16), 16U) << "the type of version resources";
  EXPECT_EQ(word(20), 0x80000000U + 24);
  EXPECT_EQ(word(24 + 16), 1U);
  EXPECT_EQ(word(24 + 20), 0x80000000U + 48);
  EXPECT_EQ(word(48 + 16), 0x409U);
  EXPECT_EQ(word(48 + 20), 72U);
  EXPECT_EQ(word(72), 0x5000U + 88) << "here alone an address counts from the image's begin";
  EXPECT_EQ(word(76), section.size() - 88);
}

TEST(VersionSectionTest, TellsTheVersionInNumbers) {
  const std::string resource = Resource();
  EXPECT_EQ(Half(resource, 0), resource.size());
  const std::optional<Node> root = Find(resource, 0, resource.size(), {"VS_VERSION_INFO"});
  ASSERT_TRUE(root.has_value());
  ASSERT_EQ(root->value.size(), 52U);
  EXPECT_EQ(WordAt(root->value, 0), 0xFEEF04BDU);
  EXPECT_EQ(WordAt(root->value, 8), 0x0003002CU) << "of the file";
  EXPECT_EQ(WordAt(root->value, 16), 0x0003002CU) << "of the product";
  EXPECT_EQ(WordAt(root->value, 36), 2U) << "a DLL";
}

TEST(VersionSectionTest, TellsTheVersionInWords) {
  const auto text = [](const char* key) {
    return TextAt({"VS_VERSION_INFO", "StringFileInfo", "040904B0", key});
  };
  EXPECT_EQ(text("FileDescription"), "What it is");
  EXPECT_EQ(text("FileVersion"), "3.44");
  EXPECT_EQ(text("ProductVersion"), "3.44");
  EXPECT_EQ(text("OriginalFilename"), "toy.dll");
  const std::string resource = Resource();
  const std::optional<Node> translation =
      Find(resource, 0, resource.size(), {"VS_VERSION_INFO", "VarFileInfo", "Translation"});
  ASSERT_TRUE(translation.has_value());
  EXPECT_EQ(WordAt(translation->value, 0), 0x04B00409U) << "where the table above is to be found";
}

TEST(VersionNumbersTest, TakesUpToFourNumbersOf16Bits) {
  EXPECT_THAT(VersionNumbers("3.44"), ElementsAre(3, 44, 0, 0));
  EXPECT_THAT(VersionNumbers("1.2.3.65535"), ElementsAre(1, 2, 3, 65535));
  for (const char* wrong : {"", ".", "1.", "1..2", "1.2.3.4.5", "65536", "000001", "1.x", "-1"}) {
    EXPECT_THROW(static_cast<void>(VersionNumbers(wrong)), Refusal) << wrong;
  }
}

TEST(ConvertTest, AddsAVersionResourceWhenThereIsAVersion) {
  DllOptions options;
  options.name = "toy.dll";
  options.exports = {"Alpha"};
  options.version = "3.44";
  const std::string dll = Convert(ReadLinkedImage(ToyImage().Bytes()), options);
  const PeImage image = ReadPe(dll);
  const auto resources =
      std::find_if(image.sections.begin(), image.sections.end(),
                   [](const PeSection& section) { return section.name == ".rsrc"; });
  ASSERT_NE(resources, image.sections.end());
  EXPECT_EQ(resources->bytes, VersionSection(resources->rva, {"3.44", "", "toy.dll"}));
  options.description = "caf\xe9";
  EXPECT_THROW(static_cast<void>(Convert(ReadLinkedImage(ToyImage().Bytes()), options)), Refusal);
}

}  // namespace
}  // namespace elf2pe

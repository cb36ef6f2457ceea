#include "tools/elf2pe/import_library.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "tools/elf2pe/coff_format.h"

namespace elf2pe {
namespace {

using ::testing::ElementsAre;

DllOptions ToyOptions() {
  DllOptions options;
  options.name = "toy.dll";
  options.exports = {"Beta", "Alpha"};
  return options;
}

struct Member {
  std::string name;
  std::size_t offset;
  std::string bytes;
};

std::vector<Member> MembersOf(const std::string& archive) {
  EXPECT_EQ(archive.substr(0, 8), coff::kArchiveMagic);
  std::vector<Member> members;
  std::size_t at = 8;
  while (at < archive.size()) {
    const std::string head = archive.substr(at, 60);
    EXPECT_EQ(head.substr(58), "`\n");
    const std::size_t size = std::stoul(head.substr(48, 10));
    members.push_back({head.substr(0, head.find(' ')), at, archive.substr(at + 60, size)});
    at += 60 + size + size % 2;
  }
  EXPECT_EQ(at, archive.size());
  return members;
}

/// The first table: symbol names, each with the offset of its member.
std::map<std::string, std::size_t> SymbolsOf(const std::string& table) {
  const auto word = [&table](std::size_t at) {
    std::size_t value = 0;
    for (std::size_t i = 0; i < 4; ++i) {
      value = value << 8 | static_cast<unsigned char>(table.at(at + i));
    }
    return value;
  };
  std::map<std::string, std::size_t> symbols;
  std::size_t text = 4 + 4 * word(0);
  for (std::size_t i = 0; i < word(0); ++i) {
    const std::string name = table.c_str() + text;
    symbols[name] = word(4 + 4 * i);
    text += name.size() + 1;
  }
  return symbols;
}

TEST(ImportLibraryTest, HasAMemberForEachFunction) {
  const std::vector<Member> members = MembersOf(MakeImportLibrary(ToyOptions()));

  ASSERT_EQ(members.size(), 2U + 3U + 2U);
  const std::string& alpha = members[5].bytes;
  const auto header = *Decode<coff::ImportHeader>(alpha, 0);
  EXPECT_EQ(members[5].name, "toy.dll/");
  EXPECT_EQ(header.first_signature, 0);
  EXPECT_EQ(header.second_signature, 0xFFFF);
  EXPECT_EQ(header.machine, pe::kMachineArm);
  EXPECT_EQ(header.time_stamp, 0U);
  EXPECT_EQ(header.kind, 4) << "code, by its very name";
  EXPECT_EQ(header.size, alpha.size() - 20);
  EXPECT_EQ(alpha.substr(20), std::string("Alpha\0toy.dll\0", 14));
  EXPECT_EQ(members[6].bytes.substr(20), std::string("Beta\0toy.dll\0", 13));
  EXPECT_EQ(Decode<coff::ImportHeader>(members[6].bytes, 0)->hint, 1);
}

TEST(ImportLibraryTest, FindsEverySymbolInItsMember) {
  const std::vector<Member> members = MembersOf(MakeImportLibrary(ToyOptions()));

  const std::map<std::string, std::size_t> expected = {
      {"__IMPORT_DESCRIPTOR_toy", members[2].offset},
      {"__NULL_IMPORT_DESCRIPTOR", members[3].offset},
      {"\x7ftoy_NULL_THUNK_DATA", members[4].offset},
      {"Alpha", members[5].offset},
      {"__imp_Alpha", members[5].offset},
      {"Beta", members[6].offset},
      {"__imp_Beta", members[6].offset},
  };
  EXPECT_EQ(SymbolsOf(members[0].bytes), expected);
}

TEST(ImportLibraryTest, HasASecondTableThatIsSorted) {
  const std::vector<Member> members = MembersOf(MakeImportLibrary(ToyOptions()));
  const std::string& table = members[1].bytes;

  EXPECT_EQ(members[1].name, "/");
  ASSERT_EQ(*WordAt(table, 0), 5U) << "members";
  for (std::size_t i = 0; i < 5; ++i) {
    EXPECT_EQ(*WordAt(table, 4 + 4 * i), members[i + 2].offset);
  }
  ASSERT_EQ(*WordAt(table, 24), 7U) << "symbols";
  std::vector<std::string> names;
  for (std::size_t text = 28 + 2 * 7; text < table.size(); text += names.back().size() + 1) {
    names.emplace_back(table.c_str() + text);
  }
  EXPECT_THAT(names,
              ElementsAre("Alpha", "Beta", "__IMPORT_DESCRIPTOR_toy", "__NULL_IMPORT_DESCRIPTOR",
                          "__imp_Alpha", "__imp_Beta", "\x7ftoy_NULL_THUNK_DATA"));
  EXPECT_EQ(table[28], 4) << "Alpha is in the fourth member";
}

TEST(ImportLibraryTest, DescribesTheDllByThreeRelocatedFields) {
  const std::vector<Member> members = MembersOf(MakeImportLibrary(ToyOptions()));
  const std::string& object = members[2].bytes;

  const auto header = *Decode<pe::FileHeader>(object, 0);
  EXPECT_EQ(header.machine, pe::kMachineArm);
  ASSERT_EQ(header.section_count, 2);
  const auto descriptor = *Decode<pe::SectionHeader>(object, 20);
  EXPECT_EQ(std::string(descriptor.name.data(), 8), ".idata$2");
  EXPECT_EQ(descriptor.raw_size, 20U);
  ASSERT_EQ(descriptor.relocation_count, 3);
  const std::vector<std::pair<std::uint32_t, std::string>> fields = {
      {12, ".idata$6"}, {0, ".idata$4"}, {16, ".idata$5"}};
  for (std::size_t i = 0; i < fields.size(); ++i) {
    const auto relocation =
        *Decode<coff::Relocation>(object, descriptor.relocations_offset + 10 * i);
    const auto symbol = *Decode<coff::Symbol>(object, header.symbol_table + 18 * relocation.symbol);
    const std::size_t texts = header.symbol_table + 18 * header.symbol_count;
    EXPECT_EQ(relocation.at, fields[i].first);
    EXPECT_EQ(relocation.type, coff::kRelocationImageRelative);
    EXPECT_EQ(std::string(object.c_str() + texts + symbol.name), fields[i].second);
  }
  const auto name = *Decode<pe::SectionHeader>(object, 60);
  EXPECT_EQ(object.substr(name.raw_offset, name.raw_size), std::string("toy.dll\0", 8));
}

TEST(ImportLibraryTest, KeepsNamesThatDoNotFitTheHeadOfAMember) {
  DllOptions options = ToyOptions();
  options.name = "quite_a_long_name.dll";

  const std::vector<Member> members = MembersOf(MakeImportLibrary(options));

  EXPECT_EQ(members[2].name, "//");
  EXPECT_EQ(members[2].bytes, std::string("quite_a_long_name.dll\0", 22));
  EXPECT_EQ(members[3].name, "/0");
  EXPECT_EQ(SymbolsOf(members[0].bytes).at("Alpha"), members[6].offset);
}

TEST(ImportLibraryTest, RefusesTheSameAsTheConverter) {
  DllOptions options = ToyOptions();
  options.exports = {"A", "A"};
  EXPECT_THROW(static_cast<void>(MakeImportLibrary(options)), Refusal);
}

}  // namespace
}  // namespace elf2pe

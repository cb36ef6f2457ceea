#include "tools/elf2pe/pe_reader.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "elf2pe/elf_file.h"
#include "tools/elf2pe/convert.h"
#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_writer.h"

namespace elf2pe {
namespace {

constexpr std::size_t kFileHeader = 0x84;
constexpr std::size_t kOptional = kFileHeader + 20;
constexpr std::size_t kDirectories = kOptional + 96;
constexpr std::size_t kSections = kOptional + 224;
constexpr std::size_t kText = 0x400;
constexpr std::size_t kExports = 0xA00;
constexpr std::size_t kImports = 0xC00;
constexpr std::size_t kResources = 0xE00;
constexpr std::size_t kRelocations = 0x1000;

std::string Toy() {
  DllOptions options;
  options.name = "toy.dll";
  options.version = "3.44";
  options.exports = {"Alpha", "Beta", "Counter"};
  return Convert(ReadLinkedImage(ToyImage().Bytes()), options);
}

std::string Refused(const std::string& bytes) {
  try {
    static_cast<void>(ReadPe(bytes));
  } catch (const Refusal& refusal) {
    return refusal.what();
  }
  return "taken";
}

/// Changes bytes of the DLL and mends its checksum. @return why it is not taken then
std::string With(const std::function<void(std::string&)>& change) {
  std::string dll = Toy();
  change(dll);
  const std::size_t field = kOptional + pe::kChecksumOffset;
  if (dll.size() > field + 4) SetWord(dll, field, PeChecksum(dll, field));
  return Refused(dll);
}

std::string WithWord(std::size_t at, std::uint32_t word) {
  return With([=](std::string& dll) { SetWord(dll, at, word); });
}

std::string WithByte(std::size_t at, int byte) {
  return With([=](std::string& dll) { dll.at(at) = static_cast<char>(byte); });
}

TEST(ReadPeTest, TakesWhatTheConverterWrites) {
  EXPECT_EQ(Refused(Toy()), "taken");
}

TEST(ReadPeTest, RefusesOtherMachinesSystemsAndVersions) {
  EXPECT_EQ(WithByte(kFileHeader, 0xC4), "the image is for machine 0x1c4, neither 0x1c0 nor 0x1c2");
  EXPECT_EQ(WithByte(kFileHeader + 18, 0x0F), "the header's characteristics is 0x210f, not 0x210e");
  EXPECT_EQ(WithWord(kFileHeader + 4, 1700000000),
            "the header's time stamp is 0x6553f100, not 0x0");
  EXPECT_EQ(WithByte(kOptional + 68, 3), "the header's subsystem is 0x3, not 0x9");
  EXPECT_EQ(WithByte(kOptional + 48, 6), "the header's subsystem version is 0x6, not 0x5");
  EXPECT_EQ(WithByte(kOptional, 0x07), "the header's magic number is 0x107, not 0x10b");
  EXPECT_EQ(WithWord(kOptional + 32, 0x2000),
            "the header's section alignment is 0x2000, not 0x1000");
  EXPECT_EQ(WithWord(kOptional + 28, 0x10001000), "no image can be at its image base 0x10001000");
  EXPECT_EQ(WithWord(kOptional + 28, 0), "no image can be at its image base 0x0");
  EXPECT_EQ(WithWord(kOptional + 92, 17), "the header's number of directories is 0x11, not 0x10");
}

TEST(ReadPeTest, RefusesAWrongChecksum) {
  std::string dll = Toy();
  dll.at(kText + 3) ^= 1;
  EXPECT_THAT(Refused(dll), ::testing::StartsWith("the header's checksum is 0x"));
}

TEST(ReadPeTest, RefusesADamagedStart) {
  EXPECT_EQ(WithByte(0, 'Z'), "the file does not begin as a DLL of this system");
  EXPECT_EQ(WithByte(0x3C, 0x40), "the file does not begin as a DLL of this system");
  EXPECT_EQ(WithByte(0x80, 'N'), "the file is no PE image");
  EXPECT_EQ(Refused(""), "the file does not begin as a DLL of this system");
  EXPECT_EQ(Refused(Toy().substr(0, 0x90)), "the file ends within its header");
  EXPECT_EQ(Refused(Toy().substr(0, 0xA0)), "the file ends within its optional header");
}

TEST(ReadPeTest, RefusesSectionsOfOtherNamesKindsAndPlaces) {
  constexpr std::size_t kData = kSections + 2 * 40;
  EXPECT_EQ(WithByte(kSections + 1, 'T'), "section '.Text' is unknown or not in its place");
  EXPECT_EQ(With([](std::string& dll) { dll.replace(kData, 8, std::string(".rdata\0\0", 8)); }),
            "section '.rdata' is unknown or not in its place");
  EXPECT_EQ(WithByte(kData + 39, 0xE0), "section .data has characteristics of another kind");
  EXPECT_EQ(WithWord(kData + 12, 0x2000), "section .data is at a wrong place in memory");
  EXPECT_EQ(WithWord(kData + 12, 0x3800), "section .data is at a wrong place in memory");
  EXPECT_EQ(WithWord(kData + 8, 0), "section .data is at a wrong place in memory");
  EXPECT_EQ(WithWord(kData + 8, 0xFFFFF000), "section .data is at a wrong place in memory");
  EXPECT_EQ(WithWord(kData + 16, 0x201), "section .data has a wrong size in the file");
  EXPECT_EQ(WithWord(kData + 20, 0x400), "section .data is at a wrong place in the file");
  EXPECT_EQ(WithWord(kSections + 8, 4), "section .text is larger in the file than in memory");
  EXPECT_EQ(WithByte(kFileHeader + 2, 0), "the image has 0 sections");
  EXPECT_EQ(WithByte(kFileHeader + 2, 17), "the image has 17 sections");
  EXPECT_EQ(WithByte(kFileHeader + 2, 5), "the headers do not have the size that they say");
  EXPECT_EQ(With([](std::string& dll) { dll += std::string(512, '\0'); }),
            "the file does not end with its last section");
  EXPECT_EQ(With([](std::string& dll) { dll.resize(dll.size() - 512); }),
            "section .reloc is at a wrong place in the file");
  EXPECT_EQ(WithWord(kOptional + 56, 0x10000), "the header's image size is 0x10000, not 0xa000");
  EXPECT_EQ(WithWord(kOptional + 60, 0x200), "section .text is at a wrong place in the file");
}

TEST(ReadPeTest, RefusesDirectoriesOutsideTheirSections) {
  EXPECT_EQ(WithWord(kDirectories, 0x1000), "directory 0 is not where it belongs");
  EXPECT_EQ(WithWord(kDirectories + 4, 0x1000), "directory 0 is not where it belongs");
  EXPECT_EQ(WithWord(kDirectories + 8, 0), "directory 1 is not where it belongs");
  EXPECT_EQ(WithWord(kDirectories + 9 * 8, 0x1000), "directory 9 is not where it belongs")
      << "thread-local variables";
  EXPECT_EQ(WithWord(kDirectories + 2 * 8, 0x3000), "directory 2 is not where it belongs");
  EXPECT_EQ(WithWord(kDirectories + 5 * 8 + 4, 8),
            "the relocations do not have the size that they say");
}

TEST(ReadPeTest, RefusesAnEntryPointOutsideTheCode) {
  EXPECT_EQ(WithWord(kOptional + 16, 0), "the entry point 0x0 is no instruction in .text");
  EXPECT_EQ(WithWord(kOptional + 16, 0x1002), "the entry point 0x1002 is no instruction in .text");
  EXPECT_EQ(WithWord(kOptional + 16, 0x1030), "the entry point 0x1030 is no instruction in .text");
}

TEST(ReadPeTest, RefusesExportsOfOtherKinds) {
  EXPECT_EQ(WithWord(kExports + 16, 2), "the table of exports is of an unknown kind");
  EXPECT_EQ(WithWord(kExports + 20, 2), "the table of exports is of an unknown kind");
  EXPECT_EQ(With([](std::string& dll) {
              SetWord(dll, kExports + 20, 0xFFFF);
              SetWord(dll, kExports + 24, 0xFFFF);
            }),
            "a name lies outside section .edata");
  EXPECT_EQ(WithWord(kExports + 12, 0x1000), "a name lies outside section .edata");
  EXPECT_EQ(WithWord(kExports + 28, 0x1000), "section .edata ends within a table");
  EXPECT_EQ(WithWord(kExports + 36, 0xFFFFFFFF), "section .edata ends within a table");
  EXPECT_EQ(WithWord(kExports + 40, 0x6050),
            "export 'Alpha' is at 0x6050, where no function or variable can be")
      << "a name of another DLL instead of code";
  EXPECT_EQ(WithWord(kExports + 40, 0x100a),
            "export 'Alpha' is at 0x100a, where no function or variable can be");
  EXPECT_EQ(With([](std::string& dll) { dll[dll.find("Beta")] = 'A'; }),
            "export 'Aeta' is not in the order of the names");
  EXPECT_EQ(WithWord(kExports + 64, 0x00010001), "the ordinals of the exports are wrong");
  EXPECT_EQ(WithWord(kExports + 64, 0x00010003), "the ordinals of the exports are wrong");
  EXPECT_EQ(With([](std::string& dll) { dll[dll.find("Alpha")] = 'C'; }),
            "export 'Beta' is not in the order of the names");
  EXPECT_EQ(With([](std::string& dll) { dll[dll.find("Alpha")] = '\n'; }),
            "section .edata has a bad name: '?lpha'");
  EXPECT_EQ(With([](std::string& dll) { dll[dll.find("Counter") + 7] = '!'; }),
            "a name in section .edata has no end");
}

TEST(ReadPeTest, RefusesImportsOfOtherKinds) {
  constexpr std::size_t kLookup = kImports + 60;
  EXPECT_EQ(WithWord(kLookup, 0x80000001), "the two tables of imports from 'COREDLL.dll' differ");
  EXPECT_EQ(With([](std::string& dll) {
              SetWord(dll, kLookup, 0x80000001);
              SetWord(dll, kLookup + 20, 0x80000001);
            }),
            "an import from 'COREDLL.dll' is by number");
  EXPECT_EQ(WithWord(kImports + 4, 1), "the imports from 'COREDLL.dll' are of an unknown kind")
      << "bound";
  EXPECT_EQ(WithWord(kImports + 8, 0xFFFFFFFF),
            "the imports from 'COREDLL.dll' are of an unknown kind")
      << "forwarded";
  EXPECT_EQ(WithWord(kImports + 16, 0x7000),
            "the imports from 'COREDLL.dll' are of an unknown kind");
  EXPECT_EQ(WithWord(kImports, 0xFFFFFFF0), "section .idata ends within a table");
  EXPECT_EQ(WithWord(kImports, 0), "an import descriptor lacks its lookup table");
  EXPECT_EQ(WithWord(kImports + 20, 0), "an import descriptor lacks its lookup table");
  EXPECT_EQ(With([](std::string& dll) { dll[dll.find("Sleep") - 2] = 7; }),
            "an import from 'COREDLL.dll' has a hint");
  EXPECT_EQ(WithWord(kDirectories + 12, 0x28),
            "the tables of imports do not have the size that they say");
}

TEST(ReadPeTest, RefusesResourcesButAVersion) {
  constexpr const char* kRefused = "the image has resources besides a version";
  EXPECT_EQ(WithByte(kResources + 16, 3), kRefused) << "an icon";
  EXPECT_EQ(WithByte(kResources + 14, 2), kRefused) << "two of them";
  EXPECT_EQ(WithWord(kResources + 72, 0x1000), kRefused) << "somewhere else";
  EXPECT_EQ(WithWord(kResources + 76, 0x7FFFFFFF), kRefused) << "of another size";
  EXPECT_EQ(WithWord(kDirectories + 2 * 8 + 4, 16),
            "the resources do not have the size that they say");
}

TEST(ReadPeTest, RefusesRelocationsOfOtherKinds) {
  // The first page has four: 0x1020 to 0x102C.
  EXPECT_EQ(WithWord(kRelocations + 4, 0), "the relocations of page 0x1000 are damaged");
  EXPECT_EQ(WithWord(kRelocations + 4, 6), "the relocations of page 0x1000 are damaged");
  EXPECT_EQ(WithWord(kRelocations + 4, 0xFFFFFFF0), "the relocations of page 0x1000 are damaged");
  EXPECT_EQ(WithWord(kRelocations, 0x1004), "the relocations of page 0x1004 are damaged");
  EXPECT_EQ(WithWord(kRelocations + 16, 0x1000), "the relocations of page 0x1000 are damaged");
  EXPECT_EQ(WithByte(kRelocations + 9, 0x50), "a relocation of page 0x1000 is of an unknown kind");
  EXPECT_EQ(WithByte(kRelocations + 8, 0x24), "the relocations are not in order at 0x1024");
  EXPECT_EQ(WithByte(kRelocations + 8, 0x21), "there is no word to relocate at 0x1021");
  EXPECT_EQ(WithWord(kRelocations, 0x7000), "there is no word to relocate at 0x7020");
  EXPECT_EQ(WithWord(kRelocations, 0x4000), "there is no word to relocate at 0x4020")
      << "among the zeros";
  EXPECT_EQ(WithByte(kRelocations + 8, 0x00), "the word at 0x1000 points out of the image");
}

TEST(ReadPeTest, ReadsNoByteBehindTheEndWhereverTheFileIsCut) {
  const std::string whole = Toy();
  for (std::size_t size = 0; size < whole.size(); size += 3) {
    EXPECT_NE(Refused(std::string(whole, 0, size)), "taken") << size;
  }
}

TEST(MemoryImageTest, LaysSectionsOutByPages) {
  const std::string dll = Toy();
  const PeImage image = ReadPe(dll);

  const std::string memory = MemoryImage(image, image.image_base);

  EXPECT_EQ(memory.size(), image.image_size);
  EXPECT_EQ(memory.substr(0, 0x200), dll.substr(0, 0x200));
  EXPECT_EQ(memory.substr(0x2004, 9), "constant!");
  EXPECT_EQ(memory.find_first_not_of('\0', 0x3008), 0x600CU) << "exports behind the zeros";
}

}  // namespace
}  // namespace elf2pe

#include "tools/elf2pe/convert.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "elf2pe/elf_file.h"
#include "tools/elf2pe/pe_reader.h"

namespace elf2pe {
namespace {

using ::testing::ElementsAre;

DllOptions ToyOptions() {
  DllOptions options;
  options.name = "toy.dll";
  options.exports = {"Beta", "Alpha", "Counter"};
  return options;
}

std::string ToyDll(const ElfFile& file = ToyImage(), const DllOptions& options = ToyOptions()) {
  return Convert(ReadLinkedImage(file.Bytes()), options);
}

const PeSection& Section(const PeImage& image, const std::string& name) {
  return *std::find_if(image.sections.begin(), image.sections.end(),
                       [&name](const PeSection& section) { return section.name == name; });
}

std::uint32_t Word(const PeImage& image, std::uint32_t rva) {
  return *WordAt(MemoryImage(image, image.image_base), rva);
}

TEST(ConvertTest, KeepsEverySectionWhereTheLinkerPutIt) {
  const std::string dll = ToyDll();
  const PeImage image = ReadPe(dll);

  std::vector<std::string> names;
  for (const PeSection& section : image.sections) names.push_back(section.name);
  EXPECT_THAT(names, ElementsAre(".text", ".rdata", ".data", ".edata", ".idata", ".reloc"));
  EXPECT_EQ(image.image_base, 0x10000000U);
  EXPECT_EQ(image.entry, 0x1000U);
  EXPECT_EQ(Section(image, ".text").rva, 0x1000U);
  EXPECT_EQ(Section(image, ".rdata").rva, 0x2000U);
  EXPECT_EQ(Section(image, ".rdata").bytes.substr(4), "constant!");
  EXPECT_EQ(Section(image, ".data").rva, 0x3000U);
}

TEST(ConvertTest, MakesZerosTheTailOfTheData) {
  const std::string dll = ToyDll();
  const PeImage image = ReadPe(dll);

  EXPECT_EQ(Section(image, ".data").virtual_size, 0x2800U);
  EXPECT_EQ(Section(image, ".data").bytes.size(), 0x200U) << "the file has whole blocks";
  EXPECT_EQ(Section(image, ".edata").rva, 0x6000U);
}

TEST(ConvertTest, MakesDataOfZerosAlone) {
  ElfFile file = ToyImage();
  file.relocations.pop_back();
  // An empty section leaves no trace; the zeros follow the constants.
  ElfFile::Section& data = file.Named(".data");
  data.bytes.clear();
  for (const char* name : {".bss", ".idata$COREDLL.dll", ".idata$WS2.dll"}) {
    file.Named(name).header.address -= 0x1000;
  }
  for (ElfFile::Symbol& symbol : file.symbols) {
    if (symbol.record.value >= 0x10004000) symbol.record.value -= 0x1000;
  }
  std::string& text = file.Named(".text").bytes;
  for (const std::size_t at : {36, 40, 44}) SetWord(text, at, *WordAt(text, at) - 0x1000);

  const std::string dll = ToyDll(file);
  const PeImage image = ReadPe(dll);

  EXPECT_EQ(Section(image, ".data").rva, 0x3000U);
  EXPECT_EQ(Section(image, ".data").virtual_size, 0x1800U);
  EXPECT_TRUE(Section(image, ".data").bytes.empty());
  EXPECT_EQ(image.exports.back().rva, 0x3000U);
}

TEST(ConvertTest, SortsExportsByTheBytesOfTheirNames) {
  ElfFile file = ToyImage();
  file.AddSymbol("alpha", 1, 0x10001014, elf::kWeak);
  DllOptions options = ToyOptions();
  options.exports = {"alpha", "Counter", "Beta", "Alpha"};

  const std::string dll = ToyDll(file, options);
  const PeImage image = ReadPe(dll);

  EXPECT_EQ(image.dll_name, "toy.dll");
  std::vector<std::string> names;
  for (const PeExport& one : image.exports) names.push_back(one.name);
  EXPECT_THAT(names, ElementsAre("Alpha", "Beta", "Counter", "alpha")) << "capitals come first";
  EXPECT_EQ(image.exports[0].rva, 0x1008U);
  EXPECT_EQ(image.exports[2].rva, 0x4000U) << "a variable among the zeros";
}

TEST(ConvertTest, ImportsByNameFromEachDll) {
  const std::string dll = ToyDll();
  const PeImage image = ReadPe(dll);

  ASSERT_EQ(image.imports.size(), 2U);
  EXPECT_EQ(image.imports[0].name, "COREDLL.dll");
  ASSERT_EQ(image.imports[0].functions.size(), 2U);
  EXPECT_EQ(image.imports[0].functions[0].name, "GetTickCount");
  EXPECT_EQ(image.imports[0].functions[1].name, "Sleep");
  EXPECT_EQ(image.imports[1].name, "WS2.dll");
  ASSERT_EQ(image.imports[1].functions.size(), 1U);
  EXPECT_EQ(image.imports[1].functions[0].name, "send");
}

TEST(ConvertTest, PointsWordsAtImportSlotsInsteadOfTheirPlaceholders) {
  const std::string dll = ToyDll();
  const PeImage image = ReadPe(dll);

  const std::uint32_t sleep = image.image_base + image.imports[0].functions[1].slot;
  EXPECT_EQ(Word(image, 0x1024), sleep);
  EXPECT_EQ(Word(image, 0x102C), sleep);
  EXPECT_EQ(Word(image, 0x1028), image.image_base + image.imports[1].functions[0].slot);
  EXPECT_EQ(Word(image, 0x1020), 0x10002004U) << "all other words stay as they are";
}

TEST(ConvertTest, RelocatesEveryWordThatHoldsAnAddressAndNothingElse) {
  const std::string dll = ToyDll();
  const PeImage image = ReadPe(dll);

  EXPECT_THAT(image.relocations, ElementsAre(0x1020, 0x1024, 0x1028, 0x102C, 0x2000, 0x3000));
  const std::string moved = MemoryImage(image, 0x7f230000);
  EXPECT_EQ(*WordAt(moved, 0x2000), 0x7f231008U);
  EXPECT_EQ(*WordAt(moved, 0x3000), 0x7f235800U) << "behind the last of the zeros";
  EXPECT_EQ(*WordAt(moved, 0x3004), 17U);
  EXPECT_EQ(*WordAt(moved, 0x1000), 0xEB000000U) << "branches go by distance";
}

TEST(ConvertTest, SaysMachineAndBaseAsTold) {
  DllOptions options = ToyOptions();
  options.machine = pe::kMachineThumb;

  const std::string dll = ToyDll(ToyImage(0x20000000), options);
  const PeImage image = ReadPe(dll);

  EXPECT_EQ(image.machine, 0x1C2);
  EXPECT_EQ(image.image_base, 0x20000000U);
}

TEST(ConvertTest, MakesTheSameBytesOfTheSameInput) {
  EXPECT_EQ(ToyDll(), ToyDll());
}

TEST(ConvertTest, DoesWithoutImports) {
  ElfFile file = ToyImage();
  file.sections.erase(file.sections.begin() + 5, file.sections.end());
  file.symbols.erase(file.symbols.begin() + 8, file.symbols.end());
  auto& words = file.relocations[0].entries;
  words.erase(words.begin() + 4, words.end());

  const std::string dll = ToyDll(file);

  EXPECT_TRUE(ReadPe(dll).imports.empty());
}

std::string OptionsRefused(const DllOptions& options) {
  try {
    return "taken, " + std::to_string(ToyDll(ToyImage(), options).size()) + " bytes";
  } catch (const Refusal& refusal) {
    return refusal.what();
  }
}

TEST(ConvertTest, RefusesExportsThatTheImageDoesNotOffer) {
  DllOptions options = ToyOptions();
  options.exports = {"Gamma"};
  EXPECT_EQ(OptionsRefused(options), "the image does not define the export 'Gamma'");
  options.exports = {"Local"};
  EXPECT_EQ(OptionsRefused(options), "the image does not define the export 'Local'");
  options.exports = {"__imp_Sleep"};
  EXPECT_EQ(OptionsRefused(options), "the image does not define the export '__imp_Sleep'");
  options.exports = {"Alpha", "Beta", "Alpha"};
  EXPECT_EQ(OptionsRefused(options), "the exports name 'Alpha' twice");
  options.exports = {"Al pha"};
  EXPECT_EQ(OptionsRefused(options), "nothing can be exported as 'Al pha'");
  options.exports = {};
  EXPECT_EQ(OptionsRefused(options), "the list of exports is empty");
  options.exports.assign(70000, "x");
  EXPECT_EQ(OptionsRefused(options), "there are too many exports");
}

TEST(ConvertTest, RefusesMachinesAndNamesThatNoDllHas) {
  DllOptions options = ToyOptions();
  options.machine = 0x1C4;
  EXPECT_EQ(OptionsRefused(options), "machine 0x1c4 is neither 0x1c0 nor 0x1c2");
  options = ToyOptions();
  options.name = "";
  EXPECT_EQ(OptionsRefused(options), "no DLL can be called ''");
}

TEST(ReadExportListTest, TakesOneNameALineAndNoComments) {
  EXPECT_THAT(ReadExportList("# all of them\n\nAlpha\r\n  \nBeta # the other\nGamma"),
              ElementsAre("Alpha", "Beta", "Gamma"));
  EXPECT_THAT(ReadExportList(""), ElementsAre());
}

}  // namespace
}  // namespace elf2pe

// One thing wrong at a time, and the line that says so.
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "elf2pe/elf_file.h"
#include "tools/elf2pe/linked_image.h"

namespace elf2pe {
namespace {

constexpr std::uint32_t kText = 0x10001000;

/// @return why the file is not taken; "taken" when it is
std::string Refused(const std::string& bytes) {
  try {
    static_cast<void>(ReadLinkedImage(bytes));
  } catch (const Refusal& refusal) {
    return refusal.what();
  }
  return "taken";
}

struct Spoiled {
  const char* expected;
  std::function<void(ElfFile&)> spoil;
};

void ExpectRefused(const std::vector<Spoiled>& cases) {
  ASSERT_EQ(Refused(ToyImage().Bytes()), "taken");
  for (const Spoiled& one : cases) {
    ElfFile file = ToyImage();
    one.spoil(file);
    EXPECT_EQ(Refused(file.Bytes()), one.expected);
  }
}

TEST(ElfRefusalTest, RefusesFilesOfOtherKinds) {
  ExpectRefused({
      {"this is no ELF file", [](ElfFile& f) { f.header.magic[1] = 'e'; }},
      {"the ELF file is not a 32-bit little-endian one of version 1 and no system",
       [](ElfFile& f) { f.header.identity[0] = 2; }},
      {"the ELF file is not a 32-bit little-endian one of version 1 and no system",
       [](ElfFile& f) { f.header.identity[3] = 3; }},
      {"the ELF file is for machine 62, not for ARM (40)",
       [](ElfFile& f) { f.header.machine = 62; }},
      {"the ELF file is of type 1, not a linked image (2)", [](ElfFile& f) { f.header.type = 1; }},
      {"the ELF file is of type 3, not a linked image (2)", [](ElfFile& f) { f.header.type = 3; }},
      {"the ELF file has flags 0x5800200, not those of software floating point in version 5 of the "
       "EABI",
       [](ElfFile& f) { f.header.flags |= 0x00800000; }},
      {"the ELF file has flags 0x200, not those of software floating point in version 5 of the "
       "EABI",
       [](ElfFile& f) { f.header.flags = 0x200; }},
      {"the ELF file has headers of an unknown size or version",
       [](ElfFile& f) { f.header.section_size = 41; }},
  });
  EXPECT_EQ(Refused(""), "this is no ELF file");
}

TEST(ElfRefusalTest, RefusesHeadersThatLie) {
  ExpectRefused({
      {"section 1 lies behind the end of the ELF file",
       [](ElfFile& f) {
         f.Named(".text").header.size = 0x7FFFFFFF;
         f.Named(".text").keep_size = true;
       }},
      {"section 2 lies behind the end of the ELF file",
       [](ElfFile& f) {
         f.Named(".rdata").header.offset = 0xFFFFFFF0;
         f.Named(".rdata").keep_offset = true;
       }},
      {"'the file's header' and '.rdata' overlap in the ELF file",
       [](ElfFile& f) {
         f.Named(".rdata").header.offset = 16;
         f.Named(".rdata").keep_offset = true;
       }},
      {"'.text' and '.rdata' overlap in the ELF file",
       [](ElfFile& f) {
         f.Named(".rdata").header.offset = 56;
         f.Named(".rdata").keep_offset = true;
       }},
      {"the first section of the ELF file is not the empty one",
       [](ElfFile& f) { f.sections[0].header.type = elf::kProgramBits; }},
      {"the relocation at 0x10001000 is of a symbol that is not there",
       [](ElfFile& f) { f.relocations[0].entries[0].symbol = 12345; }},
      {"section '.rel' relocates no section", [](ElfFile& f) { f.relocations[0].section = 99; }},
      {"symbol 'Alpha' is in section 77, which there is not",
       [](ElfFile& f) { f.SymbolNamed("Alpha").record.section = 77; }},
      {"symbol 'Alpha' is in section 65522, which there is not",
       [](ElfFile& f) { f.SymbolNamed("Alpha").record.section = 0xFFF2; }},
      {"symbol 'Alpha' is of an unknown kind (0xa2)",
       [](ElfFile& f) { f.SymbolNamed("Alpha").record.info = 0xA2; }},
      {"symbol 'Alpha' lies outside its section",
       [](ElfFile& f) { f.SymbolNamed("Alpha").record.value = 0x10002000; }},
      {"the ELF file has two symbol tables",
       [](ElfFile& f) { f.Named(".comment").header.type = elf::kSymbolTable; }},
  });
}

TEST(ElfRefusalTest, ReadsNoByteBehindTheEndWhereverTheFileIsCut) {
  const std::string whole = ToyImage().Bytes();
  for (std::size_t size = 0; size < whole.size(); ++size) {
    EXPECT_NE(Refused(std::string(whole, 0, size)), "taken") << size;
  }
}

TEST(ElfRefusalTest, RefusesSectionsThatADllDoesNotHave) {
  constexpr std::uint32_t kData = elf::kAllocate | elf::kWrite;
  ExpectRefused({
      {"section '.init_array' is not one that a DLL has",
       [](ElfFile& f) { f.AddSection(".init_array", kData, 0x10008000, "1234"); }},
      {"section '.ARM.exidx' is not one that a DLL has",
       [](ElfFile& f) { f.Named(".rdata").name = ".ARM.exidx"; }},
      {"section '.data' is not in its place",
       [](ElfFile& f) { f.AddSection(".data", kData, 0x10008000, "1234"); }},
      {"section '.rdata' is not in its place",
       [](ElfFile& f) {
         std::swap(f.Named(".rdata").name, f.Named(".data").name);
         f.Named(".data").header.flags |= elf::kWrite;
       }},
      {"the ELF file has no section .text", [](ElfFile& f) { f.Named(".text").header.flags = 0; }},
      {"section '.text' is of a wrong kind (type 1, flags 0x7)",
       [](ElfFile& f) { f.Named(".text").header.flags |= elf::kWrite; }},
      {"section '.data' is of a wrong kind (type 1, flags 0x403)",
       [](ElfFile& f) { f.Named(".data").header.flags |= 0x400; }},
      {"section '.bss' is of a wrong kind (type 1, flags 0x3)",
       [](ElfFile& f) {
         f.Named(".bss").header.type = elf::kProgramBits;
         f.Named(".bss").bytes = "1234";
         f.Named(".bss").keep_size = false;
       }},
      {"section '.rdata' is of a wrong kind (type 8, flags 0x2)",
       [](ElfFile& f) { f.Named(".rdata").header.type = elf::kNoBits; }},
  });
}

TEST(ElfRefusalTest, RefusesSectionsAtPlacesThatTheImageCannotHave) {
  ExpectRefused({
      {"section .text is at 0x10002000, not one page behind a multiple of 64 KiB",
       [](ElfFile& f) { f.Named(".text").header.address = 0x10002000; }},
      {"section .text is at 0x0, not one page behind a multiple of 64 KiB",
       [](ElfFile& f) { f.Named(".text").header.address = 0; }},
      {"section '.data' is at 0x10002000, not at 0x10003000, on the page behind the one before",
       [](ElfFile& f) { f.Named(".data").header.address = 0x10002000; }},
      {"section '.data' is at 0x10005000, not at 0x10003000, on the page behind the one before",
       [](ElfFile& f) { f.Named(".data").header.address = 0x10005000; }},
      {"section '.idata$COREDLL.dll' is at 0x10006000, not at 0x10008000, on the page behind the "
       "one "
       "before",
       [](ElfFile& f) { f.Named(".bss").header.size = 0x4000; }},
      {"section '.bss' makes the image too large",
       [](ElfFile& f) { f.Named(".bss").header.size = 0x01000000; }},
      {"section '.bss' makes the image too large",
       [](ElfFile& f) { f.Named(".bss").header.size = 0xFFFFFFFF; }},
  });
}

TEST(ElfRefusalTest, RefusesWhatTheLinkerShouldNotHaveLeft) {
  ExpectRefused({
      {"symbol 'Missing' is undefined", [](ElfFile& f) { f.AddSymbol("Missing", 0, 0); }},
      {"symbol 'Missing' is undefined",
       [](ElfFile& f) { f.AddSymbol("Missing", 0, 0, elf::kWeak, elf::kNoType); }},
      {"symbol '__Far_veneer' is a veneer of the linker's",
       [](ElfFile& f) { f.AddSymbol("__Far_veneer", 1, kText, elf::kLocal); }},
      {"symbol '__Alpha_from_thumb' is a veneer of the linker's",
       [](ElfFile& f) { f.AddSymbol("__Alpha_from_thumb", 1, kText, elf::kLocal); }},
      {"there is Thumb code at 0x10001000",
       [](ElfFile& f) { f.AddSymbol("$t", 1, kText, elf::kLocal, elf::kNoType); }},
      {"there is Thumb code at 0x10001000",
       [](ElfFile& f) { f.AddSymbol("$t.12", 1, kText, elf::kLocal, elf::kNoType); }},
      {"symbol 'Alpha' is defined twice", [](ElfFile& f) { f.AddSymbol("Alpha", 2, 0x10002000); }},
      {"the ELF file has no relocations; it must be linked with --emit-relocs",
       [](ElfFile& f) { f.relocations.clear(); }},
      {"section '.rel' has relocations with addends",
       [](ElfFile& f) { f.relocations[1].type = elf::kRelocationsWithAddend; }},
      {"the entry point 0x10001002 is no instruction in .text",
       [](ElfFile& f) { f.header.entry = kText + 2; }},
      {"the entry point 0x10002000 is no instruction in .text",
       [](ElfFile& f) { f.header.entry = 0x10002000; }},
      {"the entry point 0x0 is no instruction in .text", [](ElfFile& f) { f.header.entry = 0; }},
  });
}

TEST(ElfRefusalTest, RefusesRelocationsThatItDoesNotKnow) {
  const auto with = [](std::uint32_t address, std::uint32_t type, std::uint32_t symbol) {
    return [=](ElfFile& f) { f.relocations[0].entries.push_back({address, type, symbol}); };
  };
  ExpectRefused({
      {"the relocation at 0x10001000 is of unknown type 43", with(kText, 43, 4)},  // MOVW
      {"the relocation at 0x10001000 is of unknown type 10", with(kText, 10, 4)},  // Thumb call
      {"the relocation at 0x10001000 is of unknown type 96", with(kText, 96, 4)},  // GOT
      {"the relocation at 0x10001000 is of unknown type 255", with(kText, 255, 4)},
      {"the relocation at 0x10001002 is not at a multiple of 4",
       with(kText + 2, elf::kArmAbs32, 4)},
      {"the relocation at 0x10000ffc lies outside section '.text'",
       with(kText - 4, elf::kArmAbs32, 4)},
      {"the relocation at 0x10001030 lies outside section '.text'",
       with(kText + 0x30, elf::kArmAbs32, 4)},
      {"the relocation at 0x1000102d lies outside section '.text'",
       with(kText + 0x2D, elf::kArmAbs32, 4)},
      {"the relocation at 0xffffffff lies outside section '.text'",
       with(0xFFFFFFFF, elf::kArmAbs32, 4)},
      {"the word at 0x10001020 is relocated twice", with(kText + 0x20, elf::kArmAbs32, 4)},
      {"the relocation at 0x10001000 is of symbol '', which does not move with the image",
       with(kText, elf::kArmAbs32, 0)},
      {"the word at 0x10001004 points out of the image, to 0xe12fff1e",
       with(kText + 4, elf::kArmAbs32, 4)},
      {"the relocation at 0x10001000 is of symbol '', which does not move with the image",
       with(kText, elf::kArmCall, 0)},
  });
}

TEST(ElfRefusalTest, RefusesWordsWhoseSymbolsStayWhereTheyAre) {
  ExpectRefused({
      {"the relocation at 0x10001020 is of symbol 'Fixed', which does not move with the image",
       [](ElfFile& f) {
         f.relocations[0].entries[3].symbol = f.AddSymbol("Fixed", elf::kSectionAbsolute, 0x1234);
       }},
      {"the relocation at 0x10001020 is of symbol 'Comment', which does not move with the image",
       [](ElfFile& f) { f.relocations[0].entries[3].symbol = f.AddSymbol("Comment", 7, 0); }},
      {"the relocation at 0x10004000 lies outside section '.bss'",
       [](ElfFile& f) { f.Relocate(4, 0x10004000, elf::kArmAbs32, 4); }},
  });
}

TEST(ElfRefusalTest, RefusesImportSlotsThatAreMoreThanPlaceholders) {
  ExpectRefused({
      {"section '.idata$WS2.dll' holds more than empty slots",
       [](ElfFile& f) { f.Named(".idata$WS2.dll").bytes = Words({1}); }},
      {"section '.idata$WS2.dll' holds more than empty slots",
       [](ElfFile& f) { f.Named(".idata$WS2.dll").bytes = std::string(6, '\0'); }},
      {"the import slot at 0x10007004 has no symbol",
       [](ElfFile& f) {
         f.Named(".idata$WS2.dll").bytes = Words({0, 0});
       }},
      {"section '.idata$WS2.dll' has too many import slots",
       [](ElfFile& f) { f.Named(".idata$WS2.dll").bytes = std::string(4 * 4097, '\0'); }},
      {"an import slot is both 'send' and '__imp_recv'",
       [](ElfFile& f) { f.AddSymbol("__imp_recv", 6, 0x10007000); }},
      {"symbol '__imp_recv' names no import slot",
       [](ElfFile& f) { f.AddSymbol("__imp_recv", 6, 0x10007002); }},
      {"symbol 'recv' names no import slot",
       [](ElfFile& f) { f.SymbolNamed("__imp_send").name = "recv"; }},
      {"import '' has no name that a DLL can hold",
       [](ElfFile& f) { f.SymbolNamed("__imp_send").name = "__imp_"; }},
      {"import 'a?b' has no name that a DLL can hold",
       [](ElfFile& f) { f.SymbolNamed("__imp_send").name = "__imp_a\nb"; }},
      {"DLL '' has no name that a DLL can hold",
       [](ElfFile& f) { f.Named(".idata$WS2.dll").name = ".idata$"; }},
      {"there are two sections '.idata$COREDLL.dll'",
       [](ElfFile& f) { f.Named(".idata$WS2.dll").name = ".idata$COREDLL.dll"; }},
      {"an import slot is relocated at 0x10007000",
       [](ElfFile& f) { f.Relocate(6, 0x10007000, elf::kArmAbs32, 4); }},
      {"the relocation at 0x10001010 reaches an import slot by its distance",
       [](ElfFile& f) { f.Relocate(1, 0x10001010, elf::kArmRel32, 11); }},
      {"the word at 0x10001028 points beside an import slot",
       [](ElfFile& f) { SetWord(f.Named(".text").bytes, 40, 0x10007001); }},
      {"the word at 0x10001028 points beside an import slot",
       [](ElfFile& f) { SetWord(f.Named(".text").bytes, 40, 0x10007004); }},
  });
}

TEST(ElfRefusalTest, ShowsNamesOfAFileAsOneLineOfPrintableCharacters) {
  ElfFile file = ToyImage();
  file.AddSymbol("a\x1b[2J\n" + std::string(200, 'b'), 0, 0);

  EXPECT_EQ(Refused(file.Bytes()), "symbol 'a?[2J?" + std::string(74, 'b') + "...' is undefined");
}

std::string Unconfirmed(const ElfFile& second) {
  try {
    ConfirmBySecondLink(ReadLinkedImage(ToyImage().Bytes()), ReadLinkedImage(second.Bytes()));
  } catch (const Refusal& refusal) {
    return refusal.what();
  }
  return "confirmed";
}

TEST(SecondLinkTest, ConfirmsRelocationsByTheWordsThatMove) {
  EXPECT_EQ(Unconfirmed(ToyImage(0x20000000)), "confirmed");
  EXPECT_EQ(Unconfirmed(ToyImage(0x00010000)), "confirmed");
  EXPECT_EQ(Unconfirmed(ToyImage()), "the second link has the same base");
}

TEST(SecondLinkTest, FindsAWordThatMovesWithoutARelocation) {
  ElfFile first = ToyImage();
  ElfFile second = ToyImage(0x20000000);
  first.relocations[0].entries[3].type = elf::kArmRel32;
  second.relocations[0].entries[3].type = elf::kArmRel32;

  try {
    ConfirmBySecondLink(ReadLinkedImage(first.Bytes()), ReadLinkedImage(second.Bytes()));
    FAIL();
  } catch (const Refusal& refusal) {
    EXPECT_STREQ(refusal.what(),
                 "the word at 0x10001020 moves with the base, and no relocation says so");
  }
}

TEST(SecondLinkTest, FindsARelocatedWordThatStays) {
  ElfFile first = ToyImage();
  ElfFile second = ToyImage(0x10010000);
  // Within both images, and the same in both.
  first.AddSymbol("Odd", 1, kText);
  SetWord(first.Named(".data").bytes, 4, 0x10000000);
  first.Relocate(3, 0x10003004, elf::kArmAbs32, 4);
  second.AddSymbol("Odd", 1, 0x10011000);
  SetWord(second.Named(".data").bytes, 4, 0x10000000);

  try {
    ConfirmBySecondLink(ReadLinkedImage(first.Bytes()), ReadLinkedImage(second.Bytes()));
    FAIL();
  } catch (const Refusal& refusal) {
    EXPECT_STREQ(refusal.what(),
                 "the word at 0x10003004 is relocated, and does not move with the base");
  }
}

TEST(SecondLinkTest, RefusesASecondLinkOfSomethingElse) {
  const auto with = [](const std::function<void(ElfFile&)>& change) {
    ElfFile second = ToyImage(0x20000000);
    change(second);
    return Unconfirmed(second);
  };
  EXPECT_EQ(with([](ElfFile& f) { SetWord(f.Named(".data").bytes, 4, 18); }),
            "the second link has another word at 0x10003004, and it does not differ by what the "
            "bases do");
  EXPECT_EQ(with([](ElfFile& f) { f.Named(".rdata").bytes.back() = '?'; }),
            "the second link has other bytes at the end of a section");
  EXPECT_EQ(with([](ElfFile& f) { f.Named(".rdata").bytes += '?'; }),
            "the second link has other sections");
  EXPECT_EQ(with([](ElfFile& f) { f.SymbolNamed("Beta").name = "Delta"; }),
            "the second link has other symbols");
  EXPECT_EQ(with([](ElfFile& f) { f.SymbolNamed("__imp_send").name = "__imp_recv"; }),
            "the second link has other imports");
  EXPECT_EQ(with([](ElfFile& f) { f.header.entry += 4; }),
            "the second link has other code at its entry point");
}

}  // namespace
}  // namespace elf2pe

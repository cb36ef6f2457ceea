// The program itself, what other tools read in its files, and an image from the real linker.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "elf2pe/elf_file.h"
#include "tools/elf2pe/pe_reader.h"

namespace elf2pe {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

struct Outcome {
  int code;
  std::string output;
};

class Elf2peProgramTest : public ::testing::Test {
 protected:
  void SetUp() override {
    std::string name = (std::filesystem::temp_directory_path() / "elf2pe-XXXXXX").string();
    ASSERT_NE(mkdtemp(name.data()), nullptr);
    folder_ = name;
    Write("toy.elf", ToyImage().Bytes());
    Write("second.elf", ToyImage(0x20000000).Bytes());
    Write("exports.txt", "# of a toy\nAlpha\nBeta\nCounter\n");
  }
  void TearDown() override { std::filesystem::remove_all(folder_); }

  void Write(const std::string& name, const std::string& bytes) const {
    std::ofstream(folder_ / name, std::ios::binary) << bytes;
  }
  [[nodiscard]] std::string Read(const std::string& name) const {
    std::ifstream file(folder_ / name, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  [[nodiscard]] bool Exists(const std::string& name) const {
    return std::filesystem::exists(folder_ / name);
  }

  [[nodiscard]] Outcome Shell(const std::string& command) const {
    Outcome outcome{-1, {}};
    FILE* pipe = popen(("cd " + folder_.string() + " && " + command + " 2>&1").c_str(), "r");
    if (pipe == nullptr) return outcome;
    std::array<char, 4096> block;
    for (std::size_t got; (got = fread(block.data(), 1, block.size(), pipe)) > 0;) {
      outcome.output.append(block.data(), got);
    }
    outcome.code = WEXITSTATUS(pclose(pipe));
    return outcome;
  }
  [[nodiscard]] Outcome Run(const std::string& arguments) const {
    return Shell(ORVENIX_ELF2PE " " + arguments);
  }
  [[nodiscard]] bool Has(const std::string& program) const {
    return Shell("command -v " + program).code == 0;
  }

 private:
  std::filesystem::path folder_;
};

TEST_F(Elf2peProgramTest, ConvertsAndConfirmsTheRelocations) {
  const Outcome outcome =
      Run("toy.elf toy.dll --name toy.dll --exports exports.txt --check second.elf");

  EXPECT_EQ(outcome.code, 0);
  EXPECT_EQ(outcome.output, "check: 6 relocations confirmed by second link\n");
  const std::string dll = Read("toy.dll");
  EXPECT_EQ(ReadPe(dll).dll_name, "toy.dll");
}

TEST_F(Elf2peProgramTest, SaysInOneLineWhatIsWrongAndLeavesNoDll) {
  Write("bad.elf", "no ELF");
  Write("wrong.txt", "Alpha\nGamma\n");
  const std::string rest = " toy.dll --name toy.dll --exports ";

  EXPECT_EQ(Run("bad.elf" + rest + "exports.txt").output, "elf2pe: bad.elf: this is no ELF file\n");
  EXPECT_EQ(Run("none.elf" + rest + "exports.txt").output, "elf2pe: none.elf: cannot be read\n");
  EXPECT_EQ(Run("toy.elf" + rest + "wrong.txt").output,
            "elf2pe: the image does not define the export 'Gamma'\n");
  EXPECT_EQ(Run("toy.elf" + rest + "exports.txt --check toy.elf").output,
            "elf2pe: the second link has the same base\n");
  EXPECT_EQ(Run("toy.elf" + rest + "exports.txt --check toy.elf").code, 1);
  EXPECT_EQ(Run("toy.elf none/toy.dll --name toy.dll --exports exports.txt").output,
            "elf2pe: none/toy.dll: cannot be written\n");
  EXPECT_FALSE(Exists("toy.dll"));
}

TEST_F(Elf2peProgramTest, ShowsItsUsageForACommandLineThatItDoesNotKnow) {
  for (const char* arguments :
       {"", "toy.elf", "toy.elf toy.dll", "toy.elf toy.dll --name toy.dll",
        "a b c --name n --exports e", "toy.elf toy.dll --name toy.dll --exports",
        "toy.elf toy.dll --nmae toy.dll",
        "toy.elf toy.dll --name toy.dll --exports exports.txt --machine 0x1c4",
        "toy.elf toy.dll --name toy.dll --name toy.dll --exports exports.txt",
        "toy.elf --import-library toy.lib --name toy.dll --exports exports.txt"}) {
    const Outcome outcome = Run(arguments);
    EXPECT_EQ(outcome.code, 2) << arguments;
    EXPECT_THAT(outcome.output, StartsWith("usage: elf2pe INPUT.elf OUTPUT.dll")) << arguments;
  }
}

// Whatever somebody else's reader knows of a DLL.
constexpr const char* kReadobj =
    "llvm-readobj-14 --file-headers --sections --coff-imports --coff-exports --coff-basereloc ";

TEST_F(Elf2peProgramTest, WritesADllThatOtherToolsReadAlike) {
  if (!Has("llvm-readobj-14")) GTEST_SKIP() << "llvm-readobj-14 is not installed";
  ASSERT_EQ(Run("toy.elf toy.dll --name toy.dll --exports exports.txt").code, 0);

  const Outcome seen = Shell(std::string(kReadobj) + "toy.dll");

  ASSERT_EQ(seen.code, 0);
  std::ifstream golden(ORVENIX_TESTS_FOLDER "/elf2pe/toy_readobj.txt");
  const std::string expected{std::istreambuf_iterator<char>(golden), {}};
  EXPECT_EQ(seen.output, expected);
}

TEST_F(Elf2peProgramTest, ShowsAVersionThatOtherToolsFind) {
  if (!Has("llvm-readobj-14")) GTEST_SKIP() << "llvm-readobj-14 is not installed";
  ASSERT_EQ(Run("toy.elf toy.dll --name toy.dll --exports exports.txt --version 3.44").code, 0);

  const std::string seen = Shell("llvm-readobj-14 --coff-resources toy.dll").output;

  EXPECT_THAT(seen, HasSubstr("Total Number of Resources: 1\n"));
  EXPECT_THAT(seen, HasSubstr("Type: VERSIONINFO (ID 16) [\n"));
  EXPECT_THAT(seen, HasSubstr("Language: (ID 1033) [\n"));
}

TEST_F(Elf2peProgramTest, WritesAnImportLibraryThatOtherToolsReadAlike) {
  if (!Has("llvm-readobj-14") || !Has("llvm-ar-14")) GTEST_SKIP() << "llvm-14 is not installed";
  ASSERT_EQ(Run("--import-library toy.lib --name toy.dll --exports exports.txt").code, 0);

  EXPECT_EQ(Shell("llvm-ar-14 t toy.lib | sort | uniq -c").output, "      6 toy.dll\n");
  const std::string seen = Shell("llvm-readobj-14 toy.lib").output;
  for (const char* name : {"Alpha", "Beta", "Counter"}) {
    EXPECT_THAT(seen, HasSubstr(std::string("Symbol: __imp_") + name + "\nSymbol: " + name + "\n"));
  }
  const std::string index = Shell("llvm-nm-14 --print-armap toy.lib").output;
  EXPECT_THAT(index, HasSubstr("__IMPORT_DESCRIPTOR_toy in toy.dll"));
  EXPECT_THAT(index, HasSubstr("__imp_Counter in toy.dll"));
}

constexpr const char* kSource = R"(
  int GetTickCount(void);
  const char* const names[] = {"one", "two"};
  const char* current;
  int count[100];
  int Next(int step) { count[step] += GetTickCount(); current = names[step & 1]; return count[7]; }
  int (*next)(int) = Next;
  int _DllMainCRTStartup(void* dll, int why, void* reserved) { return next(why); }
)";

constexpr const char* kVeneer = R"(
  .text
  .global GetTickCount
  GetTickCount:
    ldr ip, 1f
    ldr ip, [ip]
    bx ip
  1: .word __imp_GetTickCount
  .section ".idata$COREDLL.dll", "aw", %progbits
  .global __imp_GetTickCount
  __imp_GetTickCount: .word 0
)";

constexpr const char* kScript = R"(
  ENTRY(_DllMainCRTStartup)
  SECTIONS {
    . = BASE;
    .text : { *(.text*) }
    . = ALIGN(0x1000);
    .rdata : { *(.rodata*) }
    . = ALIGN(0x1000);
    .data : { *(.data*) }
    . = ALIGN(0x1000);
    .bss : { *(.bss*) }
    . = ALIGN(0x1000);
    .idata$COREDLL.dll : { *(.idata$COREDLL.dll) }
    /DISCARD/ : { *(.ARM.exidx*) }
  }
)";

TEST_F(Elf2peProgramTest, ConvertsWhatTheLinkerMakesOfCompiledCode) {
  if (!Has("arm-none-eabi-gcc")) GTEST_SKIP() << "arm-none-eabi-gcc is not installed";
  Write("toy.c", kSource);
  Write("veneer.s", kVeneer);
  Write("toy.ld", kScript);
  Write("exports.txt", "Next\ncount\n");
  const std::string code = "-marm -march=armv4t -mfloat-abi=soft -O2 -ffreestanding ";
  ASSERT_EQ(Shell("arm-none-eabi-gcc " + code + "-c toy.c veneer.s").output, "");
  const std::string link = "arm-none-eabi-ld -T toy.ld --emit-relocs toy.o veneer.o --defsym=BASE=";
  ASSERT_EQ(Shell(link + "0x10001000 -o toy.elf").output, "");
  ASSERT_EQ(Shell(link + "0x20001000 -o second.elf").output, "");

  const Outcome outcome =
      Run("toy.elf toy.dll --name toy.dll --exports exports.txt --check second.elf");

  EXPECT_THAT(outcome.output, HasSubstr("relocations confirmed by second link"));
  const std::string dll = Read("toy.dll");
  const PeImage image = ReadPe(dll);
  ASSERT_EQ(image.exports.size(), 2U);
  ASSERT_EQ(image.imports.size(), 1U);
  const std::string memory = MemoryImage(image, image.image_base);
  const std::string slot = Words({image.image_base + image.imports[0].functions[0].slot});
  EXPECT_NE(memory.find(slot, 0x1000), std::string::npos) << "the veneer's word";
}

}  // namespace
}  // namespace elf2pe

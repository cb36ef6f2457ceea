// Where a DLL comes to lie, what is bound and protected, and which files are refused.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mman.h>

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce_loader/toy_dll.h"
#include "loader/dll.h"
#include "memory/memory.h"
#include "support/device_files.h"
#include "tools/elf2pe/pe_format.h"

namespace {

using test::ToyDll;
using test::WithWord;

using LoadingTest = test::ToyTest;

struct Place {
  const char* what;
  std::optional<std::uint32_t> base;
};

TEST_F(LoadingTest, HappensAtAnyAddress) {
  const Place places[] = {{"where it was linked for", std::nullopt},
                          {"where the kernel likes", 0},
                          {"where it was linked for, as asked", 0x10000000},
                          {"in the device's own slots", 0x01F00000},
                          {"elsewhere", 0x20040000},
                          {"above the first half", 0x90000000}};
  std::set<std::uint32_t> seen;
  for (const Place& place : places) {
    SCOPED_TRACE(place.what);
    LoadWith({place.base, false});
    ASSERT_NE(Load(), nullptr);
    const auto at = reinterpret_cast<std::uintptr_t>(GetProcAddressW(module_, u"ToyTable"));
    seen.insert(at & 0xFFFF0000);
    if (place.base.value_or(0) != 0) {
      EXPECT_EQ(at & 0xFFFF0000, *place.base);
    }
    EXPECT_STREQ(Find<const char*(int)>(u"ToyTable")(1), "one") << "constants moved with it";
    EXPECT_EQ(Find<int()>(u"ToyCount")(), 42) << "variables begin anew with each load";
    EXPECT_EQ(Find<int()>(u"ToyCount")(), 44);
    EXPECT_EQ(Find<std::uint32_t(std::uint32_t)>(u"ToySwap")(0x1234), 0x3412U);
    EXPECT_EQ(Find<int()>(u"ToyAttached")(), 1);
    EXPECT_EQ(Find<HINSTANCE()>(u"ToyInstance")(), module_);
    EXPECT_TRUE(FreeLibrary(module_));
    module_ = nullptr;
  }
  EXPECT_GE(seen.size(), 5U);
}

TEST_F(LoadingTest, GoesElsewhereWhenItsPlaceIsTaken) {
  constexpr std::size_t kSize = 0x1000;
  void* const taken = mmap(reinterpret_cast<void*>(elf2pe::pe::kImageBase + 0x2000), kSize,
                           PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  ASSERT_EQ(reinterpret_cast<std::uintptr_t>(taken), elf2pe::pe::kImageBase + 0x2000);
  LoadWith({});
  ASSERT_NE(Load(), nullptr);
  EXPECT_STREQ(Find<const char*(int)>(u"ToyTable")(2), "two");
  FreeLibrary(module_);

  LoadWith({elf2pe::pe::kImageBase, false});
  testing::internal::CaptureStderr();
  EXPECT_EQ(Load(), nullptr);
  EXPECT_THAT(testing::internal::GetCapturedStderr(),
              testing::MatchesRegex("ce_loader: .*/toy.dll: there is no room for 0x[0-9a-f]+ bytes "
                                    "at 0x10000000\n"));
  munmap(taken, kSize);
}

TEST_F(LoadingTest, LeavesNothingBehind) {
  const std::size_t blocks = device().memory().live_blocks();
  LoadWith({0x20040000, false});
  for (int i = 0; i < 20; ++i) {
    ASSERT_NE(Load(), nullptr) << "the place is free again";
    EXPECT_TRUE(FreeLibrary(module_));
  }
  module_ = nullptr;
  EXPECT_EQ(device().memory().live_blocks(), blocks);
}

TEST_F(LoadingTest, ProtectsCodeAndConstants) {
  ASSERT_NE(Load(), nullptr);
  EXPECT_DEATH(Find<void()>(u"ToyWriteCode")(), "");
  EXPECT_DEATH(Find<void()>(u"ToyWriteConstant")(), "");
  EXPECT_EXIT(
      {
        Find<int()>(u"ToyCount")();
        std::_Exit(0);
      },
      testing::ExitedWithCode(0), "")
      << "variables can be written";
}

TEST_F(LoadingTest, EndsTheProgramAtACallOfNothing) {
  ASSERT_NE(Load(), nullptr) << "what is not called need not be there";
  EXPECT_EXIT(Find<void()>(u"ToyCallMissing")(), testing::ExitedWithCode(1),
              "^ce_loader: the DLL calls NotOnAnyDevice of COREDLL.dll, which this device does not "
              "have\n$");
}

// ---- files that are refused ----

class RefusalsTest : public test::ToyTest {
 protected:
  /// @return what stands on stderr when a file with this content is loaded
  std::string Refused(const std::string& content) {
    test::PutFile("\\bad.dll", content);
    testing::internal::CaptureStderr();
    EXPECT_EQ(LoadLibraryW(u"\\bad.dll"), nullptr);
    std::string line = testing::internal::GetCapturedStderr();
    EXPECT_EQ(GetLastError(), ERROR_BAD_EXE_FORMAT);
    const std::string file = (folder() / "device/storage/bad.dll").string();
    const std::string before = "ce_loader: " + file + ": ";
    EXPECT_EQ(line.substr(0, before.size()), before);
    EXPECT_EQ(line.find('\n'), line.size() - 1) << "one line";
    return line.substr(before.size(), line.size() - before.size() - 1);
  }
};

constexpr std::size_t kFileHeader = 0x84;
constexpr std::size_t kOptional = kFileHeader + 20;
constexpr std::size_t kSections = kOptional + 224;

TEST_F(RefusalsTest, NameWhatIsWrongWithAFile) {
  EXPECT_EQ(Refused(""), "the file does not begin as a DLL of this system");
  EXPECT_EQ(Refused("MZ"), "the file does not begin as a DLL of this system");
  EXPECT_EQ(Refused("\x7F"
                    "ELF"),
            "the file does not begin as a DLL of this system");
  EXPECT_EQ(Refused(ToyDll().substr(0, 0x90)), "the file ends within its header");
  EXPECT_EQ(Refused(std::string(elf2pe::pe::kMaxImageSize + 1, 'M')), "it is too large for a DLL");
  std::string changed = ToyDll();
  changed.back() = static_cast<char>(changed.back() ^ 1);
  EXPECT_THAT(Refused(changed), testing::StartsWith("the header's checksum is 0x"));
}

TEST_F(RefusalsTest, MeetHeadersThatLie) {
  const std::string toy = ToyDll();
  EXPECT_EQ(Refused(WithWord(toy, kFileHeader, 0x00058664)),
            "the image is for machine 0x8664, neither 0x1c0 nor 0x1c2");
  EXPECT_EQ(Refused(WithWord(toy, kOptional + 16, 0xFFFFFFFC)),
            "the entry point 0xfffffffc is no instruction in .text");
  EXPECT_THAT(Refused(WithWord(toy, kOptional + 56, 0x7FFFF000)),
              testing::StartsWith("the header's image size is 0x7ffff000, not 0x"));
  for (const std::size_t at : {kSections + 8, kSections + 12, kSections + 16, kSections + 20}) {
    for (const std::uint32_t word : {0U, 1U, 0x7FFFFFFFU, 0xFFFFFFFFU, 0xFFFFF000U}) {
      EXPECT_NE(Refused(WithWord(toy, at, word)), "");
    }
  }
}

TEST_F(RefusalsTest, CutEverywhereItIsNoDll) {
  const std::string toy = ToyDll();
  for (std::size_t size = 0; size < toy.size(); size += 97) {
    EXPECT_NE(Refused(toy.substr(0, size)), "") << size;
  }
}

}  // namespace

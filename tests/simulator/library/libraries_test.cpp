#include "library/libraries.h"

#include <gmock/gmock.h>

#include <filesystem>
#include <memory>
#include <string_view>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "library/shared_objects.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

std::intptr_t First() {
  return 1;
}
std::intptr_t Second() {
  return 2;
}

class LibrariesTest : public DeviceTest {
 protected:
  LibrariesTest() {
    device().libraries().Install({u"Tools", {{u"first", First}, {u"second", Second}}});
  }
};

TEST_F(LibrariesTest, AreFoundByNameInAnyCaseWithEndingAndFolderOrWithout) {
  HMODULE const module = LoadLibraryW(u"tools");
  ASSERT_NE(module, nullptr);
  EXPECT_EQ(LoadLibraryW(u"TOOLS.DLL"), module) << "loaded once";
  EXPECT_EQ(LoadLibraryW(u"\\Windows\\tools.dll"), module);
  EXPECT_EQ(LoadLibraryW(u"\\Temp\\tools.dll"), nullptr) << "it is not there";
  EXPECT_LT(reinterpret_cast<std::uintptr_t>(module), 1ULL << 32U);
  EXPECT_THAT(device().libraries().Loaded(), ElementsAre(u"Tools"));
}

TEST_F(LibrariesTest, HaveModulesOfTheirOwn) {
  device().libraries().Install({u"more", {{u"first", Second}}});
  HMODULE const tools = LoadLibraryW(u"tools");
  HMODULE const more = LoadLibraryW(u"more");
  EXPECT_NE(tools, more);
  EXPECT_EQ(GetProcAddressW(tools, u"first"), &First);
  EXPECT_EQ(GetProcAddressW(more, u"first"), &Second);
  EXPECT_FALSE(CloseHandle(tools)) << "a module is no handle";
}

TEST_F(LibrariesTest, TellTheirFunctionsByExactName) {
  HMODULE const module = LoadLibraryW(u"tools");
  EXPECT_EQ(GetProcAddressW(module, u"second"), &Second);
  EXPECT_EQ(GetProcAddressW(module, u"Second"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_PROC_NOT_FOUND);
  EXPECT_EQ(GetProcAddressW(module, nullptr), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_PROC_NOT_FOUND);
}

TEST_F(LibrariesTest, KnowWhatIsNoModule) {
  HMODULE const module = LoadLibraryW(u"tools");
  const auto number = reinterpret_cast<std::uintptr_t>(module);
  for (const std::uintptr_t wrong : {std::uintptr_t{0}, number - 16, number + 1, number + 16}) {
    SetLastError(0);
    EXPECT_EQ(GetProcAddressW(reinterpret_cast<HMODULE>(wrong), u"first"), nullptr) << wrong;
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
}

TEST_F(LibrariesTest, StayLoadedWhenTheirFileIsReplacedOrRemoved) {
  HMODULE const module = LoadLibraryW(u"tools");
  device().libraries().Install({u"tools", {}});
  EXPECT_EQ(LoadLibraryW(u"tools"), module);
  EXPECT_EQ(GetProcAddressW(module, u"first"), &First);
  device().libraries().Remove(u"Tools");
  EXPECT_EQ(LoadLibraryW(u"tools"), module);
}

TEST_F(LibrariesTest, AreMissedWhenTheyAreNotInstalled) {
  device().libraries().Remove(u"TOOLS");
  for (const WCHAR* name : {u"tools", u"", u".dll", u"\\windows\\", u"unknown"}) {
    SetLastError(0);
    EXPECT_EQ(LoadLibraryW(name), nullptr);
    EXPECT_EQ(GetLastError(), ERROR_MOD_NOT_FOUND);
  }
  EXPECT_EQ(LoadLibraryW(nullptr), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
  EXPECT_THAT(device().libraries().Loaded(), IsEmpty());
}

TEST_F(LibrariesTest, AreUnloadedWithTheirLastUse) {
  HMODULE const module = LoadLibraryW(u"tools");
  EXPECT_EQ(LoadLibraryW(u"tools"), module);
  EXPECT_TRUE(FreeLibrary(module));
  EXPECT_EQ(GetProcAddressW(module, u"first"), &First) << "one use is left";
  EXPECT_TRUE(FreeLibrary(module));
  EXPECT_EQ(GetProcAddressW(module, u"first"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  EXPECT_FALSE(FreeLibrary(module));
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  EXPECT_NE(LoadLibraryW(u"tools"), nullptr) << "it can be loaded again";
}

TEST_F(LibrariesTest, CanBeMadeToFail) {
  device().faults().Add({"LoadLibraryW", 1, 1, 0});
  EXPECT_EQ(LoadLibraryW(u"tools"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_MOD_NOT_FOUND);
  HMODULE const module = LoadLibraryW(u"tools");
  device().faults().Add({"GetProcAddressW", 1, 1, 5});
  EXPECT_EQ(GetProcAddressW(module, u"first"), nullptr);
  EXPECT_EQ(GetLastError(), 5U);
}

// ---- libraries that come from files ----

/// What the reader of this test's files has been asked and has made.
struct Seen {
  std::vector<std::filesystem::path> files;
  std::vector<DWORD> reasons;
  HMODULE module = nullptr;
  bool welcome = true;
  int loaded = 0;
};

class FileCode final : public sim::LibraryCode {
 public:
  explicit FileCode(Seen& seen) : seen_(seen) { ++seen_.loaded; }
  ~FileCode() override { --seen_.loaded; }
  bool Enter(HMODULE module, DWORD reason) override {
    seen_.module = module;
    seen_.reasons.push_back(reason);
    return seen_.welcome;
  }
  [[nodiscard]] FARPROC Find(std::u16string_view name) const override {
    return name == u"first" ? &First : nullptr;
  }

 private:
  Seen& seen_;
};

class LibraryFilesTest : public DeviceTest {
 protected:
  LibraryFilesTest() {
    sim::SetLibraryReader([this](const std::filesystem::path& file) {
      seen_.files.push_back(file);
      return std::make_unique<FileCode>(seen_);
    });
    test::PutFile("\\Program Files\\a.dll", "a");
  }
  ~LibraryFilesTest() override { sim::SetLibraryReader({}); }

  Seen seen_;
};

TEST_F(LibraryFilesTest, AreReadEnteredFoundAndLeft) {
  HMODULE const module = LoadLibraryW(u"\\Program Files\\a.dll");
  ASSERT_NE(module, nullptr);
  ASSERT_EQ(seen_.files.size(), 1U);
  EXPECT_EQ(seen_.files[0], folder() / "device/storage/Program Files/a.dll");
  EXPECT_EQ(seen_.module, module);
  EXPECT_EQ(LoadLibraryW(u"\\PROGRAM FILES\\A"), module) << "read once";
  EXPECT_EQ(GetProcAddressW(module, u"first"), &First);
  EXPECT_EQ(GetProcAddressW(module, u"second"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_PROC_NOT_FOUND);

  EXPECT_TRUE(FreeLibrary(module));
  EXPECT_THAT(seen_.reasons, ElementsAre(DLL_PROCESS_ATTACH));
  EXPECT_TRUE(FreeLibrary(module));
  EXPECT_THAT(seen_.reasons, ElementsAre(DLL_PROCESS_ATTACH, DLL_PROCESS_DETACH));
  EXPECT_EQ(seen_.loaded, 0);
  EXPECT_FALSE(FreeLibrary(module));
}

TEST_F(LibraryFilesTest, AreLookedForInTheWindowsFolderAndInTheRoot) {
  test::PutFile("\\in_root.dll", "a");
  test::PutFile("\\Windows\\in_windows.dll", "a");
  test::PutFile("\\plain", "a");
  EXPECT_NE(LoadLibraryW(u"in_root"), nullptr);
  EXPECT_NE(LoadLibraryW(u"in_root.DLL"), nullptr);
  EXPECT_NE(LoadLibraryW(u"in_windows"), nullptr);
  EXPECT_EQ(LoadLibraryW(u"a"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_MOD_NOT_FOUND);
  EXPECT_EQ(LoadLibraryW(u"plain"), nullptr) << "it would be plain.dll";
  EXPECT_EQ(LoadLibraryW(u"\\Windows"), nullptr);
  EXPECT_EQ(seen_.files.size(), 2U);
}

TEST_F(LibraryFilesTest, AreGoneAgainWhenTheyDoNotWantToBeLoaded) {
  seen_.welcome = false;
  EXPECT_EQ(LoadLibraryW(u"\\Program Files\\a.dll"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_DLL_INIT_FAILED);
  EXPECT_EQ(seen_.loaded, 0);
  seen_.welcome = true;
  EXPECT_NE(LoadLibraryW(u"\\Program Files\\a.dll"), nullptr);
}

TEST_F(LibraryFilesTest, AreRefusedWhenNobodyCanReadThem) {
  sim::SetLibraryReader([](const std::filesystem::path&) { return nullptr; });
  EXPECT_EQ(LoadLibraryW(u"\\Program Files\\a.dll"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_BAD_EXE_FORMAT);
  sim::SetLibraryReader({});
  EXPECT_EQ(LoadLibraryW(u"\\Program Files\\a.dll"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_BAD_EXE_FORMAT);
}

TEST_F(LibraryFilesTest, EndWithTheirDevice) {
  EXPECT_NE(LoadLibraryW(u"\\Program Files\\a.dll"), nullptr);
  Restart();
  EXPECT_EQ(seen_.loaded, 0);
  EXPECT_THAT(seen_.reasons, ElementsAre(DLL_PROCESS_ATTACH)) << "it had no time to say goodbye";
}

TEST_F(LibraryFilesTest, RefuseWhatIsNoSharedObject) {
  sim::SetLibraryReader(&sim::ReadSharedObject);
  EXPECT_EQ(LoadLibraryW(u"\\Program Files\\a.dll"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_BAD_EXE_FORMAT);
}

}  // namespace

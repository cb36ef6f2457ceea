#include "library/libraries.h"

#include <gmock/gmock.h>

#include <string>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
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

TEST_F(LibrariesTest, CanBeMadeToFail) {
  device().faults().Add({"LoadLibraryW", 1, 1, 0});
  EXPECT_EQ(LoadLibraryW(u"tools"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_MOD_NOT_FOUND);
  HMODULE const module = LoadLibraryW(u"tools");
  device().faults().Add({"GetProcAddressW", 1, 1, 5});
  EXPECT_EQ(GetProcAddressW(module, u"first"), nullptr);
  EXPECT_EQ(GetLastError(), 5U);
}

}  // namespace

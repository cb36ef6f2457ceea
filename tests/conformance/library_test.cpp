// What the platform's calls for libraries and mutexes do, seen through the platform alone.
#include <gtest/gtest.h>

#include "conformance/target.h"
#include "coredll.h"

namespace {

using conformance::KnownLibrary;
using conformance::SampleLibrary;

constexpr DWORD kPoison = 0xBDBDBDBD;

TEST(LoadLibraryWTest, GivesTheSameModuleForTheSameLibrary) {
  const HMODULE module = LoadLibraryW(KnownLibrary().name);
  ASSERT_NE(module, nullptr);
  EXPECT_EQ(LoadLibraryW(KnownLibrary().full_name), module);
}

TEST(LoadLibraryWTest, SaysThatALibraryIsMissing) {
  SetLastError(kPoison);
  EXPECT_EQ(LoadLibraryW(TEXT("no_such_library")), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_MOD_NOT_FOUND});
}

TEST(FreeLibraryTest, GivesOneUseBack) {
  const HMODULE module = LoadLibraryW(KnownLibrary().name);
  ASSERT_EQ(LoadLibraryW(KnownLibrary().name), module);
  EXPECT_TRUE(FreeLibrary(module));
  EXPECT_NE(GetProcAddressW(module, KnownLibrary().function), nullptr);
  EXPECT_TRUE(FreeLibrary(module));
}

TEST(FreeLibraryTest, RefusesWhatIsNoModule) {
  SetLastError(kPoison);
  EXPECT_FALSE(FreeLibrary(nullptr));
  EXPECT_NE(GetLastError(), kPoison);
}

TEST(GetProcAddressWTest, FindsFunctionsByTheirExactName) {
  const SampleLibrary library = KnownLibrary();
  const HMODULE module = LoadLibraryW(library.name);
  const FARPROC found = GetProcAddressW(module, library.function);
  EXPECT_NE(found, nullptr);
  EXPECT_EQ(GetProcAddressW(module, library.function), found);
  EXPECT_NE(GetProcAddressW(module, library.other_function), nullptr);
  EXPECT_NE(GetProcAddressW(module, library.other_function), found);
  SetLastError(kPoison);
  EXPECT_EQ(GetProcAddressW(module, library.wrong_case), nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_PROC_NOT_FOUND});
}

TEST(GetProcAddressWTest, RefusesWhatIsNoModule) {
  SetLastError(kPoison);
  EXPECT_EQ(GetProcAddressW(nullptr, TEXT("lapi_open")), nullptr);
  EXPECT_NE(GetLastError(), kPoison);
}

TEST(CreateMutexWTest, GivesEveryCallerAHandleOfItsOwnToTheNamedMutex) {
  SetLastError(kPoison);
  const HANDLE first = CreateMutexW(nullptr, FALSE, TEXT("CONFORMANCE"));
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_SUCCESS});
  const HANDLE second = CreateMutexW(nullptr, FALSE, TEXT("CONFORMANCE"));
  EXPECT_NE(second, first);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_ALREADY_EXISTS});
  EXPECT_TRUE(CloseHandle(first));
  const HANDLE third = CreateMutexW(nullptr, FALSE, TEXT("CONFORMANCE"));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_ALREADY_EXISTS}) << "the second handle keeps it";
  CloseHandle(second);
  CloseHandle(third);
  const HANDLE fresh = CreateMutexW(nullptr, FALSE, TEXT("CONFORMANCE"));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_SUCCESS}) << "without handles it is gone";
  CloseHandle(fresh);
}

}  // namespace

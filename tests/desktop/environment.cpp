// The conformance tests on desktop Windows. Each begins with an empty drive, a registry of its own,
// and without windows, as on a fresh device.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <string>

#include "conformance/differences.h"
#include "conformance/target.h"

namespace conformance {

bool OnDesktop() {
  // Asked once: it must not touch the last error.
  static const bool kWithTable =
      GetEnvironmentVariableW(L"ORVENIX_DEVICE_ANSWERS", nullptr, 0) == 0;
  return kWithTable;
}

SampleLibrary KnownLibrary() {
  return {TEXT("version"), TEXT("VERSION.dll"), TEXT("VerQueryValueW"), TEXT("GetFileVersionInfoW"),
          TEXT("VERQUERYVALUEW")};
}

void MakeProgram(const WCHAR* name) {
  WCHAR path[MAX_PATH];
  GetSystemDirectoryW(path, MAX_PATH);
  CopyFileW((std::wstring(path) + L"\\hostname.exe").c_str(), name, FALSE);
}

}  // namespace conformance

namespace {

constexpr WCHAR kScratch[] = L"Software\\Orvenix conformance";

/// Empties a folder, "" for the drive's root.
void Empty(const std::wstring& folder) {
  WIN32_FIND_DATAW found;
  const HANDLE search = FindFirstFileW((folder + L"\\*").c_str(), &found);
  if (search == INVALID_HANDLE_VALUE) return;
  do {
    const std::wstring name = found.cFileName;
    const std::wstring path = folder + L"\\" + name;
    if (name == L"." || name == L"..") continue;
    SetFileAttributesW(path.c_str(), FILE_ATTRIBUTE_NORMAL);
    if ((found.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) == 0) {
      DeleteFileW(path.c_str());
    } else {
      Empty(path);
      RemoveDirectoryW(path.c_str());
    }
  } while (FindNextFileW(search, &found) != FALSE);
  FindClose(search);
}

class FreshDesktop final : public ::testing::EmptyTestEventListener {
  void OnTestStart(const ::testing::TestInfo& /*info*/) override {
    Empty(L"");
    RegCreateKeyExW(HKEY_CURRENT_USER, kScratch, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &scratch_,
                    nullptr);
    HKEY software = nullptr;
    RegCreateKeyExW(scratch_, L"Software", 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &software,
                    nullptr);
    RegCloseKey(software);
    RegOverridePredefKey(HKEY_LOCAL_MACHINE, scratch_);
  }

  void OnTestEnd(const ::testing::TestInfo& /*info*/) override {
    // The thread's input method has windows of its own, which are not to be touched.
    const auto destroy = [](HWND window, LPARAM) -> BOOL {
      WCHAR name[16] = {};
      GetClassNameW(window, name, 16);
      if (std::wstring(name).find(L"IME") == std::wstring::npos) DestroyWindow(window);
      return TRUE;
    };
    EnumThreadWindows(GetCurrentThreadId(), destroy, 0);
    MSG message;
    for (int i = 0; i < 100 && PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE) != FALSE; ++i) {
    }
    RegOverridePredefKey(HKEY_LOCAL_MACHINE, nullptr);
    RegCloseKey(scratch_);
    RegDeleteTreeW(HKEY_CURRENT_USER, kScratch);
    Empty(L"");
  }

  HKEY scratch_ = nullptr;
};

}  // namespace

int main(int count, char** arguments) {
  std::setvbuf(stdout, nullptr, _IONBF, 0);  // a test that ends the program leaves its name
  ::testing::InitGoogleMock(&count, arguments);
  conformance::OnDesktop();
  // Every test begins by emptying the drive, so it must be one that was made for that.
  WCHAR own[8] = {};
  WCHAR here[8] = {};
  if (GetEnvironmentVariableW(L"ORVENIX_OWN_DRIVE", own, 8) == 0 ||
      GetCurrentDirectoryW(8, here) != 3 || here[0] != own[0]) {
    std::puts("run this with scripts/wine_run.py: it empties the drive that it runs on");
    return 2;
  }
  ::testing::UnitTest::GetInstance()->listeners().Append(new FreshDesktop);  // gtest owns it
  return RUN_ALL_TESTS();
}

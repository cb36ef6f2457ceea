#include "registry/registry.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>

#include "ce/errors.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/faults.h"
#include "support/device_test.h"

namespace {

class RegistryTest : public DeviceTest {
 protected:
  [[nodiscard]] std::filesystem::path file() { return device().folder() / "registry.reg"; }
  [[nodiscard]] std::string Text() {
    std::ifstream in(file(), std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
  }
  static HKEY MakeKey(const WCHAR* name) {
    HKEY key = nullptr;
    EXPECT_EQ(RegCreateKeyExW(HKEY_LOCAL_MACHINE, name, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr,
                              &key, nullptr),
              0);
    return key;
  }
  static void SetNumber(HKEY key, const WCHAR* name, DWORD number) {
    EXPECT_EQ(RegSetValueExW(key, name, 0, REG_DWORD, reinterpret_cast<BYTE*>(&number), 4), 0);
  }
  static DWORD Number(const WCHAR* key_name, const WCHAR* name) {
    HKEY key = nullptr;
    if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, key_name, 0, KEY_READ, &key) != 0) return 0;
    DWORD number = 0;
    DWORD size = 4;
    EXPECT_EQ(
        RegQueryValueExW(key, name, nullptr, nullptr, reinterpret_cast<BYTE*>(&number), &size), 0);
    RegCloseKey(key);
    return number;
  }
};

TEST_F(RegistryTest, KeepsWhatIsSetAcrossARestart) {
  const HKEY key = MakeKey(TEXT("Software\\Test"));
  SetNumber(key, TEXT("Port"), 514);
  RegCloseKey(key);

  Restart();

  EXPECT_EQ(Number(TEXT("SOFTWARE\\test"), TEXT("port")), 514U);
}

TEST_F(RegistryTest, WritesTheFileWhenAKeyIsClosed) {
  const HKEY key = MakeKey(TEXT("Software\\Test"));
  SetNumber(key, TEXT("Port"), 514);
  RegCloseKey(key);

  EXPECT_EQ(Text(),
            "Windows Registry Editor Version 5.00\n"
            "\n[HKEY_LOCAL_MACHINE\\Software]\n"
            "\n[HKEY_LOCAL_MACHINE\\Software\\Test]\n"
            "\"Port\"=dword:00000202\n");
}

TEST_F(RegistryTest, WritesTheFileAtTheDevicesEndWhenNobodyClosedTheKey) {
  SetNumber(MakeKey(TEXT("Software\\Test")), TEXT("Port"), 7);
  EXPECT_EQ(device().registry().open_keys(), 1U);

  Restart();

  EXPECT_EQ(Number(TEXT("Software\\Test"), TEXT("Port")), 7U);
  EXPECT_EQ(device().registry().open_keys(), 0U);
}

TEST_F(RegistryTest, LeavesAFileAloneThatNothingHasChanged) {
  RegCloseKey(MakeKey(TEXT("Software")));
  const std::string edited = "REGEDIT4\n; mine\n[HKLM\\Software]\n\"a\"=dword:5\n";
  std::ofstream(file(), std::ios::binary) << edited;
  Restart();

  EXPECT_EQ(Number(TEXT("Software"), TEXT("a")), 5U);

  EXPECT_EQ(Text(), edited);
}

TEST_F(RegistryTest, RefusesToStartOnAFileThatItDoesNotUnderstandAndKeepsIt) {
  const std::filesystem::path other = folder() / "other";
  std::filesystem::create_directories(other);
  const std::string broken = "REGEDIT4\n[HKLM\\A]\nrubbish\n";
  std::ofstream(other / "registry.reg", std::ios::binary) << broken;

  try {
    const sim::Device damaged(world(), sim::Profile{}, other);
    FAIL() << "the device started";
  } catch (const std::runtime_error& error) {
    EXPECT_NE(std::string(error.what()).find("registry.reg: line 3: "), std::string::npos)
        << error.what();
  }
  std::ifstream in(other / "registry.reg", std::ios::binary);
  EXPECT_EQ(std::string(std::istreambuf_iterator<char>(in), {}), broken);
}

TEST_F(RegistryTest, NeverGivesAHandleNumberTwice) {
  const HKEY first = MakeKey(TEXT("A"));
  RegCloseKey(first);
  for (int i = 0; i < 100; ++i) {
    const HKEY next = MakeKey(TEXT("A"));
    EXPECT_NE(next, first);
    RegCloseKey(next);
  }
}

TEST_F(RegistryTest, DeletesAKeyWithItsChildrenAndTellsWhoStillHasItOpen) {
  const HKEY inner = MakeKey(TEXT("A\\B\\C"));

  EXPECT_EQ(RegDeleteKeyW(HKEY_LOCAL_MACHINE, TEXT("a")), 0);

  DWORD number = 1;
  EXPECT_EQ(RegSetValueExW(inner, TEXT("v"), 0, REG_DWORD, reinterpret_cast<BYTE*>(&number), 4),
            static_cast<LONG>(ERROR_KEY_DELETED));
  HKEY opened = nullptr;
  EXPECT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("A\\B"), 0, KEY_READ, &opened),
            static_cast<LONG>(ERROR_FILE_NOT_FOUND));
  EXPECT_EQ(RegCloseKey(inner), 0);
}

TEST_F(RegistryTest, IgnoresOneLeadingBackslashOfAKeysPath) {
  RegCloseKey(MakeKey(TEXT("\\SYSTEM\\Power")));
  HKEY key = nullptr;

  EXPECT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("System\\POWER"), 0, KEY_READ, &key), 0);
  RegCloseKey(key);
}

TEST_F(RegistryTest, KeepsTheRootsApartAndAlwaysOpen) {
  RegCloseKey(MakeKey(TEXT("Only Here")));
  HKEY key = nullptr;

  for (const HKEY root : {HKEY_CLASSES_ROOT, HKEY_CURRENT_USER, HKEY_USERS}) {
    EXPECT_EQ(RegOpenKeyExW(root, TEXT("Only Here"), 0, KEY_READ, &key),
              static_cast<LONG>(ERROR_FILE_NOT_FOUND));
    EXPECT_EQ(RegCloseKey(root), 0);
    EXPECT_EQ(RegOpenKeyExW(root, nullptr, 0, KEY_READ, &key), 0);
    RegCloseKey(key);
  }
}

TEST_F(RegistryTest, RefusesHostileNamesAndSizes) {
  const HKEY key = MakeKey(TEXT("A"));
  const std::u16string long_name(300, u'n');
  const std::u16string endless(100000, u'n');
  std::vector<BYTE> data(sim::kMaxRegistryData + 1);
  HKEY opened = nullptr;
  const auto invalid = static_cast<LONG>(ERROR_INVALID_PARAMETER);

  EXPECT_EQ(RegSetValueExW(key, long_name.c_str(), 0, REG_BINARY, data.data(), 1), invalid);
  EXPECT_EQ(RegSetValueExW(key, TEXT("a\nb"), 0, REG_BINARY, data.data(), 1), invalid);
  EXPECT_EQ(
      RegSetValueExW(key, TEXT("v"), 0, REG_BINARY, data.data(), static_cast<DWORD>(data.size())),
      invalid);
  EXPECT_EQ(RegSetValueExW(key, TEXT("v"), 0, REG_BINARY, nullptr, 1), invalid);
  for (const std::u16string& name : {long_name, endless, std::u16string(u"a\nb")}) {
    EXPECT_EQ(RegCreateKeyExW(key, name.c_str(), 0, nullptr, 0, 0, nullptr, &opened, nullptr),
              invalid);
    EXPECT_NE(RegOpenKeyExW(key, name.c_str(), 0, 0, &opened), 0);
  }
  RegCloseKey(key);
}

TEST_F(RegistryTest, ReportsAnInjectedFailureAndStillClosesTheKey) {
  const HKEY key = MakeKey(TEXT("A"));
  device().faults().Add({"RegQueryValueExW", 1, 1, 0});
  device().faults().Add({"RegCloseKey", 1, 1, 31});
  DWORD size = 0;

  EXPECT_EQ(RegQueryValueExW(key, nullptr, nullptr, nullptr, nullptr, &size),
            static_cast<LONG>(ERROR_FILE_NOT_FOUND));
  EXPECT_EQ(RegCloseKey(key), 31);

  EXPECT_EQ(device().registry().open_keys(), 0U);
}

}  // namespace

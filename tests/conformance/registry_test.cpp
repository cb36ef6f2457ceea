// What the platform's registry does, seen through the platform alone.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <string>
#include <vector>

#include "conformance/wide_text.h"
#include "coredll.h"

namespace {

using conformance::WideText;

constexpr DWORD kPoison = 0xBDBDBDBD;
constexpr BYTE kPoisonByte = 0xBD;
constexpr LONG kSuccess = static_cast<LONG>(ERROR_SUCCESS);
constexpr LONG kNotFound = static_cast<LONG>(ERROR_FILE_NOT_FOUND);
constexpr LONG kMoreData = static_cast<LONG>(ERROR_MORE_DATA);
constexpr LONG kNoMoreItems = static_cast<LONG>(ERROR_NO_MORE_ITEMS);

/// A key below HKEY_LOCAL_MACHINE that is made for a test and goes with it.
class ScratchKey {
 public:
  explicit ScratchKey(const WCHAR* name) : name_(name) {
    RegDeleteKeyW(HKEY_LOCAL_MACHINE, name);
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, name, 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS,
                    nullptr, &key_, nullptr);
  }
  ~ScratchKey() {
    RegCloseKey(key_);
    RegDeleteKeyW(HKEY_LOCAL_MACHINE, name_);
  }
  ScratchKey(const ScratchKey&) = delete;
  ScratchKey& operator=(const ScratchKey&) = delete;

  [[nodiscard]] HKEY get() const { return key_; }
  void SetText(const WCHAR* name, const WideText& text) const {
    const auto size = static_cast<DWORD>((text.size() + 1) * sizeof(WCHAR));
    ASSERT_EQ(
        RegSetValueExW(key_, name, 0, REG_SZ, reinterpret_cast<const BYTE*>(text.c_str()), size),
        kSuccess);
  }
  void SetNumber(const WCHAR* name, DWORD number) const {
    ASSERT_EQ(RegSetValueExW(key_, name, 0, REG_DWORD, reinterpret_cast<const BYTE*>(&number), 4),
              kSuccess);
  }

 private:
  const WCHAR* name_;
  HKEY key_ = nullptr;
};

TEST(RegQueryValueExWTest, NamesTheNeededSizeAndWritesNothingIntoATooSmallBuffer) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetText(TEXT("Path"), TEXT("\\Tarnwell"));  // 9 characters and the zero: 20 bytes
  std::array<BYTE, 32> buffer;
  buffer.fill(kPoisonByte);
  DWORD type = kPoison;
  DWORD size = 18;

  EXPECT_EQ(RegQueryValueExW(key.get(), TEXT("Path"), nullptr, &type, buffer.data(), &size),
            kMoreData);

  EXPECT_EQ(size, 20U);
  EXPECT_EQ(type, REG_SZ) << "the type is told all the same";
  for (std::size_t i = 18; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kPoisonByte) << i;
}

TEST(RegQueryValueExWTest, TellsTheSizeWhenThereIsNoBuffer) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetText(TEXT("Path"), TEXT("abc"));
  DWORD type = kPoison;
  DWORD size = kPoison;

  EXPECT_EQ(RegQueryValueExW(key.get(), TEXT("Path"), nullptr, &type, nullptr, &size), kSuccess);

  EXPECT_EQ(size, 8U);
  EXPECT_EQ(type, REG_SZ);
}

TEST(RegQueryValueExWTest, GivesTheDataAndNothingBehindThem) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetNumber(TEXT("Port"), 0x11223344);
  std::array<BYTE, 8> buffer;
  buffer.fill(kPoisonByte);
  DWORD type = kPoison;
  DWORD size = buffer.size();

  ASSERT_EQ(RegQueryValueExW(key.get(), TEXT("pORT"), nullptr, &type, buffer.data(), &size),
            kSuccess)
      << "names differ in case only";

  EXPECT_EQ(type, REG_DWORD);
  EXPECT_EQ(size, 4U);
  const std::array<BYTE, 4> expected = {0x44, 0x33, 0x22, 0x11};
  EXPECT_EQ(std::memcmp(buffer.data(), expected.data(), 4), 0);
  for (std::size_t i = 4; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kPoisonByte) << i;
}

TEST(RegQueryValueExWTest, FailsForAMissingValueAndForWhatIsNoKey) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  DWORD type = kPoison;
  DWORD size = 4;
  BYTE data[4] = {};

  EXPECT_EQ(RegQueryValueExW(key.get(), TEXT("None"), nullptr, &type, data, &size), kNotFound);
  EXPECT_EQ(type, kPoison);
  EXPECT_EQ(RegQueryValueExW(reinterpret_cast<HKEY>(std::uintptr_t{12}), TEXT("None"), nullptr,
                             &type, data, &size),
            static_cast<LONG>(ERROR_INVALID_HANDLE));
}

TEST(RegOpenKeyExWTest, IgnoresOneLeadingBackslashAndTheCaseOfNames) {
  const ScratchKey key(TEXT("Software\\PlatformTest\\Inner"));
  HKEY opened = nullptr;

  EXPECT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("SOFTWARE\\platformtest\\INNER"), 0, KEY_READ,
                          &opened),
            kSuccess);
  EXPECT_EQ(RegCloseKey(opened), kSuccess);
  EXPECT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\None"), 0, KEY_READ, &opened),
            kNotFound);
}

TEST(RegOpenKeyExWTest, OpensTheKeyItselfForAnEmptyName) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetNumber(TEXT("Port"), 1);
  HKEY opened = nullptr;

  ASSERT_EQ(RegOpenKeyExW(key.get(), TEXT(""), 0, KEY_READ, &opened), kSuccess);

  EXPECT_EQ(RegQueryValueExW(opened, TEXT("Port"), nullptr, nullptr, nullptr, nullptr), kSuccess);
  RegCloseKey(opened);
}

TEST(RegCreateKeyExWTest, SaysWhetherTheKeyIsNew) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  HKEY made = nullptr;
  DWORD disposition = kPoison;

  EXPECT_EQ(RegCreateKeyExW(key.get(), TEXT("A\\B"), 0, nullptr, 0, KEY_WRITE, nullptr, &made,
                            &disposition),
            kSuccess);
  EXPECT_EQ(disposition, REG_CREATED_NEW_KEY);
  RegCloseKey(made);
  EXPECT_EQ(RegCreateKeyExW(key.get(), TEXT("a\\b"), 0, nullptr, 0, KEY_WRITE, nullptr, &made,
                            &disposition),
            kSuccess);
  EXPECT_EQ(disposition, REG_OPENED_EXISTING_KEY);
  RegCloseKey(made);
}

TEST(RegCloseKeyTest, LeavesTheNumberUnused) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  HKEY first = nullptr;
  ASSERT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software"), 0, KEY_READ, &first), kSuccess);
  ASSERT_EQ(RegCloseKey(first), kSuccess);
  EXPECT_NE(RegCloseKey(first), kSuccess) << "closed already";
}

TEST(RegSetValueExWTest, ReplacesTypeAndData) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetText(TEXT("Value"), TEXT("text"));
  key.SetNumber(TEXT("VALUE"), 7);
  DWORD type = kPoison;
  DWORD size = 0;

  EXPECT_EQ(RegQueryValueExW(key.get(), TEXT("Value"), nullptr, &type, nullptr, &size), kSuccess);

  EXPECT_EQ(type, REG_DWORD);
  EXPECT_EQ(size, 4U);
}

TEST(RegDeleteValueWTest, DeletesOnce) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetNumber(TEXT("Port"), 7);

  EXPECT_EQ(RegDeleteValueW(key.get(), TEXT("port")), kSuccess);
  EXPECT_EQ(RegDeleteValueW(key.get(), TEXT("port")), kNotFound);
}

TEST(RegEnumKeyExWTest, NamesEveryChildAndThenEnds) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  for (const WCHAR* name : {TEXT("Beta"), TEXT("alpha")}) {
    HKEY child = nullptr;
    ASSERT_EQ(RegCreateKeyExW(key.get(), name, 0, nullptr, 0, KEY_WRITE, nullptr, &child, nullptr),
              kSuccess);
    RegCloseKey(child);
  }
  std::vector<WideText> names;
  for (DWORD index = 0; index < 3; ++index) {
    std::array<WCHAR, 16> name;
    name.fill(0xBDBD);
    DWORD size = 8;
    const LONG error =
        RegEnumKeyExW(key.get(), index, name.data(), &size, nullptr, nullptr, nullptr, nullptr);
    if (index == 2) {
      EXPECT_EQ(error, kNoMoreItems);
      break;
    }
    ASSERT_EQ(error, kSuccess);
    names.emplace_back(name.data(), size);
    EXPECT_EQ(name[size], 0);
    for (std::size_t i = 8; i < name.size(); ++i) EXPECT_EQ(name[i], 0xBDBD) << i;
  }

  EXPECT_EQ(names, (std::vector<WideText>{TEXT("alpha"), TEXT("Beta")}));
}

TEST(RegEnumKeyExWTest, WritesNothingIntoANameBufferThatIsTooSmall) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  HKEY child = nullptr;
  RegCreateKeyExW(key.get(), TEXT("Four"), 0, nullptr, 0, KEY_WRITE, nullptr, &child, nullptr);
  RegCloseKey(child);
  std::array<WCHAR, 8> name;
  name.fill(0xBDBD);
  DWORD size = 4;  // one too few for the zero

  EXPECT_EQ(RegEnumKeyExW(key.get(), 0, name.data(), &size, nullptr, nullptr, nullptr, nullptr),
            kMoreData);

  for (std::size_t i = 4; i < name.size(); ++i) EXPECT_EQ(name[i], 0xBDBD) << i;
}

TEST(RegEnumValueWTest, GivesNameTypeAndData) {
  const ScratchKey key(TEXT("Software\\PlatformTest"));
  key.SetNumber(TEXT("Port"), 514);
  std::array<WCHAR, 16> name;
  name.fill(0xBDBD);
  DWORD name_size = 16;
  DWORD type = kPoison;
  DWORD data = kPoison;
  DWORD size = 4;

  ASSERT_EQ(RegEnumValueW(key.get(), 0, name.data(), &name_size, nullptr, &type,
                          reinterpret_cast<BYTE*>(&data), &size),
            kSuccess);

  EXPECT_EQ(WideText(name.data()), TEXT("Port"));
  EXPECT_EQ(name_size, 4U);
  EXPECT_EQ(type, REG_DWORD);
  EXPECT_EQ(data, 514U);
  name_size = 16;
  EXPECT_EQ(
      RegEnumValueW(key.get(), 1, name.data(), &name_size, nullptr, nullptr, nullptr, nullptr),
      kNoMoreItems);
}

}  // namespace

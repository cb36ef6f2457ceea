// Conditions on the registry that a job sets.
#include "upgrade/registry_tests.h"

#include <gmock/gmock.h>

#include <array>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "base/text.h"
#include "ce/errors.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "product_support/host.h"
#include "product_support/jobs.h"
#include "product_support/log_lines.h"
#include "registry/registry.h"
#include "support/device_test.h"

namespace upgrade {
namespace {

constexpr char kKey[] = "Software\\Orvenix";

class RegistryTestsTest : public DeviceTest {
 protected:
  RegistryTestsTest() : job_(std::make_unique<UpgradeConfig>()) { text_.fill('\xBD'); }

  UpgradeConfig& job() { return *job_; }

  static void Store(const char16_t* name, DWORD type, const void* data, std::size_t size,
                    HKEY root = HKEY_LOCAL_MACHINE, const char16_t* path = u"Software\\Orvenix") {
    HKEY key = nullptr;
    ASSERT_EQ(RegCreateKeyExW(root, path, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr),
              ERROR_SUCCESS);
    ASSERT_EQ(RegSetValueExW(key, name, 0, type, static_cast<const BYTE*>(data),
                             static_cast<DWORD>(size)),
              ERROR_SUCCESS);
    RegCloseKey(key);
  }
  static void StoreNumber(DWORD number, HKEY root = HKEY_LOCAL_MACHINE) {
    Store(u"Number", REG_DWORD, &number, sizeof number, root);
  }
  static void StoreText(const std::u16string& text) {
    Store(u"Text", REG_SZ, text.c_str(), (text.size() + 1) * sizeof(char16_t));
  }

  void TestNumber(std::string_view operation, std::string_view value,
                  std::string_view root = "HKEY_LOCAL_MACHINE") {
    test::AddTest(job(), {root, kKey, "Number", "REG_DWORD", operation, value, "wrong number"});
  }
  void TestText(std::string_view operation, std::string_view value) {
    test::AddTest(job(), {"HKEY_LOCAL_MACHINE", kKey, "Text", "REG_SZ", operation, value, "wrong"});
  }

  bool Perform() { return PerformTests(job(), text_.data(), text_.size()); }
  /// Performs the job's tests and begins a job without any.
  bool PerformAndForget() {
    const bool passed = Perform();
    job_ = std::make_unique<UpgradeConfig>();
    return passed;
  }

  [[nodiscard]] std::string FailureText() const { return text_.data(); }
  [[nodiscard]] bool untouched() const { return text_[0] == '\xBD'; }

 private:
  std::unique_ptr<UpgradeConfig> job_;
  std::array<char, 256> text_;
};

TEST_F(RegistryTestsTest, PassWhenThereAreNone) {
  EXPECT_TRUE(Perform());
  EXPECT_TRUE(untouched());
  EXPECT_EQ(test::ReadLog(), "PerformTests - 0\r\n");
}

TEST_F(RegistryTestsTest, PassWhenAllHold) {
  StoreNumber(7);
  StoreText(u"MR7");
  TestNumber("EQ", "7");
  TestText("EQ", "MR7");
  EXPECT_TRUE(Perform());
  EXPECT_TRUE(untouched());
  EXPECT_EQ(test::ReadLog(), "PerformTests - 2\r\n");
}

TEST_F(RegistryTestsTest, StopAtTheFirstThatFails) {
  StoreNumber(7);
  TestNumber("EQ", "7");
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", kKey, "Number", "REG_DWORD", "EQ", "8", "50% of 8"});
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", kKey, "Number", "REG_DWORD", "EQ", "9", "third"});
  EXPECT_FALSE(Perform());
  EXPECT_EQ(FailureText(), "50% of 8");
  EXPECT_EQ(test::ReadLog(),
            "PerformTests - 3\r\nOrvenix - PerformTests - failed test\r\n50% of 8\r\n");
}

TEST_F(RegistryTestsTest, TellAnEmptyMessageToo) {
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", "None", "", "", "", "", ""});
  EXPECT_FALSE(Perform());
  EXPECT_EQ(FailureText(), "");
  EXPECT_EQ(test::ReadLog(),
            "PerformTests - 1\r\nOrvenix - PerformTests - No such key\r\n"
            "Orvenix - PerformTests - failed test\r\n\r\n");
}

TEST_F(RegistryTestsTest, SayNoReasonToWhomDoesNotAsk) {
  TestNumber("EQ", "7");
  EXPECT_FALSE(PerformTests(job(), nullptr, 256));
  EXPECT_EQ(test::ReadLog(),
            "PerformTests - 1\r\nOrvenix - PerformTests - No such key\r\n"
            "Orvenix - PerformTests - failed test\r\n");
}

TEST_F(RegistryTestsTest, GoOnAfterATestThatIsNone) {
  job().AddRegistryTest(nullptr);
  TestNumber("EQ", "7");
  StoreNumber(7);
  EXPECT_TRUE(Perform());
  EXPECT_EQ(test::ReadLog(),
            "PerformTests - 2\r\nPerformTests - invalid registry item pointer\r\n");
}

// ---- keys and values ----

TEST_F(RegistryTestsTest, NeedTheKeyAndTheValue) {
  StoreNumber(7);
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", "None", "Number", "REG_DWORD", "EQ", "7", ""});
  EXPECT_FALSE(PerformAndForget());
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", kKey, "None", "REG_DWORD", "EQ", "7", ""});
  EXPECT_FALSE(PerformAndForget());
  EXPECT_EQ(test::ReadLog(),
            "PerformTests - 1\r\nOrvenix - PerformTests - No such key\r\n"
            "Orvenix - PerformTests - failed test\r\n\r\n"
            "PerformTests - 1\r\nOrvenix - PerformTests - No such valuename\r\n"
            "Orvenix - PerformTests - failed test\r\n\r\n");
}

TEST_F(RegistryTestsTest, ReadTheDefaultValueOfAKey) {
  Store(u"", REG_SZ, u"x", 4);
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", kKey, "", "REG_SZ", "EQ", "x", ""});
  EXPECT_TRUE(Perform());
}

TEST_F(RegistryTestsTest, ReadAValueOfTheRootItself) {
  Store(u"Value", REG_SZ, u"x", 4, HKEY_LOCAL_MACHINE, u"");
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", "", "Value", "REG_SZ", "EQ", "x", ""});
  EXPECT_TRUE(Perform());
}

TEST_F(RegistryTestsTest, ReadKeysAndNamesInTheDevicesCodePage) {
  Store(u"W\u00E4rme", REG_SZ, u"x", 4, HKEY_LOCAL_MACHINE, u"Ger\u00E4t");
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", "Ger\xE4t", "W\xE4rme", "REG_SZ", "EQ", "x", ""});
  EXPECT_TRUE(Perform());
}

TEST_F(RegistryTestsTest, FindAKeyThatIsWrittenWithALeadingBackslash) {
  StoreNumber(7);
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", std::string("\\") + kKey, "Number", "REG_DWORD", "EQ",
                        "7", ""});
  EXPECT_TRUE(Perform());
}

TEST_F(RegistryTestsTest, KnowFourRoots) {
  struct Case {
    const char* name;
    HKEY root;
  };
  const Case cases[] = {{"HKEY_LOCAL_MACHINE", HKEY_LOCAL_MACHINE},
                        {"HKEY_CURRENT_USER", HKEY_CURRENT_USER},
                        {"HKEY_CLASSES_ROOT", HKEY_CLASSES_ROOT},
                        {"HKEY_USERS", HKEY_USERS}};
  DWORD number = 1;
  for (const Case& c : cases) StoreNumber(number++, c.root);
  number = 1;
  for (const Case& c : cases) TestNumber("EQ", std::to_string(number++), c.name);
  EXPECT_TRUE(Perform());
}

TEST_F(RegistryTestsTest, AskBelowTheRootBeforeWhenTheRootIsUnknown) {
  StoreNumber(1, HKEY_LOCAL_MACHINE);
  StoreNumber(2, HKEY_CURRENT_USER);
  TestNumber("EQ", "1", "unknown");
  TestNumber("EQ", "2", "HKEY_CURRENT_USER");
  TestNumber("EQ", "2", "HKEY_local_machine");
  TestNumber("EQ", "2", "");
  TestNumber("EQ", "1", "HKEY_LOCAL_MACHINE");
  EXPECT_TRUE(PerformAndForget()) << "letter case counts, and no root is the one before";

  TestNumber("EQ", "1", "HKLM");
  EXPECT_TRUE(Perform()) << "and a new run begins anew";
}

// ---- types ----

struct TypeCase {
  DWORD stored;
  bool holds;
  std::vector<BYTE> data;
  const char* type;
  const char* why;
  const char* log;
};

TEST_F(RegistryTestsTest, DecideByTheTypeThatTheRegistryTells) {
  const std::vector<BYTE> number = {7, 0, 0, 0};
  const std::vector<BYTE> text = {'7', 0, 0, 0};
  const std::vector<BYTE> longer = {'7', 0, '7', 0, 0, 0};
  constexpr char kUnsupported[] = "Orvenix - PerformTests - Unsupported reg type\r\n";
  constexpr char kNoValue[] = "Orvenix - PerformTests - No such valuename\r\n";
  const TypeCase cases[] = {
      {REG_DWORD, true, number, "REG_DWORD", "as it should be", ""},
      {REG_SZ, true, text, "REG_SZ", "as it should be", ""},
      {REG_SZ, false, text, "REG_DWORD", "a short text where a number should be", ""},
      {REG_SZ, false, longer, "REG_DWORD", "a text that does not fit a number", kNoValue},
      {REG_DWORD, false, number, "REG_SZ", "a number where a text should be", ""},
      {REG_DWORD, false, number, "String", "the type of a test that names none", ""},
      {REG_SZ, false, text, "String", "the type of a test that names none", ""},
      {REG_SZ, false, text, "", "no type", ""},
      {REG_SZ, false, text, "reg_sz", "letter case counts", ""},
      {REG_DWORD, false, number, "reg_dword", "letter case counts", ""},
      {REG_BINARY, false, number, "REG_DWORD", "another type", kUnsupported},
      {REG_BINARY, false, text, "REG_SZ", "another type", kUnsupported},
      {REG_BINARY, false, longer, "REG_DWORD", "bytes that do not fit a number", kNoValue},
      {REG_MULTI_SZ, false, text, "REG_SZ", "another type", kUnsupported},
      {REG_EXPAND_SZ, false, text, "REG_SZ", "another type", kUnsupported},
      {REG_BINARY, false, number, "REG_BINARY", "a type that no test can name", kUnsupported},
      {REG_DWORD, false, {7, 0}, "REG_DWORD", "half a number", ""},
      {REG_DWORD, false, {}, "REG_DWORD", "no number at all", ""},
  };
  std::string log;
  for (const TypeCase& c : cases) {
    Store(u"Value", c.stored, c.data.data(), c.data.size());
    test::AddTest(job(), {"HKEY_LOCAL_MACHINE", kKey, "Value", c.type, "EQ", "7", "message"});
    EXPECT_EQ(PerformAndForget(), c.holds) << c.stored << c.type << ": " << c.why;
    log += std::string("PerformTests - 1\r\n") + c.log;
    if (!c.holds) log += "Orvenix - PerformTests - failed test\r\nmessage\r\n";
    EXPECT_EQ(test::ReadLog(), log) << c.why;
  }
}

// ---- comparisons ----

/// Which of EQ, NEQ, LT, LTE, GT, GTE hold, as '1' and '0'.
constexpr std::array<const char*, 6> kOperators = {"EQ", "NEQ", "LT", "LTE", "GT", "GTE"};
constexpr std::string_view kLess = "011100";
constexpr std::string_view kEqual = "100101";
constexpr std::string_view kGreater = "010011";

TEST_F(RegistryTestsTest, CompareNumbersWithoutSign) {
  struct Case {
    DWORD stored;
    const char* value;
    std::string_view holds;
  };
  static constexpr Case kCases[] = {
      {7, "7", kEqual},
      {6, "7", kLess},
      {8, "7", kGreater},
      {1000, "7", kGreater},
      {4294967295U, "-1", kEqual},
      {4294967294U, "-1", kLess},
      {0, "-1", kLess},
      {4294967295U, "4294967295", kEqual},
      {2147483648U, "2147483648", kEqual},
      {2147483648U, "-2147483648", kEqual},
      {2147483648U, "2147483647", kGreater},
      {0, "4294967296", kEqual},
      {7, " \t+7x", kEqual},
      {0, "", kEqual},
      {0, "none", kEqual},
      {16, "0x10", kGreater},
  };
  for (const Case& c : kCases) {
    StoreNumber(c.stored);
    for (std::size_t i = 0; i < kOperators.size(); ++i) {
      TestNumber(kOperators[i], c.value);
      EXPECT_EQ(PerformAndForget(), c.holds[i] == '1')
          << c.stored << ' ' << kOperators[i] << ' ' << c.value;
    }
  }
}

TEST_F(RegistryTestsTest, CompareTextsByTheirBytes) {
  struct Case {
    const char16_t* stored;
    const char* value;
    std::string_view holds;
    const char* why;
  };
  static constexpr Case kCases[] = {
      {u"MR7", "MR7", kEqual, ""},
      {u"A", "B", kLess, "by one"},
      {u"A", "Z", kLess, "by more than one, and all the same less"},
      {u"Z", "A", kGreater, "by more than one"},
      {u"MR7", "mr7", kLess, "letter case counts"},
      {u"", "", kEqual, ""},
      {u"", "a", kLess, "the shorter one is less"},
      {u"a", "", kGreater, ""},
      {u"a", "ab", kLess, ""},
      {u"abz", "ab", kGreater, ""},
      {u"10", "9", kLess, "digits are letters"},
      {u"\u00E4", "z", kGreater, "bytes have no sign"},
      {u"\u00E4", "\xE4", kEqual, "in the device's code page"},
      {u"\u6587", "?", kEqual, "what the code page lacks"},
  };
  for (const Case& c : kCases) {
    StoreText(c.stored);
    for (std::size_t i = 0; i < kOperators.size(); ++i) {
      TestText(kOperators[i], c.value);
      EXPECT_EQ(PerformAndForget(), c.holds[i] == '1') << kOperators[i] << c.value << c.why;
    }
  }
}

TEST_F(RegistryTestsTest, FailForAnyOtherOperator) {
  StoreNumber(7);
  StoreText(u"7");
  for (const char* operation : {"", "eq", "EQ ", "==", "E", "EQUAL", "LTEQ"}) {
    TestNumber(operation, "7");
    EXPECT_FALSE(PerformAndForget()) << operation;
    TestText(operation, "7");
    EXPECT_FALSE(PerformAndForget()) << operation;
  }
}

// ---- hostile records and registries ----

TEST_F(RegistryTestsTest, ReadTextsWithoutTerminator) {
  Store(u"Text", REG_SZ, u"MR7", 6);
  TestText("EQ", "MR7");
  EXPECT_TRUE(PerformAndForget());

  const std::u16string full(256, u'x');
  Store(u"Text", REG_SZ, full.data(), 512);
  TestText("EQ", std::string(256, 'x'));
  EXPECT_TRUE(PerformAndForget()) << "all of the 512 bytes count";

  Store(u"Text", REG_SZ, u"MR7", 5);
  TestText("EQ", "MR");
  EXPECT_TRUE(PerformAndForget()) << "half a character is none";

  Store(u"Text", REG_SZ, nullptr, 0);
  TestText("EQ", "");
  EXPECT_TRUE(PerformAndForget());

  Store(u"Text", REG_SZ, u"MR7\0hidden", 22);
  TestText("EQ", "MR7");
  EXPECT_TRUE(PerformAndForget()) << "a text ends at its first zero";
}

TEST_F(RegistryTestsTest, FindNoValueThatIsLongerThan512Bytes) {
  const std::u16string longer(257, u'x');
  Store(u"Text", REG_SZ, longer.data(), 514);
  TestText("NEQ", "y");
  EXPECT_FALSE(Perform());
  EXPECT_THAT(test::LogLinesWith("No such valuename"), ::testing::SizeIs(1));
}

/// A record that passes once the value is there.
tagRegistryTest* MakeRecord(std::string_view value_name, std::string_view value) {
  auto* const record = static_cast<tagRegistryTest*>(LocalAlloc(LPTR, sizeof(tagRegistryTest)));
  base::CopyText(record->root, "HKEY_LOCAL_MACHINE");
  base::CopyText(record->key, kKey);
  base::CopyText(record->value_name, value_name);
  base::CopyText(record->value, value);
  base::CopyText(record->type, "REG_SZ");
  base::CopyText(record->operation, "EQ");
  base::CopyText(record->error_message, "message");
  return record;
}

template <std::size_t Size>
void FillUp(char (&field)[Size]) {
  std::memset(field, 'x', Size);
}

TEST_F(RegistryTestsTest, ReadFieldsWithoutTerminator) {
  struct Case {
    void (*fill)(tagRegistryTest& test);
    bool holds;
    const char* log;
  };
  static constexpr Case kCases[] = {
      {[](tagRegistryTest&) {}, true, ""},
      {[](tagRegistryTest& test) { FillUp(test.root); }, true, ""},
      {[](tagRegistryTest& test) { FillUp(test.key); }, false, "No such key"},
      {[](tagRegistryTest& test) { FillUp(test.value_name); }, false, "No such valuename"},
      {[](tagRegistryTest& test) { FillUp(test.value); }, false, "failed test"},
      {[](tagRegistryTest& test) { FillUp(test.type); }, false, "failed test"},
      {[](tagRegistryTest& test) { FillUp(test.operation); }, false, "failed test"},
      {[](tagRegistryTest& test) { FillUp(test.error_message); }, true, ""},
  };
  StoreText(std::u16string(255, u'x'));
  for (const Case& c : kCases) {
    const std::size_t before = test::LogLinesWith(c.log).size();
    tagRegistryTest* const record = MakeRecord("Text", std::string(255, 'x'));
    c.fill(*record);
    job().AddRegistryTest(record);
    EXPECT_EQ(PerformAndForget(), c.holds) << &c - kCases;
    EXPECT_GT(test::LogLinesWith(c.log).size(), before) << &c - kCases;
  }
}

TEST_F(RegistryTestsTest, CompareAllOfAValueWithoutTerminator) {
  StoreText(std::u16string(255, u'x'));
  tagRegistryTest* const record = MakeRecord("Text", "");
  FillUp(record->value);
  base::CopyText(record->operation, "LT");
  job().AddRegistryTest(record);
  EXPECT_TRUE(Perform()) << "the 260 characters of the record are more than the registry's 255";
}

TEST_F(RegistryTestsTest, CutAMessageWithoutTerminator) {
  tagRegistryTest* const record = MakeRecord("None", "");
  FillUp(record->error_message);
  job().AddRegistryTest(record);
  EXPECT_FALSE(Perform());
  EXPECT_EQ(FailureText(), std::string(255, 'x'));
}

TEST_F(RegistryTestsTest, FillKeysAndNamesOfTheGreatestLength) {
  // The registry's names have 255 characters at most, the record's field has 260.
  const std::string name(255, 'n');
  const std::u16string wide(name.begin(), name.end());
  Store(wide.c_str(), REG_SZ, u"x", 4, HKEY_LOCAL_MACHINE, wide.c_str());
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", name, name, "REG_SZ", "EQ", "x", ""});
  EXPECT_TRUE(PerformAndForget());
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", name + "n", name, "REG_SZ", "EQ", "x", ""});
  EXPECT_FALSE(PerformAndForget());
}

TEST_F(RegistryTestsTest, CutTheMessageToTheRoomThereIs) {
  test::AddTest(job(), {"HKEY_LOCAL_MACHINE", "None", "", "", "", "", std::string(255, 'm')});
  char small[8];
  EXPECT_FALSE(PerformTests(job(), small, sizeof small));
  EXPECT_STREQ(small, "mmmmmmm");
  EXPECT_FALSE(PerformTests(job(), small, 0));
}

// ---- failures ----

TEST_F(RegistryTestsTest, FailWhenOneOfThemHasBeenLost) {
  constexpr int kListed = 8;  // the room that a list begins with
  StoreNumber(7);
  for (int i = 0; i < kListed; ++i) TestNumber("EQ", "7");
  device().faults().Add({"LocalAlloc", 2, 1, ERROR_OUTOFMEMORY});  // behind the record
  TestNumber("EQ", "8");
  device().faults().Clear();
  ASSERT_EQ(job().RegistryTests().size(), kListed);

  EXPECT_FALSE(Perform());

  EXPECT_EQ(FailureText(), "") << "whatever it would have said";
  EXPECT_EQ(test::ReadLog(), "PerformTests - 8\r\nOrvenix - PerformTests - failed test\r\n\r\n");
  EXPECT_FALSE(PerformTests(job(), nullptr, 0));
}

TEST_F(RegistryTestsTest, FailWhenTheOnlyOneHasBeenLost) {
  device().faults().Add({"LocalAlloc", 2, 1, ERROR_OUTOFMEMORY});
  TestNumber("EQ", "8");
  device().faults().Clear();
  ASSERT_TRUE(job().RegistryTests().empty());
  EXPECT_FALSE(Perform());
}

TEST_F(RegistryTestsTest, FailAndLeaveNothingOpenWhicheverCallFails) {
  StoreNumber(7);
  StoreText(u"MR7");
  TestNumber("EQ", "7");
  TestText("EQ", "MR7");
  test::ReadLog();
  const test::Holdings before = test::HoldingsOf(device());
  for (const char* call :
       {"MultiByteToWideChar", "RegOpenKeyExW", "RegQueryValueExW", "WideCharToMultiByte"}) {
    for (std::uint64_t nth = 1;; ++nth) {
      const std::uint64_t fired = device().faults().fired();
      device().faults().Add({call, nth, 1, 0});
      const bool passed = Perform();
      const bool has_failed = device().faults().fired() != fired;
      device().faults().Clear();
      EXPECT_EQ(passed, !has_failed) << call << nth;
      EXPECT_EQ(device().registry().open_keys(), 0U) << call << nth;
      EXPECT_EQ(test::HoldingsOf(device()), before) << call << nth;
      if (!has_failed) break;
    }
  }
}

TEST_F(RegistryTestsTest, CloseTheKeysOfTestsThatPass) {
  StoreNumber(7);
  for (int i = 0; i < 500; ++i) TestNumber("EQ", "7");
  EXPECT_TRUE(Perform());
  EXPECT_EQ(device().registry().open_keys(), 0U);
}

}  // namespace
}  // namespace upgrade

#include "device/flash/registry_helpers.h"

#include <gmock/gmock.h>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "registry/registry.h"
#include "support/device_test.h"

namespace {

using device::GetRegistryValue;
using device::OpenKey;
using device::RegEnter;
using device::RegExit;
using device::RegSetDword;
using device::RegSetString;

class RegistryHelpersTest : public DeviceTest {
 protected:
  /// What was put out since the last call.
  std::string Output() {
    std::string text = device().debug().KernelText();
    device().debug().Clear();
    return text;
  }
  sim::RegistryValue Value(const char16_t* name) {
    sim::RegistryValue value;
    device().registry().Query(OpenKey(), name, value);
    return value;
  }
};

TEST_F(RegistryHelpersTest, WriteAndReadNumbers) {
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  EXPECT_EQ(RegSetDword(u"Order", 0x80000003U), 0);
  EXPECT_EQ(Output(), "");
  std::uint32_t value = 0;
  EXPECT_TRUE(GetRegistryValue(OpenKey(), u"Order", &value));
  EXPECT_EQ(value, 0x80000003U);
  char line[100];
  std::snprintf(line, sizeof line, "GetRegistryValue(Order) Value(80000003) hKey: %x\r\n",
                static_cast<unsigned>(reinterpret_cast<std::uintptr_t>(OpenKey())));
  EXPECT_EQ(Output(), line);
  EXPECT_TRUE(RegExit());
}

TEST_F(RegistryHelpersTest, WriteTextsWithTheirTerminator) {
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  EXPECT_EQ(RegSetString(u"Prefix", u"EFL"), 0);
  const sim::RegistryValue value = Value(u"Prefix");
  EXPECT_EQ(value.type, REG_SZ);
  EXPECT_EQ(value.data, (std::vector<BYTE>{'E', 0, 'F', 0, 'L', 0, 0, 0}));
  EXPECT_EQ(RegSetString(u"Empty", u""), 0);
  EXPECT_EQ(Value(u"Empty").data.size(), 2U);
}

TEST_F(RegistryHelpersTest, ReadNoTextAsANumber) {
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  RegSetString(u"A", u"A");  // four bytes, like a number
  SetLastError(0x12AB);
  std::uint32_t value = 7;
  EXPECT_FALSE(GetRegistryValue(OpenKey(), u"A", &value));
  EXPECT_EQ(value, 0xFFFFFFFFU);
  EXPECT_EQ(Output(), "RegQueryValueEx(A) failed -returned 0  Error=000012AB\r\n");
}

TEST_F(RegistryHelpersTest, TellWhyThereIsNoValue) {
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  RegSetString(u"Long", u"longer");
  SetLastError(0);
  std::uint32_t value = 7;
  EXPECT_FALSE(GetRegistryValue(OpenKey(), u"None", &value));
  EXPECT_FALSE(GetRegistryValue(OpenKey(), u"Long", &value));
  EXPECT_EQ(value, 0xFFFFFFFFU);
  EXPECT_EQ(Output(),
            "RegQueryValueEx(None) failed -returned 2  Error=00000000\r\n"
            "RegQueryValueEx(Long) failed -returned 234  Error=00000000\r\n");
}

TEST_F(RegistryHelpersTest, CloseAKeyAsOftenAsTheyAreTold) {
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  EXPECT_TRUE(RegExit());
  EXPECT_TRUE(RegExit());
  EXPECT_EQ(Output(), "");
  EXPECT_EQ(device().registry().open_keys(), 0U);
}

TEST_F(RegistryHelpersTest, ReportOnlyAKeyThatWasNeverOpened) {
  EXPECT_FALSE(RegExit());
  EXPECT_EQ(Output(), "RegExit called too often.\r\n");
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  RegExit();
  device().faults().Add({"RegCreateKeyExW", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(RegEnter(u"Drivers\\Test"));
  EXPECT_EQ(OpenKey(), nullptr);
  EXPECT_FALSE(RegExit());
  EXPECT_EQ(Output(), "ERROR Opening the registry key\r\nRegExit called too often.\r\n");
}

TEST_F(RegistryHelpersTest, WriteNothingWithoutAKey) {
  EXPECT_NE(RegSetString(u"A", u"B"), 0);
  EXPECT_EQ(Output(), "RegSetString called with NULL handle.\r\n");
  EXPECT_NE(RegSetDword(u"A", 1), 0);
  EXPECT_EQ(Output(), "RegSetString called with NULL handle.\r\n");
}

TEST_F(RegistryHelpersTest, PassOnTheErrorOfAWrite) {
  ASSERT_TRUE(RegEnter(u"Drivers\\Test"));
  device().faults().Add({"RegSetValueExW", 1, 2, ERROR_ACCESS_DENIED});
  EXPECT_EQ(RegSetString(u"A", u"B"), static_cast<std::int32_t>(ERROR_ACCESS_DENIED));
  EXPECT_EQ(RegSetDword(u"A", 1), static_cast<std::int32_t>(ERROR_ACCESS_DENIED));
}

}  // namespace

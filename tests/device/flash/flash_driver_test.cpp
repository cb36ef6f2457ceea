#include "device/flash/flash_driver.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "device/flash/driver_recorder.h"
#include "device/flash/registry_helpers.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "kernel/handle_table.h"
#include "memory/memory.h"
#include "registry/registry.h"
#include "support/device_test.h"
#include "trace/trace.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr char kLoaded[] =
    "RegQueryValueEx(HDEVICE) failed -returned 2  Error=00000000\r\n"
    "--CEEFLDRV: DONE!\r\n";

class FlashHelperTest : public DeviceTest {
 protected:
  FlashHelperTest() : requests_(test::RecordRequests(device())) { SetLastError(0); }

  std::string Output() {
    std::string text = device().debug().KernelText();
    device().debug().Clear();
    return text;
  }
  void Init(std::uint32_t bytes = 100000) {
    ASSERT_TRUE(device::EFL_Helper_Init(bytes));
    Output();
    requests_->all.clear();
  }
  const test::DriverRequests::Request& Last() const { return requests_->all.back(); }
  bool HasLoadedValue() {
    std::uint32_t value = 0;
    device::RegEnter(u"Drivers\\Eflashdrv");
    const bool found = device::GetRegistryValue(device::OpenKey(), u"HDEVICE", &value);
    device::RegExit();
    Output();
    return found;
  }

  std::shared_ptr<test::DriverRequests> requests_;
};

TEST_F(FlashHelperTest, LoadsTheDriverAndHasItMakeItsStore) {
  ASSERT_TRUE(device::EFL_Helper_Init(66560));
  EXPECT_EQ(Output(),
            std::string(kLoaded) + "\r\nEFL_Helper_Init:: SUCCESS, Allocated 66560 Bytes!\r\n");
  ASSERT_THAT(requests_->Codes(), ElementsAre(0x22CFF9U));
  EXPECT_EQ(Last().input, "00 04 01 00");
  EXPECT_TRUE(HasLoadedValue());
}

TEST_F(FlashHelperTest, RegistersTheDriverInOrder) {
  std::vector<std::string> calls;
  device().trace().SetSink([&](std::string_view line) {
    for (const char* call : {"RegCreateKeyExW", "RegQueryValueExW", "RegSetValueExW",
                             "ActivateDevice", "RegCloseKey", "CreateFileW", "DeviceIoControl"}) {
      if (line.find(call) == std::string_view::npos) continue;
      const std::size_t name = line.find("\"name\":\"");
      calls.emplace_back(call);
      if (name == std::string_view::npos) continue;
      const std::size_t begin = name + 8;
      calls.back() += " " + std::string(line.substr(begin, line.find('"', begin) - begin));
    }
  });
  ASSERT_TRUE(device::EFL_Helper_Init(1000));
  device().trace().SetSink({});
  EXPECT_THAT(calls, ElementsAre("RegCreateKeyExW Drivers\\\\Eflashdrv", "RegQueryValueExW HDEVICE",
                                 "RegSetValueExW Prefix", "RegSetValueExW Dll",
                                 "RegSetValueExW FriendlyName", "RegSetValueExW Order",
                                 "RegSetValueExW Ioctl", "ActivateDevice", "RegSetValueExW HDEVICE",
                                 "RegCloseKey", "CreateFileW EFL1:", "DeviceIoControl"));
}

TEST_F(FlashHelperTest, WritesWhatTheDriverNeedsToBeLoaded) {
  Init();
  device::RegEnter(u"Drivers\\Eflashdrv");
  const auto text = [&](const char16_t* name) {
    sim::RegistryValue value;
    device().registry().Query(device::OpenKey(), name, value);
    EXPECT_EQ(value.type, REG_SZ);
    std::u16string characters(value.data.size() / 2, 0);
    if (!value.data.empty()) std::memcpy(characters.data(), value.data.data(), value.data.size());
    return characters;
  };
  using namespace std::string_literals;
  EXPECT_EQ(text(u"Prefix"), u"EFL\0"s);
  EXPECT_EQ(text(u"Dll"), u"eflashdrv.dll\0"s);
  EXPECT_EQ(text(u"FriendlyName"), u"Corvanta Eflash Driver\0"s);
  std::uint32_t number = 0;
  EXPECT_TRUE(device::GetRegistryValue(device::OpenKey(), u"Order", &number));
  EXPECT_EQ(number, 3U);
  EXPECT_TRUE(device::GetRegistryValue(device::OpenKey(), u"Ioctl", &number));
  EXPECT_EQ(number, 4U);
}

TEST_F(FlashHelperTest, OpensTheDriverForWritingThrough) {
  std::string opening;
  device().trace().SetSink([&](std::string_view line) {
    if (line.find("EFL1:") != std::string_view::npos) opening = line;
  });
  ASSERT_TRUE(device::EFL_Helper_Init(1000));
  device().trace().SetSink({});
  EXPECT_THAT(opening, HasSubstr("\"access\":3221225472,\"share\":0,\"disposition\":3,"
                                 "\"attributes\":2147483776"));
}

TEST_F(FlashHelperTest, LoadsNothingThatIsLoadedAndOpensItAllTheSame) {
  Init();
  const std::size_t handles = device().handles().open_handles();
  ASSERT_TRUE(device::EFL_Helper_Init(2000));
  EXPECT_THAT(Output(), ::testing::AllOf(
                            HasSubstr("GetRegistryValue(HDEVICE) Value("),
                            HasSubstr("EFLASHDRV already loaded...stopping.\r\n"
                                      "--CEEFLDRV: DONE!\r\n"
                                      "\r\nEFL_Helper_Init:: SUCCESS, Allocated 2000 Bytes!\r\n")));
  EXPECT_THAT(device().drivers().Names(), ElementsAre("EFL1:"));
  EXPECT_EQ(device().handles().open_handles(), handles) << "the handle before is closed";
}

TEST_F(FlashHelperTest, SaysWhyItDoesNotLoad) {
  device().faults().Add({"RegCreateKeyExW", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(device::EFL_Helper_Init(1000));
  EXPECT_EQ(Output(),
            "ERROR Opening the registry key\r\n"
            "Could not create/open the key Drivers\\Eflashdrv ...cannot continue.\r\n");
  device().faults().Add({"ActivateDevice", 1, 1, ERROR_FILE_NOT_FOUND});
  EXPECT_FALSE(device::EFL_Helper_Init(1000));
  EXPECT_THAT(Output(), HasSubstr("CEEFLDRV : Couldn't ActivateDevice(EFLASHDRV.DLL)...stopping\r\n"
                                  "--CEEFLDRV: DONE!\r\n"));
  EXPECT_FALSE(HasLoadedValue());
  device().faults().Add({"CreateFileW", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(device::EFL_Helper_Init(1000));
  EXPECT_THAT(Output(), HasSubstr("EFL_Helper_Init::Can't open EFL1!\r\n"));
  EXPECT_THAT(requests_->all, IsEmpty());
  requests_->failing = 0x22CFF9;
  EXPECT_FALSE(device::EFL_Helper_Init(1000));
  EXPECT_THAT(Output(), HasSubstr("\r\nEFL_Helper_Init::DeviceIoControl Failed.\r\n"));
}

TEST_F(FlashHelperTest, KeepsTheOpenDriverWhenItCannotBeOpenedAnew) {
  Init();
  device().faults().Add({"CreateFileW", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_FALSE(device::EFL_Helper_Init(1000));
  EXPECT_TRUE(device::EFL_Helper_CreateFile("a", 5));
}

TEST_F(FlashHelperTest, SendsOneBlockWhoseFieldsStay) {
  Init();
  ASSERT_TRUE(device::EFL_Helper_CreateFile("os.nb0", 0x1234));
  const std::string name = "6f 73 2e 6e 62 30 00 00 00 00 00 00 00 00 00 00 00 00 00 00 ";
  EXPECT_EQ(Last().code, 0x22CFFAU);
  EXPECT_EQ(Last().input, name + "34 12 00 00 00 00 00 00 00 00 00 00 00 00 00 00");
  ASSERT_TRUE(device::EFL_Helper_Seek(0x100));
  EXPECT_EQ(Last().code, 0x22CFF4U);
  EXPECT_EQ(Last().input, name + "34 12 00 00 00 00 00 00 00 00 00 00 00 01 00 00");
  ASSERT_TRUE(device::EFL_Helper_WriteData("firmware", 8));
  EXPECT_EQ(Last().code, 0x22CFFCU);
  EXPECT_EQ(Last().input, name + "34 12 00 00 08 00 00 00 00 00 00 00 00 01 00 00");
  EXPECT_EQ(Last().data, "firmware");
  char back[3] = {};
  ASSERT_TRUE(device::EFL_Helper_ReadDataEx(back, 3, 0x102));
  EXPECT_EQ(Last().code, 0x22CFF2U);
  EXPECT_EQ(Last().input, name + "34 12 00 00 03 00 00 00 00 00 00 00 02 01 00 00");
  EXPECT_EQ(std::string(back, 3), "rmw");
  std::uint32_t size = 0;
  ASSERT_TRUE(device::EFL_Helper_FileGetSize(&size));
  EXPECT_EQ(Last().code, 0x22CFEEU);
  EXPECT_EQ(Last().input, name + "34 12 00 00 03 00 00 00 00 00 00 00 02 01 00 00");
  EXPECT_EQ(size, 0x108U);
  ASSERT_TRUE(device::EFL_Helper_CloseFile());
  EXPECT_EQ(Last().code, 0x22CFFBU);
  EXPECT_EQ(Last().input, name + "08 01 00 00 03 00 00 00 00 00 00 00 02 01 00 00")
      << "the driver's answer stands in the block, too";
  ASSERT_TRUE(device::EFL_Helper_DeleteFile("os.nb0"));
  EXPECT_EQ(Last().code, 0x22CFF0U);
  EXPECT_EQ(Last().input, name + "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00")
      << "a block of its own";
  EXPECT_EQ(Last().address, 0U);
  ASSERT_TRUE(device::EFL_Helper_Start_EFLASH());
  EXPECT_EQ(Last().code, 0x22CFFDU);
  EXPECT_EQ(Last().input, "");
  EXPECT_EQ(device().debug().ConsoleText(), "EFLASH FileName: os.nb0");
}

TEST_F(FlashHelperTest, ReportsEverySuccess) {
  Init();
  char bytes[2] = {};
  std::uint32_t size = 0;
  device::EFL_Helper_CreateFile("a", 2);
  device::EFL_Helper_Seek(0);
  device::EFL_Helper_WriteData("ab", 2);
  device::EFL_Helper_ReadDataEx(bytes, 2, 0);
  device::EFL_Helper_FileGetSize(&size);
  device::EFL_Helper_Start_EFLASH();
  device::EFL_Helper_CloseFile();
  device::EFL_Helper_DeleteFile("a");
  EXPECT_EQ(Output(),
            "EFL_Helper_CreateFile:: SUCCESS!.\r\n"
            "\r\nEFL_Helper_Seek:: SUCCESS!.\r\n"
            "\r\nEFL_Helper_WriteData:: SUCCESS!.\r\n"
            "\r\nEFL_Helper_ReadDataEx:: SUCCESS!.\r\n"
            "\r\nEFL_Helper_FileGetSize:: SUCCESS!.\r\n"
            "EFL_Helper_Start_EFLASH:: SUCCESS!.\r\n"
            "EFL_Helper_CloseFile:: SUCCESS!.\r\n"
            "EFL_Helper_DeleteFile:: SUCCESS!.\r\n");
}

TEST_F(FlashHelperTest, ReportsEveryFailedRequest) {
  Init();
  device().faults().Add({"DeviceIoControl", 1, 0, ERROR_GEN_FAILURE});
  char bytes[2] = {'x', 'y'};
  std::uint32_t size = 77;
  EXPECT_FALSE(device::EFL_Helper_CreateFile("a", 2));
  EXPECT_FALSE(device::EFL_Helper_Seek(0));
  EXPECT_FALSE(device::EFL_Helper_WriteData("ab", 2));
  EXPECT_FALSE(device::EFL_Helper_ReadDataEx(bytes, 2, 0));
  EXPECT_FALSE(device::EFL_Helper_FileGetSize(&size));
  EXPECT_FALSE(device::EFL_Helper_Start_EFLASH());
  EXPECT_FALSE(device::EFL_Helper_CloseFile());
  EXPECT_FALSE(device::EFL_Helper_DeleteFile("a"));
  EXPECT_EQ(Output(),
            "EFL_Helper_CreateFile::DeviceIoControl Failed.\r\n"
            "\r\nEFL_Helper_Seek::DeviceIoControl Failed.\r\n"
            "\r\nEFL_Helper_WriteData::DeviceIoControl Failed.\r\n"
            "\r\nEFL_Helper_ReadDataEx::DeviceIoControl Failed.\r\n"
            "\r\nEFL_Helper_FileGetSize::DeviceIoControl Failed.\r\n"
            "EFL_Helper_Start_EFLASH::DeviceIoControl Failed.\r\n"
            "EFL_Helper_CloseFile::DeviceIoControl Failed.\r\n"
            "EFL_Helper_DeleteFile::DeviceIoControl Failed.\r\n");
  EXPECT_EQ(size, 77U);
  EXPECT_EQ(bytes[0], 'x');
}

TEST_F(FlashHelperTest, SendsNothingBeforeTheDriverIsOpen) {
  char bytes[2];
  std::uint32_t size = 77;
  EXPECT_FALSE(device::EFL_Helper_CreateFile("a", 2));
  EXPECT_FALSE(device::EFL_Helper_Seek(0));
  EXPECT_FALSE(device::EFL_Helper_WriteData("ab", 2));
  EXPECT_FALSE(device::EFL_Helper_ReadDataEx(bytes, 2, 0));
  EXPECT_FALSE(device::EFL_Helper_FileGetSize(&size));
  EXPECT_FALSE(device::EFL_Helper_Start_EFLASH());
  EXPECT_FALSE(device::EFL_Helper_CloseFile());
  EXPECT_FALSE(device::EFL_Helper_DeleteFile("a"));
  EXPECT_FALSE(device::EFL_Helper_Free());
  EXPECT_EQ(Output(),
            "EFL_Helper_CreateFile::Invalid Handle.\r\n"
            "EFL_Helper_Seek::Invalid Handle.\r\n"
            "EFL_Helper_WriteData::Invalid Handle.\r\n"
            "EFL_Helper_ReadDataEx::Invalid Handle.\r\n"
            "EFL_Helper_FileGetSize::Invalid Handle.\r\n"
            "EFL_Helper_Start_EFLASH::Invalid Handle.\r\n"
            "EFL_Helper_CloseFile::Invalid Handle.\r\n"
            "EFL_Helper_DeleteFile::Invalid Handle.\r\n"
            "EFL_Helper_Free::Invalid Handle.\r\n");
  EXPECT_EQ(device().debug().ConsoleText(), "");
}

TEST_F(FlashHelperTest, CutsLongNamesTheSameWayEverywhere) {
  Init();
  const std::string cut = "31 32 33 34 35 36 37 38 39 30 31 32 33 34 35 36 37 38 39 00 ";
  ASSERT_TRUE(device::EFL_Helper_CreateFile("12345678901234567890-and-more", 5));
  EXPECT_EQ(Last().input.substr(0, cut.size()), cut);
  EXPECT_EQ(Last().input.substr(cut.size(), 11), "05 00 00 00");
  EXPECT_TRUE(device::EFL_Helper_DeleteFile("1234567890123456789_another_end"));
  EXPECT_EQ(Last().input.substr(0, cut.size()), cut);
  ASSERT_TRUE(device::EFL_Helper_CreateFile("b", 1));
  const std::string zeros = "00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 00 ";
  EXPECT_EQ(Last().input.substr(0, cut.size()), "62 " + zeros) << "nothing of a longer name stays";
}

TEST_F(FlashHelperTest, KeepsTheCallersBytesWithinTheDriversReach) {
  Init();
  ASSERT_TRUE(device::EFL_Helper_CreateFile("a", 70000));
  const std::string large(65536, 'L');
  ASSERT_TRUE(device::EFL_Helper_WriteData(large.data(), 65536));
  EXPECT_EQ(Last().data, large);
  const std::uint32_t place = Last().address;
  EXPECT_NE(place, 0U);
  ASSERT_TRUE(device::EFL_Helper_WriteData("small", 5));
  EXPECT_EQ(Last().address, place) << "one buffer for all";
  ASSERT_TRUE(device::EFL_Helper_WriteData("", 0));
  std::string back(65541, ' ');
  ASSERT_TRUE(device::EFL_Helper_ReadDataEx(back.data(), 65541, 0));
  EXPECT_EQ(back, large + "small");
}

TEST_F(FlashHelperTest, FailsWithoutMemoryWithinTheDriversReach) {
  Init();
  ASSERT_TRUE(device::EFL_Helper_CreateFile("a", 100));
  Output();
  requests_->all.clear();
  device().faults().Add({"VirtualAlloc", 1, 0, ERROR_OUTOFMEMORY});
  char byte = 0;
  EXPECT_FALSE(device::EFL_Helper_WriteData("a", 1));
  EXPECT_FALSE(device::EFL_Helper_ReadDataEx(&byte, 1, 0));
  EXPECT_EQ(Output(),
            "\r\nEFL_Helper_WriteData::DeviceIoControl Failed.\r\n"
            "\r\nEFL_Helper_ReadDataEx::DeviceIoControl Failed.\r\n");
  EXPECT_THAT(requests_->all, IsEmpty());
}

TEST_F(FlashHelperTest, UnloadsWithEverythingGivenBack) {
  const std::uint64_t free = device().memory().ram().figures().free();
  const std::size_t handles = device().handles().open_handles();
  Init();
  device::EFL_Helper_CreateFile("a", 100);
  device::EFL_Helper_WriteData("a", 1);
  Output();
  EXPECT_TRUE(device::EFL_Helper_Free());
  EXPECT_THAT(Output(), ::testing::AllOf(HasSubstr("GetRegistryValue(HDEVICE) Value("),
                                         HasSubstr("--CEEFLDRV: DONE!\r\n"),
                                         Not(HasSubstr("RegDeleteValue"))));
  EXPECT_THAT(device().drivers().Names(), IsEmpty());
  EXPECT_FALSE(HasLoadedValue());
  EXPECT_EQ(device().memory().ram().figures().free(), free);
  EXPECT_EQ(device().handles().open_handles(), handles);
}

TEST_F(FlashHelperTest, ReportsThatThereIsNothingToUnload) {
  device::UnloadFlashDriver();
  EXPECT_EQ(Output(),
            "RegQueryValueEx(HDEVICE) failed -returned 2  Error=00000000\r\n"
            "RegDeleteValue failed 2.\r\n"
            "--CEEFLDRV: DONE!\r\n");
  device().faults().Add({"RegCreateKeyExW", 1, 1, ERROR_ACCESS_DENIED});
  device::UnloadFlashDriver();
  EXPECT_EQ(Output(),
            "ERROR Opening the registry key\r\n"
            "Could not create/open the key Drivers\\Eflashdrv ...cannot continue.\r\n");
}

}  // namespace

// The simulated disk, as programs ask it about its flash chip.
#include <gmock/gmock.h>

#include <cstring>
#include <string>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "driver/drivers.h"
#include "support/device_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class DiskDriverTest : public DeviceTest {
 protected:
  static sim::Profile WithDisk() {
    sim::Profile profile;
    profile.disk_generation = 13;
    profile.disk_capacity = 0x08000000;
    return profile;
  }

  static HANDLE Open() {
    return CreateFileW(u"dsk0:", GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING,
                       FILE_ATTRIBUTE_NORMAL, nullptr);
  }
};

TEST_F(DiskDriverTest, IsNotThereUnlessTheProfileNamesAChip) {
  EXPECT_THAT(device().drivers().Names(), IsEmpty());
  EXPECT_EQ(Open(), INVALID_HANDLE_VALUE);
}

TEST_F(DiskDriverTest, TellsTheChipOfTheProfile) {
  Restart(WithDisk());
  EXPECT_THAT(device().drivers().Names(), ElementsAre("DSK0:"));
  HANDLE const disk = Open();
  ASSERT_NE(disk, INVALID_HANDLE_VALUE);
  std::string answer(64, 'x');
  DWORD returned = 0;

  EXPECT_TRUE(DeviceIoControl(disk, 3000, nullptr, 0, answer.data(), 64, &returned, nullptr));

  EXPECT_EQ(returned, 64U);
  std::string expected(64, '\0');
  expected[19] = 8;
  expected[24] = 13;
  EXPECT_EQ(answer, expected);
  CloseHandle(disk);
}

TEST_F(DiskDriverTest, RefusesOtherRequestsAndTooLittleRoom) {
  Restart(WithDisk());
  HANDLE const disk = Open();
  std::string answer(64, 'x');
  DWORD returned = 1;
  EXPECT_FALSE(DeviceIoControl(disk, 3001, nullptr, 0, answer.data(), 64, &returned, nullptr));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_NOT_SUPPORTED});
  EXPECT_FALSE(DeviceIoControl(disk, 3000, nullptr, 0, answer.data(), 63, &returned, nullptr));
  EXPECT_EQ(GetLastError(), DWORD{ERROR_INSUFFICIENT_BUFFER});
  EXPECT_EQ(returned, 0U);
  EXPECT_EQ(answer, std::string(64, 'x'));
  CloseHandle(disk);
}

}  // namespace

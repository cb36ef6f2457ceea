#include "desk/desk.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "ce/files.h"
#include "ce/kernel.h"
#include "support/device_test.h"
#include "world/world.h"

namespace {

namespace fs = std::filesystem;

class DeskTest : public ::testing::Test {
 protected:
  [[nodiscard]] fs::path device() const { return folder_.path() / "made" / "device"; }
  CesimDevice* Begin() { return CesimBegin(device().c_str(), reason_, sizeof reason_); }

  test::TemporaryFolder folder_;
  char reason_[400] = {};
};

TEST_F(DeskTest, MakesTheCallerAProgramOfTheDeviceInTheFolder) {
  CesimDevice* const device = Begin();
  ASSERT_NE(device, nullptr) << reason_;
  const HANDLE file =
      CreateFileW(u"\\note.txt", GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_NORMAL, {});
  EXPECT_NE(file, INVALID_HANDLE_VALUE);
  CloseHandle(file);
  CesimEnd(device);
  EXPECT_TRUE(fs::exists(this->device() / "storage" / "note.txt"));
  EXPECT_EQ(sim::World::Current(), nullptr) << "the caller belongs to nobody again";
}

TEST_F(DeskTest, FindsAgainWhatWasLeftThere) {
  CesimDevice* device = Begin();
  EXPECT_NE(CreateDirectoryW(u"\\Kept", nullptr), FALSE);
  CesimEnd(device);
  device = Begin();
  EXPECT_NE(GetFileAttributesW(u"\\Kept"), 0xFFFFFFFFU);
  CesimEnd(device);
}

TEST_F(DeskTest, TakesTheFoldersProfile) {
  fs::create_directories(device());
  std::ofstream(device() / "device.profile") << "no profile at all";
  EXPECT_EQ(Begin(), nullptr);
  EXPECT_NE(std::string(reason_).find("device.profile"), std::string::npos) << reason_;
}

TEST_F(DeskTest, CutsAReasonThatDoesNotFit) {
  std::ofstream(folder_.path() / "made") << "a file where a folder should be";
  char reason[8];
  for (char& each : reason) each = 'x';
  EXPECT_EQ(CesimBegin(device().c_str(), reason, 5), nullptr);
  EXPECT_EQ(std::string(reason).size(), 4U);
  EXPECT_EQ(reason[5], 'x');
  EXPECT_EQ(CesimBegin(device().c_str(), nullptr, 5), nullptr);
  EXPECT_EQ(CesimBegin(device().c_str(), reason, 0), nullptr);
}

TEST_F(DeskTest, EndsNothingWhenThereIsNothing) {
  CesimEnd(nullptr);
  SUCCEED();
}

}  // namespace

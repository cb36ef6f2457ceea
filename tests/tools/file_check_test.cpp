#include "tools/file_check.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "device/device.h"
#include "server/scratch_folder.h"
#include "storage/storage.h"
#include "world/world.h"

namespace tools {
namespace {

class CheckFilesTest : public ::testing::Test {
 protected:
  CheckFilesTest()
      : world_(sim::World::MakeVirtual()),
        device_(std::make_unique<sim::Device>(*world_, sim::Profile{}, scratch_.path())),
        job_(ParseJob("<DevInfo><Subsystem Name='Orvenix'><Group Name='FileList'>"
                      "<Field Name='Dest'>\\Lists\\a.lst</Field></Group></Subsystem></DevInfo>",
                      "job.xml")) {}

  void Write(const std::string& name, std::string_view content) const {
    scratch_.Write("storage/" + name, content);
  }
  [[nodiscard]] FileCheck Check() const { return CheckFiles(device_->storage(), job_, "TQ52-A1"); }
  /// The state of the only file.
  [[nodiscard]] FileState OnlyState() const {
    const FileCheck check = Check();
    EXPECT_EQ(check.files.size(), 1U);
    return check.files.empty() ? FileState::kMissing : check.files[0].state;
  }

  ScratchFolder scratch_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  Job job_;
};

TEST_F(CheckFilesTest, ComparesSizeAndChecksumOfEveryListedFile) {
  Write("Lists/a.lst", "s,\\a.txt,*,3421780262,9\r\n");
  EXPECT_EQ(OnlyState(), FileState::kMissing);

  Write("a.txt", "123456780");
  EXPECT_EQ(OnlyState(), FileState::kWrong);

  Write("A.TXT", "123456789");
  Write("a.txt", "123456789");
  EXPECT_EQ(OnlyState(), FileState::kRight);
  EXPECT_TRUE(Check().all_right());
}

TEST_F(CheckFilesTest, KnowsAnEmptyFileByTheChecksumThatStandsForNone) {
  Write("Lists/a.lst", "s,\\empty,*,1,0\r\n");
  Write("empty", "");
  EXPECT_EQ(OnlyState(), FileState::kRight);

  Write("empty", "x");
  EXPECT_EQ(OnlyState(), FileState::kWrong);
}

TEST_F(CheckFilesTest, LeavesOutWhatIsForOtherDevicesOrNoFile) {
  Write("Lists/a.lst", "s,\\x,ZZ99*,5,1\r\ns,RAM:os,*,5,1\r\n");

  EXPECT_TRUE(Check().files.empty());
  EXPECT_TRUE(Check().all_right());
}

TEST_F(CheckFilesTest, AcceptsAFileThatIsNotToBeChecked) {
  Write("Lists/a.lst", "s,\\x,*,0,1\r\n");
  Write("x", "anything");

  EXPECT_EQ(OnlyState(), FileState::kUnchecked);
  EXPECT_TRUE(Check().all_right());
}

TEST_F(CheckFilesTest, FindsARenamedFileUnderItsNewName) {
  Write("Lists/a.lst", "s,\\x.rename,*,3421780262,9\r\n");
  Write("x", "123456789");

  EXPECT_EQ(OnlyState(), FileState::kRight);
}

TEST_F(CheckFilesTest, SaysWhenTheListItselfNeverArrived) {
  EXPECT_FALSE(Check().list_found);
}

TEST_F(CheckFilesTest, HasNothingToCheckInAJobWithoutAList) {
  job_ =
      ParseJob("<DevInfo><Subsystem Name='Orvenix'><Group Name='Upgrade'/></Subsystem></DevInfo>",
               "job.xml");

  EXPECT_TRUE(Check().list_found);
  EXPECT_TRUE(Check().all_right());
}

}  // namespace
}  // namespace tools

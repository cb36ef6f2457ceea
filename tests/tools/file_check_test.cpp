#include "tools/file_check.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "device/device.h"
#include "server/scratch_folder.h"
#include "server/site.h"
#include "tools/lint/device_configuration.h"
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
  [[nodiscard]] FileCheck Check() const { return CheckFiles(*device_, job_); }
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

TEST_F(CheckFilesTest, LeavesOutWhatIsForOtherDevices) {
  Write("Lists/a.lst", "s,\\x,ZZ99*,5,1\r\n");

  EXPECT_TRUE(Check().files.empty());
  EXPECT_TRUE(Check().all_right());
}

TEST_F(CheckFilesTest, LooksForImagesInTheFlash) {
  Write("Lists/a.lst", "s,RAM:os,*,3421780262,9\r\n");
  EXPECT_EQ(OnlyState(), FileState::kMissing);

  scratch_.Write("flash/os", "123456789");
  EXPECT_EQ(OnlyState(), FileState::kRight);
}

TEST_F(CheckFilesTest, DoesNotMissTheLoaderImagesThatADeviceHasDeleted) {
  Write("Lists/a.lst",
        "s,\\TQ52.IPL.G3.nb0,*,5,9\r\ns,\\TQ52.IPL.G4.nb0,*,3421780262,9\r\n"
        "s,\\sub\\TQ52.IPL.H3.nb0,*,5,9\r\n");
  Write("TQ52.IPL.G4.nb0", "123456789");

  const FileCheck check = Check();

  ASSERT_EQ(check.files.size(), 3U);
  EXPECT_EQ(check.files[0].state, FileState::kRemoved);
  EXPECT_EQ(check.files[1].state, FileState::kRight);
  EXPECT_EQ(check.files[2].state, FileState::kMissing) << "they lie in the root";
}

TEST_F(CheckFilesTest, ComparesWhatAConfigurationBringsInThisPass) {
  const ScratchFolder served;
  served.Write("fw/os.nb0", "123456789");
  served.Write("fw/app001.zip", "one");
  served.Write("inf/a.inf", "");
  served.Write("inf/a.exe", "program");
  served.Write("a.txt", "hello");
  server::Site site(served.path());
  Findings unused;
  const DeviceJob job = ReadConfiguration(
      "<Job><OSFirmware><Package HardwareVersion='TQ*' SourceDir='fw' Base='os.nb0' "
      "DestDir='RAM:' AdditionalParms='Pass=1'/><Package HardwareVersion='TQ*' SourceDir='fw' "
      "Base='app' Count='1' DestDir='\\App' AdditionalParms='Pass=2'/><Package "
      "HardwareVersion='MR*' SourceDir='fw' Base='mr' DestDir='\\'/></OSFirmware>"
      "<InfFile>inf/a.inf</InfFile><Downloads><File SourceDir='a.txt' DestDir='\\a.txt'/>"
      "</Downloads></Job>",
      "upgrade.xml", unused);
  scratch_.Write("flash/os.nb0", "123456789");
  Write("a.inf", "\"TQ52-A1\" \"x\\a.exe\" \"\\a.exe\"\n\"ZZ\" \"b\" \"\\b\"\n");
  Write("a.exe", "program");
  Write("a.txt", "other");

  const auto states = [&](int pass, server::Site* from) {
    std::string text;
    for (const CheckedFile& file : CheckConfiguredFiles(*device_, job, pass, from).files) {
      text += file.path + " " + NameOf(file.state) + "; ";
    }
    return text;
  };

  EXPECT_EQ(states(1, &site), "RAM:os.nb0 right; \\a.inf wrong; \\a.exe right; \\a.txt wrong; ");
  EXPECT_EQ(states(2, &site),
            "\\App\\app001.zip missing; \\a.inf wrong; \\a.exe right; \\a.txt wrong; ");
  EXPECT_EQ(states(1, nullptr),
            "RAM:os.nb0 unchecked; \\a.inf unchecked; \\a.exe unchecked; \\a.txt unchecked; ");
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

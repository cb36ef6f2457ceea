// Which firmware packages of a configuration file a job takes, and what it takes of them.
#include <gmock/gmock.h>

#include <string>

#include "upgrade_config/configuration_test.h"

namespace {

using test::Package;
using test::Packages;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

using LoadPackagesTest = test::ConfigurationTest;

TEST_F(LoadPackagesTest, FillsAPackageFromItsAttributes) {
  UpgradeConfig job;
  Load(job, Package("HardwareVersion='TQ*' FLASH='0' SourceDir='fw\\os' Base='part' DestDir='\\im'"
                    " Count='12' CmdLine='-f x' AdditionalParms='DiskSize=7'"));
  ASSERT_THAT(job.FirmwarePackages(), SizeIs(1));
  const FirmwarePackage& package = *job.FirmwarePackages()[0];
  EXPECT_STREQ(package.source_folder, "fw\\os\\");
  EXPECT_STREQ(package.base, "part");
  EXPECT_STREQ(package.destination_folder, "\\im\\");
  EXPECT_EQ(package.count, 12);
  EXPECT_STREQ(package.command_line, "-f x");
  EXPECT_STREQ(package.additional_parameters, "DiskSize=7");
  EXPECT_EQ(job.GetFirmwarePackageCount(), 1);
  EXPECT_EQ(job.IsMultiPass(), 0);
}

TEST_F(LoadPackagesTest, LeavesEmptyWhatAPackageDoesNotSay) {
  UpgradeConfig job;
  Load(job, Package("HardwareVersion='TQ' SourceDir='fw'"));
  ASSERT_THAT(Packages(job), ElementsAre("fw\\||"));
  const FirmwarePackage& package = *job.FirmwarePackages()[0];
  EXPECT_EQ(package.count, 0);
  EXPECT_STREQ(package.command_line, "");
  EXPECT_STREQ(package.additional_parameters, "");
}

TEST_F(LoadPackagesTest, EndsTheFoldersOfAPackageWithABackslash) {
  struct Case {
    const char* source;
    const char* destination;
    const char* package;
  };
  const Case cases[] = {
      {"fw", "\\os", "fw\\||\\os\\"},
      {"fw\\", "\\os\\", "fw\\||\\os\\"},
      {"fw/", "/os/", "fw/\\||/os/\\"},
      {"", "", "\\||\\"},
      {"\\", "\\", "\\||\\"},
      {"RAM:", "RAM:", "RAM:\\||RAM:"},
      {"fw", "ram:", "fw\\||ram:"},
      {"fw", "RAM:x", "fw\\||RAM:x\\"},
      {"fw", " RAM:", "fw\\|| RAM:\\"},
      {"fw", "RAM", "fw\\||RAM\\"},
      {"fw", "\\RAM:", "fw\\||\\RAM:\\"},
  };
  for (const Case& c : cases) {
    UpgradeConfig job;
    Load(job, Package("HardwareVersion='*' SourceDir='" + std::string(c.source) + "' DestDir='" +
                      c.destination + "'"));
    EXPECT_THAT(Packages(job), ElementsAre(c.package));
  }
}

TEST_F(LoadPackagesTest, CutsTheTextsOfAPackageToTheirFields) {
  const std::string x(300, 'x');
  UpgradeConfig job;
  Load(job, Package("HardwareVersion='*' SourceDir='" + x + "' Base='" + x + "' DestDir='" + x +
                    "' CmdLine='" + x + "' AdditionalParms='" + x + "'"));
  const std::string cut(255, 'x');
  const std::string folder = std::string(254, 'x') + "\\";
  EXPECT_THAT(Packages(job), ElementsAre(folder + "|" + cut + "|" + folder));
  EXPECT_EQ(job.FirmwarePackages()[0]->command_line, cut);
  EXPECT_EQ(job.FirmwarePackages()[0]->additional_parameters, cut);
}

TEST_F(LoadPackagesTest, EndsAFolderOfAnyLengthWithABackslash) {
  for (const std::size_t length : {253U, 254U, 255U, 256U, 300U}) {
    const std::string name(length, 'x');
    const std::string folder = name.substr(0, 254) + "\\";
    UpgradeConfig job;
    Load(job, Package("HardwareVersion='*' SourceDir='" + name + "' DestDir='" + name + "\\'"));
    EXPECT_THAT(Packages(job), ElementsAre(folder + "||" + folder)) << length;
  }
}

TEST_F(LoadPackagesTest, CountsPackagesThatItDoesNotTake) {
  UpgradeConfig job;
  Load(job,
       "<OSFirmware><Package SourceDir='no version'/>"
       "<Package HardwareVersion='' SourceDir='empty version'/>"
       "<Package HardwareVersion=',' SourceDir='empty pieces'/>"
       "<Package HardwareVersion='MR' SourceDir='another device'/>"
       "<Package HardwareVersion='TQ' FLASH='64' SourceDir='another flash'/>"
       "<Package HardwareVersion='TQ' FLASH='' SourceDir='no flash'/>"
       "<Package HardwareVersion='TQ' AdditionalParms='Pass=2'/>"
       "<package HardwareVersion='TQ' SourceDir='another name'/>"
       "<Package HardwareVersion='TQ' SourceDir='taken'/></OSFirmware>"
       "<OSFirmware><Package HardwareVersion='XX,TQ5' FLASH='0' SourceDir='too'/></OSFirmware>");
  EXPECT_THAT(Packages(job), ElementsAre("taken\\||", "too\\||"));
  EXPECT_EQ(job.GetFirmwarePackageCount(), 9);
  EXPECT_EQ(job.IsMultiPass(), 0) << "only a package that is added counts";
}

TEST_F(LoadPackagesTest, AsksForTheFlashWithEveryPiece) {
  UpgradeConfig job;
  Load(job, Package("HardwareVersion='TQ,TQ52,*' FLASH='64' SourceDir='fw'"));
  EXPECT_THAT(Packages(job), IsEmpty());
  Load(job, Package("HardwareVersion='MR,TQ52,*' FLASH='0' SourceDir='fw'"));
  EXPECT_THAT(Packages(job), SizeIs(1)) << "selected once, though two pieces match";
}

TEST_F(LoadPackagesTest, KnowsSeveralPassesByAParameterOfASelectedPackage) {
  struct Case {
    const char* parameters;
    int multi_pass;
  };
  for (const Case& c : {Case{"Pass=2", 1}, Case{"DiskSize=1;Pass=", 1}, Case{"xPass=1", 1},
                        Case{"pass=2", 0}, Case{"Pass =2", 0}, Case{"", 0}}) {
    UpgradeConfig job;
    Load(job, Package("HardwareVersion='*' SourceDir='fw' AdditionalParms='" +
                      std::string(c.parameters) + "'"));
    EXPECT_EQ(job.IsMultiPass(), c.multi_pass) << c.parameters;
  }
  UpgradeConfig job;
  Load(job, Package("HardwareVersion='MR' SourceDir='fw' AdditionalParms='Pass=2'"));
  EXPECT_EQ(job.IsMultiPass(), 0) << "for another device";

  // Of a parameter that is cut, what is left counts.
  for (const std::size_t before : {250U, 251U}) {
    UpgradeConfig cut;
    Load(cut, Package("HardwareVersion='*' SourceDir='fw' AdditionalParms='" +
                      std::string(before, 'x') + "Pass=2'"));
    EXPECT_EQ(cut.IsMultiPass(), before == 250 ? 1 : 0);
  }
}

class LoadPackagesOnAnotherDeviceTest : public test::ConfigurationTest {
 protected:
  explicit LoadPackagesOnAnotherDeviceTest(std::string configuration)
      : ConfigurationTest(With(std::move(configuration))) {}
  LoadPackagesOnAnotherDeviceTest() : LoadPackagesOnAnotherDeviceTest("7X30-B2") {}

  static sim::Profile With(std::string configuration) {
    sim::Profile profile;
    profile.configuration = std::move(configuration);
    return profile;
  }
};

/// Packages for several kinds of device in one file.
constexpr char kManyDevices[] =
    "<OSFirmware><Package HardwareVersion='7?,X*' SourceDir='sevens'/>"
    "<Package HardwareVersion='TQ52' SourceDir='tq'/>"
    "<Package HardwareVersion='*' SourceDir='all'/>"
    "<Package HardwareVersion='7X30-B2-LONGER,TQ52-A' SourceDir='both'/></OSFirmware>";

TEST_F(LoadPackagesTest, TakesWhatIsForThisDeviceOutOfAFileForSeveral) {
  UpgradeConfig job;
  Load(job, kManyDevices);
  EXPECT_THAT(Packages(job), ElementsAre("tq\\||", "all\\||", "both\\||"));
}

TEST_F(LoadPackagesOnAnotherDeviceTest, TakesWhatIsForThisDeviceOutOfAFileForSeveral) {
  UpgradeConfig job;
  ASSERT_STREQ(job.GetMfgString(), "7X30-B2");
  Load(job, kManyDevices);
  EXPECT_THAT(Packages(job), ElementsAre("sevens\\||", "all\\||", "both\\||"));
}

class LoadPackagesOnUnknownDeviceTest : public LoadPackagesOnAnotherDeviceTest {
 protected:
  // A text of 24 characters does not fit what is read of it.
  LoadPackagesOnUnknownDeviceTest() : LoadPackagesOnAnotherDeviceTest("TQ52-A1-0123456789ABCDEF") {}
};

TEST_F(LoadPackagesOnUnknownDeviceTest, TakesEveryPackageThatNamesADevice) {
  UpgradeConfig job;
  ASSERT_STREQ(job.GetMfgString(), "");
  Load(job, kManyDevices);
  EXPECT_THAT(Packages(job), ElementsAre("sevens\\||", "tq\\||", "all\\||", "both\\||"));
}

}  // namespace

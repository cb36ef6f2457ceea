// Packages: a cabinet that comes onto a device and is installed there, over what was installed.
#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "installer/installer.h"
#include "orvenix/configlet.h"
#include "process/processes.h"
#include "product_support/messages.h"
#include "scenario/scenario_test.h"
#include "support/cabinets.h"

namespace {

using std::chrono::seconds;
using test::GetFile;
using test::HostJob;
using test::LogLines;
using test::StatusText;
using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsSupersetOf;
using ::testing::Not;
using ::testing::Optional;

constexpr char kProgram[] = "\\Program Files\\Scan\\scan.exe";
constexpr char kPackage[] = "\\Application\\scan.cab";
constexpr char16_t kKey[] = u"SOFTWARE\\Apps\\Tarnwell Scan";

bool Installed() {
  HKEY key = nullptr;
  if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, kKey, 0, 0, &key) != ERROR_SUCCESS) return false;
  RegCloseKey(key);
  return true;
}

class PackageTest : public test::ScenarioTest {
 protected:
  PackageTest() {
    CreateDirectoryW(u"\\Application", nullptr);
    job_.program = "\\Windows\\wceload.exe";
    job_.parameters = std::string("/noui ") + kPackage;
  }

  /// Publishes a package and lets the job bring it.
  void Publish(const std::string& package) {
    const std::string crc = server().Put("scan.cab", package);
    const std::string list = "scan.cab," + std::string(kPackage) + ",TQ5*," + crc + "," +
                             std::to_string(package.size()) + "\r\n";
    const std::string list_crc = server().Put("list.txt", list);
    job_.list = test::HostFile{"list.txt", "\\list.txt", "*", list_crc};
  }
  void RunJob() {
    EXPECT_EQ(Start(job_), ICFG_OK);
    ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  }
  /// What the installer could not do without somebody to ask.
  void ProtectTheInstalledProgram() {
    test::SetAttributesOf(kProgram, FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN);
  }

  HostJob job_;
};

TEST_F(PackageTest, IsInstalledAtTheEndOfTheUpgrade) {
  Publish(test::SmallPackage("first"));
  test::MessageRecord record(device());

  RunJob();

  EXPECT_THAT(GetFile(kProgram), Optional(std::string("first")));
  EXPECT_TRUE(Installed());
  EXPECT_THAT(
      LogLines(),
      IsSupersetOf({"Local Upgrade Executing", "Orvenix - StartUpgrade - Entering",
                    "\\Windows\\wceload.exe", "/noui \\Application\\scan.cab",
                    "Orvenix - StartUpgrade - Exiting", "Orvenix - UpgradeThread - Exiting"}));
  EXPECT_THAT(ShownLines(), Contains("\\Windows\\wceload.exe"));
  EXPECT_EQ(record.Lines().at(2), "TW_CLIENT: " + StatusText(4, "Remote Executable Started"))
      << "between the event of the beginning and that of the end";
}

TEST_F(PackageTest, IsInstalledOverAnEarlierOneWithoutAQuestion) {
  Publish(test::SmallPackage("first"));
  RunJob();
  ProtectTheInstalledProgram();
  Publish(test::SmallPackage("second"));

  RunJob();

  EXPECT_THAT(GetFile(kProgram), Optional(std::string("second")));
  EXPECT_TRUE(Installed());
  EXPECT_EQ(device().processes().Launches().size(), 2U);
}

TEST_F(PackageTest, MakesTheInstallerAskWhenItsPathCannotBeToldFromTheParameters) {
  Publish(test::SmallPackage("first"));
  RunJob();
  Publish(test::SmallPackage("second"));
  job_.parameters = kPackage;  // no blank in front

  RunJob();

  EXPECT_THAT(GetFile(kProgram), Optional(std::string("first")));
  EXPECT_EQ(device().processes().Launches().size(), 2U) << "the installer ran, and gave up";
  EXPECT_THAT(server().Device().report->error, "");
}

TEST_F(PackageTest, IsWaitedForOrNot) {
  Publish(test::SmallPackage());
  RunJob();
  const auto begin = world().now();
  RunJob();
  const auto waited = world().now() - begin;
  job_.wait = "false";
  const auto begin_without = world().now();
  RunJob();
  const auto less = waited - (world().now() - begin_without);
  EXPECT_GE(less, std::chrono::milliseconds(sim::Installer::kRunMs) - seconds(1));
}

TEST_F(PackageTest, ThatIsBrokenLeavesTheDeviceAsItIs) {
  std::string package = test::SmallPackage("first");
  Publish(package);
  RunJob();
  ProtectTheInstalledProgram();
  Publish(package.substr(0, 60));

  RunJob();

  EXPECT_TRUE(Installed());
  EXPECT_THAT(GetFile(kProgram), Optional(std::string("first")));
  EXPECT_NE(test::AttributesOf(kProgram) & FILE_ATTRIBUTE_READONLY, 0U);
  EXPECT_THAT(LogLines(), Contains("Orvenix - UpgradeThread - Exiting"));
}

TEST_F(PackageTest, OfAJobThatFailsIsNotInstalled) {
  Publish(test::SmallPackage());
  job_.tests.push_back({"No\\Such\\Key", "Name", "REG_SZ", "EQ", "value", "not this device"});
  EXPECT_NE(Start(job_), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_FALSE(Installed());
  EXPECT_THAT(LogLines(), Not(Contains(HasSubstr("StartUpgrade"))));
}

}  // namespace

// Bundles with firmware: what their configuration file says, and what is refused.

#include "tools/bundle_firmware.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "server/scratch_folder.h"
#include "server/site.h"
#include "tools/bundle.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/lint/lint.h"
#include "tools/lint_jobs.h"

namespace tools {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

class BundleFirmwareTest : public ::testing::Test {
 protected:
  BundleFirmwareTest() {
    fs::create_directories(scratch_.path() / "in");
    options_.folder = scratch_.path() / "in";
    options_.out = scratch_.path() / "out";
    options_.address = "127.0.0.2";
  }
  /// A package whose file lies in the scratch folder.
  void Add(const std::string& text) {
    options_.firmware.push_back(ParseFirmware((scratch_.path() / text).string()));
  }
  std::string Configuration() const { return ReadWholeFile(scratch_.path() / "out/upgrade.xml"); }
  std::vector<std::string> LintMade() const {
    server::Site site(scratch_.path() / "out/tree");
    return Ids(LintConfiguration(Configuration(), "upgrade.xml", &site));
  }
  std::string Complaint(ExitCode code) const {
    try {
      MakeBundle(options_);
    } catch (const Failure& failure) {
      EXPECT_EQ(failure.code(), code) << failure.what();
      EXPECT_FALSE(fs::exists(scratch_.path() / "out"));
      return failure.what();
    }
    return "nothing";
  }
  static std::string ParseComplaint(const std::string& text) {
    try {
      static_cast<void>(ParseFirmware(text));
    } catch (const Failure& failure) {
      EXPECT_EQ(failure.code(), ExitCode::kUsage);
      return failure.what();
    }
    return "nothing";
  }

  ScratchFolder scratch_;
  BundleOptions options_;
};

TEST_F(BundleFirmwareTest, WritesEverythingThatPackagesSay) {
  scratch_.Write("fw/os.nb0", std::string(1000, 'o'));
  scratch_.Write("fw/radio.nb0", std::string(500, 'r'));
  scratch_.Write("fw/apps001.zip", "one");
  scratch_.Write("fw/apps002.zip", "second");
  scratch_.Write("in/sub/a.txt", "12345");
  scratch_.Write("in/loader/boot.nb0", "boot");
  options_.destinations = {{"loader/*", "\\"}};
  options_.program = "\\Windows\\writer.exe";
  options_.parameters = "-quiet";
  Add("fw/os.nb0;hardware=TQ52*,TQ53*;flash=0;pass=1;cmd=-os");
  Add("fw/radio.nb0;to=RAM:;hardware=TQ52*,TQ53*");
  Add("fw/apps001.zip;to=\\SDMMC Disk\\Apps;pass=2");

  const Bundle bundle = MakeBundle(options_);

  EXPECT_EQ(bundle.configured_files, 4U);
  EXPECT_EQ(Configuration(),
            "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
            "<Upgrade>\n"
            "  <BaseUrl>http://127.0.0.2</BaseUrl>\n"
            "  <HTTPPort>8080</HTTPPort>\n"
            "  <ShowGUI>true</ShowGUI>\n"
            "  <FlashWriter Name=\"\\Windows\\writer.exe\" CmdLine=\"-quiet\" Wait=\"true\" />\n"
            "  <OSFirmware>\n"
            "    <Package HardwareVersion=\"TQ52*,TQ53*\" FLASH=\"0\" "
            "SourceDir=\"bundle/firmware/1\" Base=\"os.nb0\" DestDir=\"RAM:\" CmdLine=\"-os\" "
            "AdditionalParms=\"Pass=1,RAMAllocSize=1500\" />\n"
            "    <Package HardwareVersion=\"TQ52*,TQ53*\" SourceDir=\"bundle/firmware/2\" "
            "Base=\"radio.nb0\" DestDir=\"RAM:\" AdditionalParms=\"RAMAllocSize=1500\" />\n"
            "    <Package HardwareVersion=\"*\" SourceDir=\"bundle/firmware/3\" Base=\"apps\" "
            "Count=\"2\" DestDir=\"\\SDMMC Disk\\Apps\" "
            "AdditionalParms=\"Pass=2,DiskSize=\\SDMMC Disk:9\" />\n"
            "  </OSFirmware>\n"
            "  <Downloads>\n"
            "    <File SourceDir=\"bundle/loader/boot.nb0\" DestDir=\"\\boot.nb0\" />\n"
            "    <File SourceDir=\"bundle/sub/a.txt\" DestDir=\"\\Application\\sub\\a.txt\" />\n"
            "  </Downloads>\n"
            "</Upgrade>\n");
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "out/tree/bundle/firmware/3/apps002.zip"), "second");
  EXPECT_THAT(LintMade(), IsEmpty());
  EXPECT_EQ(ReadBundle(options_.out).configured_files, 4U);
}

TEST_F(BundleFirmwareTest, GivesAnInfFileWithWhatItNames) {
  scratch_.Write("apps/stock.inf",
                 "[files]\r\n\"TQ52-A1\" \"x/stock.exe\" \"\\Application\\stock.exe\"\r\n"
                 "\"TQ52-A2\" \"stock.exe\" \"\\Application\\stock.exe\"\r\n");
  scratch_.Write("apps/stock.exe", "program");
  options_.inf = scratch_.path() / "apps/stock.inf";

  const Bundle bundle = MakeBundle(options_);

  EXPECT_EQ(bundle.configured_files, 2U);
  EXPECT_THAT(Configuration(), HasSubstr("<InfFile>bundle/inf/stock.inf</InfFile>"));
  EXPECT_EQ(ReadWholeFile(scratch_.path() / "out/tree/bundle/inf/stock.exe"), "program");
  EXPECT_FALSE(fs::exists(scratch_.path() / "out/job.xml"))
      << "there is nothing for a host to send";

  fs::remove(scratch_.path() / "apps/stock.exe");
  fs::remove_all(scratch_.path() / "out");
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("stock.exe: there is no such file"));
}

TEST_F(BundleFirmwareTest, SendsImagesOfTheFolderToTheFlashStoreOnBothRoads) {
  scratch_.Write("in/images/os.nb0", std::string(1000, 'o'));
  scratch_.Write("in/a.txt", "12345");
  options_.destinations = {{"*.nb0", "RAM:"}};
  options_.configuration = true;

  MakeBundle(options_);

  EXPECT_THAT(ReadWholeFile(scratch_.path() / "out/tree/bundle.lst"),
              HasSubstr("bundle/images/os.nb0,RAM:os.nb0,*,"));
  const std::string job = ReadWholeFile(scratch_.path() / "out/job.xml");
  const std::size_t store = job.find("<Field Name=\"Name\">RAM:</Field>");
  ASSERT_NE(store, std::string::npos);
  EXPECT_NE(job.find("<Field Name=\"RequiredSpace\">1000</Field>", store), std::string::npos);
  EXPECT_LT(store, job.find("<Field Name=\"Name\">\\</Field>")) << "the last store decides";
  EXPECT_THAT(
      Configuration(),
      HasSubstr("<Package HardwareVersion=\"*\" SourceDir=\"bundle/images\" Base=\"os.nb0\" "
                "DestDir=\"RAM:\" AdditionalParms=\"RAMAllocSize=1000\" />"));
  EXPECT_THAT(Configuration(), Not(HasSubstr("DestDir=\"RAM:os.nb0\"")));
  EXPECT_THAT(LintMade(), IsEmpty());
}

TEST_F(BundleFirmwareTest, RefusesWhatDevicesCouldNotTake) {
  scratch_.Write("fw/os.nb0", "image");
  scratch_.Write("fw/image-of-the-loader.nb0", "image");
  scratch_.Write("fw/apps001.zip", "1");
  scratch_.Write("fw/apps003.zip", "3");
  scratch_.Write("in/a.txt", "12345");
  const auto complaint = [this](const std::string& package, ExitCode code) {
    options_.firmware.clear();
    Add(package);
    return Complaint(code);
  };

  EXPECT_THAT(complaint("fw/none.nb0", ExitCode::kBadInput), HasSubstr("there is no such file"));
  EXPECT_THAT(complaint("fw/image-of-the-loader.nb0", ExitCode::kBadInput),
              HasSubstr("a name of 23 characters; the flash store keeps 19"));
  EXPECT_THAT(complaint("fw/apps001.zip;to=\\", ExitCode::kBadInput),
              HasSubstr("apps002.zip: is missing, and a later part is there"));
  EXPECT_THAT(complaint("fw/os.nb0;to=ram:", ExitCode::kUsage), HasSubstr("no folder on a device"));
  EXPECT_THAT(complaint("fw/os.nb0;hardware=,", ExitCode::kUsage), HasSubstr("names no device"));
  EXPECT_THAT(complaint("fw/os.nb0;cmd=" + std::string(255, 'c'), ExitCode::kUsage),
              HasSubstr("more than 254 characters"));
  options_.masks = "TQ52*";
  EXPECT_THAT(complaint("fw/os.nb0", ExitCode::kUsage), HasSubstr("knows none for its downloads"));
}

TEST_F(BundleFirmwareTest, AnswersAPackageThatIsWrittenWrongly) {
  EXPECT_THAT(ParseComplaint(";to=RAM:"), HasSubstr("names no file"));
  EXPECT_THAT(ParseComplaint("a;fast"), HasSubstr("\"fast\" is no option"));
  EXPECT_THAT(ParseComplaint("a;colour=red"), HasSubstr("knows no \"colour\""));
  for (const char* pass : {"0", "10", "two", ""}) {
    EXPECT_THAT(ParseComplaint(std::string("a;pass=") + pass), HasSubstr("no number from 1 to 9"));
  }
  EXPECT_THAT(ParseComplaint("a;ram=99999999999"), HasSubstr("no number from 1 to 2147483647"));
}

}  // namespace
}  // namespace tools

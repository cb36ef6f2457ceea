// What `orvenix job lint` finds in configuration files.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>

#include "server/scratch_folder.h"
#include "server/site.h"
#include "tools/failure.h"
#include "tools/lint/device_configuration.h"
#include "tools/lint/lint.h"
#include "tools/lint_jobs.h"

namespace tools {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

constexpr const char* kFile = "<Downloads><File SourceDir='a.txt' DestDir='\\a.txt'/></Downloads>";

std::string Configuration(const std::string& content) {
  return "<Job><BaseUrl>http://10.0.0.2</BaseUrl><HTTPPort>8080</HTTPPort>" + content + "</Job>";
}

/// A package without a fault, but for what `attributes` say.
std::string Package(const std::string& attributes) {
  std::string text = "<Package " + attributes;
  for (const auto& [name, value] : std::vector<std::pair<std::string, std::string>>{
           {"HardwareVersion", "TQ52*"}, {"SourceDir", "fw"}, {"Base", "os"}, {"DestDir", "\\"}}) {
    if (attributes.find(name + "=") == std::string::npos) text += " " + name + "='" + value + "'";
  }
  return text + "/>";
}
std::string Firmware(const std::string& packages) {
  return Configuration("<OSFirmware>" + packages + "</OSFirmware>");
}
std::string Options(const std::string& options) {
  return "AdditionalParms='" + options + "'";
}

Findings Lint(const std::string& text, server::Site* site = nullptr) {
  return LintConfiguration(text, "upgrade.xml", site);
}

TEST(LintConfigurationTest, FindsNothingInOneWithoutAFault) {
  EXPECT_THAT(Ids(Lint(Configuration(kFile))), IsEmpty());
  const std::string image = "Base='os.nb0' DestDir='RAM:' FLASH='0' CmdLine='-os' ";
  EXPECT_THAT(Ids(Lint(Configuration(
                  "<ShowGUI>FALSE</ShowGUI><UpgradeConfig Version='1'/><FlashWriter "
                  "Name='\\Windows\\wceload.exe' CmdLine='\\a.cab'/>"
                  "<Registry><Key>Software</Key><ValueName>V</ValueName><Type>REG_DWORD</Type>"
                  "<Operator>EQ</Operator><Value>1</Value><ErrorMsg>no V</ErrorMsg></Registry>"
                  "<DiskCleanup><File Action='delete'>\\</File><File "
                  "Action='save'>\\kvoupgclnt.txt</File></DiskCleanup><OSFirmware>" +
                  Package(image + Options("Pass=1,RAMAllocSize=5")) +
                  Package("Base='app' Count='2' DestDir='\\SD Card' " +
                          Options("Pass=2,DiskSize=\\SD Card:9")) +
                  "</OSFirmware>"))),
              ElementsAre("delete-root"))
      << "which is meant here";
}

TEST(LintConfigurationTest, FindsWhatEachRuleIsAbout) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"unknown-element", Configuration(std::string(kFile) + "<Baseurl>x</Baseurl>")},
      {"unknown-element", Configuration("<Downloads><Datei/></Downloads>")},
      {"download-incomplete", Configuration("<Downloads><File DestDir='\\a'/></Downloads>")},
      {"package-no-hardware", Firmware(Package("HardwareVersion=','"))},
      {"package-flash", Firmware(Package("FLASH='64'"))},
      {"package-no-source", Firmware("<Package HardwareVersion='*' Base='os'/>")},
      {"package-source-slash", Firmware(Package("SourceDir='fw/'"))},
      {"package-no-file", Firmware(Package("Base=''"))},
      {"package-count", Firmware(Package("Count='-1'"))},
      {"package-count", Firmware(Package("Count='two'"))},
      {"pass-digits", Firmware(Package(Options("Pass=12")))},
      {"pass-never", Firmware(Package(Options("Pass=0")))},
      {"pass-never", Firmware(Package(Options("RAMAllocSize=4,Pass=")))},
      {"pass-gap", Firmware(Package(Options("Pass=1")) + Package(Options("Pass=3")))},
      {"pass-state-deleted",
       Configuration("<OSFirmware>" + Package(Options("Pass=1")) +
                     "</OSFirmware><DiskCleanup><File Action='Delete'>\\</File></DiskCleanup>")},
      {"ram-no-size", Firmware(Package("DestDir='RAM:'"))},
      {"ram-no-size", Firmware(Package("DestDir='RAM:' " + Options("Pass=1")) +
                               Package(Options("Pass=2,RAMAllocSize=5")))},
      {"ram-no-size", Firmware(Package("DestDir='RAM:'") +
                               Package("HardwareVersion='MR' " + Options("RAMAllocSize=5")))},
      {"ram-name", Firmware(Package("Base='image-of-the-loader.nb0' DestDir='RAM:' " +
                                    Options("RAMAllocSize=5")))},
      {"ram-case", Firmware(Package("DestDir='ram:'"))},
      {"destination-macro", Firmware(Package("DestDir='\\%CE1%\\app'"))},
      {"disk-size", Firmware(Package(Options("DiskSize=100")))},
      {"inf-name", Configuration("<InfFile>fw/" + std::string(64, 'i') + "</InfFile>")},
      {"duplicate-destination", Firmware(Package("") + Package("DestDir='\\' SourceDir='other'"))},
      {"url-missing", "<Job>" + std::string(kFile) + "</Job>"},
      {"test-no-type", Configuration("<Registry><Key>K</Key></Registry>")},
      {"nothing-to-fetch", Configuration("")},
      {"installer-blank", Configuration("<FlashWriter Name='wceload.exe' CmdLine='\\a.cab'/>")},
      {"cut-text", Configuration("<BeginText>" + std::string(64, 'b') + "</BeginText>")},
      {"cleanup-idle", Configuration("<DiskCleanup><File>\\a</File></DiskCleanup>")},
  };
  for (const auto& [id, text] : cases) {
    EXPECT_THAT(Ids(Lint(text)), Contains(id)) << text;
  }
  // Every rule of such files has a case here, or needs what is served.
  std::set<std::string> seen = {"ram-size-short", "inf-pattern"};
  for (const auto& known : cases) seen.insert(known.first);
  for (auto i = static_cast<std::size_t>(Rule::kUnknownElement);
       i < static_cast<std::size_t>(Rule::kNoStorage); ++i) {
    const RuleRow& rule = RowOf(static_cast<Rule>(i));
    EXPECT_EQ(seen.count(rule.id), 1U) << rule.id << " has no case";
    EXPECT_STRNE(rule.fix, "");
  }
}

TEST(LintConfigurationTest, TakesAFileOfSeveralPassesInEachOfThem) {
  EXPECT_THAT(Ids(Lint(Firmware(Package(Options("Pass=1")) + Package(Options("Pass=2"))))),
              Not(Contains("duplicate-destination")));
}

TEST(LintConfigurationTest, NamesTheLineAndRefusesWhatIsNoXml) {
  const Findings findings = Lint("<Job>\n<BaseUrl>http://10.0.0.2</BaseUrl>\n<OSFirmware>\n" +
                                 Package("FLASH='64'") + "</OSFirmware></Job>");
  ASSERT_THAT(findings.all(), SizeIs(1));
  EXPECT_EQ(findings.all()[0].where, "upgrade.xml:4");
  try {
    static_cast<void>(Lint("<Job>\n<BaseUrl>"));
    FAIL();
  } catch (const Failure& failure) {
    EXPECT_THAT(failure.where(), HasSubstr("upgrade.xml:"));
  }
}

TEST(LintConfigurationTest, ComparesWithWhatIsServed) {
  const ScratchFolder served;
  served.Write("fw/os001.zip", "one");
  served.Write("fw/image.nb0", std::string(50'000, 'i'));
  served.Write("inf/apps.inf",
               "; comment\n\"TQ52-A1\" \"x\\a.txt\" \"\\a.txt\"\n\"TQ*\" \"b.txt\" \"\\b.txt\"\n");
  served.Write("inf/a.txt", "a");
  server::Site site(served.path());

  EXPECT_THAT(Ids(Lint(Firmware(Package("Count='1'")), &site)), IsEmpty());
  EXPECT_THAT(Ids(Lint(Firmware(Package("Count='2'")), &site)), ElementsAre("file-missing"));
  const auto image = [&site](const std::string& size) {
    return Ids(Lint(
        Firmware(Package("Base='image.nb0' DestDir='RAM:' " + Options("RAMAllocSize=" + size))),
        &site));
  };
  EXPECT_THAT(image("9040"), IsEmpty()) << "the device adds 40960 bytes";
  EXPECT_THAT(image("9039"), ElementsAre("ram-size-short"));
  EXPECT_THAT(Ids(Lint(Configuration("<InfFile>inf/apps.inf</InfFile>"), &site)),
              ElementsAre("file-missing", "inf-pattern"))
      << "a.txt is found beside the INF file, b.txt is not";
}

TEST(ConfigurationTest, KnowsWhatADeviceTakesAndWhen) {
  Findings unused;
  const DeviceJob job = ReadConfiguration(
      Firmware(Package("Count='2' Base='part' DestDir='\\Store' " + Options("Pass=2")) +
               Package("HardwareVersion='MR,*' SourceDir='fw\\'") + Package("FLASH='64'") +
               "<Package HardwareVersion='*' Base='lost'/>" + Package("HardwareVersion='MR'")),
      "upgrade.xml", unused);

  const auto packages = PackagesFor(job, "TQ52-A1");

  ASSERT_THAT(packages, SizeIs(2));
  EXPECT_TRUE(IsMultiPass(packages));
  EXPECT_EQ(LastPass(packages), 2);
  const auto parts = FilesOf(*packages[0]);
  ASSERT_THAT(parts, SizeIs(2));
  EXPECT_EQ(parts[1].source, "fw\\part002.zip");
  EXPECT_EQ(parts[1].destination, "\\Store\\part002.zip");
  EXPECT_EQ(FilesOf(*packages[1]).at(0).source, "fw\\os");
  EXPECT_EQ(FilesOf(*packages[1]).at(0).destination, "\\os");
  EXPECT_EQ(LastPass(PackagesFor(job, "MR41")), 1);
}

TEST(ConfigurationTest, IsToldFromAJobByItsRoot) {
  EXPECT_TRUE(IsConfiguration(Configuration("")));
  EXPECT_FALSE(IsConfiguration("<DevInfo/>"));
  EXPECT_FALSE(IsConfiguration("no XML at all"));
}

}  // namespace
}  // namespace tools

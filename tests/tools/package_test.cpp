#include "tools/package/package.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <string>

#include "ce/system.h"
#include "installer/setup_file.h"
#include "server/scratch_folder.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/program.h"
#include "upgrade/package/package_reading.h"

namespace tools {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

class MakePackageTest : public ::testing::Test {
 protected:
  MakePackageTest() {
    options_.folder = scratch_.path() / "in";
    options_.cabinet = scratch_.path() / "scan.cab";
    options_.application = "Scan";
    options_.provider = "Tarnwell";
    options_.destination = "\\Program Files\\Scan";
  }

  std::string Made() {
    MakePackage(options_);
    return ReadWholeFile(options_.cabinet);
  }
  /// Lets cabextract unpack it into "out". @return whether it was content.
  bool Unpack() {
    const std::string command = "cd '" + scratch_.path().string() +
                                "' && cabextract --quiet --directory=out scan.cab >log 2>&1";
    return std::system(command.c_str()) == 0;
  }
  std::string Unpacked(const char* name) const {
    return ReadWholeFile(scratch_.path() / "out" / name);
  }
  sim::PackageSetup ReadSetup() {
    sim::PackageSetup setup;
    std::string error;
    EXPECT_TRUE(Unpack()) << ReadWholeFile(scratch_.path() / "log");
    EXPECT_TRUE(sim::ReadPackageSetup(Unpacked("SCAN.000"), setup, error)) << error;
    return setup;
  }
  std::string Complaint(ExitCode code) {
    try {
      MakePackage(options_);
    } catch (const Failure& failure) {
      EXPECT_EQ(failure.code(), code) << failure.what();
      EXPECT_FALSE(fs::exists(options_.cabinet));
      return failure.what();
    }
    return "nothing";
  }

  ScratchFolder scratch_;
  PackageOptions options_;
};

TEST_F(MakePackageTest, MakesACabinetThatCabextractUnpacks) {
  scratch_.Write("in/scan.exe", "the program");
  scratch_.Write("in/sub/settings.ini", "");
  scratch_.Write("in/sub/large.bin", std::string(100001, 'l'));

  Made();

  ASSERT_TRUE(Unpack());
  EXPECT_EQ(Unpacked("SCAN.001"), "the program");
  EXPECT_EQ(Unpacked("LARGE.002"), std::string(100001, 'l'));
  EXPECT_EQ(Unpacked("SETTINGS.003"), "");
}

TEST_F(MakePackageTest, GivesEveryBlockAChecksum) {
  scratch_.Write("in/scan.exe", std::string(40002, 'p'));
  std::string cabinet = Made();
  cabinet[cabinet.size() - 3] ^= 1;
  scratch_.Write("scan.cab", cabinet);
  EXPECT_FALSE(Unpack());
}

TEST_F(MakePackageTest, MakesWhatADevicePrepares) {
  scratch_.Write("in/scan.exe", "the program");
  scratch_.Write("in/sub/deep/settings.ini", "x");

  const test::PackageReading package = test::ReadPackage(Made());

  EXPECT_EQ(package.key, "SOFTWARE\\Apps\\Tarnwell Scan");
  EXPECT_THAT(package.Texts(), ElementsAre("\\Program Files\\Scan\\scan.exe",
                                           "\\Program Files\\Scan\\sub\\deep\\settings.ini"));
  EXPECT_EQ(package.paths.back().result, upgrade::PackageResult::kDone);
}

TEST_F(MakePackageTest, MakesWhatADevicePreparesOfManyFilesToo) {
  for (int i = 0; i < 999; ++i) {
    scratch_.Write("in/a-folder-with-a-long-name/a-file-with-a-long-name-" + std::to_string(i), "");
  }
  const test::PackageReading package = test::ReadPackage(Made());
  EXPECT_EQ(package.Texts().size(), 999U) << "the setup file needs more than one block";
  EXPECT_EQ(ReadSetup().files.size(), 999U);
}

TEST_F(MakePackageTest, TellsTheInstallerWhereFilesGo) {
  scratch_.Write("in/scan.exe", "the program");
  scratch_.Write("in/sub/settings.ini", "x");
  Made();
  const sim::PackageSetup setup = ReadSetup();
  EXPECT_EQ(setup.application, "Scan");
  EXPECT_EQ(setup.provider, "Tarnwell");
  EXPECT_EQ(setup.folder, "\\Program Files\\Scan");
  ASSERT_EQ(setup.files.size(), 2U);
  EXPECT_EQ(setup.files[0].path, "\\Program Files\\Scan\\scan.exe");
  EXPECT_EQ(setup.files[1].path, "\\Program Files\\Scan\\sub\\settings.ini");
}

TEST_F(MakePackageTest, CarriesRegistryValues) {
  scratch_.Write("in/scan.exe", "x");
  scratch_.Write("scan.reg",
                 "REGEDIT4\n\n[HKEY_LOCAL_MACHINE\\SOFTWARE\\Tarnwell]\n\"Port\"=dword:00001b58\n"
                 "@=\"the default\"\n[HKEY_CURRENT_USER\\Empty]\n[HKEY_CURRENT_USER\\Names]\n"
                 "\"Names\"=hex(7):41,00,00,00,00,00\n\"Bytes\"=hex:01,02\n\"None\"=\"\"\n");
  options_.registry = scratch_.path() / "scan.reg";
  EXPECT_EQ(MakePackage(options_).values, 5U);
  const sim::PackageSetup setup = ReadSetup();
  std::vector<std::string> values;
  for (const sim::PackageValue& value : setup.values) {
    values.push_back(
        value.key + "|" + std::string(value.value.name.begin(), value.value.name.end()) + "|" +
        std::to_string(value.value.type) + "|" + std::to_string(value.value.data.size()));
  }
  EXPECT_THAT(values, ElementsAre("Names|Bytes|3|2", "Names|Names|7|6", "Names|None|1|2",
                                  "SOFTWARE\\Tarnwell||1|24", "SOFTWARE\\Tarnwell|Port|4|4"));
  EXPECT_EQ(setup.values[0].root, 0x80000001U);
  EXPECT_EQ(setup.values[3].root, 0x80000002U);
}

TEST_F(MakePackageTest, GivesTheSameBytesForTheSameFiles) {
  scratch_.Write("in/scan.exe", "the program");
  const std::string first = Made();
  EXPECT_EQ(Made(), first);
}

TEST_F(MakePackageTest, NamesFoldersOfTheDeviceByMacros) {
  EXPECT_EQ(FolderWithMacro("\\Program Files\\Scan"), "%CE1%\\Scan");
  EXPECT_EQ(FolderWithMacro("\\windows"), "%CE2%");
  EXPECT_EQ(FolderWithMacro("\\Windows\\StartUp"), "%CE4%");
  EXPECT_EQ(FolderWithMacro("\\Windows\\Start Menu\\Programs\\Games\\A"), "%CE14%\\A");
  EXPECT_EQ(FolderWithMacro("\\Windows\\Start Menu"), "%CE17%");
  EXPECT_EQ(FolderWithMacro("\\Windowsill"), "\\Windowsill");
  EXPECT_EQ(FolderWithMacro("\\Application"), "\\Application");
  EXPECT_EQ(FolderWithMacro("\\"), "\\");
}

TEST_F(MakePackageTest, PutsFilesIntoTheRoot) {
  scratch_.Write("in/a.txt", "x");
  scratch_.Write("in/b/c.txt", "x");
  options_.destination = "\\";
  EXPECT_THAT(test::ReadPackage(Made()).Texts(), ElementsAre("\\a.txt", "\\b\\c.txt"));
}

TEST_F(MakePackageTest, RefusesWhatDevicesCannotTake) {
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("is not a folder"));
  fs::create_directories(options_.folder);
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("holds 0 files"));
  scratch_.Write("in/a%b", "x");
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("a character that devices cannot carry"));
  fs::remove(options_.folder / "a%b");
  scratch_.Write("in/" + std::string(240, 'n'), "x");
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("has 260 characters"));
  fs::remove_all(options_.folder);
  scratch_.Write("in/a", "x");
  options_.application = std::string(64, 'a');
  EXPECT_THAT(Complaint(ExitCode::kUsage), HasSubstr("devices read 63"));
  options_.application = "";
  EXPECT_THAT(Complaint(ExitCode::kUsage), HasSubstr("is no name"));
  options_.application = "Scan";
  options_.destination = "Scan";
  EXPECT_THAT(Complaint(ExitCode::kUsage), HasSubstr("is no folder of a device"));
  options_.destination = "\\Scan";
  scratch_.Write("scan.reg", "nonsense");
  options_.registry = scratch_.path() / "scan.reg";
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("line 1"));
  scratch_.Write("scan.reg",
                 "REGEDIT4\n[HKEY_CURRENT_USER\\A]\n\"a\"=hex(b):01,02,03,04,05,06,07,08\n");
  EXPECT_THAT(Complaint(ExitCode::kBadInput), HasSubstr("has the type 11"));
}

TEST_F(CommandLineTest, PacksAFolderIntoAPackage) {
  scratch_.Write("in/scan.exe", "the program");
  const Ended ended = Run("bundle cab in scan.cab --application Scan --provider Tarnwell --json");
  ASSERT_EQ(ended.code, 0) << ended.errors;
  const auto json = nlohmann::json::parse(ended.output);
  EXPECT_EQ(json.at("event"), "packed");
  EXPECT_EQ(json.at("files"), 1);
  EXPECT_EQ(json.at("bytes"), fs::file_size(scratch_.path() / "scan.cab"));
  EXPECT_EQ(json.at("key"), "HKEY_LOCAL_MACHINE\\SOFTWARE\\Apps\\Tarnwell Scan");
}

}  // namespace
}  // namespace tools

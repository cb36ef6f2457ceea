#include "installer/installer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "storage/storage.h"
#include "support/cabinets.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

namespace fs = std::filesystem;
using sim::Installer;
using test::CabinetBytes;
using test::GetFile;
using test::PutFile;
using test::SetupPlan;
using ::testing::HasSubstr;
using ::testing::Optional;

constexpr char kPackage[] = "\\Temp\\scan.cab";
constexpr char16_t kKey[] = u"SOFTWARE\\Apps\\Tarnwell Scan";

SetupPlan Plan() {
  SetupPlan plan;
  plan.strings = {{1, "%CE1%\\Scan"}, {2, "%CE2%"}, {3, "SOFTWARE\\Tarnwell\\Scan"}};
  plan.files = {{1, 1, "scan.exe"}, {2, 2, "scan.dll"}};
  plan.keys = {{1, 3, 3}};
  plan.values = {{1, 0x00010001, std::string("Port\0\x58\x1B\0\0", 9)},
                 {1, 0x00000000, std::string("Name\0scanner\0", 13)},
                 {1, 0x00000001, std::string("Bytes\0\x01\x02", 8)},
                 {1, 0x00010000, std::string("Names\0a\0b\0", 10)}};
  return plan;
}

std::string Package(const SetupPlan& plan) {
  return CabinetBytes({{{test::kSetupName, SetupBytes(plan)},
                        {"SCAN.001", "the program"},
                        {"LIBRARY.002", "the library"}},
                       {},
                       0,
                       32768});
}

std::vector<BYTE> Value(const char16_t* path, const char16_t* name, DWORD expected_type) {
  HKEY key = nullptr;
  EXPECT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE, path, 0, 0, &key), ERROR_SUCCESS);
  std::vector<BYTE> data(200);
  DWORD type = 0;
  auto size = static_cast<DWORD>(data.size());
  EXPECT_EQ(RegQueryValueExW(key, name, nullptr, &type, data.data(), &size), ERROR_SUCCESS);
  EXPECT_EQ(type, expected_type);
  RegCloseKey(key);
  data.resize(size);
  return data;
}

class InstallerTest : public DeviceTest {
 protected:
  explicit InstallerTest(const sim::Profile& profile = {}) : DeviceTest(profile) {}

  std::uint32_t Run(const std::string& command_line) {
    return Installer(device()).Run(command_line);
  }
  std::uint32_t Install(const std::string& cabinet) {
    PutFile(kPackage, cabinet);
    return Run(std::string("/noui ") + kPackage);
  }
  std::string Log() {
    std::ifstream file(device().folder() / "programs.log");
    return {std::istreambuf_iterator<char>(file), {}};
  }
};

TEST_F(InstallerTest, WritesFilesAndValues) {
  EXPECT_EQ(Install(Package(Plan())), Installer::kInstalled);

  EXPECT_THAT(GetFile("\\Program Files\\Scan\\scan.exe"), Optional(std::string("the program")));
  EXPECT_THAT(GetFile("\\Windows\\scan.dll"), Optional(std::string("the library")));
  const char16_t* const key = u"SOFTWARE\\Tarnwell\\Scan";
  EXPECT_EQ(Value(key, u"Port", REG_DWORD), (std::vector<BYTE>{0x58, 0x1B, 0, 0}));
  EXPECT_EQ(Value(key, u"Name", REG_SZ).size(), 2 * sizeof "scanner");
  EXPECT_EQ(Value(key, u"Bytes", REG_BINARY), (std::vector<BYTE>{1, 2}));
  EXPECT_EQ(Value(key, u"Names", REG_MULTI_SZ),
            (std::vector<BYTE>{'a', 0, 0, 0, 'b', 0, 0, 0, 0, 0}));
  EXPECT_THAT(Log(), HasSubstr("wceload.exe: installed Tarnwell Scan: 2 files, 4 values\n"));
  EXPECT_FALSE(fs::exists(device().folder() / "installer")) << "nothing of it stays";
}

TEST_F(InstallerTest, NotesThatThePackageIsInstalled) {
  ASSERT_EQ(Install(Package(Plan())), Installer::kInstalled);
  EXPECT_EQ(Value(kKey, u"Instl", REG_DWORD), (std::vector<BYTE>{1, 0, 0, 0}));
  const std::vector<BYTE> folder = Value(kKey, u"InstlDir", REG_SZ);
  EXPECT_EQ(folder.size(), 2 * sizeof "\\Program Files\\Scan");
}

TEST_F(InstallerTest, TakesOptionsAndQuotes) {
  PutFile("\\My Documents\\the package.cab", Package(Plan()));
  PutFile(kPackage, Package(Plan()));
  for (const char* command_line :
       {"/noui \"\\My Documents\\the package.cab\"", "\\My Documents\\the package.cab",
        "/silent /noui   \\Temp\\scan.cab  ", "\\Temp\\scan.cab"}) {
    RegDeleteKeyW(HKEY_LOCAL_MACHINE, kKey);
    EXPECT_EQ(Run(command_line), Installer::kInstalled) << command_line;
  }
  for (const char* command_line :
       {"", "/noui", "/noui\\Temp\\scan.cab", "\"", "\\Temp", "\\Temp\\none.cab", "../device"}) {
    RegDeleteKeyW(HKEY_LOCAL_MACHINE, kKey);
    EXPECT_EQ(Run(command_line), Installer::kNoPackage) << command_line;
  }
}

TEST_F(InstallerTest, GivesUpWhereItWouldAskWhetherToInstallOnceMore) {
  ASSERT_EQ(Install(Package(Plan())), Installer::kInstalled);
  EXPECT_EQ(Install(Package(Plan())), Installer::kWouldAsk);
  EXPECT_THAT(Log(), HasSubstr("would ask: Scan is installed already"));
  RegDeleteKeyW(HKEY_LOCAL_MACHINE, kKey);
  EXPECT_EQ(Install(Package(Plan())), Installer::kInstalled);
}

TEST_F(InstallerTest, GivesUpWhereItWouldAskWhetherToReplaceAFile) {
  PutFile("\\Windows\\scan.dll", "old");
  for (const DWORD attribute :
       {FILE_ATTRIBUTE_READONLY, FILE_ATTRIBUTE_HIDDEN, FILE_ATTRIBUTE_SYSTEM}) {
    test::SetAttributesOf("\\Windows\\scan.dll", attribute);
    EXPECT_EQ(Install(Package(Plan())), Installer::kWouldAsk);
    EXPECT_FALSE(test::Exists("\\Program Files\\Scan\\scan.exe")) << "nothing is half installed";
  }
  test::SetAttributesOf("\\Windows\\scan.dll", FILE_ATTRIBUTE_ARCHIVE);
  EXPECT_EQ(Install(Package(Plan())), Installer::kInstalled);
  EXPECT_THAT(GetFile("\\Windows\\scan.dll"), Optional(std::string("the library")));
}

TEST_F(InstallerTest, RefusesWhatIsNoPackage) {
  EXPECT_EQ(Install("no cabinet"), Installer::kNoPackage);
  const std::string package = Package(Plan());
  EXPECT_EQ(Install(package.substr(0, package.size() / 2)), Installer::kNoPackage);
  EXPECT_EQ(Install(CabinetBytes({{{"SCAN.001", "x"}}, {}, 0, 32768})), Installer::kNoPackage);
  EXPECT_THAT(Log(), HasSubstr("the setup file: there is none"));
  EXPECT_EQ(Install(CabinetBytes({{{"SCAN.000", "x"}}, {}, 0, 32768})), Installer::kNoPackage);
  EXPECT_THAT(Log(), HasSubstr("the setup file: it is no setup file"));
}

TEST_F(InstallerTest, WritesNothingOutsideTheDevice) {
  SetupPlan plan = Plan();
  plan.strings[1].text = "..\\..";
  EXPECT_EQ(Install(Package(plan)), Installer::kCannotWrite);
  EXPECT_FALSE(fs::exists(device().folder().parent_path() / "scan.dll"));
  EXPECT_THAT(Log(), HasSubstr("cannot write ..\\..\\scan.dll"));
}

TEST_F(InstallerTest, UnpacksCompressedPackagesToo) {
  const fs::path made = folder() / "made";
  fs::create_directories(made);
  const auto write = [&made](const char* name, const std::string& content) {
    std::ofstream(made / name, std::ios::binary) << content;
  };
  write("SCAN.000", SetupBytes(Plan()));
  write("SCAN.001", "the program");
  write("SCAN.002", "the library");
  const std::string command = "cd '" + made.string() +
                              "' && gcab --create --nopath --zip scan.cab SCAN.000 SCAN.001 "
                              "SCAN.002";
  ASSERT_EQ(std::system(command.c_str()), 0);
  std::ifstream cabinet(made / "scan.cab", std::ios::binary);
  EXPECT_EQ(Install({std::istreambuf_iterator<char>(cabinet), {}}), Installer::kInstalled);
  EXPECT_THAT(GetFile("\\Windows\\scan.dll"), Optional(std::string("the library")));
}

TEST_F(InstallerTest, IsOnEveryDeviceAndRunsForAWhile) {
  PutFile(kPackage, Package(Plan()));
  std::u16string command_line = u"/noui \\Temp\\scan.cab";
  PROCESS_INFORMATION started = {};
  ASSERT_TRUE(CreateProcessW(u"\\Windows\\WCELOAD.exe", command_line.data(), nullptr, nullptr,
                             FALSE, 0, nullptr, nullptr, nullptr, &started));
  const auto begin = world().now();
  EXPECT_EQ(WaitForSingleObject(started.hProcess, INFINITE), WAIT_OBJECT_0);
  EXPECT_EQ(world().now() - begin, std::chrono::milliseconds(Installer::kRunMs));
  DWORD code = 99;
  EXPECT_TRUE(GetExitCodeProcess(started.hProcess, &code));
  EXPECT_EQ(code, Installer::kInstalled);
  EXPECT_TRUE(test::Exists("\\Windows\\scan.dll"));
  CloseHandle(started.hProcess);
  CloseHandle(started.hThread);
}

sim::Profile WithOwnInstaller() {
  sim::Profile profile;
  profile.programs["wceload.exe"] = {"", 7, 0};
  return profile;
}

class OwnInstallerTest : public InstallerTest {
 protected:
  OwnInstallerTest() : InstallerTest(WithOwnInstaller()) {}
};

TEST_F(OwnInstallerTest, TakesThePlaceOfTheDevicesOne) {
  PutFile(kPackage, Package(Plan()));
  std::u16string command_line = u"\\Temp\\scan.cab";
  PROCESS_INFORMATION started = {};
  ASSERT_TRUE(CreateProcessW(u"wceload.exe", command_line.data(), nullptr, nullptr, FALSE, 0,
                             nullptr, nullptr, nullptr, &started));
  WaitForSingleObject(started.hProcess, INFINITE);
  DWORD code = 0;
  EXPECT_TRUE(GetExitCodeProcess(started.hProcess, &code));
  EXPECT_EQ(code, 7U);
  EXPECT_FALSE(test::Exists("\\Windows\\scan.dll"));
  CloseHandle(started.hProcess);
  CloseHandle(started.hThread);
}

// ---- the setup file ----

TEST(PackageSetupTest, IsReadWhateverItsBytesAre) {
  const std::string good = SetupBytes(Plan());
  std::size_t refused = 0;
  for (std::size_t at = 0; at < good.size(); ++at) {
    for (const char value : {'\0', '\x7F', '\xFF'}) {
      std::string bytes = good;
      bytes[at] = value;
      sim::PackageSetup setup;
      std::string error;
      if (!sim::ReadPackageSetup(bytes, setup, error)) ++refused;
    }
    sim::PackageSetup setup;
    std::string error;
    EXPECT_FALSE(sim::ReadPackageSetup(good.substr(0, at), setup, error)) << at;
    EXPECT_NE(error, "");
  }
  EXPECT_GT(refused, 50U);
}

TEST(PackageSetupTest, PutsAFolderTogetherFromItsStrings) {
  std::string bytes = SetupBytes(Plan());
  sim::PackageSetup setup;
  std::string error;
  ASSERT_TRUE(sim::ReadPackageSetup(bytes, setup, error)) << error;
  EXPECT_EQ(setup.folder, "\\Program Files\\Scan");
  ASSERT_EQ(setup.files.size(), 2U);
  EXPECT_EQ(setup.files[1].path, "\\Windows\\scan.dll");
  EXPECT_EQ(setup.key(), "SOFTWARE\\Apps\\Tarnwell Scan");
}

}  // namespace

#include "upgrade/prepare_package.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "product_support/host.h"
#include "storage/storage.h"
#include "support/cabinets.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace upgrade {
namespace {

using test::AttributesOf;
using test::PutFile;
using test::SetAttributesOf;
using test::SetupPlan;
using ::testing::AllOf;
using ::testing::Contains;
using ::testing::Not;

constexpr char kPackage[] = "\\Temp\\scan.cab";
constexpr std::uint32_t kAll = FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN |
                               FILE_ATTRIBUTE_SYSTEM | FILE_ATTRIBUTE_ARCHIVE;

bool KeyExists(const std::u16string& name) {
  HKEY key = nullptr;
  const bool exists = RegOpenKeyExW(HKEY_LOCAL_MACHINE, name.c_str(), 0, 0, &key) == ERROR_SUCCESS;
  if (exists) RegCloseKey(key);
  return exists;
}

void MakeKey(const std::u16string& name) {
  HKEY key = nullptr;
  DWORD disposition = 0;
  RegCreateKeyExW(HKEY_LOCAL_MACHINE, name.c_str(), 0, nullptr, 0, 0, nullptr, &key, &disposition);
  const DWORD installed = 1;
  RegSetValueExW(key, u"Instl", 0, REG_DWORD, reinterpret_cast<const BYTE*>(&installed), 4);
  RegCloseKey(key);
}

class PreparePackageTest : public DeviceTest {
 protected:
  PreparePackageTest() {
    plan_.strings = {{1, "%CE1%\\Scan"}, {2, "%CE2%"}};
    plan_.files = {{1, 1, "scan.exe"}, {2, 2, "scan.dll"}};
    for (const char* path : kFiles) {
      PutFile(path, "old");
      SetAttributesOf(path, kAll);
    }
    MakeKey(kKey);
    MakeKey(u"SOFTWARE\\Apps\\Tarnwell Other");
  }

  void PutPackage() {
    PutFile(kPackage, test::CabinetBytes({{{test::kSetupName, test::SetupBytes(plan_)},
                                           {"SCAN.001", "new"},
                                           {"SCAN.002", "new"}},
                                          {},
                                          0,
                                          32768}));
  }

  static constexpr const char* kFiles[] = {"\\Program Files\\Scan\\scan.exe",
                                           "\\Windows\\scan.dll"};
  static constexpr const char16_t* kKey = u"SOFTWARE\\Apps\\Tarnwell Scan";
  SetupPlan plan_;
};

TEST_F(PreparePackageTest, MakesTheDeviceReadyForAnotherInstallation) {
  PutFile("\\Windows\\other.dll", "");
  SetAttributesOf("\\Windows\\other.dll", kAll);
  PutPackage();

  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);

  EXPECT_FALSE(KeyExists(kKey));
  EXPECT_TRUE(KeyExists(u"SOFTWARE\\Apps\\Tarnwell Other"));
  for (const char* path : kFiles) {
    EXPECT_EQ(AttributesOf(path), std::uint32_t{FILE_ATTRIBUTE_ARCHIVE}) << path;
    EXPECT_EQ(test::GetFile(path), "old") << "writing it is the installer's business";
  }
  EXPECT_EQ(AttributesOf("\\Windows\\other.dll"), kAll) << "not a file of the package";
  EXPECT_EQ(device().storage().open_files(), 0U);
}

TEST_F(PreparePackageTest, LeavesFilesAloneThatAreNotProtected) {
  for (const char* path : kFiles) SetAttributesOf(path, FILE_ATTRIBUTE_ARCHIVE);
  PutPackage();
  const std::uint64_t before = device().faults().Count("SetFileAttributesW");
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);
  EXPECT_EQ(device().faults().Count("SetFileAttributesW"), before);
}

TEST_F(PreparePackageTest, ClearsEachOfThreeAttributesAndNoOther) {
  for (const std::uint32_t attribute :
       {FILE_ATTRIBUTE_READONLY, FILE_ATTRIBUTE_HIDDEN, FILE_ATTRIBUTE_SYSTEM}) {
    SetAttributesOf(kFiles[0], attribute | FILE_ATTRIBUTE_TEMPORARY);
    PutPackage();
    EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);
    EXPECT_EQ(AttributesOf(kFiles[0]), std::uint32_t{FILE_ATTRIBUTE_TEMPORARY}) << attribute;
  }
}

TEST_F(PreparePackageTest, LeavesFoldersAlone) {
  plan_.files = {{1, 1, ""}, {2, 1, "Sub"}};
  CreateDirectoryW(u"\\Program Files\\Scan\\Sub", nullptr);
  SetAttributesOf("\\Program Files\\Scan\\Sub", FILE_ATTRIBUTE_HIDDEN);
  PutPackage();
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);
  EXPECT_NE(AttributesOf("\\Program Files\\Scan\\Sub") & FILE_ATTRIBUTE_HIDDEN, 0U);
}

TEST_F(PreparePackageTest, TakesNoFileForAnother) {
  plan_.strings = {{1, "\\Program Files\\*"}, {2, "\\Windows"}};
  plan_.files = {{1, 1, "scan.exe"}, {2, 2, "scan.*"}};
  PutPackage();
  PreparePackage(kPackage);
  for (const char* path : kFiles) EXPECT_EQ(AttributesOf(path), kAll) << path;
}

TEST_F(PreparePackageTest, TellsWhyItCannotPrepare) {
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kCannotOpen);
  EXPECT_EQ(PreparePackage(""), PackageResult::kCannotOpen);
  EXPECT_EQ(PreparePackage("\\Temp"), PackageResult::kCannotOpen);
  EXPECT_EQ(PreparePackage(std::string(300, 'x').c_str()), PackageResult::kCannotOpen);
  PutFile(kPackage, "");
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kCannotRead);
  PutFile(kPackage, std::string(1000, 'x'));
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kNoCabinet);
  PutFile(kPackage, test::CabinetBytes({{{"SCAN.001", "no setup file"}}, {}, 0, 32768}));
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kNoSetupFile);
  EXPECT_TRUE(KeyExists(kKey));
  for (const char* path : kFiles) EXPECT_EQ(AttributesOf(path), kAll) << path;
}

TEST_F(PreparePackageTest, OpensNoFileWhoseNameIsTheBeginningOfALongerOne) {
  const std::string name = "\\" + std::string(100, 'n') + "\\" + std::string(157, 'n');
  PutFile(name, test::SmallPackage());
  EXPECT_EQ(PreparePackage((name + "x").c_str()), PackageResult::kCannotOpen);
  EXPECT_EQ(PreparePackage(name.c_str()), PackageResult::kDone);
}

TEST_F(PreparePackageTest, LeavesTheFilesAloneWhenANameIsTooLong) {
  plan_.provider = std::string(65, 'p');
  PutPackage();
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kNameOrRegistry);
  for (const char* path : kFiles) EXPECT_EQ(AttributesOf(path), kAll) << path;
}

TEST_F(PreparePackageTest, ForgetsAKeyThatIsNotThere) {
  ASSERT_EQ(RegDeleteKeyW(HKEY_LOCAL_MACHINE, kKey), ERROR_SUCCESS);
  PutPackage();
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);
  for (const char* path : kFiles) {
    EXPECT_EQ(AttributesOf(path), std::uint32_t{FILE_ATTRIBUTE_ARCHIVE}) << path;
  }
}

TEST_F(PreparePackageTest, GoesOnWhenTheKeyCannotBeDeleted) {
  PutPackage();
  device().faults().Add({"RegDeleteKeyW", 1, 1, ERROR_ACCESS_DENIED});
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);
  EXPECT_TRUE(KeyExists(kKey));
  EXPECT_EQ(AttributesOf(kFiles[0]), std::uint32_t{FILE_ATTRIBUTE_ARCHIVE});

  device().faults().Add({"RegDeleteKeyW", 1, 1, ERROR_ACCESS_DENIED});
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kNameOrRegistry)
      << "what is said when no file was looked at";
}

TEST_F(PreparePackageTest, ReturnsTheResultOfTheLastNumber) {
  plan_.files = {{1, 1, "scan.exe"}, {3, 2, "scan.dll"}};  // there is no number 2
  PutPackage();
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kCannotRead);
  EXPECT_EQ(AttributesOf(kFiles[0]), std::uint32_t{FILE_ATTRIBUTE_ARCHIVE});
  EXPECT_EQ(AttributesOf(kFiles[1]), kAll) << "its number is above the number of files";
}

TEST_F(PreparePackageTest, HoldsNothingAfterwardsWhicheverCallFails) {
  PutPackage();
  const test::Holdings before = test::HoldingsOf(device());
  for (const char* call : {"CreateFileForMappingW", "CreateFileMappingW", "MapViewOfFile",
                           "LocalAlloc", "RegDeleteKeyW", "GetFileAttributesW"}) {
    device().faults().Add({call});
    const PackageResult result = PreparePackage(kPackage);
    EXPECT_EQ(test::HoldingsOf(device()), before) << call;
    EXPECT_NE(result, PackageResult::kNoCabinet) << call;
  }
}

TEST_F(PreparePackageTest, TakesHalfAMebibyteAtMostWhateverAPackageClaims) {
  plan_.strings.push_back({65535, "\\Last"});
  plan_.files.push_back({65535, 65535, "last"});
  plan_.claimed_files = 65535;
  plan_.claimed_strings = 65535;
  PutPackage();
  const std::uint64_t used = device().memory().live_bytes();
  EXPECT_EQ(PreparePackage(kPackage), PackageResult::kDone);
  EXPECT_LE(device().memory().peak_bytes(), used + 2 * 65536 * 4);
}

}  // namespace
}  // namespace upgrade

#include "upgrade/package/cabinet.h"

#include <gmock/gmock.h>

#include <string>

#include "support/cabinets.h"
#include "upgrade/package/package_reading.h"

namespace upgrade {
namespace {

using test::CabinetBytes;
using test::CabinetPlan;
using test::kCabinetFileCount;
using test::kCabinetFiles;
using test::Put16;
using test::Put32;
using test::ReadPackage;
using test::SmallPackage;
using ::testing::ElementsAre;

std::string ScanSetup() {
  test::SetupPlan plan;
  plan.strings = {{1, "%CE1%\\Scan"}};
  plan.files = {{1, 1, "scan.exe"}};
  return SetupBytes(plan);
}

PackageResult Find(const std::string& bytes) {
  return ReadPackage(bytes).found;
}

TEST(FindSetupFileTest, FindsTheOneThatBeginsTheFolder) {
  const test::PackageReading package = ReadPackage(SmallPackage());

  EXPECT_EQ(package.found, PackageResult::kDone);
  EXPECT_EQ(package.key, "SOFTWARE\\Apps\\Tarnwell Scan");
  EXPECT_THAT(package.Texts(), ElementsAre("\\Program Files\\Scan\\scan.exe"));
}

TEST(FindSetupFileTest, FindsTheOneThatBeginsALaterFolder) {
  const CabinetPlan plan{
      {{"SCAN.001", std::string(100, 'p'), 0}, {"SCAN.002", "q", 0}, {"SCAN.000", ScanSetup(), 1}},
      {},
      0,
      32768};
  EXPECT_EQ(ReadPackage(CabinetBytes(plan)).Texts().size(), 1U);
}

TEST(FindSetupFileTest, FindsNoneThatOnlyFollowsInItsFolder) {
  const CabinetPlan plan{
      {{"SCAN.001", std::string(100, 'p')}, {"SCAN.000", ScanSetup()}}, {}, 0, 32768};
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kNoSetupFile);
}

TEST(FindSetupFileTest, SkipsWhatACabinetReservesForOthers) {
  for (const CabinetPlan::Reserves reserves :
       {CabinetPlan::Reserves{0, 0, 0}, {6144, 0, 0}, {0, 3, 0}, {0, 0, 255}, {20, 255, 7}}) {
    const CabinetPlan plan{
        {{"SCAN.001", std::string(100, 'p'), 0}, {"SCAN.000", ScanSetup(), 1}}, reserves, 0, 32768};
    EXPECT_EQ(ReadPackage(CabinetBytes(plan)).Texts().size(), 1U)
        << reserves.header << " " << int{reserves.folder} << " " << int{reserves.data};
  }
}

TEST(FindSetupFileTest, FindsNoneInCompressedData) {
  std::string data = ScanSetup();
  data.insert(0, "CK");  // as compressed blocks begin
  const CabinetPlan plan{{{"SCAN.000", data}}, {}, 1, 32768};
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kNoSetupFile);
}

TEST(FindSetupFileTest, LooksAtTheDataAndNotAtTheMethodThatTheCabinetClaims) {
  const CabinetPlan plan{{{"SCAN.000", ScanSetup()}}, {}, 1, 32768};
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kDone);
}

TEST(FindSetupFileTest, PassesOverFilesThatGoOnInAnotherCabinet) {
  for (const std::uint16_t folder : {0xFFFD, 0xFFFE, 0xFFFF}) {
    CabinetPlan plan{{{"OTHER.001", "x"}, {"SCAN.000", ScanSetup(), 1}}, {}, 0, 32768};
    plan.files[0].claimed_folder = folder;
    EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kDone) << folder;
    plan.files[1].claimed_folder = folder;
    EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kNoSetupFile) << folder;
  }
}

TEST(FindSetupFileTest, TellsWhatIsNoCabinet) {
  EXPECT_EQ(Find(""), PackageResult::kCannotRead);
  EXPECT_EQ(Find("MSCF"), PackageResult::kCannotRead);
  EXPECT_EQ(Find(std::string(35, 'x')), PackageResult::kCannotRead) << "too short to say";
  EXPECT_EQ(Find(std::string(36, 'x')), PackageResult::kNoCabinet);
  EXPECT_EQ(Find("mscf" + std::string(100, '\0')), PackageResult::kNoCabinet);
}

TEST(FindSetupFileTest, FindsNothingInACabinetWithoutFiles) {
  EXPECT_EQ(Find("MSCF" + std::string(32, '\0')), PackageResult::kNoSetupFile);
}

TEST(FindSetupFileTest, NeedsTheReservesThatItsHeaderClaims) {
  std::string header = "MSCF" + std::string(32, '\0');
  Put16(header, 30, 4);
  EXPECT_EQ(Find(header), PackageResult::kCannotRead);
  EXPECT_EQ(Find(header + std::string(3, '\0')), PackageResult::kCannotRead);
  EXPECT_EQ(Find(header + std::string(4, '\xFF')), PackageResult::kNoSetupFile);
}

TEST(FindSetupFileTest, SaysWhenTheFilesCannotBeReached) {
  std::string bytes = SmallPackage();
  const auto size = static_cast<std::uint32_t>(bytes.size());
  Put32(bytes, kCabinetFiles, size + 1);
  EXPECT_EQ(Find(bytes), PackageResult::kCannotSeek);
  Put32(bytes, kCabinetFiles, 0xFFFFFFFF);
  EXPECT_EQ(Find(bytes), PackageResult::kCannotSeek);
  Put32(bytes, kCabinetFiles, size);
  EXPECT_EQ(Find(bytes), PackageResult::kCannotRead);
  Put32(bytes, kCabinetFiles, size - 15);
  EXPECT_EQ(Find(bytes), PackageResult::kCannotRead);
}

TEST(FindSetupFileTest, ReadsOnWhenTheDataOfAFileCannotBeReached) {
  std::string bytes = CabinetBytes(
      {{{"SCAN.001", std::string(100, 'p'), 0}, {"SCAN.000", ScanSetup(), 1}}, {}, 0, 32768});
  for (const std::size_t far :
       {bytes.size() + 1, bytes.size(), bytes.size() - 8, ~std::size_t{0}}) {
    Put32(bytes, test::kCabinetFolders, static_cast<std::uint32_t>(far));
    EXPECT_EQ(Find(bytes), PackageResult::kDone) << far;
  }
  // A folder that would stand behind the end.
  CabinetPlan plan{{{"SCAN.001", "p", 0}, {"SCAN.000", ScanSetup(), 1}}, {}, 0, 32768};
  plan.files[0].claimed_folder = 0xFFFC;
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kDone);
}

TEST(FindSetupFileTest, TakesNamesOf255CharactersAndNoLongerOnes) {
  CabinetPlan plan{{{std::string(255, 'n'), "p", 0}, {"SCAN.000", ScanSetup(), 1}}, {}, 0, 32768};
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kDone);
  plan.files[0].name += "n";
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kCannotRead);
}

TEST(FindSetupFileTest, EndsWithTheBytesWhateverTheCountOfFilesClaims) {
  std::string bytes = CabinetBytes({{{"SCAN.001", "p"}}, {}, 0, 32768});
  Put16(bytes, kCabinetFileCount, 0xFFFF);
  EXPECT_EQ(Find(bytes), PackageResult::kCannotRead);
}

TEST(FindSetupFileTest, GoesOnceOverAsManyFilesAsThereCanBe) {
  CabinetPlan plan;
  for (int i = 0; i < 65535; ++i) plan.files.push_back({"n", "", 0});
  plan.files.front().data = std::string(200, 'p');
  EXPECT_EQ(Find(CabinetBytes(plan)), PackageResult::kNoSetupFile);
}

TEST(FindSetupFileTest, NeverLooksBehindTheEndWhereverTheCabinetIsCut) {
  const CabinetPlan plan{{{"SCAN.001", "p", 0}, {"SCAN.000", ScanSetup(), 1}},
                         CabinetPlan::Reserves{5, 2, 3},
                         0,
                         32768};
  const std::string bytes = CabinetBytes(plan);
  const std::string whole_path = ReadPackage(bytes).Texts().at(0);
  std::size_t first_found = 0;
  for (std::size_t size = 0; size < bytes.size(); ++size) {
    const test::PackageReading package = ReadPackage(bytes.substr(0, size));
    EXPECT_NE(package.found, PackageResult::kCannotOpen);
    if (package.found == PackageResult::kDone && first_found == 0) first_found = size;
    for (const std::string& path : package.Texts()) EXPECT_EQ(path, whole_path) << size;
  }
  EXPECT_EQ(first_found, bytes.size() - ScanSetup().size() + 92);
}

TEST(FindSetupFileTest, TakesAnyByteForWhatItIs) {
  const std::string bytes = SmallPackage();
  for (std::size_t at = 0; at < bytes.size(); ++at) {
    for (const char value : {'\0', '\x7F', '\xFF'}) {
      std::string changed = bytes;
      changed[at] = value;
      for (const std::string& path : ReadPackage(changed).Texts()) EXPECT_LE(path.size(), 259U);
    }
  }
}

}  // namespace
}  // namespace upgrade

#include "upgrade/package/setup_file.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "support/cabinets.h"
#include "upgrade/package/package_reading.h"

namespace upgrade {
namespace {

using test::CabinetBytes;
using test::PackageReading;
using test::Put16;
using test::Put32;
using test::SetupBytes;
using test::SetupPlan;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

SetupPlan Plan() {
  SetupPlan plan;
  plan.strings = {{1, "%CE1%\\Scan"}, {2, "%CE2%"}};
  plan.files = {{1, 1, "scan.exe"}, {2, 2, "scan.dll"}};
  return plan;
}

PackageReading ReadSetup(const std::string& setup) {
  return test::ReadPackage(CabinetBytes({{{test::kSetupName, setup}}, {}, 0, 32768}));
}
PackageReading Read(const SetupPlan& plan) {
  return ReadSetup(SetupBytes(plan));
}

std::vector<PackageResult> Results(const PackageReading& package) {
  std::vector<PackageResult> results;
  for (const PackageReading::Path& path : package.paths) results.push_back(path.result);
  return results;
}

// ---- names ----

TEST(SetupFileTest, NamesTheKeyByProviderAndApplication) {
  SetupPlan plan = Plan();
  EXPECT_EQ(Read(plan).key, "SOFTWARE\\Apps\\Tarnwell Scan");
  plan.counts_zeros = false;
  EXPECT_EQ(Read(plan).key, "SOFTWARE\\Apps\\Tarnwell Scan");
  plan.provider = plan.application = "";
  EXPECT_EQ(Read(plan).key, "SOFTWARE\\Apps\\ ");
}

TEST(SetupFileTest, TakesNamesOf64BytesAndNoLongerOnes) {
  SetupPlan plan = Plan();
  plan.counts_zeros = false;
  plan.provider = std::string(64, 'p');
  plan.application = std::string(64, 'a');
  EXPECT_EQ(Read(plan).key, "SOFTWARE\\Apps\\" + plan.provider + " " + plan.application);
  plan.application += 'a';
  EXPECT_EQ(Read(plan).key_result, PackageResult::kNameOrRegistry);
  plan.application.pop_back();
  plan.provider += 'p';
  EXPECT_EQ(Read(plan).key_result, PackageResult::kNameOrRegistry);
  plan.provider.pop_back();
  plan.counts_zeros = true;
  EXPECT_EQ(Read(plan).key_result, PackageResult::kNameOrRegistry) << "the zero counts";
}

TEST(SetupFileTest, CutsANameAtAZeroInsideIt) {
  SetupPlan plan = Plan();
  plan.provider = std::string("Tarn\0well", 9);
  EXPECT_EQ(Read(plan).key, "SOFTWARE\\Apps\\Tarn Scan");
}

TEST(SetupFileTest, SaysWhenANameLiesBehindTheEnd) {
  std::string setup = SetupBytes(Plan());
  const auto size = static_cast<std::uint16_t>(setup.size());
  Put16(setup, test::kSetupProvider, static_cast<std::uint16_t>(size + 1));
  EXPECT_EQ(ReadSetup(setup).key_result, PackageResult::kCannotSeek);
  Put16(setup, test::kSetupProvider, size);
  EXPECT_EQ(ReadSetup(setup).key_result, PackageResult::kCannotRead);
  Put16(setup, test::kSetupProvider, static_cast<std::uint16_t>(size - 9));
  EXPECT_EQ(ReadSetup(setup).key_result, PackageResult::kDone);
}

// ---- entries ----

TEST(SetupFileTest, TriesOneNumberMoreThanThereAreFiles) {
  const PackageReading package = Read(Plan());
  EXPECT_THAT(package.Texts(),
              ElementsAre("\\Program Files\\Scan\\scan.exe", "\\Windows\\scan.dll"));
  EXPECT_THAT(Results(package),
              ElementsAre(PackageResult::kCannotRead, PackageResult::kDone, PackageResult::kDone));
}

TEST(SetupFileTest, FindsFilesThatAreNumberedFromZero) {
  SetupPlan plan = Plan();
  plan.files = {{0, 1, "scan.exe"}, {1, 2, "scan.dll"}};
  EXPECT_THAT(Results(Read(plan)),
              ElementsAre(PackageResult::kDone, PackageResult::kDone, PackageResult::kCannotRead));
}

TEST(SetupFileTest, GoesOnAfterANumberThatIsMissing) {
  SetupPlan plan = Plan();
  plan.files = {{3, 1, "c"}, {7, 1, "never asked for"}, {1, 2, "a"}};
  EXPECT_THAT(Read(plan).Texts(), ElementsAre("\\Windows\\a", "\\Program Files\\Scan\\c"));
}

TEST(SetupFileTest, TakesTheFirstOfEntriesWithTheSameNumber) {
  SetupPlan plan = Plan();
  plan.strings = {{1, "\\First"}, {1, "\\Second"}};
  plan.files = {{1, 1, "first"}, {1, 1, "second"}};
  EXPECT_THAT(Read(plan).Texts(), ElementsAre("\\First\\first"));
}

TEST(SetupFileTest, FindsStringsOfAnyNumberAndNoneThatIsMissing) {
  SetupPlan plan = Plan();
  plan.strings = {{0, "\\Zero"}, {65535, "\\Last"}};
  plan.files = {{1, 0, "a"}, {2, 65535, "b"}, {3, 1, "c"}};
  const PackageReading package = Read(plan);
  EXPECT_THAT(package.Texts(), ElementsAre("\\Zero\\a", "\\Last\\b"));
  EXPECT_EQ(package.paths.back().result, PackageResult::kCannotRead);
}

TEST(SetupFileTest, FindsNoFileWithoutStrings) {
  SetupPlan plan = Plan();
  plan.claimed_strings = 0;
  EXPECT_THAT(Read(plan).Texts(), IsEmpty());
  plan = Plan();
  plan.claimed_files = 0;
  EXPECT_THAT(Results(Read(plan)), ElementsAre(PackageResult::kCannotRead)) << "number 0";
}

TEST(SetupFileTest, TakesNamesOf260BytesAndFindsNothingBehindALongerOne) {
  SetupPlan plan = Plan();
  plan.strings = {{1, "\\F"}};
  plan.counts_zeros = false;
  plan.files = {{1, 1, "a"}, {2, 1, std::string(260, 'n')}, {3, 1, "c"}};
  EXPECT_THAT(Read(plan).Texts(), ElementsAre("\\F\\a", "\\F\\" + std::string(256, 'n'), "\\F\\c"));
  plan.files[1].name += 'n';
  EXPECT_THAT(Results(Read(plan)),
              ElementsAre(PackageResult::kNameOrRegistry, PackageResult::kDone,
                          PackageResult::kNameOrRegistry, PackageResult::kNameOrRegistry));
}

TEST(SetupFileTest, FindsWhatThereIsWhenTheCountsClaimMore) {
  SetupPlan plan = Plan();
  plan.claimed_files = 65535;
  plan.claimed_strings = 65535;
  const PackageReading package = Read(plan);
  EXPECT_EQ(package.paths.size(), 65536U);
  EXPECT_THAT(package.Texts(),
              ElementsAre("\\Program Files\\Scan\\scan.exe", "\\Windows\\scan.dll"));
}

TEST(SetupFileTest, SaysWhenATableLiesBehindTheEnd) {
  std::string setup = SetupBytes(Plan());
  Put32(setup, test::kSetupFiles, 0xFFFFFFFF);
  EXPECT_THAT(Results(ReadSetup(setup)), Each(PackageResult::kCannotSeek));
  setup = SetupBytes(Plan());
  Put32(setup, test::kSetupStrings, 0x80000000);
  EXPECT_EQ(ReadSetup(setup).paths.back().result, PackageResult::kCannotSeek);
}

TEST(SetupFileTest, FindsAsManyFilesAsThereCanBeInOneWalk) {
  SetupPlan plan;
  for (std::uint32_t id = 0; id < 65535; ++id) {
    plan.strings.push_back({static_cast<std::uint16_t>(65534 - id), ""});
    plan.files.push_back({static_cast<std::uint16_t>(65535 - id), 7, ""});
  }
  // A walk for each would look at four thousand million entries and not come back.
  EXPECT_EQ(Read(plan).Texts().size(), 65535U);
}

TEST(SetupFileTest, LooksAtTheFirst1024BytesOfAFolder) {
  SetupPlan plan;
  std::string nothing;
  for (int i = 0; i < 204; ++i) nothing += "%CE3%";
  plan.strings = {{1, nothing + "\\abcd" + std::string(60000, 'e')}};
  plan.files = {{1, 1, "n"}};
  EXPECT_THAT(Read(plan).Texts(), ElementsAre("\\abc\\n"));
}

TEST(SetupFileTest, IsReadAcrossTheBlocksOfTheCabinet) {
  SetupPlan plan;
  plan.strings = {{9, "\\Many"}};
  for (std::uint32_t id = 1; id <= 5000; ++id) {
    plan.files.push_back({static_cast<std::uint16_t>(id), 9, "file-" + std::to_string(id)});
  }
  const std::string setup = SetupBytes(plan);
  ASSERT_GT(setup.size(), 3 * 32768U);
  for (const auto& reserves :
       {std::optional<test::CabinetPlan::Reserves>{},
        std::optional<test::CabinetPlan::Reserves>{test::CabinetPlan::Reserves{0, 0, 11}}}) {
    const test::CabinetPlan cabinet{{{test::kSetupName, setup}}, reserves, 0, 32768};
    const std::vector<std::string> paths = test::ReadPackage(CabinetBytes(cabinet)).Texts();
    ASSERT_EQ(paths.size(), 5000U);
    for (std::uint32_t id = 1; id <= 5000; ++id) {
      EXPECT_EQ(paths[id - 1], "\\Many\\file-" + std::to_string(id));
    }
  }
}

// ---- paths ----

struct PathCase {
  const char* folder;
  const char* name;
  const char* path;
  const char* why;
};

TEST(InstalledPathTest, PutsFolderAndNameTogether) {
  static constexpr PathCase kCases[] = {
      {"%CE1%", "a", "\\Program Files\\a", "a macro"},
      {"%CE2%\\Sub", "a", "\\Windows\\Sub\\a", "a macro and a folder in it"},
      {"%CE3%", "a", "\\a", "a macro that stands for nothing"},
      {"%CE4%", "a", "\\Windows\\StartUp\\a", ""},
      {"%CE5%", "a", "\\My Documents\\a", ""},
      {"%CE6%%CE7%%CE8%%CE9%%CE10%", "a", "\\a", "nothing, five times"},
      {"%CE11%", "a", "\\Windows\\Start Menu\\Programs\\a", "two digits"},
      {"%CE12%%CE13%%CE16%", "a", "\\a", ""},
      {"%CE14%", "a", "\\Windows\\Start Menu\\Programs\\Games\\a", ""},
      {"%CE15%", "a", "\\Windows\\Fonts\\a", ""},
      {"%CE17%", "a", "\\Windows\\Start Menu\\a", ""},
      {"%CE0%", "a", "%CE0%\\a", "no macro"},
      {"%CE18%", "a", "%CE18%\\a", "no macro"},
      {"%CE19%%CE20%", "a", "%CE19%%CE20%\\a", "no macro"},
      {"%CE01%", "a", "%CE01%\\a", "no macro"},
      {"%CE111%", "a", "%CE111%\\a", "no macro"},
      {"%CE1", "a", "%CE1\\a", "not closed"},
      {"%CE1x%", "a", "%CE1x%\\a", "no macro"},
      {"%ce1%", "a", "%ce1%\\a", "letter case counts"},
      {"%%CE1%%", "a", "%\\Program Files%\\a", "a macro anywhere"},
      {"%InstallDir%", "a", "%InstallDir%\\a", "another program's macro"},
      {"%CE1%\\", "a", "\\Program Files\\a", "a backslash behind a backslash is dropped"},
      {"\\\\A\\\\\\B\\", "\\a", "\\A\\B\\a", "everywhere"},
      {"\\A\\%CE2%", "a", "\\A\\Windows\\a", "before a macro's folder too"},
      {"", "a", "\\a", "no folder"},
      {"", "", "\\", "nothing at all"},
      {"\\A", "", "\\A\\", "no name"},
      {"A", "%CE1%", "A\\%CE1%", "a name has no macros"},
  };
  for (const PathCase& c : kCases) {
    InstalledPath path;
    path.AddFolder(c.folder);
    path.AddText("\\");
    path.AddText(c.name);
    EXPECT_EQ(path.view(), c.path) << c.folder << " " << c.why;
    EXPECT_EQ(std::string(path.c_str()), c.path);
  }
}

TEST(InstalledPathTest, CutsWhatIsLongerThanAPath) {
  InstalledPath path;
  path.AddFolder(std::string(250, 'f') + "%CE1%");
  EXPECT_EQ(path.view(), std::string(250, 'f') + "\\Program ");
  path.AddText("\\more");
  EXPECT_EQ(path.view().size(), 259U);
}

}  // namespace
}  // namespace upgrade

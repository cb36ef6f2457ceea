#include "upgrade/list_file/package_options.h"

#include <gtest/gtest.h>

#include <string>

namespace upgrade {
namespace {

TEST(PackagePassTest, IsOneWithoutTheOption) {
  EXPECT_EQ(PackagePass(""), 1);
  EXPECT_EQ(PackagePass("DiskSize=\\SD Card:5"), 1);
  EXPECT_EQ(PackagePass("pass=2"), 1) << "letter case counts";
}

TEST(PackagePassTest, ReadsOneDigitOnly) {
  EXPECT_EQ(PackagePass("Pass=2"), 2);
  EXPECT_EQ(PackagePass("Pass=12"), 1);
  EXPECT_EQ(PackagePass("RAMAllocSize=9,Pass=3,DiskSize=\\:1"), 3);
  EXPECT_EQ(PackagePass("XPass=2"), 2) << "the name may stand anywhere";
}

TEST(PackagePassTest, IsZeroForAZeroANonDigitAndTheEnd) {
  EXPECT_EQ(PackagePass("Pass=0"), 0);
  EXPECT_EQ(PackagePass("Pass=x"), 0);
  EXPECT_EQ(PackagePass("Pass= 2"), 0);
  EXPECT_EQ(PackagePass("Pass="), 0);
}

TEST(PackageDiskNeedTest, TakesTheFolderBeforeTheColonAndTheNumberBehindIt) {
  const DiskNeed need = PackageDiskNeed("Pass=1,DiskSize=\\SDMMC Disk:5000000,RAMAllocSize=7");
  EXPECT_EQ(need.folder.view(), "\\SDMMC Disk");
  EXPECT_EQ(need.bytes, 5000000);
}

TEST(PackageDiskNeedTest, NeedsNothingWithoutTheOptionOrTheColon) {
  EXPECT_EQ(PackageDiskNeed("").bytes, 0);
  EXPECT_EQ(PackageDiskNeed("Pass=1").bytes, 0);
  EXPECT_EQ(PackageDiskNeed("DiskSize=5000").bytes, 0);
  EXPECT_TRUE(PackageDiskNeed("DiskSize=5000").folder.empty());
  EXPECT_EQ(PackageDiskNeed("DiskSize=\\SD Card,Pass=1:9").bytes, 0)
      << "a colon behind the comma belongs to the next option";
}

TEST(PackageDiskNeedTest, CutsTheValueAt127Characters) {
  const std::string long_folder(200, 'f');
  const DiskNeed cut = PackageDiskNeed("DiskSize=" + long_folder + ":9");
  EXPECT_EQ(cut.bytes, 0) << "the colon lies beyond the cut";
  const DiskNeed kept = PackageDiskNeed("DiskSize=" + std::string(125, 'f') + ":9");
  EXPECT_EQ(kept.folder.view(), std::string(125, 'f'));
  EXPECT_EQ(kept.bytes, 9);
}

TEST(PackageDiskNeedTest, WrapsANumberThatDoesNotFit) {
  EXPECT_EQ(PackageDiskNeed("DiskSize=\\:4294967297").bytes, 1);
}

TEST(PackageRamSizeTest, ReadsTheNumberBehindTheName) {
  EXPECT_EQ(PackageRamSize("RAMAllocSize=16777216"), 16777216);
  EXPECT_EQ(PackageRamSize("Pass=2,RAMAllocSize= 12,"), 12);
  EXPECT_EQ(PackageRamSize("RAMAllocSize="), 0);
  EXPECT_EQ(PackageRamSize(""), 0);
}

}  // namespace
}  // namespace upgrade

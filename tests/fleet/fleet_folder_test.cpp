#include "tools/fleet/fleet_folder.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <memory>
#include <string>

namespace fleet {
namespace {

namespace fs = std::filesystem;

class FleetFolderTest : public ::testing::Test {
 protected:
  FleetFolderTest() {
    std::string pattern = ::testing::TempDir() + "fleet-folders-XXXXXX";
    parent_ = ::mkdtemp(pattern.data());
  }
  ~FleetFolderTest() override { fs::remove_all(parent_); }

  fs::path parent_;
};

TEST_F(FleetFolderTest, IsGoneWithItsFleet) {
  fs::path path;
  {
    const FleetFolder folder(parent_);
    path = folder.path();
    EXPECT_TRUE(fs::is_directory(path));
    std::ofstream(path / "file") << "content";
  }
  EXPECT_FALSE(fs::exists(path));
}

TEST_F(FleetFolderTest, IsRemovedByTheNextFleetWhenItsOwnWasKilled) {
  const fs::path left = parent_ / "orvenix-fleet-killed";
  fs::create_directories(left / "0" / "storage");
  std::ofstream(left / "0" / "storage" / "file.bin") << "content";
  fs::create_directory(parent_ / "somebody-elses");
  const FleetFolder folder(parent_);
  EXPECT_FALSE(fs::exists(left));
  EXPECT_TRUE(fs::exists(parent_ / "somebody-elses"));
}

TEST_F(FleetFolderTest, StaysWhileItsFleetIsUnderWay) {
  const FleetFolder first(parent_);
  const FleetFolder second(parent_);
  EXPECT_NE(first.path(), second.path());
  EXPECT_TRUE(fs::exists(first.path()));
  EXPECT_TRUE(fs::exists(second.path()));
}

TEST_F(FleetFolderTest, IsNeverReachedThroughALink) {
  const fs::path target = parent_ / "target";
  fs::create_directory(target);
  std::ofstream(target / "file") << "content";
  fs::create_directory_symlink(target, parent_ / "orvenix-fleet-link");
  const FleetFolder folder(parent_);
  EXPECT_TRUE(fs::exists(target / "file"));
}

}  // namespace
}  // namespace fleet

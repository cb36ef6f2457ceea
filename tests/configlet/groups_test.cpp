// What begins and ends with a group, in any order that a host may think of.
#include <gmock/gmock.h>

#include <cstring>
#include <random>
#include <string>

#include "ce/errors.h"
#include "configlet/configlet_test.h"
#include "upgrade/run_state/run_state.h"

namespace configlet {
namespace {

class GroupsTest : public ConfigletTest {
 protected:
  GroupsTest() {
    Begin("Orvenix");
    blocks_ = device().memory().live_blocks();
  }

  /// Frees the job as its upgrade thread does.
  void FreeJob() {
    UpgradeConfig* const ending = &job();
    ForgetJob(ending);
    delete ending;
  }

  /// Frees the job and expects that nothing remains of what was made since it began, after a new
  /// top group has dropped the records that no job took over.
  void ExpectNoLeak() {
    FreeJob();
    Begin("Orvenix");
    EXPECT_EQ(device().memory().live_blocks(), blocks_);
    EXPECT_EQ(device().memory().bad_frees(), 0U);
    FreeJob();
  }

 private:
  std::size_t blocks_ = 0;
};

TEST_F(GroupsTest, KeepFourOfThemOpenUntilTheirEnd) {
  struct Case {
    const char* group;
    bool Walk::*flag;
  };
  const Case cases[] = {{"Download", &Walk::in_download},
                        {"DiskCleanup", &Walk::in_disk_cleanup},
                        {"FileList", &Walk::in_file_list},
                        {"StartProcess", &Walk::in_start_process}};
  for (const Case& c : cases) {
    EXPECT_FALSE(TheWalk().*c.flag);
    Begin(c.group);
    EXPECT_TRUE(TheWalk().*c.flag) << c.group;
    Begin("Syslog");
    End("Syslog");
    EXPECT_TRUE(TheWalk().*c.flag) << c.group;
    End(c.group);
    EXPECT_FALSE(TheWalk().*c.flag) << c.group;
  }
  ExpectNoLeak();
}

TEST_F(GroupsTest, MakeTheFileListTheJobsMulticastList) {
  Begin("FileList");
  Begin("File");
  Set("Source", "list");
  End("File");
  Set("Dest", "\\list");
  EXPECT_EQ(job().GetMCFileList(), nullptr) << "handed over at the end of the list only";
  End("FileList");

  ASSERT_NE(job().GetMCFileList(), nullptr);
  EXPECT_STREQ(job().GetMCFileList()->source, "list");
  EXPECT_STREQ(job().GetMCFileList()->destination, "\\list");
  EXPECT_TRUE(job().DownloadFiles().empty());
  ExpectNoLeak();
}

TEST_F(GroupsTest, TestForCleanupFirstWhenAFileEndsInTwoGroups) {
  Begin("Download");
  Begin("DiskCleanup");
  Begin("File");  // inside "Download": a new file to fetch, and the action is left alone
  Set("Source", "s");
  Set("Action", "Save");
  Set("Name", "\\n");
  End("File");

  EXPECT_TRUE(job().DownloadFiles().empty());
  EXPECT_EQ(job().FilesToSave().size(), 1U);

  End("DiskCleanup");
  End("File");
  EXPECT_EQ(job().DownloadFiles().size(), 1U);
  ExpectNoLeak();
}

TEST_F(GroupsTest, LeaveTheCleanupFileAloneInsideDownload) {
  Begin("DiskCleanup");
  Begin("File");
  Set("Action", "Delete");
  Set("Name", "\\n");
  Begin("Download");
  Begin("File");
  End("Download");
  End("File");

  EXPECT_EQ(job().FilesToDelete().size(), 1U);
  ExpectNoLeak();
}

TEST_F(GroupsTest, BeginACleanupFileWithoutActionAndName) {
  Begin("DiskCleanup");
  Begin("File");
  Set("Action", "Delete");
  Set("Name", "\\forgotten");
  Begin("File");
  End("File");

  EXPECT_TRUE(job().FilesToDelete().empty());
  ExpectNoLeak();
}

TEST_F(GroupsTest, ListARecordAgainWhenTheyEndTwice) {
  Begin("Download");
  Begin("File");
  End("File");
  End("File");
  Begin("Store");
  End("Store");
  End("Store");
  Begin("Registry");
  End("Registry");
  End("Registry");
  Begin("FileList");
  End("FileList");
  End("FileList");
  End("File");

  EXPECT_EQ(job().DownloadFiles().size(), 3U);
  EXPECT_EQ(job().DownloadFiles()[0], job().DownloadFiles()[1]);
  EXPECT_EQ(job().DownloadFiles()[2], job().GetMCFileList()) << "a list ended inside the downloads";
  EXPECT_EQ(job().StorageRequirements().size(), 2U);
  EXPECT_EQ(job().RegistryTests().size(), 2U);
  ExpectNoLeak();
}

TEST_F(GroupsTest, EndWithoutABeginning) {
  Begin("Download");
  for (const char* group : {"File", "Store", "FileList", "DiskCleanup", "StartProcess", "Registry",
                            "Download", "Orvenix", "Syslog"}) {
    EXPECT_EQ(End(group), ICFG_OK) << group;
  }

  EXPECT_TRUE(job().DownloadFiles().empty());
  EXPECT_TRUE(job().StorageRequirements().empty());
  EXPECT_EQ(job().GetMCFileList(), nullptr);
  ASSERT_EQ(job().RegistryTests().size(), 1U);
  EXPECT_EQ(job().RegistryTests()[0], nullptr) << "listed, so that the tests fail with a reason";
  ExpectNoLeak();
}

TEST_F(GroupsTest, DropARecordThatIsBegunAgainWithoutAnEnd) {
  for (int i = 0; i < 3; ++i) {
    Begin("Download");
    Begin("File");
    Begin("Store");
    Begin("Registry");
    Begin("FileList");
  }
  ExpectNoLeak();
}

TEST_F(GroupsTest, ListNullForARegistryTestThatCouldNotBeMade) {
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});

  EXPECT_EQ(Begin("Registry"), ICFG_OK);
  EXPECT_EQ(Set("Key", "x"), ICFG_OK);
  EXPECT_EQ(End("Registry"), ICFG_OK);

  ASSERT_EQ(job().RegistryTests().size(), 1U);
  EXPECT_EQ(job().RegistryTests()[0], nullptr);
  ExpectNoLeak();
}

TEST_F(GroupsTest, ForgetTheJobThatItsThreadFrees) {
  Begin("Download");
  Begin("File");
  End("File");
  Begin("Store");
  FreeJob();

  EXPECT_FALSE(HasJob());
  EXPECT_EQ(Set("Source", "late"), ICFG_OK);
  EXPECT_EQ(Set("RequiredSpace", "1"), ICFG_OK) << "this record is still the walk's own";
  EXPECT_EQ(End("File"), ICFG_OK);
  EXPECT_EQ(End("Store"), ICFG_OK);
}

TEST_F(GroupsTest, KeepTheirOwnJobWhenAnotherIsFreed) {
  UpgradeConfig* const first = &job();
  Begin("Orvenix");
  Begin("Download");
  Begin("File");
  End("File");

  ForgetJob(first);
  delete first;

  ASSERT_TRUE(HasJob());
  Set("Source", "second's");
  EXPECT_STREQ(job().DownloadFiles()[0]->source, "second's");
  FreeJob();
}

TEST_F(GroupsTest, NeverTouchAnEarlierJobsRecords) {
  UpgradeConfig* const first = &job();
  Begin("Download");
  Begin("File");
  Set("Source", "first's");
  End("File");
  Begin("Orvenix");

  EXPECT_EQ(Set("Source", "lost"), ICFG_OK);
  End("File");

  EXPECT_TRUE(job().DownloadFiles().empty());
  EXPECT_STREQ(first->DownloadFiles()[0]->source, "first's");
  delete first;
  FreeJob();
}

TEST_F(GroupsTest, FillNoJobWhenThereIsNoMemoryForTheNextOne) {
  UpgradeConfig* const first = &job();
  Begin("Download");
  Begin("File");
  Set("Source", "first's");
  End("File");
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});

  EXPECT_EQ(Begin("Orvenix"), ICFG_OK);

  EXPECT_FALSE(HasJob()) << "the first job is not filled on under the second one's name";
  EXPECT_EQ(Begin("Upgrade"), ICFG_OK);
  EXPECT_EQ(Set("Source", "lost"), ICFG_OK);
  EXPECT_EQ(End("File"), ICFG_OK);
  EXPECT_EQ(End("Upgrade"), ICFG_OK) << "nothing to start";
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  ASSERT_EQ(first->DownloadFiles().size(), 1U);
  EXPECT_STREQ(first->DownloadFiles()[0]->source, "first's");
  delete first;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(GroupsTest, SurviveEveryOrderOfCallsWithAndWithoutMemory) {
  static constexpr const char* kGroups[] = {
      "Orvenix",  "Download",    "File",         "FileList",    "Store",
      "Registry", "DiskCleanup", "StartProcess", "StopProcess", "Test"};
  static constexpr const char* kFields[] = {"Source", "Dest",  "Name",    "Action", "RequiredSpace",
                                            "Root",   "Value", "Process", "Wait",   ""};
  std::minstd_rand random(20060301);
  const auto pick = [&random](const auto& texts) { return texts[random() % std::size(texts)]; };
  std::vector<UpgradeConfig*> jobs;
  for (int step = 0; step < 4000; ++step) {
    if (step % 7 == 0) device().faults().Add({"LocalAlloc", 1 + random() % 5, 1, 0});
    switch (random() % 3) {
      case 0: Begin(pick(kGroups)); break;
      case 1: End(pick(kGroups)); break;
      default: Set(pick(kFields), step % 2 == 0 ? "Save" : "Delete"); break;
    }
    if (HasJob() && (jobs.empty() || jobs.back() != &job())) jobs.push_back(&job());
    if (step % 50 == 49 && !jobs.empty()) {
      ForgetJob(jobs.front());
      delete jobs.front();
      jobs.erase(jobs.begin());
    }
  }
  device().faults().Clear();
  for (UpgradeConfig* left : jobs) {
    ForgetJob(left);
    delete left;
  }
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

}  // namespace
}  // namespace configlet

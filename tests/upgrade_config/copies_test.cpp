// Copies of a job, and a job that is filled.
#include "upgrade_config/upgrade_config_test.h"

namespace test {
namespace {

using ::testing::ElementsAre;

TEST_F(UpgradeConfigTest, SharesItsElementsWithACopy) {
  const std::size_t before = Blocks();
  auto* const original = new UpgradeConfig;
  original->SetBaseURL("http://server/");
  original->SetSysLogPort(514);
  original->AddDownloadFile(NewRecord<tagDownloadFile>());
  original->AddFileSave("\\kept");
  original->AddMCFileList(NewRecord<tagDownloadFile>());

  auto* const copy = new UpgradeConfig(*original);

  EXPECT_STREQ(copy->GetBaseURL(), "http://server/");
  EXPECT_EQ(copy->GetSysLogPort(), 514);
  EXPECT_STREQ(copy->GetUniqueId(), original->GetUniqueId());
  EXPECT_EQ(Elements(copy->DownloadFiles()), Elements(original->DownloadFiles()));
  EXPECT_EQ(Elements(copy->FilesToSave()), Elements(original->FilesToSave()));
  EXPECT_EQ(copy->GetMCFileList(), original->GetMCFileList());
  // A list grows alone.
  copy->AddFileSave("\\new");
  EXPECT_EQ(original->FilesToSave().size(), 1U);
  // Only one of the two is destroyed; of the other, the arrays and the record alone remain.
  delete copy;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_EQ(Blocks(), before + 3) << "the original and its two arrays";
}

/// A job with something in every list and every kind of field.
UpgradeConfig* FilledJob() {
  auto* const job = new UpgradeConfig;
  for (const TextField& field : kTextFields) (job->*field.set)(field.name);
  job->SetHTTPPort(8080);
  job->SetSysLogPort(70000);
  job->SetProcessWait(0);
  job->AddFileSave("\\save");
  job->AddFileDelete("\\delete");
  job->AddStopProcess("stop.exe");
  job->AddDownloadFile(static_cast<tagDownloadFile*>(LocalAlloc(LPTR, sizeof(tagDownloadFile))));
  job->AddStorageReqEntry(static_cast<tagStorageReq*>(LocalAlloc(LPTR, sizeof(tagStorageReq))));
  job->AddRegistryTest(static_cast<tagRegistryTest*>(LocalAlloc(LPTR, sizeof(tagRegistryTest))));
  job->AddRegistryTest(nullptr);
  job->AddFirmwarePkg(new FirmwarePackage);
  job->AddMCFileList(static_cast<tagDownloadFile*>(LocalAlloc(LPTR, sizeof(tagDownloadFile))));
  return job;
}

void ExpectTheSameContent(const UpgradeConfig& a, const UpgradeConfig& b) {
  for (const TextField& field : kTextFields) EXPECT_STREQ((a.*field.get)(), (b.*field.get)());
  EXPECT_EQ(a.GetHTTPPort(), b.GetHTTPPort());
  EXPECT_EQ(a.GetSysLogPort(), b.GetSysLogPort());
  EXPECT_EQ(a.GetProcessWait(), b.GetProcessWait());
  EXPECT_STREQ(a.GetUniqueId(), b.GetUniqueId());
  EXPECT_EQ(a.GetMCFileList(), b.GetMCFileList());
  EXPECT_EQ(Elements(a.FilesToSave()), Elements(b.FilesToSave()));
  EXPECT_EQ(Elements(a.FilesToDelete()), Elements(b.FilesToDelete()));
  EXPECT_EQ(Elements(a.ProcessesToStop()), Elements(b.ProcessesToStop()));
  EXPECT_EQ(Elements(a.DownloadFiles()), Elements(b.DownloadFiles()));
  EXPECT_EQ(Elements(a.StorageRequirements()), Elements(b.StorageRequirements()));
  EXPECT_EQ(Elements(a.RegistryTests()), Elements(b.RegistryTests()));
  EXPECT_EQ(Elements(a.FirmwarePackages()), Elements(b.FirmwarePackages()));
}

TEST_F(UpgradeConfigTest, TakesEverythingOverInACopyAndInAnAssignment) {
  UpgradeConfig* const source = FilledJob();
  auto* const copy = new UpgradeConfig(*source);
  auto* const target = new UpgradeConfig;

  *target = *source;

  EXPECT_EQ(source->GetSysLogPort(), 4464);
  ExpectTheSameContent(*copy, *source);
  ExpectTheSameContent(*target, *source);
  // The numbers and the lists themselves are each record's own.
  target->SetSysLogPort(514);
  target->AddFileSave("\\more");
  target->AddMCFileList(nullptr);
  EXPECT_EQ(source->GetSysLogPort(), 4464);
  EXPECT_EQ(source->FilesToSave().size(), 1U);
  EXPECT_NE(source->GetMCFileList(), nullptr);
  // Of records that share their elements one is destroyed.
  delete source;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(UpgradeConfigTest, KeepsWhatItListedBeforeAnAssignmentAlive) {
  auto* const kept = NewRecord<tagDownloadFile>();
  auto* const list = NewRecord<tagDownloadFile>();
  auto* const target = new UpgradeConfig;
  target->AddDownloadFile(kept);
  target->AddMCFileList(list);
  UpgradeConfig* const source = FilledJob();

  *target = *source;

  std::strcpy(kept->source, "still there");
  std::strcpy(list->source, "still there");
  LocalFree(kept);
  LocalFree(list);
  delete target;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(UpgradeConfigTest, ReadsTheIdentityAgainWithoutTouchingTheRestOfAFilledJob) {
  UpgradeConfig* const job = FilledJob();
  const auto* const before = new UpgradeConfig(*job);
  const std::size_t blocks = Blocks();

  job->GetDeviceInfo();
  job->GetDeviceInfo();

  ExpectTheSameContent(*job, *before);
  EXPECT_STREQ(job->GetMfgString(), "TQ52-A1");
  EXPECT_STREQ(job->GetSerialNumber(), "MR700123");
  EXPECT_STREQ(job->GetType(), "T");
  EXPECT_STREQ(job->GetFamily(), "Q");
  EXPECT_STREQ(job->GetModel(), "52");
  EXPECT_STREQ(job->GetFlash(), "0");
  EXPECT_EQ(Blocks(), blocks);
  delete job;
}

TEST_F(UpgradeConfigTest, IsUnchangedByAnAssignmentToItself) {
  UpgradeConfig job;
  job.AddFileSave("\\kept");
  job.SetBaseURL("http://server/");
  UpgradeConfig& same = job;

  job = same;

  EXPECT_THAT(Texts(job.FilesToSave()), ElementsAre("\\kept"));
  EXPECT_STREQ(job.GetBaseURL(), "http://server/");
}

}  // namespace
}  // namespace test

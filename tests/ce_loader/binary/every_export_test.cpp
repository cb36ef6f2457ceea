// Every function that the device's binary exports is entered once, by its public header, and does
// what the header says. The eleven of the configlet are entered by its own tests and by every job.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "ce/kernel.h"
#include "ce/system.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_config.h"
#include "orvenix/upgrade_thread.h"
#include "support/device_test.h"

namespace {

using EveryExportTest = DeviceTest;

struct Text {
  const char* name;
  void (UpgradeConfig::*set)(const char* text) noexcept;
  const char* (UpgradeConfig::*get)() const noexcept;
};

constexpr Text kTexts[] = {
    {"HTTPIPAddress", &UpgradeConfig::SetHTTPIPAddress, &UpgradeConfig::GetHTTPIPAddress},
    {"BaseURL", &UpgradeConfig::SetBaseURL, &UpgradeConfig::GetBaseURL},
    {"MCIp", &UpgradeConfig::SetMCIp, &UpgradeConfig::GetMCIp},
    {"MCEncryptionKey", &UpgradeConfig::SetMCEncryptionKey, &UpgradeConfig::GetMCEncryptionKey},
    {"MCProcessParms", &UpgradeConfig::SetMCProcessParms, &UpgradeConfig::GetMCProcessParms},
    {"ProcessName", &UpgradeConfig::SetProcessName, &UpgradeConfig::GetProcessName},
    {"ProcessParms", &UpgradeConfig::SetProcessParms, &UpgradeConfig::GetProcessParms},
    {"SysLogIP", &UpgradeConfig::SetSysLogIP, &UpgradeConfig::GetSysLogIP},
    {"UpgBeginMsg", &UpgradeConfig::SetUpgBeginMsg, &UpgradeConfig::GetUpgBeginMsg},
    {"UpgEndMsg", &UpgradeConfig::SetUpgEndMsg, &UpgradeConfig::GetUpgEndMsg},
    {"FlashFileStore", &UpgradeConfig::SetFlashFileStore, &UpgradeConfig::GetFlashFileStore},
};

struct Number {
  const char* name;
  void (UpgradeConfig::*set)(int number) noexcept;
  int (UpgradeConfig::*get)() const noexcept;
};

constexpr Number kNumbers[] = {
    {"HTTPPort", &UpgradeConfig::SetHTTPPort, &UpgradeConfig::GetHTTPPort},
    {"MulticastPort", &UpgradeConfig::SetMulticastPort, &UpgradeConfig::GetMulticastPort},
    {"MulticastBlockSize", &UpgradeConfig::SetMulticastBlockSize,
     &UpgradeConfig::GetMulticastBlockSize},
    {"ProcessWait", &UpgradeConfig::SetProcessWait, &UpgradeConfig::GetProcessWait},
    {"ShowGUI", &UpgradeConfig::SetShowGUI, &UpgradeConfig::GetShowGUI},
    {"SysLogPort", &UpgradeConfig::SetSysLogPort, &UpgradeConfig::GetSysLogPort},
};

template <typename Record>
Record* NewRecord() {
  return static_cast<Record*>(LocalAlloc(LPTR, sizeof(Record)));
}

TEST_F(EveryExportTest, KeepsTextsAndNumbers) {
  UpgradeConfig job;
  for (const Text& text : kTexts) {
    (job.*text.set)(text.name);
    EXPECT_STREQ((job.*text.get)(), text.name);
  }
  for (const Number& number : kNumbers) {
    (job.*number.set)(1);
    EXPECT_EQ((job.*number.get)(), 1) << number.name;
  }
  job.AppendFlashWriterParms("more");
  EXPECT_STREQ(job.GetProcessParms(), "ProcessParms more");
}

TEST_F(EveryExportTest, KnowsTheDeviceAndTheDefaults) {
  UpgradeConfig job;
  job.GetDeviceInfo();
  EXPECT_STREQ(job.GetSerialNumber(), "MR700123");
  EXPECT_STREQ(job.GetUniqueId(), "TQ52MR700123");
  EXPECT_STREQ(job.GetMfgString(), device().profile().configuration.c_str());
  EXPECT_STREQ(job.GetFamily(), "Q");
  EXPECT_STREQ(job.GetModel(), "52");
  EXPECT_STREQ(job.GetType(), "T");
  EXPECT_STREQ(job.GetFlash(), "0");
  for (const char* const empty :
       {job.GetVersion(), job.GetFlashFileFolder(), job.GetINFFileSrc(), job.GetINFFile()}) {
    EXPECT_STREQ(empty, "");
  }
  EXPECT_EQ(job.GetXferPacketSize(), 4096);
  EXPECT_EQ(job.GetDownloadLoopCount() + job.GetFirmwarePackageCount() + job.IsMultiPass(), 0);
  EXPECT_EQ(job.LoadFromFile(u"none.xml"), 0);
  job.DumpData();
}

TEST_F(EveryExportTest, ListsAndFrees) {
  const std::size_t blocks = device().memory().live_blocks();
  auto* const job = new UpgradeConfig;
  job->AddFileSave("a");
  job->AddFileDelete("b");
  job->AddStopProcess("c");
  job->AddDownloadFile(NewRecord<tagDownloadFile>());
  job->AddFirmwarePkg(new FirmwarePackage);
  job->AddStorageReqEntry(NewRecord<tagStorageReq>());
  job->AddRegistryTest(NewRecord<tagRegistryTest>());
  auto* const list = NewRecord<tagDownloadFile>();
  job->AddMCFileList(list);
  EXPECT_STREQ(job->FilesToSave()[0], "a");
  EXPECT_STREQ(job->FilesToDelete()[0], "b");
  EXPECT_STREQ(job->ProcessesToStop()[0], "c");
  EXPECT_EQ(job->DownloadFiles().size(), 1U);
  EXPECT_EQ(job->FirmwarePackages()[0]->count, 0);
  EXPECT_EQ(job->StorageRequirements().size(), 1U);
  EXPECT_EQ(job->RegistryTests().size(), 1U);
  EXPECT_EQ(job->GetMCFileList(), list);

  // Copies share the elements: only one of the records is destroyed.
  auto* const copy = new UpgradeConfig(*job);
  auto* const other = new UpgradeConfig;
  *other = *copy;
  EXPECT_EQ(other->GetMCFileList(), list);
  delete job;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  EXPECT_GT(device().memory().live_blocks(), blocks) << "the records of the copies";

  delete new FirmwarePackage;
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(EveryExportTest, StartsNothingWithoutAJob) {
  EXPECT_EQ(StartUpgradeThread(nullptr, 1), nullptr);
}

}  // namespace

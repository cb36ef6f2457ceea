// The library as outside callers see it: the shared object and its public headers, nothing else.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstring>
#include <new>
#include <string>

#include "ce/system.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_config.h"
#include "orvenix/upgrade_thread.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

using ConsumerTest = DeviceTest;

TEST_F(ConsumerTest, FindsTheFunctionsUnderTheirPlainNames) {
  for (const char* name :
       {"IcfgInitialize", "IcfgSetCallbacks", "IcfgBeginGroup", "IcfgSetField", "IcfgGetField",
        "IcfgEndGroup", "IcfgGetFirstInstance", "IcfgGetNextInstance", "IcfgGetInterfaceVersion",
        "IcfgGetSchemaVersion", "IcfgUninitialize", "StartUpgradeThread"}) {
    EXPECT_NE(dlsym(RTLD_DEFAULT, name), nullptr) << name;
  }
}

TEST_F(ConsumerTest, WalksTheTreeAsAHostDoes) {
  EXPECT_EQ(IcfgInitialize(), ICFG_OK);
  EXPECT_EQ(IcfgBeginGroup("Orvenix", 0, 0), ICFG_OK);
  EXPECT_EQ(IcfgBeginGroup("Syslog", 0, 0), ICFG_OK);
  EXPECT_EQ(IcfgSetField("Port", 0, "514"), ICFG_OK);
  EXPECT_EQ(IcfgSetField("Porto", 0, "514"), ICFG_UNKNOWN_NAME);
  EXPECT_EQ(IcfgEndGroup("Syslog", 0, 0), ICFG_OK);
  char text[8] = {};
  std::uint32_t length = 0;
  EXPECT_EQ(IcfgGetField("Protocol Version", 0, 0, text, &length), ICFG_OK);
  EXPECT_STREQ(text, "3.44");
  EXPECT_EQ(IcfgUninitialize(), ICFG_OK);
}

TEST_F(ConsumerTest, MakesCopiesAndFreesJobsOfItsOwn) {
  const std::size_t blocks = device().memory().live_blocks();
  auto* const job = new UpgradeConfig;
  auto* const file = static_cast<tagDownloadFile*>(LocalAlloc(LPTR, sizeof(tagDownloadFile)));
  std::strcpy(file->source, "a.bin");
  job->AddDownloadFile(file);
  job->AddFirmwarePkg(new FirmwarePackage);
  job->AddFileSave("\\kept");
  auto* const copy = new UpgradeConfig(*job);

  ASSERT_EQ(copy->DownloadFiles().size(), 1U);
  for (const tagDownloadFile* each : copy->DownloadFiles()) EXPECT_STREQ(each->source, "a.bin");
  EXPECT_EQ(copy->FirmwarePackages()[0]->count, 0);
  EXPECT_STREQ(copy->FilesToSave()[0], "\\kept");
  EXPECT_STREQ(job->GetModel(), "52");

  delete job;
  // The copy's elements are gone with the job: only the record and its three arrays remain.
  EXPECT_EQ(device().memory().live_blocks(), blocks + 4);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(ConsumerTest, LoadsAJobFromAFile) {
  test::PutFile("\\windows\\job.xml",
                "<Job><BaseUrl>http://127.0.0.2</BaseUrl><OSFirmware>"
                "<Package HardwareVersion='TQ' SourceDir='fw' Base='os.bin'/>"
                "<Package HardwareVersion='MR' SourceDir='fw'/></OSFirmware></Job>");
  const std::size_t blocks = device().memory().live_blocks();
  {
    UpgradeConfig job;
    EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
    EXPECT_STREQ(job.GetBaseURL(), "http://127.0.0.2");
    ASSERT_EQ(job.FirmwarePackages().size(), 1U);
    EXPECT_STREQ(job.FirmwarePackages()[0]->base, "os.bin");
    EXPECT_EQ(job.GetFirmwarePackageCount(), 2);
    job.DumpData();  // a release shows it to nobody
    EXPECT_EQ(job.LoadFromFile(u"job.xml"), 0) << "the first load has deleted it";
  }
  EXPECT_EQ(device().memory().live_blocks(), blocks);
}

TEST_F(ConsumerTest, MakesJobsAndPackagesWithTheNewThatDoesNotThrowToo) {
  const std::size_t blocks = device().memory().live_blocks();
  auto* const job = new (std::nothrow) UpgradeConfig;
  auto* const package = new (std::nothrow) FirmwarePackage;
  EXPECT_EQ(device().memory().live_blocks(), blocks + 2) << "both where the library frees them";
  job->AddFirmwarePkg(package);

  delete job;

  EXPECT_EQ(device().memory().live_blocks(), blocks);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
}

TEST_F(ConsumerTest, GetsNullFromEitherNewWithoutMemory) {
  device().faults().Add({"LocalAlloc", 1, 0, 0});

  EXPECT_EQ(new UpgradeConfig, nullptr);
  EXPECT_EQ(new (std::nothrow) UpgradeConfig, nullptr);
  EXPECT_EQ(new FirmwarePackage, nullptr);
  EXPECT_EQ(new (std::nothrow) FirmwarePackage, nullptr);
  device().faults().Clear();
}

TEST_F(ConsumerTest, StartsNothingWithoutAJob) {
  EXPECT_EQ(StartUpgradeThread(nullptr, 1), nullptr);
}

}  // namespace

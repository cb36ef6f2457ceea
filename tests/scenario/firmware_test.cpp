// Firmware: images that come into the flash driver's store and are written into the flash.
#include "scenario/firmware_test.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/system.h"
#include "device/flash/ram_file.h"
#include "driver/drivers.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "orvenix/upgrade_thread.h"
#include "product_support/jobs.h"
#include "server/multicast_run.h"
#include "tools/fleet/fleet.h"
#include "tools/virtual_multicast.h"
#include "trace/trace.h"

namespace {

using std::chrono::seconds;
using test::ReadLog;
using ::testing::AllOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::IsSupersetOf;
using ::testing::Not;

class FirmwareTest : public test::FirmwareScenario {
 protected:
  explicit FirmwareTest(const sim::Profile& profile = test::FirmwareProfile())
      : FirmwareScenario(profile) {
    network().SetDefaultLink(fleet::Plan::DefaultLink());
  }
  ~FirmwareTest() override { port_.reset(); }

  void Announce(const std::string& name, const std::string& image) {
    files_.push_back({name, "", 0x20, "2006-03-01 14:05:09", server::MemoryContent(image)});
  }
  void StartMulticast() {
    job_.multicast = "-A=239.1.1.1 -P=7000 -HV=TQ52";
    server::MulticastOptions options;
    options.start.expected = 1;
    run_ = std::make_unique<server::MulticastRun>(options, files_);
    port_ =
        std::make_unique<tools::VirtualMulticast>(world(), sim::Endpoint{0x0A000002, 7001}, *run_);
    After(seconds(10), [this] { port_->Start(); });
  }

  std::vector<server::MulticastFile> files_;
  std::unique_ptr<server::MulticastRun> run_;
  std::unique_ptr<tools::VirtualMulticast> port_;
};

TEST_F(FirmwareTest, ComesByHttpIntoTheStoreAndIsFlashed) {
  const std::string image = fleet::Noise(200000, 1);
  List("os.nb0", image);

  RunJob();

  EXPECT_EQ(Flashed("os.nb0"), image);
  EXPECT_EQ(FlashedFiles(), 1U);
  EXPECT_EQ(Count("EFL_Helper_Start_EFLASH:: SUCCESS!."), 1U);
  EXPECT_THAT(device().debug().KernelText(), HasSubstr("Allocated 1040960 Bytes!"));
  EXPECT_THAT(ShownLines(),
              IsSupersetOf({"InitRAM = 1040960", "Validating, RAM:os.nb0", "Starting EFlash...",
                            "This may take several minutes..."}));
  EXPECT_THAT(ShownLines(), Not(Contains("RAMFile::Init - ok"))) << "the job has made it";
  EXPECT_THAT(ReadLog(), AllOf(HasSubstr("Orvenix - InitRAM - RAM needed = 1000000\r\n"),
                               HasSubstr("Orvenix - after Ramfile::Init - opening, os.nb0\r\n"),
                               HasSubstr("Orvenix - RAMFILECRC32\r\n"),
                               HasSubstr("Starting Eflash...After Eflash...Local Upgrade "
                                         "Executing\r\n")));
}

TEST_F(FirmwareTest, IsFlashedAfterTheMemoryWasDividedAndThreeSeconds) {
  List("os.nb0", "image");
  std::vector<std::string> steps;
  device().trace().SetSink([&steps](std::string_view line) {
    const auto holds = [line](const char* part) {
      return line.find(part) != std::string_view::npos;
    };
    if (holds("\"SetSystemMemoryDivision\"")) steps.emplace_back("division");
    if (holds("\"Sleep\"") && holds("\"ms\":3000")) steps.emplace_back("pause");
    if (holds("\"DeviceIoControl\"") && holds("\"code\":2281469")) steps.emplace_back("start");
  });

  RunJob();

  device().trace().SetSink({});
  EXPECT_EQ(Flashed("os.nb0"), "image");
  const auto start = std::find(steps.begin(), steps.end(), "start");
  ASSERT_NE(start, steps.end());
  ASSERT_GE(start - steps.begin(), 2);
  EXPECT_THAT(std::vector<std::string>(start - 2, start), ElementsAre("division", "pause"));
  EXPECT_EQ(std::count(steps.begin(), steps.end(), "start"), 1);
}

TEST_F(FirmwareTest, ComesByMulticastAndNeedsNoHttp) {
  const std::string image = fleet::Noise(150000, 2);
  List("os.nb0", image);
  Announce("\\list.txt", list_);
  Announce("ram:os.nb0", image);
  StartMulticast();

  RunJob();

  EXPECT_EQ(Flashed("os.nb0"), image);
  EXPECT_EQ(FlashedFiles(), 1U);
  EXPECT_THAT(server().RequestedPaths(), IsEmpty());
  EXPECT_FALSE(test::Exists("\\os.nb0"));
  EXPECT_EQ(run_->figures().files.back().Count(server::DeviceState::kProven), 1U);
}

TEST_F(FirmwareTest, ThatMulticastSpoiltIsRepairedByHttp) {
  const std::string image = fleet::Noise(150000, 3);
  const std::string loader = fleet::Noise(20000, 4);
  List("os.nb0", image);
  List("loader.nb0", loader);
  std::string spoilt = image;
  spoilt[77777] ^= 1;
  Announce("RAM:os.nb0", spoilt);
  Announce("RAM:loader.nb0", loader);
  StartMulticast();

  RunJob();

  EXPECT_EQ(Flashed("os.nb0"), image);
  EXPECT_EQ(Flashed("loader.nb0"), loader);
  EXPECT_THAT(server().RequestedPaths(), ElementsAre("fw/list.txt:1,1", "fw/os.nb0:2,1"));
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - ValidateFiles - crc mismatch, RAM:os.nb0, "));
}

TEST_F(FirmwareTest, IsFetchedIntoAStoreThatTheJobAsksForInItsPackage) {
  const std::string image = fleet::Noise(100000, 5);
  server().Put("fw/os.nb0", image);
  auto* const job = new UpgradeConfig;
  job->SetBaseURL(test::kServerUrl);
  test::AddPackage(*job, {0, "os.nb0", "RAM:", "fw/", "", "RAMAllocSize=100000"});
  CloseHandle(StartUpgradeThread(job, 1));
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(Flashed("os.nb0"), image);
  EXPECT_THAT(ShownLines(), IsSupersetOf({"RAMSIZE From parms = 100000", "RAMFile::Init - ok"}));
  EXPECT_THAT(device().debug().KernelText(), HasSubstr("Allocated 140960 Bytes!"));
}

TEST_F(FirmwareTest, IsNotFlashedWhenAPackageIsNotForMemory) {
  server().Put("fw/os.nb0", "image");
  auto* const job = new UpgradeConfig;
  job->SetBaseURL(test::kServerUrl);
  test::AddPackage(*job, {0, "os.nb0", "\\", "fw/", "", ""});
  CloseHandle(StartUpgradeThread(job, 1));
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(FlashedFiles(), 0U);
  EXPECT_THAT(ReadLog(), Not(HasSubstr("Eflash")));
  EXPECT_EQ(device().debug().KernelText(), "");
}

TEST_F(FirmwareTest, AnnouncedInAPackageWithoutAFileFlashesNothing) {
  auto* const job = new UpgradeConfig;
  job->SetBaseURL(test::kServerUrl);
  test::AddPackage(*job, {0, "", "RAM:", "fw/", "", "RAMAllocSize=100000"});
  CloseHandle(StartUpgradeThread(job, 1));
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_THAT(ReadLog(), HasSubstr("Starting Eflash...After Eflash..."));
  EXPECT_EQ(device().faults().Count("DeviceIoControl"), 0U) << "nothing was made to be flashed";
}

TEST_F(FirmwareTest, IsNotFlashedWhenATestOfTheDeviceFails) {
  server().Put("fw/os.nb0", "image");
  auto* const job = new UpgradeConfig;
  job->SetBaseURL(test::kServerUrl);
  test::AddStore(*job, "RAM:", "1000");
  test::AddTest(*job, {"HKEY_LOCAL_MACHINE", "None", "None", "REG_SZ", "=", "x", "wrong device"});
  test::AddPackage(*job, {0, "os.nb0", "RAM:", "fw/", "", "RAMAllocSize=1000"});
  CloseHandle(StartUpgradeThread(job, 1));
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));
  EXPECT_EQ(FlashedFiles(), 0U);
  EXPECT_EQ(Count("Start_EFLASH"), 0U);
}

TEST_F(FirmwareTest, GoesIntoTheStoreAtTheSecondTryAfterADriverThatARestartTook) {
  HKEY key = nullptr;
  RegCreateKeyExW(HKEY_LOCAL_MACHINE, u"Drivers\\Eflashdrv", 0, nullptr, 0, KEY_ALL_ACCESS, nullptr,
                  &key, nullptr);
  const DWORD gone = 0x55;
  RegSetValueExW(key, u"HDEVICE", 0, REG_DWORD, reinterpret_cast<const BYTE*>(&gone), 4);
  RegCloseKey(key);
  List("os.nb0", "image");

  RunJob();

  EXPECT_EQ(Flashed("os.nb0"), "image");
  EXPECT_THAT(ReadLog(), HasSubstr("Orvenix - InitRAM - RAM init error = 1000000\r\n"));
  EXPECT_THAT(ShownLines(), Contains("RAMFile::Init - ok"));
}

TEST_F(FirmwareTest, IsGivenBackWhole) {
  List("os.nb0", fleet::Noise(100000, 6));
  const test::Holdings before = test::HoldingsOf(device());
  const std::uint64_t used = device().memory().ram().figures().used;
  RunJob();
  device::FreeRAMStore();
  EXPECT_EQ(test::HoldingsOf(device()), before);
  EXPECT_EQ(device().memory().ram().figures().used, used);
}

class FailingFlashTest : public FirmwareTest {
 protected:
  FailingFlashTest() : FirmwareTest(test::FirmwareProfile("fails")) {}
};

TEST_F(FailingFlashTest, LeavesTheJobASuccess) {
  List("os.nb0", "image");
  RunJob();
  EXPECT_EQ(Count("EFL_Helper_Start_EFLASH::DeviceIoControl Failed."), 1U);
  EXPECT_EQ(FlashedFiles(), 0U);
  EXPECT_EQ(server().Device().report->error, "");
  EXPECT_THAT(ReadLog(), HasSubstr("After Eflash...Local Upgrade Executing\r\n"));
}

class RestartingFlashTest : public FirmwareTest {
 protected:
  RestartingFlashTest() : FirmwareTest(test::FirmwareProfile("restarts")) {}
};

TEST_F(RestartingFlashTest, EndsTheJobWhereTheDeviceRestarts) {
  List("os.nb0", "image");
  EXPECT_EQ(Start(job_), ICFG_OK);
  for (int i = 0; i < 600 && !device().drivers().restart_requested(); ++i) Sleep(1000);
  ASSERT_TRUE(device().drivers().restart_requested());
  EXPECT_EQ(Flashed("os.nb0"), "image");
  EXPECT_TRUE(server().Device().report.has_value()) << "it was told before";
  const std::string log = ReadLog();
  EXPECT_THAT(log, HasSubstr("Starting Eflash..."));
  EXPECT_THAT(log, Not(HasSubstr("After Eflash...")));
}

}  // namespace

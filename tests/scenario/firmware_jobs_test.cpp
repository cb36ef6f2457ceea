// Firmware in several jobs of one process, in several passes of one job, and beside loader images.
#include <gmock/gmock.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "ce/kernel.h"
#include "ce/system.h"
#include "device/flash/ram_file.h"
#include "driver/drivers.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "orvenix/upgrade_thread.h"
#include "product_support/jobs.h"
#include "scenario/firmware_test.h"
#include "support/own_process.h"

namespace {

using test::Exists;
using test::GetFile;
using test::PutFile;
using test::ReadLog;
using ::testing::AllOf;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Optional;

// ---- jobs, one after the other ----

using FirmwareJobsTest = test::FirmwareScenario;

TEST_F(FirmwareJobsTest, UseTheSameStore) {
  List("os.nb0", "the first image");
  RunJob();
  list_.clear();
  List("os.nb0", "the second");
  job_.required_space = "2000000";

  RunJob();

  EXPECT_EQ(Flashed("os.nb0"), "the second");
  EXPECT_EQ(Count("Allocated"), 1U);
  EXPECT_EQ(Count("Allocated 1040960 Bytes!"), 1U) << "the first job's size stays";
  EXPECT_THAT(ReadLog(), Not(HasSubstr("RAM init error")));
}

TEST_F(FirmwareJobsTest, FlashWhatEarlierOnesHaveLeftInTheStore) {
  List("os.nb0", "image");
  RunJob();
  std::filesystem::remove(device().folder() / "flash" / "os.nb0");
  list_.clear();
  List("loader.nb0", "loader");

  RunJob();

  EXPECT_EQ(Flashed("loader.nb0"), "loader");
  EXPECT_EQ(Flashed("os.nb0"), "image");
  EXPECT_EQ(Count("EFL_Helper_Start_EFLASH:: SUCCESS!."), 2U);
}

TEST_F(FirmwareJobsTest, FlashNothingWhenTheyBringNoImage) {
  List("os.nb0", "image");
  RunJob();
  list_.clear();
  ListAs("\\a.txt", "a.txt", "text");

  RunJob();

  EXPECT_THAT(GetFile("\\a.txt"), Optional(std::string("text")));
  EXPECT_EQ(Count("EFL_Helper_Start_EFLASH"), 1U);
}

TEST_F(FirmwareJobsTest, MakeANewStoreWhenItWasGivenUp) {
  List("os.nb0", "the first image");
  RunJob();
  EXPECT_TRUE(device::FreeRAMStore());
  EXPECT_THAT(device().drivers().Names(), IsEmpty());
  list_.clear();
  List("loader.nb0", "loader");
  job_.required_space = "2000000";
  std::filesystem::remove(device().folder() / "flash" / "os.nb0");

  RunJob();

  EXPECT_EQ(Flashed("loader.nb0"), "loader");
  EXPECT_EQ(Flashed("os.nb0"), "(none)") << "it went with its store";
  EXPECT_EQ(Count("Allocated 2040960 Bytes!"), 1U);
}

TEST_F(FirmwareJobsTest, MayBeHandedOverWhileTheLastPutsThingsAway) {
  const test::Holdings before = test::HoldingsOf(device());
  List("os.nb0", "image");
  Start(job_);
  while (Flashed("os.nb0") != "image") Sleep(100);
  list_.clear();
  List("loader.nb0", "loader");
  while (test::WalkJob(job_) != ICFG_OK) {
    test::DropKeptJob();
    Sleep(100);
  }
  EXPECT_GT(device().kernel().LiveThreads(), 1U) << "the first thread has not ended";
  EXPECT_EQ(test::EndJob(), ICFG_OK);
  ASSERT_TRUE(test::AwaitEndOfJobs(device()));

  EXPECT_EQ(Flashed("os.nb0"), "image");
  EXPECT_EQ(Flashed("loader.nb0"), "loader");
  EXPECT_EQ(Count("EFL_Helper_Start_EFLASH:: SUCCESS!."), 2U);
  EXPECT_EQ(server().Device().reports, 2U);
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  device::FreeRAMStore();
  EXPECT_EQ(test::HoldingsOf(device()), before);
}

// ---- loader images ----

class LoaderImagesOfAJobTest : public test::FirmwareScenario {
 protected:
  LoaderImagesOfAJobTest() : FirmwareScenario(test::FirmwareProfile("writes", 13)) {
    for (const char* generation : {"G3", "G4", "H3"}) {
      const std::string name = std::string("TQ52.IPL.") + generation + ".nb0";
      ListAs("\\" + name, name, std::string("loader for ") + generation);
    }
  }
};

TEST_F(LoaderImagesOfAJobTest, AreDownToOneWhenTheFlashBegins) {
  List("os.nb0", "image");
  RunJob();
  EXPECT_EQ(Flashed("os.nb0"), "image");
  EXPECT_THAT(GetFile("\\TQ52.IPL.G4.nb0"), Optional(std::string("loader for G4")));
  EXPECT_FALSE(Exists("\\TQ52.IPL.G3.nb0"));
  EXPECT_FALSE(Exists("\\TQ52.IPL.H3.nb0"));
  std::vector<std::string> shown = ShownLines();
  shown.erase(shown.begin(), std::find(shown.begin(), shown.end(), "DOC is !G4!"));
  shown.resize(std::min<std::size_t>(shown.size(), 5));
  EXPECT_THAT(shown,
              ElementsAre("DOC is !G4!", "Deleting !TQ52.IPL.G3.nb0!", "Deleting !TQ52.IPL.H3.nb0!",
                          "Starting EFlash...", "This may take several minutes..."));
}

TEST_F(LoaderImagesOfAJobTest, AllStayWhenNoImageComes) {
  RunJob();
  for (const char* generation : {"G3", "G4", "H3"}) {
    EXPECT_TRUE(Exists(std::string("\\TQ52.IPL.") + generation + ".nb0")) << generation;
  }
  EXPECT_THAT(ShownLines(), Not(Contains("DOC is !G4!")));
}

// ---- passes ----

/// A device that restarts when its flash has been written. Each start is a process of its own: the
/// product begins anew there, too.
class FirmwarePassesTest : public ::testing::Test {
 protected:
  /// One start.
  class Started {
   public:
    explicit Started(const std::filesystem::path& folder)
        : world_(sim::World::MakeVirtual()),
          device_(std::make_unique<sim::Device>(*world_, Profile(), folder)),
          host_(std::make_unique<sim::AttachedThread>(*device_, "host")),
          server_(std::make_unique<test::UpgradeServer>(*world_)) {
      for (const char* pass : {"1", "2", "3"}) {
        server_->Put(std::string("fw/os") + pass, std::string("image of pass ") + pass);
      }
    }
    ~Started() {
      server_.reset();
      host_.reset();
      device_.reset();
    }
    Started(const Started&) = delete;
    Started& operator=(const Started&) = delete;

    sim::Device& device() { return *device_; }
    test::UpgradeServer& server() { return *server_; }

    /// Starts the job as the management client sends it for each of its passes.
    /// @param model  what the job asks the device's model to be
    static void StartJob(const std::string& model = "seven") {
      auto* const job = new UpgradeConfig;
      job->SetBaseURL(test::kServerUrl);
      test::SetMultiPass(*job);
      test::AddTest(*job, {"HKEY_LOCAL_MACHINE", "Software\\Orvenix", "Model", "REG_SZ", "EQ",
                           model, "wrong model"});
      for (const char* pass : {"1", "2", "3"}) {
        test::AddPackage(*job, {0, std::string("os") + pass, "RAM:", "fw/", "",
                                std::string("RAMAllocSize=100000,Pass=") + pass});
      }
      CloseHandle(StartUpgradeThread(job, 1));
    }
    bool AwaitRestart() {
      for (int i = 0; i < 600 && !device_->drivers().restart_requested(); ++i) Sleep(1000);
      return device_->drivers().restart_requested();
    }
    static std::string Pass() { return GetFile("\\kvoupgclnt.txt").value_or("(none)"); }

   private:
    static sim::Profile Profile() {
      sim::Profile profile;
      profile.flash_start = "restarts";
      return profile;
    }

    std::unique_ptr<sim::World> world_;
    std::unique_ptr<sim::Device> device_;
    std::unique_ptr<sim::AttachedThread> host_;
    std::unique_ptr<test::UpgradeServer> server_;
  };

  FirmwarePassesTest() {
    Start([](Started& /*device*/) {
      HKEY key = nullptr;
      RegCreateKeyExW(HKEY_LOCAL_MACHINE, u"Software\\Orvenix", 0, nullptr, 0, KEY_ALL_ACCESS,
                      nullptr, &key, nullptr);
      RegSetValueExW(key, u"Model", 0, REG_SZ, reinterpret_cast<const BYTE*>(u"seven"), 12);
      RegCloseKey(key);
    });
  }

  void Start(const std::function<void(Started&)>& work) {
    const bool good = test::InOwnProcess([this, &work] {
      Started device(folder_.path() / "device");
      work(device);
    });
    EXPECT_TRUE(good) << "start " << starts_;
    ++starts_;
  }
  /// A start in which the job runs as this pass and ends in the device's restart.
  void StartForPass(const std::string& pass) {
    Start([pass](Started& started) {
      Started::StartJob();
      ASSERT_TRUE(started.AwaitRestart());
      EXPECT_EQ(test::FlashedOn(started.device(), "os" + pass), "image of pass " + pass);
      EXPECT_EQ(Started::Pass(), pass);
      EXPECT_EQ(started.server().Device().reports, 1U);
      // Twice where the registry names a driver that the restart took: that is noticed then.
      EXPECT_THAT(started.server().RequestedPaths(),
                  AllOf(Not(IsEmpty()), Each("fw/os" + pass + ":1,1")));
    });
  }

 private:
  test::TemporaryFolder folder_;
  int starts_ = 0;
};

TEST_F(FirmwarePassesTest, FollowEachOtherOverRestarts) {
  for (const char* pass : {"1", "2", "3"}) StartForPass(pass);
}

TEST_F(FirmwarePassesTest, BeginAtTheFirstAgainWhenOneHasFailed) {
  StartForPass("1");
  Start([](Started& started) {
    Started::StartJob("eight");
    ASSERT_TRUE(test::AwaitEndOfJobs(started.device()));
    EXPECT_FALSE(started.device().drivers().restart_requested());
    EXPECT_EQ(test::FlashedOn(started.device(), "os2"), "(none)");
    EXPECT_EQ(Started::Pass(), "(none)");
    EXPECT_EQ(started.server().Device().report->error, "wrong model");
    EXPECT_THAT(ReadLog(), HasSubstr("wrong model\r\n"));
  });
  StartForPass("1");
  StartForPass("2");
}

}  // namespace

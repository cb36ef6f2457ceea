// Every API call of an upgrade is made to fail, one call a run.
//
// A run is a small job on a fresh device: a registry test, a program to end, a folder to empty but
// for one file, a list file that is not there, a right file, a damaged one. Its n-th call that can
// fail does so, for every n up to the last call of the job. Whatever call that is, the program must
// not crash or hang, must keep nothing, must leave the right file alone and must never leave a
// damaged file that looks complete.
#include "scenario/fault_walk.h"

#include <gmock/gmock.h>

#include <memory>
#include <string>

#include "ce/files.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "http/job_client.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "process/processes.h"
#include "product_support/host.h"
#include "product_support/upgrade_server.h"
#include "support/device_files.h"
#include "support/device_test.h"
#include "upgrade/run_state/run_state.h"

namespace {

using test::CrcText;
using test::GetFile;

constexpr int kShards = 32;

const std::string kRight = "right from the beginning";
const std::string kNew(3000, 'n');
const std::string kDamaged(3000, 'd');

/// One run.
class Walk {
 public:
  explicit Walk(std::uint64_t nth)
      : nth_(nth),
        world_(sim::World::MakeVirtual()),
        device_(std::make_unique<sim::Device>(*world_, WithProgram(), folder_.path() / "device")),
        host_(std::make_unique<sim::AttachedThread>(*device_, "host")),
        server_(std::make_unique<test::UpgradeServer>(*world_)) {
    PrepareJob();
    before_ = test::HoldingsOf(*device_);
  }
  ~Walk() {
    server_.reset();
    host_.reset();
    device_.reset();
  }
  Walk(const Walk&) = delete;
  Walk& operator=(const Walk&) = delete;

  void Run() {
    device_->faults().Add({"*", nth_, 1, 0});
    IcfgInitialize();
    const std::uint32_t began = test::WalkJob(job_);
    const std::uint32_t result = test::EndJob();
    EXPECT_EQ(began, ICFG_OK);
    EXPECT_TRUE(result == ICFG_OK || result == ICFG_NO_POWER || result == ICFG_NO_SPACE ||
                result == ICFG_TEST_FAILED)
        << result;
    ended_ = test::AwaitEndOfJobs(*device_, test::kWalkLimit);
    call_ = device_->faults().last_fired();
    device_->faults().Clear();
  }

  /// False once the job makes fewer than n calls.
  [[nodiscard]] bool fired() const { return !call_.empty(); }
  [[nodiscard]] const std::string& call() const { return call_; }

  void Check() {
    EXPECT_EQ(device_->memory().bad_frees(), 0U);
    if (!test::IsRelease(call_)) CheckEnd();
    EXPECT_EQ(GetFile("\\right.txt"), kRight);
    EXPECT_EQ(GetFile("\\Old\\Data\\settings"), kRight) << "to be saved";
    const auto repaired = GetFile("\\damaged.bin");
    if (fired()) {
      EXPECT_TRUE(repaired == kNew || repaired == kDamaged || test::IsRelease(call_))
          << repaired.value_or("(none)");
    } else {
      EXPECT_EQ(repaired, kNew);
      EXPECT_FALSE(test::Exists("\\Old\\app.bin"));
      EXPECT_EQ(device_->processes().List().size(), 1U);
    }
  }

 private:
  void CheckEnd() {
    EXPECT_TRUE(ended_) << "a thread hangs";
    EXPECT_FALSE(upgrade::UpgradeInProgress());
    EXPECT_EQ(http::JobClient(), nullptr);
    test::DropKeptJob();
    test::Holdings after = test::HoldingsOf(*device_);
    // The queue's functions are looked for once; without lapi_close the connection stays open.
    if (call_ == "GetProcAddressW") after.queue_connections = before_.queue_connections;
    EXPECT_EQ(after, before_);
  }

  void PrepareJob() {
    test::PutFile("\\right.txt", kRight);
    test::PutFile("\\damaged.bin", kDamaged);
    test::PutFile("\\Old\\app.bin", kDamaged);
    test::SetAttributesOf("\\Old\\app.bin", FILE_ATTRIBUTE_READONLY);
    test::PutFile("\\Old\\Data\\settings", kRight);
    StoreSystem();
    job_.tests = {{"Software\\Orvenix", "System", "REG_SZ", "EQ", "seven", "needs system seven"}};
    job_.stop = {"app.exe"};
    job_.cleared = {"\\Old"};
    job_.saved = {"\\old\\data\\settings"};
    const std::string list =
        "files/right.txt,\\right.txt,*," + server_->Put("files/right.txt", kRight) + ",24\r\n" +
        "files/new.bin,\\damaged.bin,*," + server_->Put("files/new.bin", kNew) + ",3000\r\n";
    job_.list =
        test::HostFile{"files/list.txt", "\\list.txt", "*", server_->Put("files/list.txt", list)};
  }

  static void StoreSystem() {
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Orvenix"), 0, nullptr, 0, KEY_ALL_ACCESS,
                    nullptr, &key, nullptr);
    RegSetValueExW(key, TEXT("System"), 0, REG_SZ, reinterpret_cast<const BYTE*>(u"seven"), 12);
    RegCloseKey(key);
  }

  static sim::Profile WithProgram() {
    sim::Profile profile;
    profile.processes = {{"app.exe"}};
    return profile;
  }

  const std::uint64_t nth_;
  test::TemporaryFolder folder_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  std::unique_ptr<sim::AttachedThread> host_;
  std::unique_ptr<test::UpgradeServer> server_;
  test::HostJob job_;
  test::Holdings before_;
  bool ended_ = false;
  std::string call_;
};

class FaultWalkTest : public ::testing::TestWithParam<int> {};

// Each shard takes every 32nd call.
TEST_P(FaultWalkTest, SurvivesTheFailureOfEachCallInTurn) {
  const auto first = static_cast<std::uint64_t>(GetParam()) + 1;
  EXPECT_THAT(test::WalkCalls<Walk>(first, kShards), ::testing::IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(EveryThirtySecond, FaultWalkTest, ::testing::Range(0, kShards));

}  // namespace

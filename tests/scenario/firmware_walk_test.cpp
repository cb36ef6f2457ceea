// Every API call of a firmware upgrade is made to fail, one call a run: from the loading of the
// flash driver to the start of the flash. Whatever call that is, the program must not crash or
// hang, must keep nothing once the store is given up, and must never flash a damaged image.
#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>

#include "device/flash/ram_file.h"
#include "driver/drivers.h"
#include "faults/faults.h"
#include "http/job_client.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "product_support/host.h"
#include "product_support/upgrade_server.h"
#include "scenario/fault_walk.h"
#include "support/device_files.h"
#include "support/device_test.h"
#include "upgrade/run_state/run_state.h"

namespace {

constexpr int kShards = 16;

const std::string kImage(5000, 'i');

/// One run.
class Walk {
 public:
  explicit Walk(std::uint64_t nth)
      : nth_(nth),
        world_(sim::World::MakeVirtual()),
        device_(std::make_unique<sim::Device>(*world_, sim::Profile{}, folder_.path() / "device")),
        host_(std::make_unique<sim::AttachedThread>(*device_, "host")),
        server_(std::make_unique<test::UpgradeServer>(*world_)) {
    const std::string crc = server_->Put("os.nb0", kImage);
    const std::string list = "os.nb0,RAM:os.nb0,*," + crc + ",5000\r\n";
    job_.store = "RAM:";
    job_.required_space = "10000";
    job_.list = test::HostFile{"list.txt", "\\list.txt", "*", server_->Put("list.txt", list)};
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
    IcfgInitialize();
    test::WalkJob(job_);
    // The calls until here are those of any job, whose failures have a walk of their own.
    device_->faults().Add({"*", nth_, 1, 0});
    test::EndJob();
    ended_ = test::AwaitEndOfJobs(*device_, test::kWalkLimit);
    call_ = device_->faults().last_fired();
    device_->faults().Clear();
  }

  /// False once the job makes fewer than n calls.
  [[nodiscard]] bool fired() const { return !call_.empty(); }
  [[nodiscard]] const std::string& call() const { return call_; }

  void Check() {
    EXPECT_EQ(device_->memory().bad_frees(), 0U);
    const std::string flashed = Flashed();
    if (fired()) {
      EXPECT_TRUE(flashed == kImage || flashed.empty()) << flashed.size() << " bytes";
    } else {
      EXPECT_EQ(flashed, kImage);
    }
    if (!test::IsRelease(call_)) CheckEnd();
  }

 private:
  void CheckEnd() {
    EXPECT_TRUE(ended_) << "a thread hangs";
    EXPECT_FALSE(upgrade::UpgradeInProgress());
    EXPECT_EQ(http::JobClient(), nullptr);
    test::DropKeptJob();
    device::FreeRAMStore();
    // A driver whose handle could not be kept or read stays loaded.
    if (!device_->drivers().Names().empty()) {
      EXPECT_TRUE(call_ == "RegSetValueExW" || call_ == "RegQueryValueExW") << call_;
      ++before_.handles;
    }
    test::Holdings after = test::HoldingsOf(*device_);
    if (call_ == "GetProcAddressW") after.queue_connections = before_.queue_connections;
    EXPECT_EQ(after, before_);
  }

  /// What was written into the flash, empty for nothing.
  std::string Flashed() {
    std::ifstream file(device_->folder() / "flash" / "os.nb0", std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
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

class FirmwareWalkTest : public ::testing::TestWithParam<int> {};

TEST_P(FirmwareWalkTest, SurvivesTheFailureOfEachCallInTurn) {
  const auto first = static_cast<std::uint64_t>(GetParam()) + 1;
  EXPECT_THAT(test::WalkCalls<Walk>(first, kShards), ::testing::IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(EverySixteenth, FirmwareWalkTest, ::testing::Range(0, kShards));

}  // namespace

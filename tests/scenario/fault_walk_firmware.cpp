// The walks of jobs that bring firmware.
#include <gmock/gmock.h>

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "ce/kernel.h"
#include "net/virtual/virtual_network.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_thread.h"
#include "product_support/jobs.h"
#include "scenario/fault_walk.h"
#include "server/multicast_run.h"
#include "support/device_files.h"
#include "tools/fleet/fleet.h"
#include "tools/virtual_multicast.h"

namespace test {
namespace {

const std::string kImage(5000, 'i');

sim::Profile WithDisk() {
  sim::Profile profile;
  profile.address = "10.0.0.1";
  profile.disk_generation = 13;
  return profile;
}

class FirmwareWalk : public Walk {
 public:
  FirmwareWalk() : Walk(WithDisk()) {}

 protected:
  void PrepareJob() override {
    for (const char* name : {kOwnLoader, kOtherLoader}) PutFile(name, "loader");
    const std::string crc = server().Put("os.nb0", kImage);
    list_ = "os.nb0,RAM:os.nb0,*," + crc + ",5000\r\n";
    job_.store = "RAM:";
    job_.required_space = "10000";
    job_.show_gui = false;
    job_.list = HostFile{"list.txt", "\\list.txt", "*", server().Put("list.txt", list_)};
  }

  void RunJob() override {
    IcfgInitialize();
    WalkJob(job_);
    EndJob();
  }

  void CheckResult() override {
    EXPECT_EQ(GetFile(kOwnLoader), "loader");
    const std::string flashed = Flashed("os.nb0");
    if (failed()) {
      EXPECT_TRUE(flashed == kImage || flashed.empty()) << flashed.size() << " bytes";
    } else {
      EXPECT_EQ(flashed, kImage);
      EXPECT_FALSE(Exists(kOtherLoader));
    }
  }

  static constexpr const char* kOwnLoader = "\\TQ52.IPL.G4.nb0";
  static constexpr const char* kOtherLoader = "\\TQ52.IPL.H3.nb0";
  HostJob job_;
  std::string list_;
};

class MulticastWalk final : public FirmwareWalk {
 public:
  MulticastWalk() : network_(world()) { network_.SetDefaultLink(fleet::Plan::DefaultLink()); }

 private:
  void PrepareJob() override {
    FirmwareWalk::PrepareJob();
    job_.multicast = "-A=239.1.1.1 -P=7000";
    server::MulticastOptions options;
    options.start.expected = 1;
    const auto announce = [](const char* name, const std::string& content) {
      return server::MulticastFile{name, "", 0x20, "2006-03-01 14:05:09",
                                   server::MemoryContent(content)};
    };
    run_ = std::make_unique<server::MulticastRun>(
        options, std::vector<server::MulticastFile>{announce("\\list.txt", list_),
                                                    announce("RAM:os.nb0", kImage)});
    port_ =
        std::make_unique<tools::VirtualMulticast>(world(), sim::Endpoint{0x0A000002, 7001}, *run_);
    network_.At(world().now() + std::chrono::seconds(5), [this] { port_->Start(); });
  }

  void CheckResult() override {
    FirmwareWalk::CheckResult();
    if (!failed()) EXPECT_THAT(server().RequestedPaths(), ::testing::IsEmpty());
  }

  sim::VirtualNetwork network_;
  std::unique_ptr<server::MulticastRun> run_;
  std::unique_ptr<tools::VirtualMulticast> port_;
};

class ClientWalk final : public Walk {
 private:
  void PrepareJob() override {
    server().Put("fw/os.nb0", kImage);
    server().Put("fw/part001.zip", kPart);
    server().Put("apps/job.inf", "\"*******\" \"x.cab\" \"\\Temp\\x.cab\"\n");
    server().Put("apps/x.cab", kPart);
    server().Put("a.txt", kPart);
    job_ = new UpgradeConfig;
    job_->SetBaseURL(kServerUrl);
    job_->SetShowGUI(0);
    SetMultiPass(*job_);
    SetMfgString(*job_, "TQ52-A1");
    AddPackage(*job_, {0, "os.nb0", "RAM:", "fw/", "/flash", "Pass=1,RAMAllocSize=10000"});
    AddPackage(*job_, {1, "part", "\\", "fw/", "", ""});
    AddPackage(*job_, {0, "later.bin", "\\", "fw/", "", "Pass=2"});
    SetInf(*job_, "apps/job.inf", "job.inf");
    job_->AddDownloadFile(MakeFile({"a.txt", "\\a.txt"}));
  }

  void RunJob() override {
    HANDLE const thread = StartUpgradeThread(job_, 1);
    if (thread != nullptr) {
      CloseHandle(thread);
    } else {
      delete job_;
    }
  }

  void CheckResult() override {
    const std::string flashed = Flashed("os.nb0");
    if (failed()) {
      EXPECT_TRUE(flashed == kImage || flashed.empty()) << flashed.size() << " bytes";
      return;
    }
    EXPECT_EQ(flashed, kImage);
    EXPECT_EQ(GetFile("\\part001.zip"), kPart);
    EXPECT_EQ(GetFile("\\Temp\\x.cab"), kPart);
    EXPECT_EQ(GetFile("\\a.txt"), kPart);
    EXPECT_EQ(GetFile("\\kvoupgclnt.txt"), "1");
  }

  const std::string kPart = std::string(600, 'p');
  UpgradeConfig* job_ = nullptr;  ///< the upgrade thread's, once there is one
};

}  // namespace

std::unique_ptr<Walk> MakeFirmwareWalk() {
  return std::make_unique<FirmwareWalk>();
}

std::unique_ptr<Walk> MakeMulticastWalk() {
  return std::make_unique<MulticastWalk>();
}

std::unique_ptr<Walk> MakeClientWalk() {
  return std::make_unique<ClientWalk>();
}

}  // namespace test

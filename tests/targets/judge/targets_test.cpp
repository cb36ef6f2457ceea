// The library on every target: the same management client does the same there, beside the same
// server, and everything that the outside sees of it is the same, byte for byte but for times.
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <exception>
#include <filesystem>
#include <iostream>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "targets/judge/compare.h"
#include "targets/judge/run.h"
#include "targets/judge/scenario.h"
#include "targets/judge/target.h"

namespace targets {
namespace {

namespace fs = std::filesystem;

const fs::path kRuns = ORVENIX_RUNS;
/// Most of a run's time the device pauses for its reader.
constexpr std::size_t kAtOnce = 6;
constexpr std::chrono::milliseconds kPoll{20};

std::string KeyOf(const Scenario& scenario, const Target& target) {
  return scenario.name + "/" + target.name();
}

/// Carries out all runs before the first test, several at a time.
class Runs : public ::testing::Environment {
 public:
  void SetUp() override {
    for (const Target* target : {&WindowsTarget(), &DeviceTarget(), &LinuxTarget()}) {
      if (!target->WhyNot().empty() || !IsReady(*target)) continue;
      for (const Scenario& scenario : Scenarios()) Add(scenario, *target);
    }
    CarryOut();
  }

  /// @return null for a target that could not be prepared
  static const Run* Find(const std::string& key) {
    const auto found = all().find(key);
    return found == all().end() ? nullptr : found->second.get();
  }

 private:
  static bool IsReady(const Target& target) {
    try {
      target.Prepare();
      return true;
    } catch (const std::exception& error) {
      std::cerr << target.name() << ": " << error.what() << '\n';
      return false;
    }
  }

  static std::map<std::string, std::unique_ptr<Run>>& all() {
    static std::map<std::string, std::unique_ptr<Run>> runs;
    return runs;
  }

  void Add(const Scenario& scenario, const Target& target) {
    const std::string key = KeyOf(scenario, target);
    all()[key] = std::make_unique<Run>(scenario, target, kRuns / key);
    waiting_.push_back(all()[key].get());
  }

  void CarryOut() {
    std::vector<Run*> running;
    auto next = waiting_.begin();
    while (next != waiting_.end() || !running.empty()) {
      while (next != waiting_.end() && running.size() < kAtOnce) {
        (*next)->Start();
        running.push_back(*next++);
      }
      std::this_thread::sleep_for(kPoll);
      running.erase(
          std::remove_if(running.begin(), running.end(), [](Run* run) { return run->PollEnd(); }),
          running.end());
    }
  }

  std::vector<Run*> waiting_;
};

[[maybe_unused]] const auto* const kEnvironment = ::testing::AddGlobalTestEnvironment(new Runs);

using Case = std::tuple<const Target*, const Scenario*>;

class TargetsTest : public ::testing::TestWithParam<Case> {};

TEST_P(TargetsTest, DoesWhatLinuxDoes) {
  const auto& [target, scenario] = GetParam();
  const std::string reason = target->WhyNot();
  if (!reason.empty()) GTEST_SKIP() << reason;
  const auto* const reference = Runs::Find(KeyOf(*scenario, LinuxTarget()));
  const auto* const run = Runs::Find(KeyOf(*scenario, *target));
  ASSERT_TRUE(reference != nullptr && run != nullptr) << "could not be prepared";
  if (run->has_no_network()) GTEST_SKIP() << run->Complaint();
  ASSERT_TRUE(reference->Complaint().empty()) << reference->Complaint();
  ASSERT_TRUE(run->Complaint().empty()) << run->Complaint();
  const std::string differences = Differences(reference->ReadRecord(), run->ReadRecord());
  EXPECT_TRUE(differences.empty()) << "in " << run->folder() << ":\n" << differences;
}

/// What each walk is for: were it not recorded any more, nothing would equal nothing.
const std::map<std::string, std::vector<std::string>> kPieces = {
    {"entry_points", {"storage/host.trace", "storage/Tarnwell/TWSubSystems/Orvenix.ini"}},
    {"refused_jobs", {"storage/documents.trace", "storage/FileXfer.log", "wire/syslog"}},
    {"http_job",
     {"wire/requests-1", "flash/os.nb0", "storage/Data/large.bin", "storage/documents.trace",
      "messages/000001-TW_Event_DB.~MASTERKX.xml", "storage/FileXfer.log"}},
    {"multicast_job",
     {"wire/frames-from-server", "wire/frames-from-device", "wire/requests-1",
      "storage/Data/whole.bin", "storage/mcast.log"}},
};

TEST_P(TargetsTest, LeavesARecordOfAllThatIsCompared) {
  const auto& [target, scenario] = GetParam();
  const auto* const run = Runs::Find(KeyOf(*scenario, *target));
  if (run == nullptr || run->has_no_network()) GTEST_SKIP() << "was not carried out";
  const Record record = run->ReadRecord();
  for (const std::string& piece : kPieces.at(scenario->name)) {
    const auto found = record.find(piece);
    EXPECT_TRUE(found != record.end() && !found->second.empty()) << piece;
  }
}

std::vector<const Scenario*> AllScenarios() {
  std::vector<const Scenario*> all;
  for (const Scenario& scenario : Scenarios()) all.push_back(&scenario);
  return all;
}

INSTANTIATE_TEST_SUITE_P(All, TargetsTest,
                         ::testing::Combine(::testing::Values(&LinuxTarget(), &DeviceTarget(),
                                                              &WindowsTarget()),
                                            ::testing::ValuesIn(AllScenarios())),
                         [](const auto& test) {
                           return std::get<0>(test.param)->name() + "_" +
                                  std::get<1>(test.param)->name;
                         });

}  // namespace
}  // namespace targets

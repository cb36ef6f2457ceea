// Fleets: the product's own client on each of many devices, and the server's own engine.
#include "tools/fleet/fleet.h"

#include <gmock/gmock.h>

#include <cstdlib>
#include <nlohmann/json.hpp>
#include <string>
#include <tuple>

#include "tools/fleet/fleet_report.h"

namespace {

using fleet::FileFate;
using fleet::Outcome;
using fleet::Plan;
using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr char kFile[] = "\\Temp\\fleet.bin";

TEST(IdealFramesTest, AreWhatNoServerCanDoBetterThan) {
  EXPECT_DOUBLE_EQ(fleet::IdealFrames(8, 0), 1);
  EXPECT_NEAR(fleet::IdealFrames(1, 0.5), 2, 1e-9);
  EXPECT_NEAR(fleet::IdealFrames(8, 0.01), 1.08, 0.005);
  EXPECT_NEAR(fleet::IdealFrames(8, 0.05), 1.36, 0.005);
  EXPECT_NEAR(fleet::IdealFrames(8, 0.10), 1.66, 0.005);
  EXPECT_NEAR(fleet::IdealFrames(1000, 0.02), 2.338, 0.001);
}

Plan PlanOf(std::uint32_t devices, std::uint64_t seed, std::size_t size = 60000) {
  Plan plan;
  plan.devices = devices;
  plan.seed = seed;
  plan.files = {{kFile, "", fleet::Noise(size, seed)}};
  return plan;
}

TEST(FleetTest, GivesEveryDeviceItsFile) {
  const Outcome outcome = fleet::Run(PlanOf(5, 1));
  EXPECT_TRUE(outcome.all_right());
  EXPECT_TRUE(outcome.run_finished);
  EXPECT_EQ(outcome.Count(FileFate::kRight), 5U);
  ASSERT_EQ(outcome.figures.files.size(), 1U);
  EXPECT_EQ(outcome.figures.files[0].Count(server::DeviceState::kProven), 5U);
  EXPECT_EQ(outcome.figures.files[0].repair_frames, 0U) << "nothing was lost";
}

TEST(FleetTest, HasEqualOutcomesForEqualPlans) {
  const auto run = [](std::uint64_t seed, bool light) {
    Plan plan = PlanOf(6, seed);
    plan.link.loss = 0.1;
    plan.light_threads = light;
    return fleet::JsonReport(plan, fleet::Run(plan)).dump();
  };
  const std::string first = run(3, true);
  EXPECT_EQ(first, run(3, true));
  EXPECT_EQ(first, run(3, false)) << "the kind of threads changes nothing";
  EXPECT_NE(first, run(4, true));
}

TEST(FleetTest, SendsSeveralFilesOneAfterTheOther) {
  Plan plan = PlanOf(4, 1);
  plan.link.loss = 0.05;
  plan.files.push_back({"\\Temp\\second.bin", "", fleet::Noise(30000, 2)});
  plan.files.push_back({"\\Temp\\third.bin", "TQ5*", fleet::Noise(1, 3)});
  const Outcome outcome = fleet::Run(plan);
  EXPECT_EQ(outcome.Count(FileFate::kRight), 12U) << fleet::TextReport(plan, outcome);
}

TEST(FleetTest, SeesFilesThatAreNotRight) {
  Plan plan = PlanOf(2, 1);
  plan.link.loss = 1;
  const Outcome outcome = fleet::Run(plan);
  EXPECT_FALSE(outcome.all_right());
  EXPECT_EQ(outcome.Count(FileFate::kMissing), 2U);
}

TEST(FleetTest, WorksEnciphered) {
  Plan plan = PlanOf(3, 5);
  plan.link.loss = 0.05;
  plan.server.encrypt = true;
  EXPECT_TRUE(fleet::Run(plan).all_right());
}

TEST(FleetTest, EndsWhenTheServerIsCutOffForGoodAndCallsNobodyProven) {
  Plan plan = PlanOf(3, 1);
  plan.server.rate = 2'000'000;
  for (std::uint32_t device = 0; device < plan.devices; ++device) {
    plan.absences.push_back({device, milliseconds(100), seconds(0)});
  }
  const Outcome outcome = fleet::Run(plan);
  EXPECT_TRUE(outcome.run_finished);
  EXPECT_EQ(outcome.figures.files[0].Count(server::DeviceState::kDead), 3U);
  for (const fleet::DeviceOutcome& device : outcome.devices) {
    EXPECT_TRUE(device.ended) << "it waits for announcements no longer than five minutes";
  }
}

/// What can befall a fleet.
struct Trouble {
  const char* name;
  void (*arrange)(Plan& plan);
};

constexpr Trouble kTroubles[] = {
    {"Loss", [](Plan& plan) { plan.link.loss = 0.1; }},
    {"BurstLoss",
     [](Plan& plan) {
       plan.link.burst_begin = 0.05;
       plan.link.burst_end = 0.7;  // counted in frames: a burst must not outlast eight requests
     }},
    {"Duplication",
     [](Plan& plan) {
       plan.link.duplicate = 0.2;
       plan.link.loss = 0.02;
     }},
    {"Reordering",
     [](Plan& plan) {
       plan.link.reorder = 0.1;
       plan.link.loss = 0.02;
     }},
    {"Death",
     [](Plan& plan) {
       plan.link.loss = 0.02;
       plan.server.rate = 2'000'000;
       plan.absences.push_back({plan.devices - 1, milliseconds(100), seconds(0)});
     }},
    {"Roaming",
     [](Plan& plan) {
       plan.link.loss = 0.02;
       plan.server.rate = 2'000'000;
       const auto who = static_cast<std::uint32_t>(plan.seed % plan.devices);
       plan.absences.push_back({who, milliseconds(100), seconds(3)});
     }},
    {"ServerCutOff",
     [](Plan& plan) {
       plan.link.loss = 0.02;
       plan.server.rate = 2'000'000;
       for (std::uint32_t device = 0; device < plan.devices; ++device) {
         plan.absences.push_back({device, milliseconds(100), seconds(6)});
       }
     }},
};

void PrintTo(const Trouble& trouble, std::ostream* out) {
  *out << trouble.name;
}

class FleetInTroubleTest : public ::testing::TestWithParam<std::tuple<Trouble, std::uint32_t>> {
 protected:
  /// So many seeds are tried; ORVENIX_FLEET_SEEDS says another number.
  static std::uint64_t Seeds() {
    const char* const wanted = std::getenv("ORVENIX_FLEET_SEEDS");
    return wanted != nullptr ? std::strtoull(wanted, nullptr, 10) : 2;
  }
};

TEST_P(FleetInTroubleTest, EveryLivingDeviceEndsWithTheRightBytes) {
  const auto& [trouble, devices] = GetParam();
  for (std::uint64_t seed = 1; seed <= Seeds(); ++seed) {
    Plan plan = PlanOf(devices, seed);
    trouble.arrange(plan);
    const Outcome outcome = fleet::Run(plan);
    EXPECT_TRUE(outcome.all_right()) << "seed " << seed << "\n" << fleet::TextReport(plan, outcome);
    EXPECT_TRUE(outcome.run_finished) << "seed " << seed;
  }
}

INSTANTIATE_TEST_SUITE_P(Fleets, FleetInTroubleTest,
                         ::testing::Combine(::testing::ValuesIn(kTroubles),
                                            ::testing::Values(1U, 3U, 20U)),
                         [](const auto& one) {
                           return std::string(std::get<0>(one.param).name) + "To" +
                                  std::to_string(std::get<1>(one.param));
                         });

}  // namespace

// Every API call of an upgrade is made to fail, one call a run. Whatever call that is, the program
// must not crash or hang and must keep nothing, must leave right files alone, must never leave a
// damaged file that looks complete, and must never flash a damaged image.
#include "scenario/fault_walk.h"

#include <gtest/gtest.h>

#include <ostream>
#include <tuple>
#include <vector>

namespace {

constexpr int kShards = 3;

struct Job {
  const char* name;
  test::Walk::Maker make;
  std::vector<test::Walk::Maker> walked_before;  ///< jobs whose calls need no second walk
};
void PrintTo(const Job& job, std::ostream* out) {
  *out << job.name;
}

class FaultWalkTest : public ::testing::TestWithParam<std::tuple<Job, int>> {};

TEST_P(FaultWalkTest, SurvivesTheFailureOfEachCallInTurn) {
  const auto& [job, shard] = GetParam();
  test::Walker walker(job.make);
  for (const test::Walk::Maker other : job.walked_before) walker.LeaveOut(other);
  walker.Go(static_cast<std::size_t>(shard), kShards);
}

const Job kJobs[] = {
    {"Files", test::MakeFilesWalk, {}},
    {"Firmware", test::MakeFirmwareWalk, {test::MakeFilesWalk}},
    {"Multicast", test::MakeMulticastWalk, {test::MakeFilesWalk, test::MakeFirmwareWalk}},
    {"Client", test::MakeClientWalk, {test::MakeFilesWalk, test::MakeFirmwareWalk}},
};

INSTANTIATE_TEST_SUITE_P(
    Of, FaultWalkTest, ::testing::Combine(::testing::ValuesIn(kJobs), ::testing::Range(0, kShards)),
    [](const auto& info) {
      return std::get<0>(info.param).name + std::to_string(std::get<1>(info.param));
    });

}  // namespace

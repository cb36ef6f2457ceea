#include "tools/job_walk.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vector>

#include "tools/failure.h"

namespace tools {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

// The walk calls plain functions, so what they note lies here.
std::vector<std::string> calls;
std::uint32_t result_of_end_upgrade = ICFG_OK;

std::uint32_t BeginGroup(const char* name, std::uint32_t, std::uint32_t mode) noexcept {
  calls.push_back(std::string("begin ") + name + (mode == 0 ? "" : " mode"));
  return std::string(name) == "Unknown" ? ICFG_UNKNOWN_NAME : ICFG_OK;
}
std::uint32_t SetField(const char* name, std::uint32_t, const char* value) noexcept {
  calls.push_back(std::string(name) + "=" + value);
  return std::string(name) == "Wrong" ? ICFG_UNKNOWN_NAME : ICFG_OK;
}
std::uint32_t EndGroup(const char* name, std::uint32_t, std::uint32_t) noexcept {
  calls.push_back(std::string("end ") + name);
  return std::string(name) == "Upgrade" ? result_of_end_upgrade : ICFG_OK;
}

class WalkJobTest : public ::testing::Test {
 protected:
  void SetUp() override {
    calls.clear();
    result_of_end_upgrade = ICFG_OK;
    configlet_.begin_group = &BeginGroup;
    configlet_.set_field = &SetField;
    configlet_.end_group = &EndGroup;
  }
  static Job JobOf(const std::string& groups) {
    return ParseJob("<DevInfo><Subsystem Name='Orvenix'>" + groups + "</Subsystem></DevInfo>",
                    "job.xml");
  }
  ExitCode CodeOf(const Job& job, const char* text) const {
    try {
      WalkJob(configlet_, job, "job.xml", {});
    } catch (const Failure& failure) {
      EXPECT_THAT(failure.what(), HasSubstr(text));
      return failure.code();
    }
    return ExitCode::kOk;
  }

  ConfigletLibrary configlet_;
};

TEST_F(WalkJobTest, CallsTheConfigletInDocumentOrderAndEndsUpgradeAfterAllItHolds) {
  const Job job = JobOf(
      "<Group Name='Orvenix'><Group Name='Upgrade'><Field Name='ShowGUI'>true</Field>"
      "<Group Name='HTTPServer'><Field Name='HTTPPort'>80</Field></Group></Group></Group>");
  std::vector<std::string> seen;

  WalkJob(configlet_, job, "job.xml",
          [&seen](const WalkedCall& call) { seen.emplace_back(call.function); });

  EXPECT_THAT(calls,
              ElementsAre("begin Orvenix", "begin Upgrade", "ShowGUI=true", "begin HTTPServer",
                          "HTTPPort=80", "end HTTPServer", "end Upgrade", "end Orvenix"));
  EXPECT_THAT(seen,
              ElementsAre("IcfgBeginGroup", "IcfgBeginGroup", "IcfgSetField", "IcfgBeginGroup",
                          "IcfgSetField", "IcfgEndGroup", "IcfgEndGroup", "IcfgEndGroup"));
}

TEST_F(WalkJobTest, StopsAtANameThatIsNotKnownAndTellsItsLine) {
  EXPECT_EQ(CodeOf(JobOf("<Group Name='Orvenix'>\n<Group Name='Unknown'/></Group>"),
                   "job.xml:2: the configlet knows no group or field \"Unknown\""),
            ExitCode::kUnknownName);
  EXPECT_THAT(calls, ElementsAre("begin Orvenix", "begin Unknown"));

  EXPECT_EQ(CodeOf(JobOf("<Group Name='Orvenix'>\n\n<Field Name='Wrong'>x</Field></Group>"),
                   "job.xml:3: "),
            ExitCode::kUnknownName);
}

TEST_F(WalkJobTest, TurnsEveryRefusalOfAnUpgradeIntoItsExitCode) {
  const Job job = JobOf("<Group Name='Upgrade'/>");
  const std::pair<std::uint32_t, ExitCode> kCases[] = {
      {ICFG_UPGRADE_RUNNING, ExitCode::kUpgradeRunning},
      {ICFG_NO_SPACE, ExitCode::kNoSpace},
      {ICFG_NO_POWER, ExitCode::kNoPower},
      {ICFG_TEST_FAILED, ExitCode::kTestFailed},
      {0x12345678, ExitCode::kInternal},
  };
  for (const auto& [result, code] : kCases) {
    result_of_end_upgrade = result;
    EXPECT_EQ(CodeOf(job, "job.xml:1: "), code) << std::hex << result;
  }
}

}  // namespace
}  // namespace tools

#include "upgrade/start_upgrade.h"

#include <gmock/gmock.h>

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "process/processes.h"
#include "product_support/host.h"
#include "product_support/log_lines.h"
#include "product_support/messages.h"
#include "report/messages/message_link.h"
#include "report/window/window_state.h"
#include "support/cabinets.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace upgrade {
namespace {

using std::chrono::seconds;
using test::ReadLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kEntering[] = "Orvenix - StartUpgrade - Entering\r\n";
constexpr char kExiting[] = "Orvenix - StartUpgrade - Exiting\r\n";
constexpr char kProtected[] = "\\Program Files\\Scan\\scan.exe";

class StartUpgradeTest : public DeviceTest {
 protected:
  StartUpgradeTest() : DeviceTest(WithPrograms()), job_(std::make_unique<UpgradeConfig>()) {
    report::window_state.lines.Clear();
    job().SetProcessName("tool.exe");
    test::PutFile("\\Temp\\scan.cab", test::SmallPackage());
    test::PutFile(kProtected, "old");
    test::SetAttributesOf(kProtected, FILE_ATTRIBUTE_READONLY);
  }
  ~StartUpgradeTest() override {
    report::CloseTransferHandle();
    report::window_state.lines.Clear();
  }

  static sim::Profile WithPrograms() {
    sim::Profile profile;
    profile.programs["tool.exe"] = {"", 0, 7000};
    profile.programs["wceload.exe"] = {"", 0, 1000};
    profile.programs["xwceload.exe.exe"] = {"", 0, 0};
    return profile;
  }

  UpgradeConfig& job() { return *job_; }
  bool Prepared() { return (test::AttributesOf(kProtected) & FILE_ATTRIBUTE_READONLY) == 0; }
  /// Runs it. @return how long it took, in the device's time.
  std::chrono::milliseconds Run() {
    const auto begin = world().now();
    StartUpgrade(job());
    return std::chrono::duration_cast<std::chrono::milliseconds>(world().now() - begin);
  }
  std::vector<std::string> Launched() {
    std::vector<std::string> lines;
    for (const auto& launch : device().processes().Launches()) {
      lines.push_back(launch.program + " | " + launch.command_line);
    }
    return lines;
  }
  static std::vector<std::string> Shown() {
    std::vector<std::string> lines;
    report::LineList::Line line;
    for (int i = 0; report::window_state.lines.Copy(i, line); ++i) {
      lines.emplace_back(line.view().begin(), line.view().end());
    }
    return lines;
  }

 private:
  std::unique_ptr<UpgradeConfig> job_;
};

TEST_F(StartUpgradeTest, RunsTheProgramAndTellsOfIt) {
  job().SetProcessParms("/quiet all");
  test::MessageRecord record(device());

  Run();

  EXPECT_THAT(Launched(), ElementsAre("tool.exe | /quiet all"));
  EXPECT_THAT(Shown(), ElementsAre("tool.exe"));
  EXPECT_THAT(record.Lines(),
              ElementsAre("TW_CLIENT: " + test::StatusText(4, "Remote Executable Started")));
  const std::string log = ReadLog();
  EXPECT_EQ(log.find(std::string(kEntering) + "tool.exe\r\n/quiet all\r\n"), 0U);
  EXPECT_EQ(log.substr(log.size() - sizeof kExiting + 1), kExiting);
}

TEST_F(StartUpgradeTest, DoesNothingForAJobWithoutAProgram) {
  job().SetProcessName("");
  job().SetProcessParms("/quiet \\Temp\\scan.cab");
  test::MessageRecord record(device());

  EXPECT_EQ(Run(), seconds(0));

  EXPECT_EQ(ReadLog(), std::string(kEntering) + kExiting);
  EXPECT_THAT(Launched(), IsEmpty());
  EXPECT_THAT(Shown(), IsEmpty());
  EXPECT_THAT(record.Lines(), IsEmpty());
  EXPECT_FALSE(Prepared());
}

TEST_F(StartUpgradeTest, LogsNoParametersWhenThereAreNone) {
  Run();
  EXPECT_EQ(ReadLog().find(std::string(kEntering) + "tool.exe\r\nOrvenix - SetRWIStatus"), 0U);
}

TEST_F(StartUpgradeTest, WaitsForTheEndOfTheProgramOrNotAtAll) {
  job().SetShowGUI(0);
  job().SetProcessWait(1);
  EXPECT_EQ(Run(), seconds(7));
  job().SetProcessWait(-1);
  EXPECT_EQ(Run(), seconds(7)) << "any number but 0";
  job().SetProcessWait(0);
  EXPECT_EQ(Run(), seconds(0));
}

TEST_F(StartUpgradeTest, PausesBeforeTheProgramWhenTheWindowShows) {
  job().SetProcessWait(0);
  for (const std::int32_t show : {0, 1, 2}) {
    job().SetShowGUI(show);
    EXPECT_EQ(Run(), seconds(show == 1 ? 2 : 0)) << show;
  }
}

TEST_F(StartUpgradeTest, GoesOnWhenTheProgramIsNotThere) {
  job().SetProcessName("\\Windows\\none.exe");
  job().SetShowGUI(0);
  test::MessageRecord record(device());

  EXPECT_EQ(Run(), seconds(0));

  EXPECT_EQ(record.Lines().size(), 1U) << "it is said to have started all the same";
  EXPECT_THAT(test::LogLines(), ::testing::Contains("Orvenix - StartUpgrade - Exiting"));
}

// ---- packages ----

struct PackageCase {
  const char* program;
  const char* parameters;
  bool prepared;
  const char* why;
};

TEST_F(StartUpgradeTest, PreparesThePackageBehindTheLastBlank) {
  static constexpr PackageCase kCases[] = {
      {"\\Windows\\wceload.exe", "/noui \\Temp\\scan.cab", true, "the usual way"},
      {"wceload.exe", " \\Temp\\scan.cab", true, "a blank and nothing before it"},
      {"xwceload.exe.exe", "/noui \\Temp\\scan.cab", true, "anywhere in the name"},
      {"wceload.exe", "/a \\Temp\\other.cab \\Temp\\scan.cab", true, "the last one"},
      {"wceload.exe", "\\Temp\\scan.cab", false, "no blank"},
      {"wceload.exe", "", false, "no parameters"},
      {"wceload.exe", "/noui \\Temp\\scan.cab ", false, "nothing behind the blank"},
      {"wceload.exe", "/noui \"\\Temp\\scan.cab\"", false, "in quotes"},
      {"wceload.exe", "/noui\t\\Temp\\scan.cab", false, "a tab is no blank"},
      {"wceload.exe", "\\Temp\\scan.cab /noui", false, "something else comes last"},
      {"WCELOAD.EXE", "/noui \\Temp\\scan.cab", false, "letter case counts"},
      {"tool.exe", "wceload.exe \\Temp\\scan.cab", false, "not the program"},
  };
  std::size_t started = 0;
  for (const PackageCase& c : kCases) {
    test::SetAttributesOf(kProtected, FILE_ATTRIBUTE_READONLY);
    job().SetProcessName(c.program);
    job().SetProcessParms(c.parameters);
    Run();
    EXPECT_EQ(Prepared(), c.prepared) << c.program << " " << c.parameters << ": " << c.why;
    EXPECT_EQ(Launched().size(), ++started) << c.why << ": the installer runs in any case";
  }
}

TEST_F(StartUpgradeTest, PreparesThePackageBeforeTheInstallerRuns) {
  job().SetProcessName("wceload.exe");
  job().SetProcessParms("/noui \\Temp\\scan.cab");
  device().faults().Add({"CreateProcessW"});
  Run();
  EXPECT_TRUE(Prepared());
  EXPECT_THAT(Launched(), IsEmpty());
}

TEST_F(StartUpgradeTest, StartsTheInstallerWithAPackageThatCannotBePrepared) {
  test::PutFile("\\Temp\\scan.cab", "no cabinet");
  job().SetProcessName("wceload.exe");
  job().SetProcessParms("/noui \\Temp\\scan.cab");
  Run();
  EXPECT_THAT(Launched(), ElementsAre("wceload.exe | /noui \\Temp\\scan.cab"));
}

TEST_F(StartUpgradeTest, ComesToItsEndAndHoldsNothingWhicheverCallFails) {
  job().SetProcessName("wceload.exe");
  job().SetProcessParms("/noui \\Temp\\scan.cab");
  Run();
  report::CloseTransferHandle();
  report::window_state.lines.Clear();
  std::uint64_t calls = 0;
  for (bool fired = true; fired; ++calls) {
    const test::Holdings before = test::HoldingsOf(device());
    const std::uint64_t fired_before = device().faults().fired();
    device().faults().Add({"*", calls + 1});
    Run();
    fired = device().faults().fired() > fired_before;
    const std::string call = device().faults().last_fired();
    device().faults().Clear();
    report::CloseTransferHandle();
    report::window_state.lines.Clear();
    // What cannot be given back is kept.
    if (!fired || test::IsRelease(call)) continue;
    EXPECT_EQ(test::HoldingsOf(device()), before) << calls + 1 << ": " << call;
  }
  EXPECT_GT(calls, 30U);
}

TEST_F(StartUpgradeTest, TakesTextsThatLookLikeFormats) {
  job().SetProcessName("%s%n.exe");
  job().SetProcessParms("%d %s");
  Run();
  EXPECT_EQ(ReadLog().find(std::string(kEntering) + "%s%n.exe\r\n%d %s\r\n"), 0U);
  EXPECT_THAT(Shown(), ElementsAre("%s%n.exe"));
}

}  // namespace
}  // namespace upgrade

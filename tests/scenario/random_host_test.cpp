// A host that calls in any order, while the upgrades that it has started run.
#include <gmock/gmock.h>

#include <iterator>
#include <new>
#include <random>
#include <string>

#include "ce/kernel.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "orvenix/configlet.h"
#include "orvenix/upgrade_thread.h"
#include "report/log/log.h"
#include "scenario/scenario_test.h"
#include "upgrade/run_state/run_state.h"

namespace test {
namespace {

constexpr int kSteps = 500;

/// Begins, fills and ends groups as a seed has it. What it asks for can be had, because a job whose
/// file the server lacks is meant to try for ever.
class RandomHost {
 public:
  RandomHost(std::uint32_t seed, HostFile file, HostFile list)
      : random_(seed), file_(std::move(file)), list_(std::move(list)) {}

  void Step() {
    switch (Below(13)) {
      case 0: BeginJob(); break;
      case 1: BeginFileList(); break;
      case 2: BeginFile(); break;
      case 3: BeginUpgrade(); break;
      case 4: EndUpgrade(); break;
      case 5: Sleep(Below(6000)); break;
      case 10: StartFromOutside(); break;
      case 6:
      case 7: IcfgBeginGroup(kToBegin[Below(std::size(kToBegin))], 0, 0); break;
      case 8:
      case 9: IcfgEndGroup(kToEnd[Below(std::size(kToEnd))], 0, 0); break;
      default: SetSomeField(); break;
    }
  }

  /// How often an upgrade was begun while one ran, and one was ended without a failure.
  [[nodiscard]] int refused() const { return refused_; }
  [[nodiscard]] int started() const { return started_; }

  std::uint32_t Below(std::size_t limit) {
    return static_cast<std::uint32_t>(random_() % static_cast<std::uint32_t>(limit));
  }

 private:
  static constexpr const char* kToBegin[] = {"Download",    "DiskCleanup", "Store",
                                             "Registry",    "Tests",       "StartProcess",
                                             "StopProcess", "Syslog",      "Nowhere"};
  static constexpr const char* kToEnd[] = {"File",         "File",        "FileList", "Download",
                                           "DiskCleanup",  "Store",       "Registry", "Tests",
                                           "StartProcess", "StopProcess", "Upgrade",  "Orvenix"};

  static void Set(const char* name, const std::string& value) {
    IcfgSetField(name, 0, value.c_str());
  }

  std::string InSomeLetterCase(std::string name) {
    if (Below(2) == 0) name[0] = 'u';
    return name;
  }

  void BeginUpgrade() {
    const std::uint32_t result = IcfgBeginGroup(InSomeLetterCase("Upgrade").c_str(), 0, 0);
    refused_ += result == ICFG_UPGRADE_RUNNING ? 1 : 0;
  }

  void EndUpgrade() {
    const std::uint32_t result = IcfgEndGroup(InSomeLetterCase("Upgrade").c_str(), 0, 0);
    started_ += result == ICFG_OK ? 1 : 0;
  }

  /// Another part of the host hands over a job of its own making.
  void StartFromOutside() {
    if (Below(3) != 0) return;
    auto* const job = new (std::nothrow) UpgradeConfig;
    if (job == nullptr) return;
    job->SetBaseURL(kServerUrl);
    job->SetShowGUI(static_cast<int>(Below(2)));
    job->AddFileSave("\\old");
    if (HANDLE thread = StartUpgradeThread(job, static_cast<std::int32_t>(Below(2)))) {
      CloseHandle(thread);
    } else {
      delete job;
    }
  }

  void BeginJob() {
    IcfgBeginGroup("Orvenix", 0, Below(8) == 0 ? 1 : 0);
    Set("BaseURL", kServerUrl);
    Set("ShowGUI", Below(2) == 0 ? "true" : "false");
    IcfgBeginGroup("Store", 0, 0);
    Set("Name", "\\");
    Set("RequiredSpace", Below(8) == 0 ? "4000000000" : "1000");
    IcfgEndGroup("Store", 0, 0);
    if (Below(2) == 0) SendTest();
    if (Below(2) == 0) SendCleanup();
  }

  /// A test that passes unless a later field spoils it.
  static void SendTest() {
    IcfgBeginGroup("Registry", 0, 0);
    Set("Key", "Software\\Orvenix");
    Set("ValueName", "Number");
    Set("Type", "REG_DWORD");
    Set("Operator", "EQ");
    Set("Value", "7");
    IcfgEndGroup("Registry", 0, 0);
  }

  /// Empties a folder but for one file: no job ever deletes more of it.
  void SendCleanup() {
    IcfgBeginGroup("DiskCleanup", 0, 0);
    SendCleanupFile("Save", "\\kept\\Sub\\KEEP.txt");
    SendCleanupFile("Delete", "\\kept");
    IcfgEndGroup("DiskCleanup", 0, 0);
  }

  void SendCleanupFile(const char* action, const char* path) {
    IcfgBeginGroup("File", 0, 0);
    SendFile(file_);  // inside "Download" the group begins a record of a file all the same
    Set("Action", action);
    Set("Name", path);
    IcfgEndGroup("File", 0, 0);
  }

  void SendFile(const HostFile& file) {
    Set("Source", file.source);
    Set("Dest", file.destination);
    Set("CRC", file.crc);
    Set("MCTMask", file.masks);
  }

  // A record of a file or a list is filled at once: half of one would be fetched for ever.
  void BeginFileList() {
    IcfgBeginGroup("FileList", 0, 0);
    SendFile(list_);
    if (Below(2) == 0) IcfgEndGroup("FileList", 0, 0);
  }

  void BeginFile() {
    if (Below(2) == 0) IcfgBeginGroup("Download", 0, 0);
    IcfgBeginGroup("File", 0, 0);
    SendFile(file_);
    if (Below(2) == 0) IcfgEndGroup("File", 0, 0);
  }

  void SetSomeField() {
    const std::pair<const char*, std::string> fields[] = {{"Source", file_.source},
                                                          {"Dest", file_.destination},
                                                          {"CRC", file_.crc},
                                                          {"Name", "\\old"},
                                                          {"Action", "Save"},
                                                          {"Action", "Delete"},
                                                          {"Process", "absent.exe"},
                                                          {"Parameters", "-a"},
                                                          {"Wait", "false"},
                                                          {"BeginText", "begins"},
                                                          {"EndText", "ends"},
                                                          {"Port", "514"},
                                                          {"Port", "0"},
                                                          {"Address", "127.0.0.9"},
                                                          {"", "127.0.0.8"},
                                                          {"Root", "HKEY_CLASSES_X"},
                                                          {"Value", "v"},
                                                          {"Val", "unknown"}};
    const auto& [name, value] = fields[Below(std::size(fields))];
    Set(name, value);
  }

  std::minstd_rand random_;
  HostFile file_;
  HostFile list_;
  int refused_ = 0;
  int started_ = 0;
};

class RandomHostTest : public ScenarioTest, public ::testing::WithParamInterface<std::uint32_t> {
 protected:
  RandomHostTest()
      : host_(GetParam(), {"a.bin", "\\a.bin", "*", server().Put("a.bin", std::string(5000, 'a'))},
              {"list.txt", "\\list.txt", "*", PutList()}) {
    PutFile("\\kept\\Sub\\keep.txt", "kept");
    PutFile("\\kept\\Sub\\go.txt", "old");
    PutFile("\\old\\a.txt", "old");
    const DWORD seven = 7;
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Orvenix"), 0, nullptr, 0, KEY_ALL_ACCESS,
                    nullptr, &key, nullptr);
    RegSetValueExW(key, TEXT("Number"), 0, REG_DWORD, reinterpret_cast<const BYTE*>(&seven),
                   sizeof seven);
    RegCloseKey(key);
  }

  std::string PutList() {
    const std::string crc = server().Put("b.bin", std::string(3000, 'b'));
    return server().Put("list.txt", "b.bin,\\b.bin,*," + crc + ",3000\r\n");
  }

  /// Ends what the host has left open, and waits for every job.
  bool AwaitTheEnd() {
    device().faults().Clear();
    IcfgEndGroup("Upgrade", 0, 0);
    return AwaitEndOfJobs(device());
  }

  RandomHost host_;
};

TEST_P(RandomHostTest, LosesNeitherMemoryNorHandlesWhateverItCallsAndWhen) {
  const bool short_of_memory = GetParam() % 2 == 1;
  const std::size_t handles = HoldingsOf(device()).handles;
  for (int step = 0; step < kSteps; ++step) {
    if (short_of_memory && step % 20 == 0) {
      device().faults().Clear();
      device().faults().Add({"LocalAlloc", 1 + host_.Below(30), 1, 0});
    }
    host_.Step();
  }

  ASSERT_TRUE(AwaitTheEnd());

  EXPECT_GT(host_.refused(), 0);
  EXPECT_GT(host_.started(), 0);
  EXPECT_GT(server().received().size(), 0U) << "some of the jobs have fetched something";

  EXPECT_EQ(GetFile("\\kept\\Sub\\keep.txt"), "kept");
  EXPECT_FALSE(Exists("\\kept\\Sub\\go.txt"));
  EXPECT_FALSE(upgrade::UpgradeInProgress());
  EXPECT_EQ(device().memory().bad_frees(), 0U);
  report::SetSyslogTarget(0, "");
  report::CloseLogFile();
  const Holdings after = HoldingsOf(device());
  EXPECT_EQ(after.handles, handles);
  EXPECT_EQ(after.sockets, 0U);
  EXPECT_EQ(after.sockets_started, 0U);
  EXPECT_EQ(after.power_requirements, 0U);
  EXPECT_EQ(after.windows, 0U);
  EXPECT_EQ(after.gdi_objects, 0U);
  EXPECT_EQ(after.device_contexts, 0U);
}

INSTANTIATE_TEST_SUITE_P(Seeds, RandomHostTest, ::testing::Range(1U, 13U));

}  // namespace
}  // namespace test

// The walk of a job whose files come by HTTP.
#include <gmock/gmock.h>

#include "ce/files.h"
#include "ce/system.h"
#include "orvenix/configlet.h"
#include "process/processes.h"
#include "scenario/fault_walk.h"
#include "support/device_files.h"

namespace test {
namespace {

const std::string kRight = "right from the beginning";
const std::string kNew(3000, 'n');
const std::string kDamaged(3000, 'd');

void StoreSystem() {
  HKEY key = nullptr;
  RegCreateKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Orvenix"), 0, nullptr, 0, KEY_ALL_ACCESS,
                  nullptr, &key, nullptr);
  RegSetValueExW(key, TEXT("System"), 0, REG_SZ, reinterpret_cast<const BYTE*>(u"seven"), 12);
  RegCloseKey(key);
}

class FilesWalk final : public Walk {
 public:
  FilesWalk() : Walk(WithProgram()) {}

 private:
  static sim::Profile WithProgram() {
    sim::Profile profile;
    profile.processes = {{"app.exe"}};
    return profile;
  }

  void PrepareJob() override {
    PutFile("\\right.txt", kRight);
    PutFile("\\damaged.bin", kDamaged);
    PutFile("\\Old\\app.bin", kDamaged);
    SetAttributesOf("\\Old\\app.bin", FILE_ATTRIBUTE_READONLY);
    PutFile("\\Old\\Data\\settings", kRight);
    StoreSystem();
    job_.tests = {{"Software\\Orvenix", "System", "REG_SZ", "EQ", "seven", "needs system seven"}};
    job_.stop = {"app.exe"};
    job_.cleared = {"\\Old"};
    job_.saved = {"\\old\\data\\settings"};
    const std::string list =
        "files/right.txt,\\right.txt,*," + server().Put("files/right.txt", kRight) + ",24\r\n" +
        "files/new.bin,\\damaged.bin,*," + server().Put("files/new.bin", kNew) + ",3000\r\n";
    job_.list = HostFile{"files/list.txt", "\\list.txt", "*", server().Put("files/list.txt", list)};
  }

  void RunJob() override {
    IcfgInitialize();
    const std::uint32_t began = WalkJob(job_);
    const std::uint32_t result = EndJob();
    EXPECT_EQ(began, ICFG_OK);
    EXPECT_TRUE(result == ICFG_OK || result == ICFG_NO_POWER || result == ICFG_NO_SPACE ||
                result == ICFG_TEST_FAILED)
        << result;
  }

  void CheckResult() override {
    EXPECT_EQ(GetFile("\\right.txt"), kRight);
    EXPECT_EQ(GetFile("\\Old\\Data\\settings"), kRight) << "to be saved";
    const auto repaired = GetFile("\\damaged.bin");
    if (failed()) {
      EXPECT_TRUE(repaired == kNew || repaired == kDamaged || release_failed())
          << repaired.value_or("(none)");
    } else {
      EXPECT_EQ(repaired, kNew);
      EXPECT_FALSE(Exists("\\Old\\app.bin"));
      EXPECT_EQ(device().processes().List().size(), 1U);
    }
  }

  HostJob job_;
};

}  // namespace

std::unique_ptr<Walk> MakeFilesWalk() {
  return std::make_unique<FilesWalk>();
}

}  // namespace test

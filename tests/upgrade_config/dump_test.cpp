#include <gmock/gmock.h>

#include <cstring>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "upgrade_config/configuration_test.h"
#include "upgrade_config/diagnostic_output.h"

namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

std::vector<std::string>* g_dumped = nullptr;

class DumpDataTest : public test::ConfigurationTest {
 protected:
  DumpDataTest() {
    g_dumped = &dumped_;
    orvenix::SetDiagnosticOutput([](const char* text) noexcept { g_dumped->emplace_back(text); });
  }
  ~DumpDataTest() override { orvenix::SetDiagnosticOutput(nullptr); }

  [[nodiscard]] std::string DumpOf(const UpgradeConfig& job) {
    dumped_.clear();
    job.DumpData();
    EXPECT_EQ(dumped_.size(), 1U);
    return dumped_.empty() ? std::string() : dumped_[0];
  }

  static void AddStore(UpgradeConfig& job, const char* name, const char* space) {
    auto* const store = static_cast<tagStorageReq*>(LocalAlloc(LPTR, sizeof(tagStorageReq)));
    std::strcpy(store->name, name);
    std::strcpy(store->required_space, space);
    job.AddStorageReqEntry(store);
  }

  std::vector<std::string> dumped_;
};

TEST_F(DumpDataTest, ShowsAnEmptyJob) {
  EXPECT_EQ(DumpOf(UpgradeConfig()),
            "MultiCast IP = \r\n"
            "UDPPort = 4096\r\n"
            "UDPBlockSize=0\r\n"
            "EncryptionKey = \r\n"
            "Parms = \r\n"
            "BaseURL = \r\n"
            "HTTPPort = 80\r\n"
            "HTTPIPAddr = \r\n"
            "PacketSize = 4096\r\n"
            "Syslog Address = \r\n"
            "Syslog Port = 0\r\n"
            "Flash Writer = \r\n"
            "FlashWriter CmdLine = \r\n"
            "Delete file count = 0\r\n"
            "Save file count = 0\r\n"
            "Stop Process count = 0\r\n"
            "Storage Req List count = 0\r\n"
            "Download File List count = 0\r\n"
            "Firmware List count = 0\r\n");
}

TEST_F(DumpDataTest, ShowsEveryPartOfAJobButItsTests) {
  UpgradeConfig job;
  job.SetMCIp("239.1.2.3");
  job.SetMulticastPort(4711);
  job.SetMulticastBlockSize(512);
  job.SetMCEncryptionKey("key");
  job.SetMCProcessParms("-x");
  job.SetHTTPIPAddress("127.0.0.2");
  AddStore(job, "\\", "3000007");
  AddStore(job, "RAM:", "0");
  Load(job,
       "<BaseUrl>http://127.0.0.2</BaseUrl><HTTPPort>8080</HTTPPort>"
       "<FilePacketXferSize>-1</FilePacketXferSize><Syslog Address='127.0.0.3' Port='65535'/>"
       "<FlashWriter Name='\\w.exe' CmdLine='-a -b'/>"
       "<DiskCleanup><File Action='delete'>\\Temp\\</File><File Action='delete'>\\b%d</File>"
       "<File Action='save'>\\keep</File></DiskCleanup>"
       "<StopProcesses><Process>a.exe</Process></StopProcesses>"
       "<Downloads><File SourceDir='s' DestDir='\\d'/></Downloads>"
       "<Registry><Root>HKEY_CURRENT_USER</Root></Registry>"
       "<OSFirmware><Package HardwareVersion='TQ' SourceDir='fw' DestDir='\\os' Base='part'"
       " Count='12'/><Package HardwareVersion='*' SourceDir='two'/></OSFirmware>");

  EXPECT_EQ(DumpOf(job),
            "MultiCast IP = 239.1.2.3\r\n"
            "UDPPort = 512\r\n"
            "UDPBlockSize=4711\r\n"
            "EncryptionKey = key\r\n"
            "Parms = -x\r\n"
            "BaseURL = http://127.0.0.2\r\n"
            "HTTPPort = 8080\r\n"
            "HTTPIPAddr = 127.0.0.2\r\n"
            "PacketSize = -1\r\n"
            "Syslog Address = 127.0.0.3\r\n"
            "Syslog Port = 65535\r\n"
            "Flash Writer = \\w.exe\r\n"
            "FlashWriter CmdLine = -a -b\r\n"
            "Delete file count = 2\r\n"
            "Delete File = \\Temp\\\r\n"
            "Delete File = \\b%d\r\n"
            "Save file count = 1\r\n"
            "Save File = \\keep\r\n"
            "Stop Process count = 1\r\n"
            "Stop Process = a.exe\r\n"
            "Storage Req List count = 2\r\n"
            "Storage Entry = \\, 3000007\r\n"
            "Storage Entry = RAM:, 0\r\n"
            "Download File List count = 1\r\n"
            "Firmware List count = 2\r\n"
            "Src = fw\\\r\nDest = \\os\\\r\nBase = part\r\nCount = 12\r\n"
            "Src = two\\\r\nDest = \r\nBase = \r\nCount = 0\r\n");
}

TEST_F(DumpDataTest, CutsWhatDoesNotFit) {
  UpgradeConfig job;
  for (int i = 0; i < 3; ++i) job.AddFileDelete(std::string(5000, 'x').c_str());

  const std::string text = DumpOf(job);

  EXPECT_EQ(text.size(), 4095U);
  EXPECT_THAT(text, StartsWith("MultiCast IP = \r\n"));
  EXPECT_THAT(text, HasSubstr("Delete file count = 3\r\nDelete File = xxx"));
  EXPECT_THAT(text, EndsWith("xxx"));
}

TEST_F(DumpDataTest, ReadsNothingBehindAFieldThatLacksItsTerminator) {
  UpgradeConfig job;
  auto* const store = static_cast<tagStorageReq*>(LocalAlloc(LPTR, sizeof(tagStorageReq)));
  std::memset(store, 's', sizeof *store);
  job.AddStorageReqEntry(store);
  auto* const package = new FirmwarePackage;
  for (auto* const field :
       {&package->base, &package->destination_folder, &package->source_folder}) {
    std::memset(*field, 'p', sizeof *field);
  }
  package->count = -1;
  job.AddFirmwarePkg(package);

  const std::string text = DumpOf(job);

  EXPECT_THAT(text, HasSubstr("Storage Entry = " + std::string(260, 's') + ", " +
                              std::string(32, 's') + "\r\n"));
  EXPECT_THAT(text,
              HasSubstr("Src = " + std::string(256, 'p') + "\r\nDest = " + std::string(256, 'p') +
                        "\r\nBase = " + std::string(256, 'p') + "\r\nCount = -1\r\n"));
}

TEST_F(DumpDataTest, PassesOverMissingRecords) {
  UpgradeConfig job;
  job.AddStorageReqEntry(nullptr);
  job.AddFirmwarePkg(nullptr);
  job.AddDownloadFile(nullptr);

  EXPECT_THAT(DumpOf(job), EndsWith("Storage Req List count = 1\r\n"
                                    "Download File List count = 1\r\n"
                                    "Firmware List count = 1\r\n"));
}

TEST_F(DumpDataTest, NeedsNoMemoryAndWritesNothingWithoutAnOutput) {
  const UpgradeConfig job;
  orvenix::SetDiagnosticOutput(nullptr);
  device().faults().Add({"LocalAlloc", 1, 0, ERROR_OUTOFMEMORY});
  job.DumpData();
  EXPECT_EQ(device().faults().fired(), 0U);
  EXPECT_THAT(dumped_, IsEmpty());
}

TEST_F(DumpDataTest, WritesNothingWhenThereIsNoMemory) {
  const UpgradeConfig job;
  const std::size_t blocks = Blocks();
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  job.DumpData();
  EXPECT_THAT(dumped_, IsEmpty());
  job.DumpData();
  EXPECT_THAT(dumped_, ElementsAre(StartsWith("MultiCast IP")));
  EXPECT_EQ(Blocks(), blocks);
}

}  // namespace

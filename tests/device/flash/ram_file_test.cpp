#include "device/flash/ram_file.h"

#include <gmock/gmock.h>

#include <memory>
#include <string>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "device/flash/driver_recorder.h"
#include "device/flash/flash_driver.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "memory/memory.h"
#include "storage/storage.h"
#include "support/device_files.h"
#include "support/device_test.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Optional;

constexpr DWORD kInit = 0x22CFF9;
constexpr DWORD kStart = 0x22CFFD;

class RamFileTest : public DeviceTest {
 protected:
  static sim::Profile WithCard() {
    sim::Profile profile;
    profile.volumes = {{"\\SD Card", 1000000, true}};
    return profile;
  }
  RamFileTest() : DeviceTest(WithCard()), requests_(test::RecordRequests(device())) {}
  ~RamFileTest() override { file_.reset(); }

  void MakeStore(std::uint32_t size = 100000) {
    device::SetRAMSize(size);
    ASSERT_TRUE(device::InitRAMStore());
  }
  void Put(const char* name, const std::string& content) {
    device::RAMFile file;
    ASSERT_TRUE(file.OpenForWriting(name, false, static_cast<std::uint32_t>(content.size())));
    ASSERT_TRUE(file.Write(content.data(), static_cast<std::uint32_t>(content.size())));
  }
  std::uint32_t Crc(const char* name, std::uint32_t length, std::uint32_t* crc) {
    return device::RAMFILECRC32(name, crc, length, "RAM:whatever");
  }
  /// Sets "LogRAMFiles" to these bytes.
  void SetMirror(DWORD type, const std::string& bytes) {
    HKEY key = nullptr;
    RegCreateKeyExW(HKEY_LOCAL_MACHINE, u"SOFTWARE\\Corvanta\\DevMgmt", 0, nullptr, 0,
                    KEY_ALL_ACCESS, nullptr, &key, nullptr);
    RegSetValueExW(key, u"LogRAMFiles", 0, type, reinterpret_cast<const BYTE*>(bytes.data()),
                   static_cast<DWORD>(bytes.size()));
    RegCloseKey(key);
  }

  std::shared_ptr<test::DriverRequests> requests_;
  std::unique_ptr<device::RAMFile> file_{new device::RAMFile};
};

// ---- the store ----

TEST_F(RamFileTest, StoreIsMadeOnceOfTheSizeSetBefore) {
  EXPECT_FALSE(device::HasRAMStore());
  MakeStore(0x1000);
  EXPECT_TRUE(device::HasRAMStore());
  device::SetRAMSize(0x2000);
  EXPECT_FALSE(device::InitRAMStore()) << "nothing done";
  ASSERT_THAT(requests_->Codes(), ElementsAre(kInit));
  EXPECT_EQ(requests_->all[0].input, "00 10 00 00");
}

TEST_F(RamFileTest, StoreNeverStartsTheFlash) {
  MakeStore();
  Put("a", "abc");
  device::FreeRAMStore();
  EXPECT_THAT(requests_->Codes(), Each(Not(kStart)));
}

TEST_F(RamFileTest, StoreThatCannotBeMadeUnloadsTheDriver) {
  device::SetRAMSize(0);
  EXPECT_FALSE(device::InitRAMStore());
  EXPECT_FALSE(device::HasRAMStore());
  EXPECT_THAT(device().drivers().Names(), IsEmpty());
  MakeStore();
  EXPECT_TRUE(device::HasRAMStore());
}

TEST_F(RamFileTest, StoreIsMadeAtTheSecondTryAfterARestart) {
  HKEY key = nullptr;
  RegCreateKeyExW(HKEY_LOCAL_MACHINE, u"Drivers\\Eflashdrv", 0, nullptr, 0, KEY_ALL_ACCESS, nullptr,
                  &key, nullptr);
  const DWORD before_the_restart = 0x77;
  RegSetValueExW(key, u"HDEVICE", 0, REG_DWORD, reinterpret_cast<const BYTE*>(&before_the_restart),
                 4);
  RegCloseKey(key);
  device::SetRAMSize(1000);
  EXPECT_FALSE(device::InitRAMStore()) << "the registry says that the driver is loaded";
  EXPECT_TRUE(device::InitRAMStore());
}

TEST_F(RamFileTest, StoreIsGivenUpAndCanBeMadeAgain) {
  EXPECT_TRUE(device::FreeRAMStore()) << "there is none";
  MakeStore();
  EXPECT_TRUE(device::FreeRAMStore());
  EXPECT_FALSE(device::HasRAMStore());
  EXPECT_TRUE(device::FreeRAMStore());
  EXPECT_THAT(device().drivers().Names(), IsEmpty());
  MakeStore();
}

// ---- files ----

TEST_F(RamFileTest, KeepsWhatIsWritten) {
  MakeStore();
  ASSERT_TRUE(file_->OpenForWriting("os.nb0", false, 8));
  EXPECT_TRUE(file_->Seek(4));
  EXPECT_TRUE(file_->Write("tail", 4));
  EXPECT_TRUE(file_->Seek(0));
  EXPECT_TRUE(file_->Write("head", 4));
  std::uint32_t size = 0;
  EXPECT_TRUE(file_->GetSize(&size));
  EXPECT_EQ(size, 8U);
  EXPECT_TRUE(file_->Flush());
  char bytes[8];
  std::uint32_t read = 0;
  EXPECT_TRUE(file_->Read(bytes, 5, &read));
  EXPECT_EQ(read, 5U);
  EXPECT_TRUE(file_->Read(bytes + 5, 3, &read)) << "a seek does not move the reading";
  EXPECT_EQ(std::string(bytes, 8), "headtail");
  EXPECT_TRUE(file_->Close());
  EXPECT_FALSE(file_->Close());
}

TEST_F(RamFileTest, ReadsNothingWithoutBufferLengthOrResult) {
  MakeStore();
  Put("a", "abc");
  ASSERT_TRUE(file_->OpenForReading("a", true));
  char bytes[4] = {};
  std::uint32_t read = 7;
  EXPECT_FALSE(file_->Read(nullptr, 1, &read));
  EXPECT_FALSE(file_->Read(bytes, 0, &read));
  EXPECT_FALSE(file_->Read(bytes, 1, nullptr));
  EXPECT_FALSE(file_->Read(bytes, 4, &read)) << "there are three";
  EXPECT_EQ(read, 0U);
  EXPECT_TRUE(file_->Read(bytes, 3, &read)) << "from the beginning";
  EXPECT_STREQ(bytes, "abc");
}

TEST_F(RamFileTest, DoesNothingBeforeItIsOpen) {
  MakeStore();
  requests_->all.clear();
  char byte = 0;
  std::uint32_t number = 7;
  EXPECT_FALSE(file_->Write("a", 1));
  EXPECT_FALSE(file_->Seek(0));
  EXPECT_FALSE(file_->Flush());
  EXPECT_FALSE(file_->Read(&byte, 1, &number));
  EXPECT_FALSE(file_->DeleteFile(nullptr, nullptr));
  EXPECT_FALSE(file_->DeleteFile("", &number));
  EXPECT_EQ(number, DWORD{ERROR_GEN_FAILURE});
  EXPECT_FALSE(file_->GetSize(&number));
  EXPECT_EQ(number, 0xFFFFFFFFU);
  EXPECT_FALSE(file_->Close());
  EXPECT_THAT(requests_->all, IsEmpty());
}

TEST_F(RamFileTest, HasNeitherTimesNorAttributes) {
  MakeStore();
  ASSERT_TRUE(file_->OpenForWriting("a", false, 1));
  FILETIME time = {};
  SYSTEMTIME parts = {};
  EXPECT_FALSE(file_->GetTime(device::TimeKind::kLastWrite, &time));
  EXPECT_FALSE(file_->GetTime(device::TimeKind::kLastWrite, &parts));
  EXPECT_FALSE(file_->SetTime(device::TimeKind::kLastWrite, time));
  EXPECT_FALSE(file_->SetTime(device::TimeKind::kLastWrite, parts));
  test::PutFile("\\a", "a file of the same name");
  EXPECT_EQ(file_->GetAttributes("\\a"), INVALID_FILE_ATTRIBUTES);
  EXPECT_FALSE(file_->SetAttributes("\\a", FILE_ATTRIBUTE_READONLY));
  EXPECT_EQ(test::AttributesOf("\\a"), FILE_ATTRIBUTE_ARCHIVE);
}

TEST_F(RamFileTest, IsOpenedInEveryWay) {
  MakeStore();
  Put("a", "abc");
  std::uint32_t error = 7;
  std::uint32_t size = 0;
  EXPECT_TRUE(file_->OpenForWriting("a", true, 99));
  EXPECT_TRUE(file_->GetSize(&size));
  EXPECT_EQ(size, 3U) << "kept";
  EXPECT_TRUE(file_->OpenFile("a", false));
  EXPECT_TRUE(file_->OpenFile("a", true));
  EXPECT_TRUE(file_->CreateForWriting("a", false, &error));
  EXPECT_EQ(error, 0U);
  EXPECT_TRUE(file_->OpenForWriting("a", false, 5));
  EXPECT_TRUE(file_->GetSize(&size));
  EXPECT_EQ(size, 0U) << "made anew";
}

TEST_F(RamFileTest, IsNotOpenWhenTheStoreRefusesIt) {
  std::uint32_t error = 0;
  EXPECT_FALSE(file_->OpenForWriting("a", false, 1)) << "there is no store";
  EXPECT_FALSE(file_->CreateForWriting("a", false, &error));
  EXPECT_EQ(error, DWORD{ERROR_GEN_FAILURE});
  MakeStore(10);
  EXPECT_FALSE(file_->OpenForWriting("a", false, 11));
  EXPECT_FALSE(file_->Write("a", 1));
  EXPECT_FALSE(file_->OpenForReading("", true));
  EXPECT_FALSE(file_->OpenForReading(nullptr, true));
  EXPECT_FALSE(file_->OpenForReading(std::string(260, 'n').c_str(), true));
}

TEST_F(RamFileTest, IsDeletedByNameOrAsItIsOpen) {
  MakeStore();
  Put("a", "abc");
  Put("b", "abc");
  std::uint32_t error = 7;
  EXPECT_TRUE(file_->DeleteFile("a", &error));
  EXPECT_EQ(error, 0U);
  EXPECT_FALSE(file_->DeleteFile("a", &error));
  ASSERT_TRUE(file_->OpenForReading("b", true));
  EXPECT_TRUE(file_->DeleteFile(nullptr, nullptr));
}

// ---- the copy on the storage card ----

TEST_F(RamFileTest, IsCopiedWhileTheRegistryHasTheValueEvenIfItIsZero) {
  SetMirror(REG_DWORD, std::string(4, '\0'));
  MakeStore();
  ASSERT_TRUE(file_->OpenForWriting("os.nb0", false, 100));
  file_->Seek(50);
  file_->Write("later ", 6);
  file_->Seek(0);
  file_->Write("first", 5);
  file_->Close();
  EXPECT_THAT(test::GetFile("\\SD Card\\RAMFileLog\\os.nb0"), Optional(std::string("later first")))
      << "in the order of the writes";
  std::uint32_t crc = 0;
  EXPECT_EQ(Crc("os.nb0", 5, &crc), 0U);
  EXPECT_THAT(test::GetFile("\\SD Card\\RAMFileLog\\os.nb0"), Optional(std::string("later first")))
      << "a check leaves it alone";
}

TEST_F(RamFileTest, IsCopiedForAValueOfAnyTypeUpToFourBytes) {
  SetMirror(REG_SZ, std::string(2, '\0'));
  MakeStore();
  Put("a", "abc");
  EXPECT_TRUE(test::Exists("\\SD Card\\RAMFileLog\\a"));
  SetMirror(REG_BINARY, "12345");
  Put("b", "abc");
  EXPECT_FALSE(test::Exists("\\SD Card\\RAMFileLog\\b"));
}

TEST_F(RamFileTest, IsNotCopiedWithoutTheValue) {
  MakeStore();
  Put("a", "abc");
  EXPECT_FALSE(test::Exists("\\SD Card\\RAMFileLog"));
}

TEST_F(RamFileTest, IsWrittenWithoutACardToCopyItTo) {
  SetMirror(REG_DWORD, "1234");
  device().storage().SetVolumePresent(u"\\SD Card", false);
  MakeStore();
  Put("a", "abc");
  std::uint32_t crc = 0;
  EXPECT_EQ(Crc("a", 3, &crc), 0U);
  EXPECT_EQ(crc, 0x352441C2U);
}

TEST_F(RamFileTest, IsNotCopiedAnyMoreOnceTheCardIsFull) {
  SetMirror(REG_DWORD, "1234");
  MakeStore();
  ASSERT_TRUE(file_->OpenForWriting("a", false, 100));
  EXPECT_TRUE(file_->Write("ab", 2));
  device().faults().Add({"WriteFile", 1, 0, ERROR_DISK_FULL});
  EXPECT_TRUE(file_->Write("cd", 2));
  const std::uint64_t writes = device().faults().Count("WriteFile");
  EXPECT_TRUE(file_->Write("ef", 2));
  EXPECT_EQ(device().faults().Count("WriteFile"), writes);
  device().faults().Clear();
  file_->Close();
  EXPECT_THAT(test::GetFile("\\SD Card\\RAMFileLog\\a"), Optional(std::string("ab")));
}

TEST_F(RamFileTest, IsNotCopiedWhenTheDriverRefusesIt) {
  SetMirror(REG_DWORD, "1234");
  MakeStore();
  ASSERT_TRUE(file_->OpenForWriting("a", false, 2));
  EXPECT_TRUE(file_->Write("ab", 2));
  EXPECT_FALSE(file_->Write("c", 1));
  file_->Close();
  EXPECT_THAT(test::GetFile("\\SD Card\\RAMFileLog\\a"), Optional(std::string("ab")));
}

// ---- the checksum ----

TEST_F(RamFileTest, ChecksumIsThatOfTheGivenLength) {
  MakeStore();
  Put("a", "123456789 and more");
  std::uint32_t crc = 0;
  EXPECT_EQ(Crc("a", 9, &crc), 0U);
  EXPECT_EQ(crc, 0xCBF43926U);
  EXPECT_EQ(Crc("a", 0, &crc), 0U);
  EXPECT_EQ(crc, 0U);
}

TEST_F(RamFileTest, ChecksumIsReadInBlocksWithAShorterOneAtTheEnd) {
  MakeStore();
  Put("a", std::string(4096 + 4096 + 100, 'x'));
  requests_->all.clear();
  std::uint32_t crc = 0;
  EXPECT_EQ(Crc("a", 4096 + 4096 + 100, &crc), 0U);
  std::vector<std::string> reads;
  for (const auto& request : requests_->all) {
    if (request.code == 0x22CFF2) reads.push_back(request.input.substr(24 * 3));
  }
  EXPECT_THAT(reads, ElementsAre("00 10 00 00 00 00 00 00 00 00 00 00",
                                 "00 10 00 00 00 00 00 00 00 10 00 00",
                                 "64 00 00 00 00 00 00 00 00 20 00 00"));
}

TEST_F(RamFileTest, ChecksumFailsForWhatIsNotThere) {
  std::uint32_t crc = 7;
  EXPECT_NE(Crc("a", 3, &crc), 0U) << "no store";
  EXPECT_EQ(crc, 0U);
  MakeStore();
  EXPECT_NE(Crc("a", 3, &crc), 0U) << "no file";
  Put("a", "abc");
  EXPECT_NE(Crc("a", 4, &crc), 0U) << "too short";
  EXPECT_EQ(crc, 0U);
  requests_->failing = 0x22CFF2;
  EXPECT_NE(Crc("a", 3, &crc), 0U);
  device().faults().Add({"LocalAlloc", 2, 1, ERROR_OUTOFMEMORY});
  EXPECT_EQ(Crc("a", 3, &crc), DWORD{ERROR_NOT_ENOUGH_MEMORY});
}

}  // namespace

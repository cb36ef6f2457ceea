// Fetching a file into the store of the flash driver.
#include "device/flash/ram_file.h"

#include "ce/errors.h"
#include "driver/drivers.h"
#include "driver/flash_driver.h"
#include "faults/faults.h"
#include "http/client/get_fixture.h"

namespace test {
namespace {

using http::BundleRx;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

class GetIntoRamTest : public GetTest {
 protected:
  GetIntoRamTest() {
    device().drivers().SetLibrary(u"eflashdrv.dll", [this](sim::Device& on) {
      driver_ = std::make_shared<sim::FlashDriver>(on);
      return driver_;
    });
    device::SetRAMSize(50000);
    client_.SetDestination(TEXT("RAM:os.nb0"));
  }
  std::optional<std::string> Stored(const std::string& name) {
    const auto files = driver_->Files();
    const auto found = files.find(name);
    if (found == files.end()) return std::nullopt;
    const auto& content = found->second.content;
    return std::string(content.begin(), content.begin() + found->second.written);
  }

  std::shared_ptr<sim::FlashDriver> driver_;
};

TEST_F(GetIntoRamTest, MakesTheStoreWritesAndChecks) {
  const std::string body = Noise(40000);
  server().Add(Served(body, "Content-Attributes: 33\r\n"));

  EXPECT_TRUE(Get());

  EXPECT_EQ(Stored("os.nb0"), body);
  EXPECT_EQ(BundleRx, 40000U);
  EXPECT_TRUE(client_.crc_good());
  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - after Ramfile::Init - opening, os.nb0",
                          "Orvenix - after OPenForWriting - success, !RAM:os.nb0%",
                          "Orvenix - http file size match, transfer success",
                          "Setting file attributes, RAM:os.nb0, 33, 1", "Orvenix - RAMFILECRC32",
                          "Orvenix - good CRC"));
  EXPECT_THAT(StatusLines(), ElementsAre("RAMFile::Init - ok"));
}

TEST_F(GetIntoRamTest, MakesTheStoreOnlyOnce) {
  server().Add(Served("first"));
  server().Add(Served("second"));
  EXPECT_TRUE(Get());
  client_.SetDestination(TEXT("RAM:b"));
  EXPECT_TRUE(Get());
  EXPECT_EQ(Stored("os.nb0"), "first");
  EXPECT_EQ(Stored("b"), "second");
  EXPECT_THAT(StatusLines(), ElementsAre("RAMFile::Init - ok"));
}

TEST_F(GetIntoRamTest, TakesAnEmptyFileAndOneThatComesWithItsHead) {
  server().Add(Served(""));
  server().Add({{std::chrono::milliseconds(0), HeadFor("whole") + "whole", kGoOn}});
  EXPECT_TRUE(Get());
  EXPECT_EQ(Stored("os.nb0"), "");
  Open(client_);
  EXPECT_TRUE(Get());
  EXPECT_EQ(Stored("os.nb0"), "whole");
  EXPECT_THAT(LogLines(), Contains("Orvenix - httpClient - file complete in first frame"));
}

TEST_F(GetIntoRamTest, GivesUpWithoutAStore) {
  device::SetRAMSize(0);
  server().Add(Served("hello"));

  EXPECT_FALSE(Get());

  EXPECT_THAT(LogLines(), Contains("Orvenix - OpenForWriting - error, RAM:os.nb0"));
  EXPECT_THAT(StatusLines(), ElementsAre("RAMFile::Init - error", "file open error", "RAM:os.nb0"));
  EXPECT_FALSE(File("os.nb0").has_value());
  EXPECT_FALSE(File("RAM:os.nb0").has_value());
}

TEST_F(GetIntoRamTest, GivesUpOnAFileThatTheStoreHasNoRoomFor) {
  server().Add({{std::chrono::milliseconds(0),
                 "HTTP/1.1 200 OK\r\nContent-Length: 50001\r\nContent-CRC32: 1\r\n\r\n", kGoOn}});
  EXPECT_FALSE(Get());
  EXPECT_THAT(StatusLines(), ElementsAre("RAMFile::Init - ok", "file open error", "RAM:os.nb0"));
}

TEST_F(GetIntoRamTest, AsksAgainForADamagedFile) {
  const std::string body = Noise(20000);
  std::string damaged = body;
  damaged[19999] = static_cast<char>(damaged[19999] ^ 1);
  server().Add({{std::chrono::milliseconds(0), HeadFor(body), kGoOn},
                {std::chrono::milliseconds(10), damaged, kGoOn}});
  server().Add(Served(body));

  EXPECT_TRUE(Get());

  EXPECT_EQ(Stored("os.nb0"), body);
  EXPECT_THAT(StatusLines(), Contains("CRC failed\r\n"));
  EXPECT_EQ(server().requests().size(), 2U);
}

TEST_F(GetIntoRamTest, AsksAgainWhenTheCheckFails) {
  server().Add(Served(Noise(20000)));
  server().Add(Served(Noise(20000)));
  ASSERT_TRUE(device::InitRAMStore());
  device().faults().Add({"LocalAlloc", 4, 1, ERROR_OUTOFMEMORY});  // buffer, request, file, check

  EXPECT_TRUE(Get());

  EXPECT_THAT(LogLines(), Contains("Orvenix - RAMFILECRC32 or FILECRC32 returned error"));
  EXPECT_EQ(Stored("os.nb0"), Noise(20000));
}

TEST_F(GetIntoRamTest, KnowsThePrefixInCapitalsOnly) {
  client_.SetDestination(TEXT("ram:os.nb0"));
  server().Add(Served("hello"));
  EXPECT_FALSE(Get()) << "no file can have this name";
  EXPECT_EQ(driver_, nullptr);
}

}  // namespace
}  // namespace test

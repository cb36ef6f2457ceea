// Fetching a file: the whole way, and how answers may be cut into segments.
#include "http/client/get_fixture.h"
#include "net/virtual/virtual_network.h"

namespace test {
namespace {

using http::BundleRx;
using http::CHTTPClient;
using std::chrono::milliseconds;
using std::chrono::seconds;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

// ---- the whole way ----

TEST_F(GetTest, FetchesAFileOfSeveralBlocks) {
  const std::string body = Noise(40000);
  server().Add(Served(body,
                      "Content-Attributes: 33\r\n"
                      "Content-timestamp: 2006-03-01 14:05:09\r\n"));

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), body);
  EXPECT_THAT(server().requests(), ElementsAre(kRequest));
  EXPECT_EQ(GetFileAttributesW(TEXT("\\a.bin")), FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_ARCHIVE);
  EXPECT_EQ(BundleRx, 40000U);
  EXPECT_TRUE(client_.crc_good());
  EXPECT_TRUE(client_.is_open()) << "the connection is kept for the next file";
  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - Content-timestamp:  2006-03-01 14:05:09",
                          "Orvenix - after OPenForWriting - success, !\\a.bin%",
                          "Orvenix - http file size match, transfer success",
                          "Setting file attributes, \\a.bin, 33, 1", "Orvenix - FILECRC32",
                          "Orvenix - good CRC"));
  EXPECT_EQ(DebugText(), "performing CRC check\r\nCRC ok\r\n");
  EXPECT_THAT(StatusLines(), IsEmpty());
  EXPECT_THAT(Sleeps(), ElementsAre(50));
}

TEST_F(GetTest, LogsWhatTheHeadDoesNotSayAndSetsAttributesToZero) {
  server().Add(Served("0123456789"));

  EXPECT_TRUE(Get());

  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-Attributes",
                          "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - after OPenForWriting - success, !\\a.bin%",
                          "Orvenix - http file size match, transfer success",
                          "Setting file attributes, \\a.bin, 0, 1", "Orvenix - FILECRC32",
                          "Orvenix - good CRC"));
}

TEST_F(GetTest, FetchesTheNextFileOnTheSameConnectionAndReportsTheBytesSoFar) {
  server().Add(Served("first"));
  server().Add(Served("second"));
  EXPECT_TRUE(Get());
  client_.SetDestination(TEXT("\\b.bin"));

  EXPECT_TRUE(client_.Get(TEXT("b.bin:2,2")));

  EXPECT_EQ(server().connections(), 1U);
  EXPECT_EQ(File("b.bin"), "second");
  EXPECT_THAT(server().requests().at(1), ::testing::HasSubstr("\r\nBundle-rx: 5\r\n"));
  EXPECT_EQ(BundleRx, 11U);
}

TEST_F(GetTest, LogsTheRequestAsItWasSent) {
  server().Add(Served("x"));

  EXPECT_TRUE(Get());

  EXPECT_EQ(LogText().substr(0, kRequest.size() + 6), "\r\n" + kRequest + "\r\n\r\n");
}

TEST_F(GetTest, TellsWhoFollowsTheTransferAfterEveryBlockButTheFirst) {
  static std::vector<std::pair<std::uint32_t, std::uint32_t>> told;
  told.clear();
  client_.SetProgress([](CHTTPClient*, std::uint32_t total, std::uint32_t so_far) {
    told.emplace_back(total, so_far);
  });
  HANDLE semaphore = CreateSemaphoreW(nullptr, 0, 100, nullptr);
  client_.SetTransferSemaphore(semaphore);
  const std::string body = Noise(30);
  server().Add({{milliseconds(0), HeadFor(body) + body.substr(0, 10), kGoOn},
                {milliseconds(10), body.substr(10, 10), kGoOn},
                {milliseconds(10), body.substr(20), kGoOn}});

  EXPECT_TRUE(Get());

  EXPECT_THAT(told, ElementsAre(std::pair(30U, 20U), std::pair(30U, 30U)));
  LONG raised = 0;
  EXPECT_TRUE(ReleaseSemaphore(semaphore, 1, &raised));
  EXPECT_EQ(raised, 2);
  CloseHandle(semaphore);
}

TEST_F(GetTest, TakesAFileWithoutACrcWhenCrcCheckingIsOff) {
  client_.SetCrcCheck(false);
  server().Add({{milliseconds(0), "200 OK\r\nContent-Length: 5\r\n\r\n", kGoOn},
                {milliseconds(50), "hello", kGoOn}});

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "hello");
  EXPECT_EQ(BundleRx, 5U);
  EXPECT_THAT(LogLines(), Not(Contains("Orvenix - FILECRC32")));
}

TEST_F(GetTest, ReplacesAnEarlierFileThatWasLonger) {
  server().Add(Served(Noise(5000)));
  server().Add(Served("short"));
  EXPECT_TRUE(Get());

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "short");
}

TEST_F(GetTest, ReplacesAnEarlierFileThatIsReadOnlyHiddenAndSystem) {
  server().Add(Served("first", "Content-Attributes: 7\r\n"));
  server().Add(Served("second", "Content-Attributes: 1\r\n"));
  EXPECT_TRUE(Get());

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "second");
  EXPECT_EQ(GetFileAttributesW(TEXT("\\a.bin")), FILE_ATTRIBUTE_READONLY);
}

// ---- the path ----

TEST_F(GetTest, APathWithoutALetterIsNotAskedFor) {
  for (const WCHAR* path : {static_cast<const WCHAR*>(nullptr), TEXT(""), TEXT("/123.456:7,8")}) {
    EXPECT_FALSE(client_.Get(path));

    EXPECT_EQ(LogText(), "Orvnix - CHttpClient:Get - bad ret 1\r\n");
  }
  EXPECT_TRUE(client_.is_open()) << "the socket is not touched";
  EXPECT_THAT(server().requests(), IsEmpty());
}

TEST_F(GetTest, AsksForThePathFromItsFirstLetterOn) {
  server().Add(Served("x"));

  EXPECT_TRUE(client_.Get(TEXT("\\7xx\\100%s.zip:1,1")));

  EXPECT_EQ(server().requests().at(0).substr(0, 30), "GET xx\\100%s.zip:1,1 HTTP/1.1\r");
}

// ---- heads and bodies in other segments ----

TEST_F(GetTest, AFieldThatArrivesInASecondSegmentCountsAsMissing) {
  server().Add({{milliseconds(0), "HTTP/1.1 200 OK\r\nContent-Length: 5\r\n", kGoOn},
                {milliseconds(50), "Content-CRC32: 907060870\r\n\r\nhello", kGoOn}});

  EXPECT_FALSE(Get());

  EXPECT_EQ(LogLines().back(), "Orvenix - CHttpClient:Get - bad ret 7");
}

TEST_F(GetTest, AHeadThatDoesNotEndInTheFirstSegmentIsNotWrittenIntoTheFile) {
  server().Add({{milliseconds(0),
                 "HTTP/1.1 200 OK\r\nContent-Length: 5\r\nContent-CRC32: 907060870\r\n", kGoOn},
                {milliseconds(50), "\r\nhello", kGoOn}});

  EXPECT_FALSE(Get());

  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-Attributes",
                          "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - CSocketIO::Close"));
  EXPECT_FALSE(client_.is_open());
  EXPECT_FALSE(File("a.bin").has_value());
}

TEST_F(GetTest, TakesABodyThatComesWholeWithItsHeadWithoutALookAtCrcAndAttributes) {
  server().Add({{milliseconds(0),
                 "HTTP/1.1 200 OK\r\nContent-Length: 5\r\nContent-Attributes: 1\r\n"
                 "Content-timestamp: x\r\nContent-CRC32: 1\r\n\r\nhello",
                 kGoOn}});

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "hello");
  EXPECT_EQ(GetFileAttributesW(TEXT("\\a.bin")) & FILE_ATTRIBUTE_READONLY, 0U);
  EXPECT_EQ(BundleRx, 0U);
  EXPECT_FALSE(client_.is_open());
  EXPECT_THAT(Sleeps(), IsEmpty());
  EXPECT_THAT(LogLines(), ElementsAre("<request>", "Orvenix - Content-timestamp:  x",
                                      "Orvenix - after OPenForWriting - success, !\\a.bin%",
                                      "Orvenix - httpClient - file complete in first frame",
                                      "Orvenix - CSocketIO::Close"));
}

TEST_F(GetTest, AnEmptyFileIsASuccess) {
  server().Add({{milliseconds(0), HeadFor("", "Content-Attributes: 1\r\n"), kGoOn}});

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "");
  EXPECT_FALSE(client_.is_open());
  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - after OPenForWriting - success, !\\a.bin%",
                          "Orvenix - after OpenForWriting - zero length file, !\\a.bin%",
                          "Orvenix - CSocketIO::Close"));
  EXPECT_THAT(StatusLines(), ElementsAre("filesize = 0"));
}

TEST_F(GetTest, AnEmptyFileNeedsACrcAllTheSame) {
  server().Add({{milliseconds(0), "200 OK\r\nContent-Length: 0\r\n\r\n", kGoOn}});

  EXPECT_FALSE(Get());

  EXPECT_EQ(LogLines().back(), "Orvenix - CHttpClient:Get - bad ret 7");
}

TEST_F(GetTest, TakesAFirstBlockThatFillsTheBuffer) {
  const std::string body = Noise(40000);
  server().Add({{milliseconds(0), HeadFor(body) + body, kGoOn}});
  // Everything that finds room arrives at one instant.
  sim::VirtualNetwork network(world());
  network.Stall(kServerAddress, 0x0A000001);
  network.At(world().now() + seconds(1), [&] { network.Release(kServerAddress, 0x0A000001); });

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), body);
}

TEST_F(GetTest, NeverWritesMoreThanTheLength) {
  const std::string body = Noise(3000);
  server().Add(
      {{milliseconds(0), HeadFor(body), kGoOn}, {milliseconds(50), body + "surplus", kGoOn}});

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), body);
  EXPECT_EQ(BundleRx, 3000U);
}

TEST_F(GetTest, NeverWritesMoreThanTheLengthOfABodyThatCameWithItsHead) {
  server().Add({{milliseconds(0), HeadFor("hello") + "hello and more", kGoOn}});

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "hello");
}

}  // namespace
}  // namespace test

#include "faults/faults.h"
#include "http/client/http_test.h"
#include "kernel/debug.h"
#include "net/network.h"
#include "net/virtual/virtual_network.h"

namespace {

using http::BundleRx;
using http::CHTTPClient;
using std::chrono::milliseconds;
using std::chrono::seconds;
using test::Answer;
using test::HeadFor;
using test::HttpTest;
using test::Noise;
using test::Served;
using test::Step;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr auto kGoOn = Step::Then::kGoOn;

const std::string kRequest =
    "GET a.bin:1,1 HTTP/1.1\r\n"
    "Host: 2.0.0.10\r\n"
    "User-Agent: UpgradeClient\r\n"
    "Accept: */*\r\n"
    "Connection: Keep-Alive\r\n"
    "Type: 7\r\n"
    "Family: MR7\r\n"
    "Model: MR70\r\n"
    "SerialNum: 123456\r\n"
    "Core-name: 00112233\r\n"
    "Bundle-rx: 0\r\n"
    "HTTP-fallback: 1\r\n"
    "Cache-Control: no-cache\r\n"
    "\r\n";

class GetTest : public HttpTest {
 protected:
  GetTest() {
    client_.SetIdentity({"7", "MR7", "MR70", "123456", "00112233"});
    client_.SetDestination(TEXT("\\a.bin"));
    http::HttpFallback = 1;
    Open(client_);
  }

  bool Get() { return client_.Get(TEXT("/a.bin:1,1")); }

  CHTTPClient client_;
};

/// A head whose CRC is not the body's.
std::string HeadWithCrc(std::string_view body, const std::string& crc) {
  return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) +
         "\r\nContent-CRC32: " + crc + "\r\n\r\n";
}

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

// ---- failures with a number ----

struct RefusedHead {
  const char* head;
  int number;
  const char* debug_text;
};

TEST_F(GetTest, RefusesAnAnswerByTheFirstRuleThatItBreaks) {
  static const RefusedHead kCases[] = {
      {"HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\n\r\n", 5, "get - no 200 ok\r\n"},
      {"garbage", 5, "get - no 200 ok\r\n"},
      {"HTTP/1.1 200 OK\r\nContent-CRC32: 1\r\n\r\n", 6, "get - no length\r\n"},
      {"HTTP/1.1 200 OK\r\nContent-Length: x\r\nContent-CRC32: 1\r\n\r\n", 6,
       "get - no length\r\n"},
      {"HTTP/1.1 200 OK\r\nContent-Length: 4294967296\r\nContent-CRC32: 1\r\n\r\n", 6,
       "get - no length\r\n"},
      {"HTTP/1.1 200 OK\r\nContent-Length: 5\r\n\r\n", 7, "get - no CRC32\r\n"},
      {"HTTP/1.1 200 OK\r\nContent-Length: 5\r\nContent-CRC32: 1\r\n"
       "CheckPoint-BlockSize: 16385\r\n\r\n",
       8, "get - Chk Pnt Blk size error\r\n"},
  };
  for (const RefusedHead& c : kCases) {
    server().Add({{milliseconds(0), c.head, kGoOn}});
    Open(client_);
    device().debug().Clear();

    EXPECT_FALSE(Get()) << c.head;

    EXPECT_FALSE(client_.is_open()) << c.head;
    const std::vector<std::string> lines = LogLines();
    ASSERT_GE(lines.size(), 3U);
    EXPECT_EQ(lines[lines.size() - 2], "Orvenix - CSocketIO::Close") << c.head;
    EXPECT_EQ(lines.back(), "Orvenix - CHttpClient:Get - bad ret " + std::to_string(c.number));
    EXPECT_EQ(DebugText(), c.debug_text) << c.head;
    EXPECT_FALSE(File("a.bin").has_value()) << c.head;
  }
}

TEST_F(GetTest, LogsTheFieldsThatStandBeforeTheMissingOne) {
  server().Add({{milliseconds(0), "HTTP/1.1 200 OK\r\nContent-Length: 5\r\n\r\n", kGoOn}});

  EXPECT_FALSE(Get());

  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-Attributes",
                          "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - CSocketIO::Close", "Orvenix - CHttpClient:Get - bad ret 7"));
}

TEST_F(GetTest, AcceptsACheckpointBlockAsLargeAsTheBuffer) {
  server().Add(Served("hello", "CheckPoint-BlockSize: 16384\r\n"));

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), "hello");
  EXPECT_THAT(LogLines(), Contains("Orvenix - check pointing is true"));
}

TEST_F(GetTest, FailsWhenTheRequestIsNotSentWhole) {
  device().faults().Add({"send", 1, 1, WSAECONNRESET});

  EXPECT_FALSE(Get());

  EXPECT_FALSE(client_.is_open());
  const std::vector<std::string> lines = LogLines();
  EXPECT_EQ(lines.back(), "Orvenix - CHttpClient:Get - bad ret 2");
  EXPECT_EQ(lines[lines.size() - 2], "Orvenix - CSocketIO::Close");
}

TEST_F(GetTest, FailsWhenNothingComesWithinTheTimeout) {
  client_.set_timeout_ms(20000);
  const milliseconds begin = Now();

  EXPECT_FALSE(Get());

  EXPECT_GE(Now() - begin, seconds(20));
  EXPECT_LT(Now() - begin, seconds(21));
  EXPECT_THAT(LogLines(), ElementsAre("<request>", "Orvenix - CSocketIO::Close",
                                      "Orvenix - CHttpClient:Get - bad ret 3"));
}

TEST_F(GetTest, FailsWhenTheServerClosesWithoutAnAnswer) {
  server().Add({{milliseconds(5), "", Step::Then::kClose}});

  EXPECT_FALSE(Get());

  EXPECT_THAT(LogLines(), ElementsAre("<request>", "Orvenix - CSocketIO::Close",
                                      "Orvenix - CHttpClient:Get - bad ret 4"));
}

TEST_F(GetTest, FailsWhenTheServerResetsTheConnection) {
  server().Add({{milliseconds(5), "", Step::Then::kReset}});

  EXPECT_FALSE(Get());

  EXPECT_EQ(LogLines().back(), "Orvenix - CHttpClient:Get - bad ret 4");
}

TEST_F(GetTest, SendsNothingWithoutAConnection) {
  client_.CloseAtOnce();

  EXPECT_FALSE(Get());

  EXPECT_EQ(LogText(), "\r\n" + kRequest + "\r\n\r\n" + "Orvenix - CHttpClient:Get - bad ret 2\r\n")
      << "there is nothing to close";
}

TEST_F(GetTest, ReportsThatThereIsNoMemoryForARequest) {
  device().faults().Add({"LocalAlloc", 1, 1});

  EXPECT_FALSE(Get());

  EXPECT_EQ(LogText(), "Orvenix - CHTTPClinent::Get - bad alloc\r\n");
  EXPECT_TRUE(client_.is_open());
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

// ---- repetition ----

TEST_F(GetTest, RepeatsTheRequestOnTheSameConnectionUntilTheCrcIsRight) {
  const std::string body = "a body";
  const Answer damaged = {{milliseconds(0), HeadWithCrc(body, "4294967295"), kGoOn},
                          {milliseconds(50), body, kGoOn}};
  for (int i = 0; i < 3; ++i) server().Add(damaged);
  server().Add(Served(body));

  EXPECT_TRUE(Get());

  EXPECT_EQ(server().connections(), 1U);
  EXPECT_THAT(server().requests(), ElementsAre(kRequest, kRequest, kRequest, kRequest));
  EXPECT_THAT(Sleeps(), ElementsAre(50, 50, 50, 50));
  EXPECT_EQ(BundleRx, body.size()) << "counted once";
  EXPECT_TRUE(client_.crc_good());
  const std::vector<std::string> lines = LogLines();
  ASSERT_GE(lines.size(), 8U);
  EXPECT_EQ(lines[4], "Orvenix - http file size match, transfer success");
  EXPECT_EQ(lines[5], "Setting file attributes, \\a.bin, 0, 1");
  EXPECT_EQ(lines[6], "Orvenix - FILECRC32");
  EXPECT_EQ(lines[7].substr(0, 33), "Orvenix - CRC error, \\a.bin, -1, ");
  EXPECT_THAT(StatusLines(), ElementsAre("CRC failed\r\n", "CRC failed\r\n", "CRC failed\r\n"));
}

TEST_F(GetTest, RemembersAWrongCrc) {
  server().Add(
      {{milliseconds(0), HeadWithCrc("abc", "1"), kGoOn}, {milliseconds(50), "abc", kGoOn}});

  EXPECT_FALSE(Get()) << "the second round finds no answer";

  EXPECT_FALSE(client_.crc_good());
  EXPECT_EQ(BundleRx, 0U);
  EXPECT_EQ(LogLines().back(), "Orvenix - CHttpClient:Get - bad ret 3");
}

TEST_F(GetTest, RepeatsAfterACrcThatCouldNotBeComputed) {
  server().Add(Served("abc"));
  server().Add(Served("abc"));
  device().faults().Add({"ReadFile", 1, 1});

  EXPECT_TRUE(Get());

  EXPECT_EQ(server().requests().size(), 2U);
  EXPECT_THAT(LogLines(), Contains("Orvenix - RAMFILECRC32 or FILECRC32 returned error"));
}

TEST_F(GetTest, RepeatsAfterAServerThatStopsInTheMiddle) {
  const std::string body = Noise(100);
  server().Add(
      {{milliseconds(0), HeadFor(body), kGoOn}, {milliseconds(50), body.substr(0, 40), kGoOn}});
  server().Add(Served(body));
  const milliseconds begin = Now();

  EXPECT_TRUE(Get());

  EXPECT_GE(Now() - begin, seconds(10));
  EXPECT_EQ(server().connections(), 1U);
  EXPECT_EQ(File("a.bin"), body);
  const std::vector<std::string> lines = LogLines();
  EXPECT_EQ(lines.at(4), "Orvenix - httpclient, server not sending data 3");
  EXPECT_EQ(lines.at(5), "Setting file attributes, \\a.bin, 0, 1")
      << "also after a transfer that failed";
  EXPECT_EQ(lines.at(6), "<request>");
}

TEST_F(GetTest, RepeatsAfterAWriteThatFails) {
  const std::string body = Noise(100);
  server().Add({{milliseconds(0), HeadFor(body) + body.substr(0, 10), kGoOn},
                {milliseconds(50), body.substr(10), kGoOn}});
  server().Add(Served(body));
  device().faults().Add({"WriteFile", 2, 1, ERROR_GEN_FAILURE});

  EXPECT_TRUE(Get());

  EXPECT_EQ(File("a.bin"), body);
  EXPECT_THAT(LogLines(), Contains("Orvenix - file->Write error"));
  EXPECT_EQ(server().connections(), 1U);
}

// ---- failures without a number ----

TEST_F(GetTest, GivesUpWhenTheFileCannotBeOpened) {
  client_.SetDestination(TEXT("\\no folder\\a.bin"));
  server().Add(Served("hello"));

  EXPECT_FALSE(Get());

  EXPECT_FALSE(client_.is_open());
  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-Attributes",
                          "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - OpenForWriting - error, \\no folder\\a.bin",
                          "Orvenix - CSocketIO::Close"));
  EXPECT_THAT(StatusLines(), ElementsAre("file open error", "\\no folder\\a.bin"));
}

TEST_F(GetTest, GivesUpOnARamFileWhileThereIsNoRamStore) {
  client_.SetDestination(TEXT("RAM:os.bin"));
  server().Add(Served("hello"));

  EXPECT_FALSE(Get());

  EXPECT_THAT(LogLines(), Contains("Orvenix - OpenForWriting - error, RAM:os.bin"));
  EXPECT_FALSE(File("RAM:os.bin").has_value());
}

TEST_F(GetTest, GivesUpOnADestinationThatIsTooLongInsteadOfCuttingIt) {
  const std::u16string path = u"\\" + std::u16string(259, u'a');
  client_.SetDestination(path.c_str());
  server().Add(Served("hello"));

  EXPECT_FALSE(Get());

  EXPECT_FALSE(client_.is_open());
}

TEST_F(GetTest, GivesUpWhenTheFirstWriteFails) {
  server().Add(
      {{milliseconds(0), HeadFor("hello") + "he", kGoOn}, {milliseconds(50), "llo", kGoOn}});
  device().faults().Add({"WriteFile", 1, 1, ERROR_GEN_FAILURE});

  EXPECT_FALSE(Get());

  EXPECT_FALSE(client_.is_open());
  EXPECT_THAT(
      LogLines(),
      ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-Attributes",
                  "Orvenix - CHttpClient:Get - No Content-timestamp",
                  "Orvenix - after OPenForWriting - success, !\\a.bin%",
                  "Orvenix - httpClient - first write error", "Orvenix - CSocketIO::Close"));
  EXPECT_THAT(StatusLines(), ElementsAre("fileWrite error - \\a.bin"));
}

TEST_F(GetTest, DoesNotSpinWhenTheServerClosesInTheMiddleOfTheBody) {
  const std::string body = Noise(100);
  server().Add({{milliseconds(0), HeadFor(body), kGoOn},
                {milliseconds(50), body.substr(0, 40), Step::Then::kClose}});
  const milliseconds begin = Now();

  EXPECT_FALSE(Get());

  EXPECT_LT(Now() - begin, seconds(1));
  EXPECT_LT(device().faults().Count("select"), 20U);
  EXPECT_FALSE(client_.is_open());
  EXPECT_THAT(LogLines(),
              ElementsAre("<request>", "Orvenix - CHttpClient:Get - No Content-Attributes",
                          "Orvenix - CHttpClient:Get - No Content-timestamp",
                          "Orvenix - after OPenForWriting - success, !\\a.bin%",
                          "Orvenix - m_HTTP.ReadData error", "Orvenix - CSocketIO::Close"));
  EXPECT_THAT(StatusLines(), ElementsAre("Read data error 2\r\n"));
}

TEST_F(GetTest, GivesUpWhenReceivingFails) {
  const std::string body = Noise(100);
  server().Add({{milliseconds(0), HeadFor(body), kGoOn}, {milliseconds(50), body, kGoOn}});
  device().faults().Add({"recv", 2, 1, WSAECONNABORTED});

  EXPECT_FALSE(Get());

  EXPECT_THAT(LogLines(), Contains("Orvenix - m_HTTP.ReadData error"));
  EXPECT_EQ(BundleRx, 0U);
}

TEST_F(GetTest, LeavesNoFileOpenWhateverHappens) {
  server().Add({{milliseconds(0), HeadFor("hello") + "he", Step::Then::kClose}});

  EXPECT_FALSE(Get());

  HANDLE file = CreateFileW(TEXT("\\a.bin"), GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr);
  EXPECT_NE(file, INVALID_HANDLE_VALUE) << "nobody else holds it";
  CloseHandle(file);
  client_.CloseFile();
}

// ---- every call that can fail, one at a time ----

TEST_F(GetTest, SurvivesTheFailureOfEveryCallAndFetchesTheRightFileInTheEnd) {
  const std::string body = Noise(20000);
  server().SetLast(Served(body, "Content-Attributes: 32\r\n"));
  client_.Close();
  std::uint64_t nth = 0;
  for (bool fired = true; fired;) {
    ++nth;
    const std::string name = "a" + std::to_string(nth) + ".bin";
    client_.SetDestination(device::WideText<>("\\" + name).c_str());
    const std::size_t left_open = device().network().open_sockets();
    const std::uint64_t fired_before = device().faults().fired();
    device().faults().Add({"*", nth, 1, 0});
    http::UrlText path;
    bool good = false;
    for (int attempt = 0; attempt < 10 && !good; ++attempt) {
      good = client_.OpenURL(TEXT("http://10.0.0.2:8080/a.bin:1,1"), path) && Get();
      client_.Close();
      client_.CloseFile();
    }
    device().faults().Clear();
    fired = device().faults().fired() != fired_before;

    const std::string call = fired ? device().faults().last_fired() : "";
    SCOPED_TRACE("call " + std::to_string(nth) + ", " + call);
    // What the system refuses to close stays open: a socket more, and a file that no one can open.
    EXPECT_EQ(device().network().open_sockets(), left_open + (call == "closesocket" ? 1 : 0));
    if (call == "CloseHandle") continue;
    ASSERT_TRUE(good);
    ASSERT_TRUE(File(name) == body);
  }
  EXPECT_GT(nth, 50U);
}

}  // namespace

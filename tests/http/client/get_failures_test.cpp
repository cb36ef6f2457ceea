// Fetching a file when something fails: what ends it, and what is tried again.
#include "faults/faults.h"
#include "http/client/get_fixture.h"
#include "kernel/debug.h"
#include "net/network.h"

namespace test {
namespace {

using http::BundleRx;
using std::chrono::milliseconds;
using std::chrono::seconds;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::Not;

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
}  // namespace test

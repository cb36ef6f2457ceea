#include "faults/faults.h"
#include "http/client/http_test.h"
#include "net/network.h"

namespace {

using http::CHTTPClient;
using http::CreateJobClient;
using http::JobClient;
using http::ReleaseJobClient;
using http::SendUpgradeComplete;
using std::chrono::milliseconds;
using std::chrono::seconds;
using test::HttpTest;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

class JobClientTest : public HttpTest {
 protected:
  JobClientTest() {
    job_.SetBaseURL("http://10.0.0.2");
    job_.SetHTTPPort(kPort);
  }
  ~JobClientTest() override { ReleaseJobClient(); }

  [[nodiscard]] std::string Report(const std::string& more = "") const {
    return "GET HTTP/1.1\r\nCore-name: " + std::string(job_.GetUniqueId()) +
           "\r\nBundle-rx: 0\r\nHTTP-fallback: 1\r\nBundle-transfer: COMPLETE\r\n" + more + "\r\n";
  }
  void LetArrive() { Sleep(100); }

  UpgradeConfig job_;
};

TEST_F(JobClientTest, ThereIsNoClientAtFirst) {
  EXPECT_EQ(JobClient(), nullptr);
}

TEST_F(JobClientTest, MakesOneClientForAllFetches) {
  CHTTPClient* client = CreateJobClient(job_);
  ASSERT_NE(client, nullptr);

  EXPECT_EQ(CreateJobClient(job_), client);
  EXPECT_EQ(JobClient(), client);
  EXPECT_EQ(client->timeout_ms(), 20000U);
  EXPECT_EQ(device().network().started(), 2U) << "the test's reference and the client's";
}

TEST_F(JobClientTest, ReleasesClientConnectionAndWindowsSockets) {
  server().set_stubborn(true);
  CHTTPClient* client = CreateJobClient(job_);
  Open(*client);
  const milliseconds begin = Now();

  ReleaseJobClient();

  EXPECT_EQ(JobClient(), nullptr);
  EXPECT_EQ(Now(), begin) << "nothing is waited for";
  EXPECT_EQ(device().network().open_sockets(), 0U);
  EXPECT_EQ(device().network().started(), 1U);
  EXPECT_EQ(LogText(), "");
  ReleaseJobClient();
  EXPECT_EQ(device().network().started(), 1U) << "a second call does nothing";
}

TEST_F(JobClientTest, IdentifiesTheDeviceByTheJobsTexts) {
  CHTTPClient* client = CreateJobClient(job_);
  client->SetDestination(TEXT("\\a"));
  Open(*client);
  server().Add(test::Served("x"));

  EXPECT_TRUE(client->Get(TEXT("a")));

  const std::string identity = std::string("\r\nType: ") + job_.GetType() +
                               "\r\nFamily: " + job_.GetFamily() + "\r\nModel: " + job_.GetModel() +
                               "\r\nSerialNum: " + job_.GetSerialNumber() +
                               "\r\nCore-name: " + job_.GetUniqueId() + "\r\n";
  EXPECT_THAT(server().requests().at(0), HasSubstr(identity));
  EXPECT_STRNE(job_.GetUniqueId(), "");
}

TEST_F(JobClientTest, GoesOnWithoutMemoryForAClient) {
  device().faults().Add({"LocalAlloc", 1, 0});

  EXPECT_EQ(CreateJobClient(job_), nullptr);
  SendUpgradeComplete(job_, "");

  EXPECT_EQ(JobClient(), nullptr);
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - SendUpgradeComplete - Entering",
                                      "Orvenix - SendUpgradeComplete - Exiting"));
}

// ---- the report ----

TEST_F(JobClientTest, ReportsASuccessfulJobWithoutAnErrorLine) {
  http::HttpFallback = 1;

  SendUpgradeComplete(job_, "");

  LetArrive();
  EXPECT_THAT(server().requests(), ElementsAre(Report()));
  EXPECT_EQ(LogText(),
            "Orvenix - SendUpgradeComplete - Entering\r\n"
            "Orvenix - CHTTPClient::OpenURL - entering !http://10.0.0.2:8080!\r\n"
            "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!\r\n"
            "Orvenix - CHTTPClient::OpenURL - Connect, 33554442\r\n"
            "Orvenix - CSocketIO::Connect - connect established\r\n"
            "Orvenix - CHTTPClient::OpenURL - Exiting\r\n"
            "Orvenix - CHTTPClient::SendUpgradeComplete - Entering\r\n" +
                Report() +
                "Orvenix - CHTTPClient::SendUpgradeComplete - Exiting\r\n"
                "Orvenix - SendUpgradeComplete - Exiting\r\n");
  EXPECT_EQ(JobClient()->timeout_ms(), 10000U) << "a client made for the report keeps the default";
  EXPECT_TRUE(JobClient()->is_open()) << "the upgrade thread closes it at its end";
}

TEST_F(JobClientTest, ReportsAFailedJobWithItsTextAsGiven) {
  http::HttpFallback = 1;

  SendUpgradeComplete(job_, "Wrong version 100%s");

  LetArrive();
  EXPECT_THAT(server().requests(), ElementsAre(Report("Error: Wrong version 100%s\r\n")));
}

TEST_F(JobClientTest, TakesANullErrorTextForNone) {
  http::HttpFallback = 1;

  SendUpgradeComplete(job_, nullptr);

  LetArrive();
  EXPECT_THAT(server().requests(), ElementsAre(Report()));
}

TEST_F(JobClientTest, ReportsOnTheConnectionOfTheLastDownload) {
  CHTTPClient* client = CreateJobClient(job_);
  client->SetDestination(TEXT("\\a"));
  Open(*client);
  server().Add(test::Served("hello"));
  ASSERT_TRUE(client->Get(TEXT("a")));

  SendUpgradeComplete(job_, "");

  LetArrive();
  EXPECT_EQ(server().connections(), 1U);
  EXPECT_THAT(server().requests().at(1), HasSubstr("\r\nBundle-rx: 5\r\n"));
}

TEST_F(JobClientTest, ReadsNoAnswer) {
  server().SetLast({{milliseconds(0), "HTTP/1.1 200 OK\r\n\r\n", test::Step::Then::kGoOn}});

  SendUpgradeComplete(job_, "");

  EXPECT_EQ(device().faults().Count("recv"), 0U);
}

TEST_F(JobClientTest, LogsTheReportThatNoConnectionCarries) {
  http::HttpFallback = 1;
  server().StopAccepting();

  SendUpgradeComplete(job_, "");

  const std::string log = LogText();
  EXPECT_THAT(log,
              HasSubstr("Orvenix - OpenURL - could not connect\r\n"
                        "Orvenix - CHTTPClient::SendUpgradeComplete - Entering\r\n" +
                        Report() + "Orvenix - CHTTPClient::SendUpgradeComplete - Exiting\r\n"));
}

TEST_F(JobClientTest, ABaseUrlWithAPortOfItsOwnLosesTheReport) {
  job_.SetBaseURL("http://10.0.0.2:8080");

  SendUpgradeComplete(job_, "");

  EXPECT_EQ(server().connections(), 0U);
  EXPECT_THAT(LogText(), HasSubstr("GetHostIp !10.0.0.2:8080, 8080!\r\n"
                                   "Orvenix - CHTTPClient::OpenURL - Connect, 0\r\n"
                                   "Orvenix - CSocketIO::Connect - Error !10049%\r\n"));
}

TEST_F(JobClientTest, KeepsWhatTheReportAndTheLogCanHoldOfALongErrorText) {
  const std::string text(20000, 'e');

  SendUpgradeComplete(job_, text.c_str());

  LetArrive();
  EXPECT_THAT(server().unfinished(), HasSubstr("Error: eeee"));
}

}  // namespace

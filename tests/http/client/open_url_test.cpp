#include "faults/faults.h"
#include "http/client/http_test.h"
#include "net/network.h"

namespace {

using http::CHTTPClient;
using http::UrlText;
using test::HttpTest;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class OpenUrlTest : public HttpTest {
 protected:
  CHTTPClient client_;
  UrlText path_;
};

TEST_F(OpenUrlTest, ConnectsAndGivesThePath) {
  ASSERT_TRUE(client_.OpenURL(TEXT("http://10.0.0.2:8080/os files/a.bin:3,12"), path_));

  EXPECT_EQ(path_.view(), base::WideView(TEXT("os files/a.bin:3,12")));
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - CHTTPClient::OpenURL - entering "
                                      "!http://10.0.0.2:8080/os files/a.bin:3,12!",
                                      "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!",
                                      "Orvenix - CHTTPClient::OpenURL - Connect, 33554442",
                                      "Orvenix - CSocketIO::Connect - connect established",
                                      "Orvenix - CHTTPClient::OpenURL - Exiting"));
}

TEST_F(OpenUrlTest, FailsForANullUrlWithoutALine) {
  EXPECT_FALSE(client_.OpenURL(nullptr, path_));

  EXPECT_THAT(LogLines(), IsEmpty());
}

TEST_F(OpenUrlTest, LogsAUrlThatCannotBeRead) {
  EXPECT_FALSE(client_.OpenURL(TEXT("ftp://10.0.0.2:8080/x"), path_));

  EXPECT_THAT(LogLines(),
              ElementsAre("Orvenix - CHTTPClient::OpenURL - entering !ftp://10.0.0.2:8080/x!",
                          "Orvenix - CHTTPClient::OpenURL ParseURL error"));
  EXPECT_EQ(server().connections(), 0U);
}

TEST_F(OpenUrlTest, AskForNoPathThatWouldHaveToBeCut) {
  const std::u16string url = u"http://10.0.0.2:8080/" + std::u16string(700, u'x');

  EXPECT_FALSE(client_.OpenURL(url.c_str(), path_));

  EXPECT_EQ(server().connections(), 0U);
}

TEST_F(OpenUrlTest, NeverTakesAUrlForAFormat) {
  EXPECT_FALSE(client_.OpenURL(TEXT("%s%n%d"), path_));

  EXPECT_EQ(LogLines().front(), "Orvenix - CHTTPClient::OpenURL - entering !%s%n%d!");
}

TEST_F(OpenUrlTest, AUrlWithoutAPortDoesNotConnect) {
  EXPECT_FALSE(client_.OpenURL(TEXT("http://10.0.0.2/x"), path_));

  EXPECT_THAT(LogLines(),
              ElementsAre("Orvenix - CHTTPClient::OpenURL - entering !http://10.0.0.2/x!",
                          "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2/, 0!",
                          "Orvenix - CHTTPClient::OpenURL - Connect, 0",
                          "Orvenix - CSocketIO::Connect - Error !10049%",
                          "Orvenix - CSocketIO::Close", "Orvenix - OpenURL - could not connect"));
}

TEST_F(OpenUrlTest, LogsARefusedConnection) {
  server().StopAccepting();

  EXPECT_FALSE(client_.OpenURL(TEXT("http://10.0.0.2:8080/x"), path_));

  EXPECT_THAT(LogLines(),
              ElementsAre("Orvenix - CHTTPClient::OpenURL - entering "
                          "!http://10.0.0.2:8080/x!",
                          "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!",
                          "Orvenix - CHTTPClient::OpenURL - Connect, 33554442",
                          "Orvenix - CSocketIO::Connect - Error !10061%",
                          "Orvenix - CSocketIO::Close", "Orvenix - OpenURL - could not connect"));
  EXPECT_FALSE(client_.is_open());
}

TEST_F(OpenUrlTest, ClosesAConnectionThatDoesNotBecomeWritable) {
  device().faults().Add({"select", 1, 1, WSAENETDOWN});

  EXPECT_FALSE(client_.OpenURL(TEXT("http://10.0.0.2:8080/x"), path_));

  EXPECT_THAT(LogLines(),
              ElementsAre("Orvenix - CHTTPClient::OpenURL - entering "
                          "!http://10.0.0.2:8080/x!",
                          "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!",
                          "Orvenix - CHTTPClient::OpenURL - Connect, 33554442",
                          "Orvenix - CSocketIO::SocketWriteable - error = !10050!",
                          "Orvenix - OpenURL - could not connect", "Orvenix - CSocketIO::Close"));
  EXPECT_FALSE(client_.is_open());
}

TEST_F(OpenUrlTest, LogsASocketThatCannotBeMade) {
  device().faults().Add({"socket"});

  EXPECT_FALSE(client_.OpenURL(TEXT("http://10.0.0.2:8080/x"), path_));

  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - CHTTPClient::OpenURL - entering "
                                      "!http://10.0.0.2:8080/x!",
                                      "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!",
                                      "Orvenix - CSocketIO::CreateTcpSocket - Error Invalid Socket",
                                      "Orvenix - OpenURL - could not create socket"));
  EXPECT_EQ(DebugText(), "OpenURL  can not create socket");
}

TEST_F(OpenUrlTest, KeepsAConnectionToTheSameServer) {
  Open(client_);

  EXPECT_TRUE(client_.OpenURL(TEXT("http://10.0.0.2:8080/y"), path_));

  EXPECT_EQ(server().connections(), 1U);
  EXPECT_EQ(path_.view(), base::WideView(TEXT("y")));
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - CHTTPClient::OpenURL - entering "
                                      "!http://10.0.0.2:8080/y!",
                                      "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!",
                                      "Orvenix - CHTTPClient::OpenURL - Already Connected"));
}

TEST_F(OpenUrlTest, LeavesAConnectionToAnotherPort) {
  test::ScriptedServer other(world(), {kServerAddress, 8081});
  Open(client_);

  EXPECT_TRUE(client_.OpenURL(TEXT("http://10.0.0.2:8081/y"), path_));

  EXPECT_EQ(server().goodbyes(), 1);
  EXPECT_EQ(other.connections(), 1U);
  EXPECT_EQ(LogLines()[2], "Orvenix - CSocketIO::Close");
  EXPECT_EQ(DebugText(), "OpenURL  closing connection");
}

TEST_F(OpenUrlTest, LeavesAConnectionToAnotherAddress) {
  test::ScriptedServer other(world(), {kServerAddress + 1, kPort});
  Open(client_);

  EXPECT_TRUE(client_.OpenURL(TEXT("http://10.0.0.3:8080/y"), path_));

  EXPECT_EQ(server().goodbyes(), 1);
  EXPECT_EQ(other.connections(), 1U);
}

TEST_F(OpenUrlTest, ReplacesAConnectionThatCannotBeWritten) {
  Open(client_);
  device().faults().Add({"select", 1, 1, WSAENETDOWN});

  EXPECT_TRUE(client_.OpenURL(TEXT("http://10.0.0.2:8080/y"), path_));

  EXPECT_EQ(server().connections(), 2U);
  EXPECT_EQ(device().network().open_sockets(), 1U);
  EXPECT_THAT(LogLines(), ElementsAre("Orvenix - CHTTPClient::OpenURL - entering "
                                      "!http://10.0.0.2:8080/y!",
                                      "Orvenix - CHTTPClient::OpenURL - GetHostIp !10.0.0.2, 8080!",
                                      "Orvenix - CSocketIO::SocketWriteable - error = !10050!",
                                      "Orvenix - CSocketIO::Close",
                                      "Orvenix - CHTTPClient::OpenURL - Connect, 33554442",
                                      "Orvenix - CSocketIO::Connect - connect established",
                                      "Orvenix - CHTTPClient::OpenURL - Exiting"));
}

}  // namespace

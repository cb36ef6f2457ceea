#include "server/request.h"

#include <gtest/gtest.h>

namespace server {
namespace {

constexpr std::string_view kDeviceRequest =
    "GET apps/big file.bin:3,14 HTTP/1.1\r\nHost: 2.0.0.127\r\nUser-Agent: UpgradeClient\r\n"
    "Accept: */*\r\nConnection: Keep-Alive\r\nType: MR\r\nFamily: 7\r\nModel: TQ52\r\n"
    "SerialNum: 700123\r\nCore-name: MR700123\r\nBundle-rx: 41943040\r\nHTTP-fallback: 1\r\n"
    "Cache-Control: no-cache\r\n";

TEST(ParseRequestTest, ReadsADevicesRequestWithAllItSaysAboutItself) {
  const Request request = ParseRequest(kDeviceRequest);

  EXPECT_EQ(request.kind, RequestKind::kFile);
  EXPECT_EQ(request.path, "apps/big file.bin");
  EXPECT_EQ(request.attempt, 3U);
  EXPECT_EQ(request.total, 14U);
  EXPECT_EQ(request.identity.type, "MR");
  EXPECT_EQ(request.identity.family, "7");
  EXPECT_EQ(request.identity.model, "TQ52");
  EXPECT_EQ(request.identity.serial, "700123");
  EXPECT_EQ(request.identity.core_name, "MR700123");
  EXPECT_EQ(request.bundle_rx, 41943040U);
  EXPECT_EQ(request.http_fallback, true);
}

struct LineCase {
  const char* line;
  RequestKind kind;
  const char* path;
  const char* why;
};

TEST(ParseRequestTest, TakesARequestLineApartAsDevicesWriteIt) {
  static constexpr LineCase kCases[] = {
      {"GET a.txt HTTP/1.1", RequestKind::kFile, "a.txt", "no suffix"},
      {"GET a.txt:1,1 HTTP/1.1", RequestKind::kFile, "a.txt", "the suffix counts attempts"},
      {"GET dir\\sub\\a.txt:12,3 HTTP/1.1", RequestKind::kFile, "dir/sub/a.txt", "either slash"},
      {"GET a b  c.txt HTTP/1.1", RequestKind::kFile, "a b  c.txt", "blanks belong to the name"},
      {"GET a HTTP/1.1 b HTTP/1.1", RequestKind::kFile, "a HTTP/1.1 b", "the last version ends it"},
      {"GET a:1,2:3,4 HTTP/1.1", RequestKind::kFile, "a:1,2", "one suffix only"},
      {"GET a:1 HTTP/1.1", RequestKind::kFile, "a:1", "no comma, no suffix"},
      {"GET a:1, HTTP/1.1", RequestKind::kFile, "a:1,", "both numbers or none"},
      {"GET a:,1 HTTP/1.1", RequestKind::kFile, "a:,1", "both numbers or none"},
      {"GET a:-1,1 HTTP/1.1", RequestKind::kFile, "a:-1,1", "digits only"},
      {"GET /a HTTP/1.1", RequestKind::kFile, "/a", "kept, for the site to refuse"},
      {"GET  HTTP/1.1", RequestKind::kFile, "", "an empty path, for the site to refuse"},
      {"GET HTTP/1.1", RequestKind::kReport, "", "the report has no path"},
      {"HEAD a HTTP/1.1", RequestKind::kBadMethod, "", "only GET is known"},
      {"POST a HTTP/1.0", RequestKind::kBadMethod, "", "only GET is known"},
      {"GET a HTTP/1.0", RequestKind::kMalformed, "", "devices speak 1.1"},
      {"GET a", RequestKind::kMalformed, "", "no version"},
      {"get a HTTP/1.1", RequestKind::kMalformed, "", "letter case counts"},
      {"GETa HTTP/1.1", RequestKind::kMalformed, "", "no blank"},
      {"", RequestKind::kMalformed, "", "nothing"},
      {"hello", RequestKind::kMalformed, "", "garbage"},
      {"\x16\x03\x01\x02", RequestKind::kMalformed, "", "another protocol"},
  };
  for (const LineCase& c : kCases) {
    const Request request = ParseRequest(c.line);
    EXPECT_EQ(request.kind, c.kind) << c.line << ": " << c.why;
    EXPECT_EQ(request.path, c.path) << c.line << ": " << c.why;
  }
}

TEST(ParseRequestTest, ReadsTheReportOfASuccessfulJob) {
  const Request request = ParseRequest(
      "GET HTTP/1.1\r\nCore-name: MR700123\r\nBundle-rx: 0\r\nHTTP-fallback: 1\r\n"
      "Bundle-transfer: COMPLETE\r\n");

  EXPECT_EQ(request.kind, RequestKind::kReport);
  EXPECT_EQ(request.identity.core_name, "MR700123");
  EXPECT_EQ(request.bundle_rx, 0U);
  EXPECT_EQ(request.error, "");
}

TEST(ParseRequestTest, ReadsTheReportOfAFailedJobWithItsReason) {
  const Request request = ParseRequest(
      "GET HTTP/1.1\r\nCore-name: MR700123\r\nBundle-rx: 12\r\nHTTP-fallback: 0\r\n"
      "Bundle-transfer: COMPLETE\r\nError: Key: not found, 50% done\r\n");

  EXPECT_EQ(request.http_fallback, false);
  EXPECT_EQ(request.error, "Key: not found, 50% done");
}

TEST(ParseRequestTest, KnowsAReportByItsHeaderWhateverItsFirstLineIs) {
  EXPECT_EQ(ParseRequest("GET x HTTP/1.1\r\nBundle-transfer: COMPLETE").kind, RequestKind::kReport);
  EXPECT_EQ(ParseRequest("nonsense\r\nBundle-transfer: COMPLETE").kind, RequestKind::kReport);
  EXPECT_EQ(ParseRequest("GET x HTTP/1.1\r\nBundle-transfer: STARTED").kind, RequestKind::kFile);
}

TEST(ParseRequestTest, ReadsANegativeCountAsTheUnsignedNumberItWas) {
  EXPECT_EQ(ParseRequest("GET HTTP/1.1\r\nBundle-rx: -294967296").bundle_rx, 4000000000U);
}

TEST(ParseRequestTest, LetsNoErrorTextReplaceWhatStandsBeforeIt) {
  const Request request = ParseRequest(
      "GET HTTP/1.1\r\nCore-name: MR1\r\nBundle-rx: 5\r\nBundle-transfer: COMPLETE\r\n"
      "Error: first\r\nCore-name: MR2\r\nBundle-rx: 6\r\nError: second");

  EXPECT_EQ(request.identity.core_name, "MR1");
  EXPECT_EQ(request.bundle_rx, 5U);
  EXPECT_EQ(request.error, "first");
}

TEST(ParseRequestTest, KeepsWhatItShowsShortAndPrintable) {
  const Request request = ParseRequest("GET a HTTP/1.1\r\nModel: \x1B[2J\xC3\xA4\r\nCore-name: " +
                                       std::string(500, 'n'));

  EXPECT_EQ(request.identity.model, "?[2J??");
  EXPECT_EQ(request.identity.core_name, std::string(Request::kMaxIdentityText, 'n'));
}

}  // namespace
}  // namespace server

#include "http/request.h"

#include <gtest/gtest.h>

#include <cstring>

namespace {

TEST(FormatRequestTest, MakesTheRequestByteForByte) {
  char out[1024];
  const std::size_t length = http::FormatRequest(out, sizeof out, "os files/a.bin:3,12", "2.0.0.10",
                                                 {"7", "MR7", "MR70", "123456", "00112233"},
                                                 {/*bundle_rx=*/40960, /*http_fallback=*/1});

  EXPECT_STREQ(out,
               "GET os files/a.bin:3,12 HTTP/1.1\r\n"
               "Host: 2.0.0.10\r\n"
               "User-Agent: UpgradeClient\r\n"
               "Accept: */*\r\n"
               "Connection: Keep-Alive\r\n"
               "Type: 7\r\n"
               "Family: MR7\r\n"
               "Model: MR70\r\n"
               "SerialNum: 123456\r\n"
               "Core-name: 00112233\r\n"
               "Bundle-rx: 40960\r\n"
               "HTTP-fallback: 1\r\n"
               "Cache-Control: no-cache\r\n"
               "\r\n");
  EXPECT_EQ(length, std::strlen(out));
}

TEST(FormatRequestTest, PrintsNothingForAnIdentityThatIsNotKnown) {
  char out[1024];
  http::FormatRequest(out, sizeof out, "a", "", {}, {});

  EXPECT_NE(std::strstr(out, "\r\nHost: \r\n"), nullptr);
  EXPECT_NE(std::strstr(out, "\r\nType: \r\nFamily: \r\nModel: \r\nSerialNum: \r\nCore-name: \r\n"),
            nullptr);
}

TEST(FormatRequestTest, ShowsTheByteCountAsASignedNumber) {
  char out[1024];
  http::FormatRequest(out, sizeof out, "a", "", {}, {/*bundle_rx=*/4294967295U, 0});

  EXPECT_NE(std::strstr(out, "\r\nBundle-rx: -1\r\n"), nullptr);
}

TEST(FormatRequestTest, NeverTakesAPathForAFormat) {
  char out[1024];
  http::FormatRequest(out, sizeof out, "100%s%n.bin", "", {}, {});

  EXPECT_EQ(std::strncmp(out, "GET 100%s%n.bin HTTP/1.1\r\n", 26), 0);
}

TEST(FormatRequestTest, IsCutAtTheEndOfTheBuffer) {
  char out[12];
  std::memset(out, '#', sizeof out);
  EXPECT_EQ(http::FormatRequest(out, 10, "abcdefghij", "", {}, {}), 9U);

  EXPECT_STREQ(out, "GET abcde");
  EXPECT_EQ(out[10], '#');
}

TEST(FormatReportTest, HasNoErrorLineForASuccessfulJob) {
  for (const char* error_text : {"", static_cast<const char*>(nullptr)}) {
    char out[512];
    const std::size_t length =
        http::FormatReport(out, sizeof out, "00112233", {/*bundle_rx=*/0, 1}, error_text);

    EXPECT_STREQ(out,
                 "GET HTTP/1.1\r\n"
                 "Core-name: 00112233\r\n"
                 "Bundle-rx: 0\r\n"
                 "HTTP-fallback: 1\r\n"
                 "Bundle-transfer: COMPLETE\r\n"
                 "\r\n");
    EXPECT_EQ(length, std::strlen(out));
  }
}

TEST(FormatReportTest, CarriesTheErrorTextAsGiven) {
  char out[512];
  http::FormatReport(out, sizeof out, "", {}, "Wrong version 100%s");

  EXPECT_STREQ(out,
               "GET HTTP/1.1\r\n"
               "Core-name: \r\n"
               "Bundle-rx: 0\r\n"
               "HTTP-fallback: 0\r\n"
               "Bundle-transfer: COMPLETE\r\n"
               "Error: Wrong version 100%s\r\n"
               "\r\n");
}

}  // namespace

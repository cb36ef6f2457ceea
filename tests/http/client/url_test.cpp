#include "http/url.h"

#include <gtest/gtest.h>

#include <string>

#include "http/client/http_test.h"

namespace {

struct UrlCase {
  const WCHAR* url;
  const WCHAR* host;
  std::int32_t port;
  const WCHAR* path;
  const char* why;
};

TEST(ParseUrlTest, TakesHostPortAndPathApart) {
  static const UrlCase kCases[] = {
      {TEXT("http://10.0.0.2:8080/a/b.txt:1,7"), TEXT("10.0.0.2"), 8080, TEXT("a/b.txt:1,7"),
       "as the engine makes them; a colon behind the slash is part of the path"},
      {TEXT("HtTp://host:80/x"), TEXT("host"), 80, TEXT("x"), "any letter case"},
      {TEXT("http:\\\\host:80\\x\\y"), TEXT("host"), 80, TEXT("x\\y"), "backslashes"},
      {TEXT("http://host:80"), TEXT("host"), 80, TEXT(""), "no path"},
      {TEXT("http://host:80/"), TEXT("host"), 80, TEXT(""), "an empty path"},
      {TEXT("http://host:80//x"), TEXT("host"), 80, TEXT("/x"), "the first slash only"},
      {TEXT("http://host/x"), TEXT("host/"), 0, TEXT("x"),
       "deliberate: without a port the host keeps the slash"},
      {TEXT("http://host\\x"), TEXT("host\\"), 0, TEXT("x"), "and the backslash"},
      {TEXT("http://host"), TEXT("host"), 0, TEXT(""), "no port, no slash"},
      {TEXT("http://10.0.0.2:8080:80"), TEXT("10.0.0.2:8080"), 80, TEXT(""),
       "the last colon counts"},
      {TEXT("http://host:/x"), TEXT("host"), 0, TEXT("x"), "no digits"},
      {TEXT("http://host:80a/x"), TEXT("host"), 80, TEXT("x"), "leading digits"},
      {TEXT("http://"), TEXT(""), 0, TEXT(""), "nothing behind it"},
      {TEXT("http://:80/x"), TEXT(""), 80, TEXT("x"), "no host"},
  };
  for (const UrlCase& c : kCases) {
    const auto parts = http::ParseUrl(c.url);
    ASSERT_TRUE(parts.has_value()) << c.why;
    EXPECT_EQ(parts->host, base::WideView(c.host)) << c.why;
    EXPECT_EQ(parts->port, c.port) << c.why;
    EXPECT_EQ(parts->path, base::WideView(c.path)) << c.why;
  }
}

TEST(ParseUrlTest, RefusesWhatDoesNotBeginAsAUrl) {
  for (const WCHAR* url : {TEXT(""), TEXT("http:/"), TEXT("http:/x/y"), TEXT("http:/\\host:80/x"),
                           TEXT("https://host:80/x"), TEXT(" http://host:80/x"),
                           TEXT("10.0.0.2:8080/x"), TEXT("\u0168ttp://host:80/x")}) {
    EXPECT_FALSE(http::ParseUrl(url).has_value());
  }
}

TEST(FromFirstLetterTest, SkipsEverythingThatIsNoLetter) {
  EXPECT_EQ(http::FromFirstLetter(TEXT("/dir/file")), base::WideView(TEXT("dir/file")));
  EXPECT_EQ(http::FromFirstLetter(TEXT("/7xx/os.zip:1,1")), base::WideView(TEXT("xx/os.zip:1,1")));
  EXPECT_EQ(http::FromFirstLetter(TEXT("\\_.a")), base::WideView(TEXT("a")));
  EXPECT_EQ(http::FromFirstLetter(TEXT("[@`{Z")), base::WideView(TEXT("Z")))
      << "neighbours of the letters are no letters";
  EXPECT_EQ(http::FromFirstLetter(TEXT("\u00E9a")), base::WideView(TEXT("a"))) << "ASCII only";
  EXPECT_TRUE(http::FromFirstLetter(TEXT("/123/:1,1")).empty());
  EXPECT_TRUE(http::FromFirstLetter(TEXT("")).empty());
}

}  // namespace

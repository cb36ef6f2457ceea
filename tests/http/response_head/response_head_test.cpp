#include "http/response_head/response_head.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

namespace {

using http::HeadError;
using http::ParseResponseHead;
using http::ResponseHead;

constexpr std::uint32_t kBuffer = 16384;

const std::string kWhole =
    "HTTP/1.1 200 OK\r\nContent-Length: 5\r\nContent-Attributes: 33\r\n"
    "Content-timestamp: 2006-03-01 14:05:09\r\nContent-CRC32: 3421780262\r\n"
    "CheckPoint-BlockSize: 4096\r\n\r\nhello";

std::string Without(std::string_view line) {
  std::string head = kWhole;
  const std::size_t at = head.find(line);
  head.erase(at, head.find('\n', at) + 1 - at);
  return head;
}

std::string With(std::string_view name, std::string_view value) {
  std::string head = kWhole;
  const std::size_t at = head.find(name) + name.size();
  head.replace(at, head.find('\r', at) - at, value);
  return head;
}

HeadError Parse(std::string_view block, ResponseHead& head, bool crc_required = true) {
  return ParseResponseHead(block, crc_required, kBuffer, head);
}
HeadError Parse(std::string_view block) {
  ResponseHead head;
  return Parse(block, head);
}

TEST(ResponseHeadTest, ReadsEveryField) {
  ResponseHead head;
  ASSERT_EQ(Parse(kWhole, head), HeadError::kNone);

  EXPECT_EQ(head.content_length, 5U);
  EXPECT_EQ(head.attributes, 33U);
  EXPECT_EQ(head.time_stamp, " 2006-03-01 14:05:09") << "the leading blank belongs to it";
  EXPECT_EQ(head.crc32, 3421780262U);
  EXPECT_EQ(head.checkpoint_size, 4096U);
  EXPECT_EQ(kWhole.substr(head.body_offset), "hello");
}

TEST(ResponseHeadTest, LeavesAbsentWhatIsAbsent) {
  ResponseHead head;
  ASSERT_EQ(Parse("200 OK\r\nContent-Length:0\r\n\r\n", head, /*crc_required=*/false),
            HeadError::kNone);

  EXPECT_FALSE(head.attributes);
  EXPECT_FALSE(head.time_stamp);
  EXPECT_FALSE(head.crc32);
  EXPECT_FALSE(head.checkpoint_size);
}

TEST(ResponseHeadTest, RefusesInTheOrderOfTheNumbers) {
  EXPECT_EQ(Parse(""), HeadError::kNotOk);
  EXPECT_EQ(Parse("HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\n\r\n"), HeadError::kNotOk);
  EXPECT_EQ(Parse("HTTP/1.1 200 ok\r\n\r\n"), HeadError::kNotOk) << "letter case counts";
  EXPECT_EQ(Parse("200 OK"), HeadError::kNoLength);
  EXPECT_EQ(Parse("200 OK\r\ncontent-length: 5\r\n\r\n"), HeadError::kNoLength);
  EXPECT_EQ(Parse("200 OK\r\nContent-Length: 5"), HeadError::kNoCrc);
  EXPECT_EQ(Parse("200 OK\r\nContent-Length: 5\r\nContent-CRC32: 1\r\nCheckPoint-BlockSize: 16385"),
            HeadError::kBlockTooLarge);
  EXPECT_EQ(Parse("200 OK\r\nContent-Length: 5\r\nContent-CRC32: 1\r\n"), HeadError::kNoEnd);
}

TEST(ResponseHeadTest, GivesTheFieldsBeforeTheOneThatIsMissing) {
  ResponseHead head;
  ASSERT_EQ(Parse(Without("Content-CRC32"), head), HeadError::kNoCrc);

  EXPECT_EQ(head.content_length, 5U);
  EXPECT_EQ(head.attributes, 33U);
  EXPECT_TRUE(head.time_stamp);
  EXPECT_FALSE(head.checkpoint_size);
}

TEST(ResponseHeadTest, ForgetsWhatAnEarlierHeadLeft) {
  ResponseHead head;
  ASSERT_EQ(Parse(kWhole, head), HeadError::kNone);
  ASSERT_EQ(Parse("404", head), HeadError::kNotOk);

  EXPECT_EQ(head.content_length, 0U);
  EXPECT_FALSE(head.attributes);
  EXPECT_FALSE(head.crc32);
}

TEST(ResponseHeadTest, NeedsACrcOnlyWhenItIsChecked) {
  ResponseHead head;
  EXPECT_EQ(Parse(Without("Content-CRC32"), head, false), HeadError::kNone);
  EXPECT_EQ(Parse(kWhole, head, false), HeadError::kNone);
  EXPECT_EQ(head.crc32, 3421780262U);
}

TEST(ResponseHeadTest, FindsFieldsAnywhereInTheBlockTheBodyIncluded) {
  ResponseHead head;
  EXPECT_EQ(Parse("x\r\n\r\nContent-CRC32:7 Content-Length:9 200 OK", head), HeadError::kNone);

  EXPECT_EQ(head.content_length, 9U);
  EXPECT_EQ(head.crc32, 7U);
  EXPECT_EQ(head.body_offset, 5U);
}

TEST(ResponseHeadTest, TakesTheFirstOfSeveralFieldsOfOneName) {
  ResponseHead head;
  ASSERT_EQ(
      Parse("200 OK\r\nContent-Length: 1\r\nContent-Length: 2\r\nContent-CRC32: 3\r\n\r\n", head),
      HeadError::kNone);
  EXPECT_EQ(head.content_length, 1U);
}

struct LengthCase {
  const char* text;
  HeadError error;
  std::uint32_t length;
  const char* why;
};

TEST(ResponseHeadTest, TakesALengthWithDigitsThatFit32BitsAndNoOther) {
  static constexpr LengthCase kCases[] = {
      {"5", HeadError::kNone, 5, "no blank is needed"},
      {" \t 5", HeadError::kNone, 5, "white space is skipped"},
      {" 0", HeadError::kNone, 0, "an empty file is a file"},
      {" 00000000000000000012", HeadError::kNone, 12, "leading zeros"},
      {" 12abc", HeadError::kNone, 12, "what follows the digits is not read"},
      {" 4294967295", HeadError::kNone, 4294967295U, "the largest"},
      {" 4294967296", HeadError::kNoLength, 0, "one more"},
      {" 18446744073709551621", HeadError::kNoLength, 0, "5 modulo 2^64"},
      {" 99999999999999999999999", HeadError::kNoLength, 0, "many digits"},
      {"", HeadError::kNoLength, 0, "none"},
      {" -5", HeadError::kNoLength, 0, "a sign is no digit"},
      {" +5", HeadError::kNoLength, 0, "a sign is no digit"},
      {" five", HeadError::kNoLength, 0, "words"},
  };
  for (const LengthCase& c : kCases) {
    ResponseHead head;
    EXPECT_EQ(Parse(With("Content-Length:", c.text), head), c.error) << c.text << ": " << c.why;
    EXPECT_EQ(head.content_length, c.length) << c.text << ": " << c.why;
  }
}

TEST(ResponseHeadTest, AcceptsACheckpointBlockAsLargeAsTheBufferAndNoLarger) {
  EXPECT_EQ(Parse(With("CheckPoint-BlockSize:", " 16384")), HeadError::kNone);
  EXPECT_EQ(Parse(With("CheckPoint-BlockSize:", " 16385")), HeadError::kBlockTooLarge);
  EXPECT_EQ(Parse(With("CheckPoint-BlockSize:", " 4294967297")), HeadError::kBlockTooLarge)
      << "1 modulo 2^32";
  EXPECT_EQ(Parse(With("CheckPoint-BlockSize:", " none")), HeadError::kNone) << "reads as 0";
}

TEST(ResponseHeadTest, EndsTheHeadAtTheFirstEmptyLine) {
  ResponseHead head;
  const std::string head_text = "200 OK\r\nContent-Length: 5\r\nContent-CRC32: 3\r\n\r\n";
  ASSERT_EQ(Parse(head_text + "ab\r\n\r\ncd", head), HeadError::kNone);
  EXPECT_EQ(head.body_offset, head_text.size());

  const std::string bare = "200 OK\nContent-Length: 5\nContent-CRC32: 3\n\n";
  ASSERT_EQ(Parse(bare + "ab\n\ncd", head), HeadError::kNone);
  EXPECT_EQ(head.body_offset, bare.size());
}

TEST(ResponseHeadTest, PrefersTheProperLineEndWhereverItStands) {
  ResponseHead head;
  const std::string block = "200 OK\nContent-Length: 5\nContent-CRC32: 3\n\nab\r\n\r\ncd";
  ASSERT_EQ(Parse(block, head), HeadError::kNone);
  EXPECT_EQ(block.substr(head.body_offset), "cd");
}

TEST(ResponseHeadTest, CutsTheTimeStampAtTheEndOfItsLineOrOfTheBlock) {
  ResponseHead head;
  const std::string empty = With("Content-timestamp:", "");
  ASSERT_EQ(Parse(empty, head), HeadError::kNone);
  EXPECT_EQ(head.time_stamp, "");

  const std::string last = "200 OK Content-CRC32:1 Content-Length:1\n\nContent-timestamp: x\nrest";
  ASSERT_EQ(Parse(last, head), HeadError::kNone);
  EXPECT_EQ(head.time_stamp, " x\nrest") << "only a carriage return ends it";

  const std::string endless = With("Content-timestamp:", std::string(300, 'x'));
  ASSERT_EQ(Parse(endless, head), HeadError::kNone);
  EXPECT_EQ(head.time_stamp, std::string(255, 'x'));
}

TEST(ResponseHeadTest, MissesWhatAShorterBlockDoesNotHold) {
  // Whatever the length of the first segment, nothing behind it is seen.
  for (std::size_t size = 0; size < kWhole.size(); ++size) {
    const std::string block = kWhole.substr(0, size);  // its own memory: reading on is an error
    ResponseHead head;
    const HeadError error = Parse(block, head);
    const std::size_t end = kWhole.find("\r\n\r\n") + 4;
    EXPECT_EQ(error == HeadError::kNone, size >= end) << size;
  }
}

TEST(ResponseHeadTest, ReadsBlocksWithZerosInThem) {
  std::string block = "!200 OK!Content-Length:4!Content-CRC32:9!\n\nbody";
  std::replace(block.begin(), block.end(), '!', '\0');
  ResponseHead head;
  EXPECT_EQ(Parse(block, head), HeadError::kNone);
  EXPECT_EQ(head.content_length, 4U);
}

}  // namespace

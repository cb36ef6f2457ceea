#include "upgrade/list_file/list_file.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

namespace upgrade {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

using Fields = std::vector<std::string>;

std::vector<Fields> ReadAll(const std::string& bytes) {
  std::vector<Fields> records;
  ListFileReader reader(bytes);
  ListRecord record;
  while (reader.Next(&record)) {
    records.push_back({std::string(record.source), std::string(record.destination),
                       std::string(record.masks), std::string(record.crc),
                       std::string(record.size)});
  }
  return records;
}

TEST(ListFileReaderTest, ReadsFiveFieldsARecordInOrder) {
  EXPECT_THAT(ReadAll("b/a.bin,\\a.bin,TQ5* MR4*,3421780262,20\r\nb/c.bin,\\c.bin,*,7,8\r\n"),
              ElementsAre(Fields{"b/a.bin", "\\a.bin", "TQ5* MR4*", "3421780262", "20"},
                          Fields{"b/c.bin", "\\c.bin", "*", "7", "8"}));
}

TEST(ListFileReaderTest, ShiftsTheFieldsBehindAnEmptyOneOverTheLineEnd) {
  EXPECT_THAT(ReadAll("s1,,*,1,2\r\ns2,\\d2,*,3,4\r\n"),
              ElementsAre(Fields{"s1", "*", "1", "2", "s2"}))
      << "the second record is then incomplete and dropped";
}

TEST(ListFileReaderTest, TakesAnyRunOfSeparatorsAsOne) {
  EXPECT_THAT(ReadAll("\r\n,,s,\r\r\n\\d,,,*\n1\r2,,\n"),
              ElementsAre(Fields{"s", "\\d", "*", "1", "2"}));
}

TEST(ListFileReaderTest, DropsAnIncompleteLastRecord) {
  EXPECT_THAT(ReadAll("s,\\d,*,1"), IsEmpty());
  EXPECT_THAT(ReadAll("s,\\d,*,1,2\r\ns,\\d,*,1\r\n"),
              ElementsAre(Fields{"s", "\\d", "*", "1", "2"}));
}

TEST(ListFileReaderTest, NeedsNoLineEndBehindTheLastRecord) {
  EXPECT_THAT(ReadAll("s,\\d,*,1,2"), ElementsAre(Fields{"s", "\\d", "*", "1", "2"}));
}

TEST(ListFileReaderTest, EndsAtAZeroByte) {
  using namespace std::string_literals;
  EXPECT_THAT(ReadAll("s,\\d,*,1,2\0,s,\\d,*,1,2"s),
              ElementsAre(Fields{"s", "\\d", "*", "1", "2"}));
}

TEST(ListFileReaderTest, HasNoRecordInAnEmptyFile) {
  EXPECT_THAT(ReadAll(""), IsEmpty());
  EXPECT_THAT(ReadAll("\r\n\r\n"), IsEmpty());
}

TEST(ListFileReaderTest, KeepsBlanksInsideAndAroundFields) {
  EXPECT_THAT(ReadAll(" s 1 , \\d 1,*, 1, 2\r\n"),
              ElementsAre(Fields{" s 1 ", " \\d 1", "*", " 1", " 2"}));
}

TEST(ListFileReaderTest, PassesOverRecordsThatNoJobCouldHold) {
  const std::string good = "s,\\d,*,1,2\r\n";
  const Fields expected{"s", "\\d", "*", "1", "2"};
  EXPECT_THAT(ReadAll(std::string(260, 'x') + ",\\d,*,1,2\r\n" + good), ElementsAre(expected));
  EXPECT_THAT(ReadAll("s," + std::string(260, 'x') + ",*,1,2\r\n" + good), ElementsAre(expected));
  EXPECT_THAT(ReadAll("s,\\d," + std::string(2008, '*') + ",1,2\r\n" + good),
              ElementsAre(expected));
  EXPECT_THAT(ReadAll("s,\\d,*," + std::string(32, '1') + ",2\r\n" + good), ElementsAre(expected));
  EXPECT_THAT(ReadAll("s,\\d,*,1," + std::string(32, '2') + "\r\n" + good), ElementsAre(expected));
}

TEST(ListFileReaderTest, TakesFieldsOfExactlyTheSizeThatAJobHolds) {
  const Fields longest{std::string(259, 's'), std::string(259, 'd'), std::string(2007, '*'),
                       std::string(31, '1'), std::string(31, '2')};
  EXPECT_THAT(ReadAll(longest[0] + "," + longest[1] + "," + longest[2] + "," + longest[3] + "," +
                      longest[4]),
              ElementsAre(longest));
}

}  // namespace
}  // namespace upgrade

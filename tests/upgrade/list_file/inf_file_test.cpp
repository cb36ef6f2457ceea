#include "upgrade/list_file/inf_file.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

namespace upgrade {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace std::string_literals;

using Entry = std::vector<std::string>;

std::vector<Entry> ReadAll(const std::string& bytes) {
  std::vector<Entry> entries;
  InfFileReader reader(bytes);
  InfEntry entry;
  while (reader.Next(&entry)) {
    entries.push_back(
        {std::string(entry.pattern), std::string(entry.source), std::string(entry.destination)});
  }
  return entries;
}

TEST(InfFileReaderTest, ReadsThreeQuotedTextsALine) {
  EXPECT_THAT(
      ReadAll("\"TQ5*\" \"apps\\a.cab\" \"\\Temp\\a.cab\"\r\n"
              "\"*\",\"b.cab\",\"\\b.cab\"\r\n"),
      ElementsAre(Entry{"TQ5*", "apps\\a.cab", "\\Temp\\a.cab"}, Entry{"*", "b.cab", "\\b.cab"}));
}

TEST(InfFileReaderTest, EndsLinesAtCarriageReturnOrLineFeed) {
  EXPECT_THAT(ReadAll("\"p\"\"s\"\"d\"\r\"q\"\"s\"\"d\"\n\n\r\n\"r\"\"s\"\"d\""),
              ElementsAre(Entry{"p", "s", "d"}, Entry{"q", "s", "d"}, Entry{"r", "s", "d"}));
}

TEST(InfFileReaderTest, SkipsBlanksAndTabsBeforeTheFirstQuote) {
  EXPECT_THAT(ReadAll(" \t \"p\" = \"s\" -> \"d\" ; remark\n"), ElementsAre(Entry{"p", "s", "d"}));
}

TEST(InfFileReaderTest, IgnoresLinesThatDoNotBeginWithAQuote) {
  EXPECT_THAT(ReadAll("[Files]\n; \"p\" \"s\" \"d\"\nx\"p\"\"s\"\"d\"\n\v\"p\"\"s\"\"d\"\n"),
              IsEmpty());
}

TEST(InfFileReaderTest, PassesOverIncompleteEntries) {
  EXPECT_THAT(ReadAll("\"p\" \"s\"\n\"p\" \"s\" \"d\n\"p\n\"\n\"ok\" \"s\" \"d\"\n"),
              ElementsAre(Entry{"ok", "s", "d"}));
}

TEST(InfFileReaderTest, NeverReadsATextOverALineEnd) {
  EXPECT_THAT(ReadAll("\"p\" \"s\" \"d\r\n\"\n"), IsEmpty());
}

TEST(InfFileReaderTest, PassesOverTextsThatAreTooLong) {
  const std::string longest(259, 'x');
  EXPECT_THAT(ReadAll("\"p\" \"" + longest + "x\" \"d\"\n"), IsEmpty());
  EXPECT_THAT(ReadAll("\"p\" \"s\" \"" + longest + "x\"\n"), IsEmpty());
  EXPECT_THAT(ReadAll("\"" + longest + "x\" \"s\" \"d\"\n"), IsEmpty());
  EXPECT_THAT(ReadAll("\"p\" \"" + longest + "\" \"d\"\n"), ElementsAre(Entry{"p", longest, "d"}));
}

TEST(InfFileReaderTest, PassesOverTextsWithAZeroByte) {
  EXPECT_THAT(ReadAll("\"p\" \"s\0x\" \"d\"\n\"ok\" \"s\" \"d\"\n"s),
              ElementsAre(Entry{"ok", "s", "d"}));
}

TEST(InfFileReaderTest, KeepsEmptyTexts) {
  EXPECT_THAT(ReadAll("\"\" \"\" \"\""), ElementsAre(Entry{"", "", ""}));
}

}  // namespace
}  // namespace upgrade

// The catalogue against the product's sources: what the device can say, `orvenix explain` knows.

#include "tools/explain/catalogue.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <regex>
#include <set>
#include <string>
#include <vector>

#include "tools/explain/text_match.h"
#include "tools/file_text.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

const std::string kLiterals = R"re(((?:\s*"(?:[^"\\]|\\.)*")+))re";

/// Source text without its comments; literals stay whole.
std::string WithoutComments(const std::string& source) {
  std::string code;
  bool in_text = false;
  for (std::size_t i = 0; i < source.size(); ++i) {
    if (!in_text && source.compare(i, 2, "//") == 0) {
      i = std::min(source.find('\n', i), source.size() - 1);
    }
    if (source[i] == '"') in_text = !in_text;
    code += source[i];
    if (in_text && source[i] == '\\') code += source[++i];
  }
  return code;
}

/// What adjacent literals stand for.
std::string Unescape(const std::string& literals) {
  static const std::map<char, char> kEscapes = {{'r', '\r'}, {'n', '\n'}, {'t', '\t'}, {'0', '\0'}};
  std::string text;
  bool inside = false;
  for (std::size_t i = 0; i < literals.size(); ++i) {
    if (literals[i] == '"') {
      inside = !inside;
    } else if (inside && literals[i] == '\\') {
      const auto escape = kEscapes.find(literals[++i]);
      text += escape == kEscapes.end() ? literals[i] : escape->second;
    } else if (inside) {
      text += literals[i];
    }
  }
  return text;
}

struct Said {
  std::string where;
  std::string format;
  bool on_screen = false;
};

/// Every format that the sources hand to the log and to the screen. A call whose format cannot be
/// read from the source is a failure of its own.
std::vector<Said> EverythingSaid() {
  std::map<std::string, std::string> sources;
  for (const auto& entry : fs::recursive_directory_iterator(ORVENIX_SOURCES)) {
    const auto ending = entry.path().extension();
    if (ending != ".cpp" && ending != ".h") continue;
    sources[entry.path().lexically_relative(ORVENIX_SOURCES).generic_string()] =
        WithoutComments(ReadWholeFile(entry.path()));
  }
  const std::regex constant(R"re(\b(k\w+)\[\]\s*=)re" + kLiterals + ";");
  const std::regex call(R"re(\b(Log|ShowStatus)\((?:)re" + kLiterals +
                        R"re(|\s*(?:\w+::)*(k\w+)|\s*([^\s)]*)))re");
  std::multimap<std::string, std::string> constants;
  for (const auto& [file, text] : sources) {
    for (std::sregex_iterator at(text.begin(), text.end(), constant), end; at != end; ++at) {
      constants.emplace((*at)[1], Unescape((*at)[2]));
    }
  }
  std::vector<Said> said;
  for (const auto& [file, text] : sources) {
    for (std::sregex_iterator at(text.begin(), text.end(), call), end; at != end; ++at) {
      const bool on_screen = (*at)[1] == "ShowStatus";
      if ((*at)[2].matched) {
        said.push_back({file, Unescape((*at)[2]), on_screen});
      } else if ((*at)[3].matched) {
        const auto [first, last] = constants.equal_range((*at)[3]);
        EXPECT_NE(first, last) << file << ": no text " << (*at)[3];
        for (auto known = first; known != last; ++known) {
          said.push_back({file, known->second, on_screen});
        }
      } else {
        EXPECT_EQ((*at)[4], "const") << file << ": a format that cannot be read: " << (*at)[0];
      }
    }
  }
  return said;
}

TEST(CatalogueTest, KnowsEveryTextThatTheSourcesSay) {
  std::set<std::pair<std::string, bool>> known;
  for (const TextRow& row : Texts()) known.emplace(row.format, row.on_screen);
  std::set<std::pair<std::string, bool>> of_the_client;
  for (const TextRow& row : ClientTexts()) of_the_client.emplace(row.format, row.on_screen);

  const std::vector<Said> said = EverythingSaid();

  EXPECT_GT(said.size(), 100U) << "the sources were not found";
  for (const Said& text : said) {
    const bool by_client = text.where.compare(0, 6, "mcftp/") == 0;
    EXPECT_EQ((by_client ? of_the_client : known).count({text.format, text.on_screen}), 1U)
        << text.where << " says what tools/explain does not know: " << text.format;
  }
}

TEST(CatalogueTest, HasEachTextAndEachNumberOnce) {
  std::set<std::pair<std::string, bool>> texts;
  for (const TextRow& row : Texts()) {
    EXPECT_TRUE(texts.emplace(row.format, row.on_screen).second) << row.format;
    EXPECT_STRNE(row.meaning, "") << row.format;
  }
  std::set<std::pair<CodeKind, std::uint32_t>> codes;
  for (const CodeRow& row : Codes()) {
    EXPECT_TRUE(codes.emplace(row.kind, row.value).second) << row.name;
    EXPECT_STRNE(row.meaning, "") << row.name;
  }
}

TEST(CatalogueTest, SaysWhatToDoAboutEveryTroubleOfTheLog) {
  for (const TextRow& row : Texts()) {
    const bool trouble = row.weight == Weight::kTrouble || row.weight == Weight::kFatal;
    const std::string text = row.format;
    const bool harmless = text.find("IPToString") != std::string::npos ||
                          text.find("MCStatusThread") != std::string::npos ||
                          text.find("Error: ") != std::string::npos;
    if (trouble && !harmless) {
      EXPECT_STRNE(row.remedy, "") << text;
    }
  }
}

/// The line that a format gives, with `text` for every "%s".
std::string Written(const std::string& format, const std::string& text) {
  std::string line;
  for (std::size_t i = 0; i < format.size(); ++i) {
    if (format[i] != '%') {
      line += format[i];
    } else {
      ++i;
      line += format[i] == 's' ? text : format[i] == 'd' ? "-12" : "%";
    }
  }
  while (!line.empty() && (line.back() == '\r' || line.back() == '\n')) line.pop_back();
  return line;
}

TEST(TextMatcherTest, FindsEachTextInTheLineThatItGives) {
  const TextMatcher log, screen(true);
  for (const TextRow& row : Texts()) {
    const std::string format = row.format;
    if (format.find_first_not_of("%s\r\n") == std::string::npos) continue;
    for (const char* text :
         {"x", "", "a, 5, 6", "!", "\\A folder\\b.txt", "http://10.0.0.2:80/a:1,2"}) {
      const std::string line = Written(format, text);
      const TextMatch match = (row.on_screen ? screen : log).Find(line);
      ASSERT_NE(match.row, nullptr) << line;
      // "Error getting file x" and the like may be read in more ways than one only with odd texts.
      if (std::string(text) == "x") {
        EXPECT_STREQ(match.row->format, row.format) << line;
      }
      if (format.find("%d") != std::string::npos && match.row == &row) {
        EXPECT_EQ(match.number, 0U - 12U) << line;
      }
    }
  }
}

TEST(TextMatcherTest, LeavesOtherLinesAlone) {
  const TextMatcher log;

  for (const char* line : {"", "x", "Orvenix - ", "Orvenix", "\xFF\xFE", "good CRC",
                           "Orvenix - good CRC ", "Orvenix - CSocketIO::Connect - Error !%",
                           "PerformTests - ", "%s", "IcfgSetField - Port"}) {
    EXPECT_EQ(log.Find(line).row, nullptr) << line;
  }
}

TEST(TextMatcherTest, FindsTheNextTextBehindOneWithoutALineEnd) {
  const TextMatcher log;

  const TextMatch first =
      log.Find("Multicast Fallback Mode...Orvenix - UpgradeThread - Validate Files");
  ASSERT_NE(first.row, nullptr);
  EXPECT_EQ(first.rest, "Orvenix - UpgradeThread - Validate Files");
  EXPECT_NE(log.Find(first.rest).row, nullptr);
  EXPECT_EQ(log.Find("Server = !http://10.0.0.2!Error getting file a").rest,
            "Error getting file a");
}

TEST(TextMatcherTest, ReadsTheTimeOfASyslogLine) {
  const StampedLine line = SplitStamp("< 14>2006-03-01 14:05:09 Orvenix - good CRC");

  EXPECT_EQ(line.time, "2006-03-01 14:05:09");
  EXPECT_EQ(line.message, "Orvenix - good CRC");
  EXPECT_EQ(SplitStamp("2006/03/01:14:05:09Orvenix - good CRC").message, "Orvenix - good CRC");
  EXPECT_EQ(SplitStamp("2006-03-01").time, "");
}

}  // namespace
}  // namespace tools

#include "mcftp/rules/command_line.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using mcftp::CommandLine;
using mcftp::ParseCommandLine;

CommandLine Parse(std::string_view line) {
  CommandLine options;
  EXPECT_TRUE(ParseCommandLine(line, options)) << line;
  return options;
}
bool IsMalformed(std::string_view line) {
  CommandLine options;
  return !ParseCommandLine(line, options);
}

TEST(ParseCommandLineTest, SetsWhatEachOptionSays) {
  const CommandLine options =
      Parse("-UA=127.0.0.1 -UP=5001 -A=239.1.1.1 -P=7000 -HV=MR41 -DA=10.0.0.3 -DP=514");

  EXPECT_EQ(options.local_ui.view(), "127.0.0.1");
  EXPECT_EQ(options.local_ui_port, 5001);
  EXPECT_EQ(options.public_group.view(), "239.1.1.1");
  EXPECT_EQ(options.public_port, 7000);
  EXPECT_EQ(options.mct.view(), "MR41");
  EXPECT_EQ(options.debug.view(), "10.0.0.3");
  EXPECT_EQ(options.debug_port, 514);
}

TEST(ParseCommandLineTest, RefusesALineWithAnOptionThatBeginsLikeNone) {
  EXPECT_TRUE(IsMalformed("-X=1"));
  EXPECT_TRUE(IsMalformed("-A=239.1.1.1 -X=1"));
  EXPECT_TRUE(IsMalformed("-X=1 -A=239.1.1.1"));
  EXPECT_TRUE(IsMalformed("=1"));
  EXPECT_TRUE(IsMalformed("-A =239.1.1.1")) << "the blank makes two options of it";
  EXPECT_TRUE(IsMalformed("\t-P=7000")) << "a tab is no blank";
  EXPECT_TRUE(IsMalformed("-P=7000\r\n-A=1 \n"));
}

TEST(ParseCommandLineTest, RefusesAnEmptyLineButNotOneOfBlanks) {
  EXPECT_TRUE(IsMalformed(""));
  EXPECT_TRUE(Parse("   ").public_group.empty());
  EXPECT_EQ(Parse(" - / ").public_port, 0);
}

TEST(ParseCommandLineTest, DividesAtBlanksSlashesAndDashes) {
  const CommandLine options = Parse("/P=7000/A=239.1.1.1-UP=5001   UA=127.0.0.1");

  EXPECT_EQ(options.public_port, 7000);
  EXPECT_EQ(options.public_group.view(), "239.1.1.1");
  EXPECT_EQ(options.local_ui_port, 5001);
  EXPECT_EQ(options.local_ui.view(), "127.0.0.1");
}

TEST(ParseCommandLineTest, CutsAnMctAtItsFirstSeparator) {
  EXPECT_EQ(Parse("-HV=MR41-A").mct.view(), "MR41") << "and A is an option without a value";
  EXPECT_EQ(Parse("-HV=MR41/A").mct.view(), "MR41");
  EXPECT_TRUE(IsMalformed("-HV=TQ52-BE")) << "no option begins with B";
}

TEST(ParseCommandLineTest, TakesLettersInEitherCase) {
  const CommandLine options = Parse("-a=239.1.1.1 -p=7000 -uA=127.0.0.1 -Up=1 -hv=mr41 -dp=514");

  EXPECT_EQ(options.public_group.view(), "239.1.1.1");
  EXPECT_EQ(options.public_port, 7000);
  EXPECT_EQ(options.local_ui.view(), "127.0.0.1");
  EXPECT_EQ(options.local_ui_port, 1);
  EXPECT_EQ(options.mct.view(), "mr41") << "the value stays as it is";
  EXPECT_EQ(options.debug_port, 514);
}

TEST(ParseCommandLineTest, IgnoresWhatItKnowsByTheFirstLetterOnly) {
  const CommandLine options = Parse("-UX=1 -U=1 -U -HX=1 -DZ=1 -A -P -PA=7 -AA=1.1.1.1 -UAA=1");

  EXPECT_TRUE(options.public_group.empty());
  EXPECT_TRUE(options.local_ui.empty());
  EXPECT_TRUE(options.mct.empty());
  EXPECT_EQ(options.public_port, 0);
}

TEST(ParseCommandLineTest, LeavesASettingAloneForAZeroOrAnEmptyValue) {
  const CommandLine options =
      Parse("-A=239.1.1.1 -P=7000 -HV=MR41 -UA=127.0.0.1 -A= -P=0 -P= -HV= -UA= -P=x");

  EXPECT_EQ(options.public_group.view(), "239.1.1.1");
  EXPECT_EQ(options.public_port, 7000);
  EXPECT_EQ(options.mct.view(), "MR41");
  EXPECT_EQ(options.local_ui.view(), "127.0.0.1");
}

TEST(ParseCommandLineTest, TakesTheLastOfEqualOptions) {
  EXPECT_EQ(Parse("-P=1 -P=2").public_port, 2);
}

TEST(ParseCommandLineTest, IgnoresPortsThatAreNone) {
  EXPECT_EQ(Parse("-P=65535").public_port, 65535);
  EXPECT_EQ(Parse("-P=65536").public_port, 0);
  EXPECT_EQ(Parse("-P=4294967297").public_port, 0);
  EXPECT_EQ(Parse("-P=99999999999999999999").public_port, 0);
  EXPECT_EQ(Parse("-P=12x4").public_port, 12) << "digits up to the first other character";
}

TEST(ParseCommandLineTest, KeepsAnOverlongAddressAsOneThatIsNone) {
  const CommandLine options = Parse("-A=239.100.100.1001");

  EXPECT_EQ(options.public_group.view(), "too long") << "cut, it would be another address";
}

TEST(ParseCommandLineTest, CutsAnOverlongMctAt63Characters) {
  EXPECT_EQ(Parse("-HV=" + std::string(300, 'A')).mct.view(), std::string(63, 'A'));
}

TEST(ParseCommandLineTest, TakesAnEqualsSignInAValue) {
  EXPECT_EQ(Parse("-HV=A=B").mct.view(), "A=B");
}

}  // namespace

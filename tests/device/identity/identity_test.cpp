#include "device/identity/identity.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <string>
#include <string_view>

#include "ce/errors.h"
#include "faults/faults.h"
#include "orvenix/upgrade_config.h"
#include "support/device_test.h"
#include "trace/trace.h"

namespace device {
namespace {

using ::testing::HasSubstr;

// The readers remember the platform's answers as long as the process lives; each test runs in a
// process of its own.
class IdentityTest : public DeviceTest {
 protected:
  explicit IdentityTest(const sim::Profile& profile = {}) : DeviceTest(profile) {}

  using Reader = IdentityResult (*)(char*, int*) noexcept;

  /// What `reader` copies into a buffer of `capacity` characters, "!" and the code on a failure.
  static std::string Read(Reader reader, int capacity = 64) {
    std::array<char, 80> text;
    text.fill('\xBD');
    int size = capacity;
    const IdentityResult result = reader(text.data(), &size);
    if (result != IdentityResult::kOk) {
      EXPECT_EQ(text[0], '\xBD') << "a failure writes nothing";
      return "!" + std::to_string(static_cast<int>(result));
    }
    EXPECT_EQ(std::string(text.data()).size(), static_cast<std::size_t>(size));
    EXPECT_EQ(text[static_cast<std::size_t>(size) + 1], '\xBD') << "nothing behind the terminator";
    return text.data();
  }
};

sim::Profile On(const char* platform) {
  sim::Profile profile;
  profile.platform = platform;
  return profile;
}

// ---- the serial number ----

struct SerialCase {
  const char* name;
  const char* platform;
  const char* network_id;
  std::uint32_t major;
  std::uint32_t minor;
  const char* serial;
};

sim::Profile ProfileOf(const SerialCase& c) {
  sim::Profile profile = On(c.platform);
  profile.network_id = c.network_id;
  profile.serial = "ZQ-0042";
  profile.os_major = c.major;
  profile.os_minor = c.minor;
  return profile;
}

class SerialNumberTest : public IdentityTest, public ::testing::WithParamInterface<SerialCase> {
 protected:
  SerialNumberTest() : IdentityTest(ProfileOf(GetParam())) {}
};

TEST_P(SerialNumberTest, FollowsPlatformAndSystemVersion) {
  EXPECT_EQ(Read(GetSerialNumber), GetParam().serial);
  EXPECT_EQ(Read(GetSerialNumber), GetParam().serial) << "the second time from memory";
  EXPECT_LE(device().faults().Count("KernelIoControl"), 2U);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, SerialNumberTest,
    ::testing::Values(
        SerialCase{"TextOnZq", "Corvanta Zq", "5E4D3C2B1A00", 5, 0, "ZQ-0042"},
        SerialCase{"TextOnMr7", "Corvanta MR7", "5E4D3C2B1A00", 5, 0, "ZQ-0042"},
        SerialCase{"OtherLetterCaseIsAnotherPlatform", "corvanta zq", "5E4D3C2B1A00", 5, 0,
                   "1A2B3C4D5E"},
        SerialCase{"OldSystemDropsAllZeros", "Corvanta X", "5E4D3C2B1A00", 5, 0, "1A2B3C4D5E"},
        SerialCase{"OldSystemDropsManyZeros", "Corvanta X", "5E4D3C000000", 5, 1, "3C4D5E"},
        SerialCase{"OldSystemDropsAnAddressOfZeros", "Corvanta X", "000000000000", 5, 0, ""},
        SerialCase{"NewSystemDropsOneZero", "Corvanta X", "5E4D3C2B1A00", 5, 2, "01A2B3C4D5E"},
        SerialCase{"NewSystemWithoutZero", "Corvanta X", "5E4D3C2B1A10", 6, 0, "101A2B3C4D5E"},
        SerialCase{"MajorSixIsNew", "Corvanta X", "5E4D3C2B1A00", 6, 0, "01A2B3C4D5E"},
        SerialCase{"Version420CountsAsNew", "Corvanta X", "5E4D3C2B1A00", 4, 20, "01A2B3C4D5E"},
        SerialCase{"Version51IsOld", "Corvanta X", "5E4D3C2B1A00", 5, 1, "1A2B3C4D5E"},
        SerialCase{"LettersAreCapitals", "Corvanta X", "abcdefabcdef", 5, 0, "EFCDABEFCDAB"}),
    [](const auto& each) { return each.param.name; });

TEST_F(IdentityTest, CopiesOnlyIntoABufferThatIsLongerThanTheText) {
  EXPECT_EQ(Read(GetSerialNumber, 9), "MR700123");
  EXPECT_EQ(Read(GetSerialNumber, 8), "!-8");
  EXPECT_EQ(Read(GetSerialNumber, 0), "!-8");
  EXPECT_EQ(Read(GetSerialNumber, -1), "!-8");
  int size = 4;
  char text[4];
  EXPECT_EQ(GetSerialNumber(text, &size), IdentityResult::kTooSmall);
  EXPECT_EQ(size, 8) << "says how long the text is";
}

TEST_F(IdentityTest, IsEmptyWithoutAnAnswerAndAsksAgain) {
  device().faults().Add({"KernelIoControl", 1, 1, 0});

  EXPECT_EQ(Read(GetSerialNumber), "");
  EXPECT_EQ(Read(GetSerialNumber), "MR700123");
}

TEST_F(IdentityTest, CountsASystemWithoutAVersionAsOld) {
  Restart(On("Corvanta X"));
  device().faults().Add({"GetVersionExW", 1, 0, 0});

  EXPECT_EQ(Read(GetSerialNumber), "1A2B3C4D5E");
}

// ---- how long an answer may be ----

struct AnswerCase {
  const char* name;
  std::size_t characters;  ///< of both texts; the platform's answer has a terminating zero more
  bool counts;
  const char* unique_id;
};

sim::Profile ProfileOf(const AnswerCase& c) {
  sim::Profile profile;
  profile.serial = std::string(c.characters, 'S');
  profile.configuration = std::string(c.characters, 'C');
  return profile;
}

class AnswerLengthTest : public IdentityTest, public ::testing::WithParamInterface<AnswerCase> {
 protected:
  AnswerLengthTest() : IdentityTest(ProfileOf(GetParam())) {}
};

TEST_P(AnswerLengthTest, CountsUpTo255BytesAndIsCutToWhatIsRemembered) {
  const std::size_t length = GetParam().characters;
  const bool counts = GetParam().counts;

  EXPECT_EQ(Read(GetSerialNumber),
            counts ? std::string(std::min<std::size_t>(length, 63), 'S') : "");
  EXPECT_EQ(Read(GetConfigurationText),
            counts ? std::string(std::min<std::size_t>(length, 31), 'C') : "!-1");
  EXPECT_EQ(Read(GetUniqueId), GetParam().unique_id);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, AnswerLengthTest,
    ::testing::Values(
        AnswerCase{"Characters23", 23, true, "CCCCSSSSSSSSSSSSSSSSSSSSSSS"},
        AnswerCase{"Characters32", 32, true, "!-8"},  // the serial number does not fit any more
        AnswerCase{"Characters63", 63, true, "!-8"}, AnswerCase{"Characters64", 64, true, "!-8"},
        AnswerCase{"Bytes255", 254, true, "!-8"}, AnswerCase{"Bytes256", 255, false, "!-1"},
        AnswerCase{"Bytes257", 256, false, "!-1"}),
    [](const auto& each) { return each.param.name; });

// ---- configuration text and unique id ----

struct SelectorCase {
  const char* name;
  const char* platform;
  int selector;
};

class SelectorTest : public IdentityTest, public ::testing::WithParamInterface<SelectorCase> {
 protected:
  SelectorTest() : IdentityTest(On(GetParam().platform)) {}
};

TEST_P(SelectorTest, AsksForTheConfigurationTextAsThePlatformWantsIt) {
  std::string calls;
  device().trace().SetSink([&calls](std::string_view line) { calls.append(line); });

  EXPECT_EQ(Read(GetConfigurationText), "TQ52-A1");

  device().trace().SetSink({});
  EXPECT_THAT(calls, HasSubstr("\"selector\":" + std::to_string(GetParam().selector) + "}"));
}

INSTANTIATE_TEST_SUITE_P(Cases, SelectorTest,
                         ::testing::Values(SelectorCase{"Zq", "Corvanta Zq", 39},
                                           SelectorCase{"Mr7", "Corvanta MR7", 10},
                                           SelectorCase{"LongerName", "Corvanta Zq2", 10},
                                           SelectorCase{"ShorterName", "Corvanta Z", 10},
                                           SelectorCase{"OtherLetterCase", "CORVANTA ZQ", 10},
                                           SelectorCase{"AnotherMaker", "Jupiter", 10}),
                         [](const auto& each) { return each.param.name; });

TEST_F(IdentityTest, ReadsTheConfigurationTextOnce) {
  EXPECT_EQ(Read(GetConfigurationText), "TQ52-A1");
  EXPECT_EQ(Read(GetConfigurationText), "TQ52-A1");

  EXPECT_EQ(device().faults().Count("KernelIoControl"), 1U);
  EXPECT_EQ(device().faults().Count("SystemParametersInfoW"), 1U);
}

TEST_F(IdentityTest, HasNoConfigurationTextWithoutAnAnswer) {
  device().faults().Add({"KernelIoControl", 1, 1, 0});

  EXPECT_EQ(Read(GetConfigurationText), "!-1");
  EXPECT_EQ(Read(GetConfigurationText), "TQ52-A1") << "a failure is not remembered";
}

TEST_F(IdentityTest, JoinsFourCharactersAndTheSerialNumberToTheUniqueId) {
  EXPECT_EQ(Read(GetUniqueId), "TQ52MR700123");
}

TEST_F(IdentityTest, KeepsTheUniqueIdThatASerialNumberUnreadOnceHasLeft) {
  ASSERT_EQ(Read(GetConfigurationText), "TQ52-A1");
  device().faults().Add({"KernelIoControl", 1, 1, 0});

  EXPECT_EQ(Read(GetUniqueId), "TQ52");

  EXPECT_EQ(Read(GetSerialNumber), "MR700123") << "the serial number can be read again";
  EXPECT_EQ(Read(GetUniqueId), "TQ52") << "and the unique id stays as it is";
  EXPECT_STREQ(UpgradeConfig().GetUniqueId(), "TQ52");
}

TEST_F(IdentityTest, RemembersNoUniqueIdWhenTheConfigurationTextIsMissing) {
  device().faults().Add({"KernelIoControl", 1, 1, 0});

  EXPECT_EQ(Read(GetUniqueId), "!-1");
  EXPECT_EQ(Read(GetUniqueId), "TQ52MR700123");
}

TEST_F(IdentityTest, AsksAgainWhatPlatformItIsUntilItIsTold) {
  device().faults().Add({"SystemParametersInfoW", 1, 1, 0});

  EXPECT_EQ(Read(GetSerialNumber), "!-1");
  EXPECT_EQ(Read(GetSerialNumber), "MR700123");
}

class NoPlatformTest : public IdentityTest {
 protected:
  NoPlatformTest() : IdentityTest(On("")) {}
};

TEST_F(NoPlatformTest, FailsInAllReadersAndLeavesTheJobWithoutIdentity) {
  EXPECT_EQ(Read(GetConfigurationText), "!-1");
  EXPECT_EQ(Read(GetSerialNumber), "!-1");
  EXPECT_EQ(Read(GetUniqueId), "!-1");

  const UpgradeConfig job;
  for (const char* text : {job.GetSerialNumber(), job.GetMfgString(), job.GetType(),
                           job.GetFamily(), job.GetModel(), job.GetUniqueId()}) {
    EXPECT_STREQ(text, "");
  }
  EXPECT_STREQ(job.GetFlash(), "0");
}

// ---- what a job makes of it ----

struct JobCase {
  const char* name;
  const char* configuration;
  const char* mfg;
  const char* type;
  const char* family;
  const char* model;
  const char* unique_id;
};

sim::Profile ProfileOf(const JobCase& c) {
  sim::Profile profile;
  profile.configuration = c.configuration;
  profile.serial = "S1";
  return profile;
}

class JobIdentityTest : public IdentityTest, public ::testing::WithParamInterface<JobCase> {
 protected:
  JobIdentityTest() : IdentityTest(ProfileOf(GetParam())) {}
};

TEST_P(JobIdentityTest, IsTakenFromTheConfigurationText) {
  const UpgradeConfig job;

  EXPECT_STREQ(job.GetMfgString(), GetParam().mfg);
  EXPECT_STREQ(job.GetType(), GetParam().type);
  EXPECT_STREQ(job.GetFamily(), GetParam().family);
  EXPECT_STREQ(job.GetModel(), GetParam().model);
  EXPECT_STREQ(job.GetUniqueId(), GetParam().unique_id);
  EXPECT_STREQ(job.GetSerialNumber(), "S1");
  EXPECT_STREQ(job.GetFlash(), "0");
}

INSTANTIATE_TEST_SUITE_P(
    Cases, JobIdentityTest,
    ::testing::Values(JobCase{"Handheld", "TQ52-A1", "TQ52-A1", "T", "Q", "52", "TQ52S1"},
                      JobCase{"Computer", "7535-X", "7535-X", "Computer", "7xx", "7535", "7535S1"},
                      JobCase{"ComputerOfOneCharacter", "7", "7", "Computer", "7xx", "7", "7S1"},
                      JobCase{"OneCharacter", "T", "T", "T", "", "", "TS1"},
                      JobCase{"ThreeCharacters", "TQ5", "TQ5", "T", "Q", "5", "TQ5S1"},
                      JobCase{"Longest", "TQ52567890123456789012X", "TQ52567890123456789012X", "T",
                              "Q", "52", "TQ52S1"},
                      JobCase{"TooLongByOne", "TQ525678901234567890123X", "", "", "", "",
                              "TQ52S1"}),
    [](const auto& each) { return each.param.name; });

class LongTextJobTest : public IdentityTest {
 protected:
  LongTextJobTest() : IdentityTest(Profile()) {}
  static sim::Profile Profile() {
    sim::Profile profile;
    profile.serial = std::string(24, 'S');
    return profile;
  }
};

TEST_F(LongTextJobTest, KeepsASerialNumberOf24CharactersOutOfTheFieldButInTheUniqueId) {
  const UpgradeConfig job;

  EXPECT_STREQ(job.GetSerialNumber(), "");
  EXPECT_EQ(std::string(job.GetUniqueId()), "TQ52" + std::string(24, 'S'));
}

}  // namespace
}  // namespace device

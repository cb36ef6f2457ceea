#include "profile/profile.h"

#include <gmock/gmock.h>

#include <fstream>
#include <iterator>
#include <string>

#include "support/device_test.h"

namespace {

using ::testing::HasSubstr;

class ProfileTest : public ::testing::Test {
 protected:
  void Write(const std::string& text) const { std::ofstream(file_, std::ios::binary) << text; }

  [[nodiscard]] std::string Read() const {
    std::ifstream in(file_, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
  }

  /// The profile that `text` makes; a refusal fails the test.
  sim::Profile Load(const std::string& text) {
    Write(text);
    sim::Profile profile;
    EXPECT_TRUE(sim::LoadProfile(file_, profile, error_)) << error_;
    return profile;
  }

  /// The error that `text` gives, without the file's name.
  std::string ErrorOf(const std::string& text) {
    Write(text);
    sim::Profile profile;
    profile.name = "untouched";
    EXPECT_FALSE(sim::LoadProfile(file_, profile, error_)) << text;
    EXPECT_EQ(profile.name, "untouched");
    const std::string start = file_.string() + ':';
    EXPECT_EQ(error_.substr(0, start.size()), start);
    EXPECT_EQ(error_.find('\n'), std::string::npos) << "one line";
    return error_.substr(start.size());
  }

  test::TemporaryFolder folder_;
  std::filesystem::path file_ = folder_.path() / "device.profile";
  std::string error_;
};

sim::Profile Unusual() {
  sim::Profile profile;
  profile.name = "  shelf 7 \"east\" ";
  profile.platform = "";
  profile.configuration = "\"TQ52\"";
  profile.network_id = "0123456789aF";
  profile.os_major = 4294967295U;
  profile.os_minor = 20;
  profile.host_name = "# no comment";
  profile.address = "10.0.0.255";
  profile.datagram_loss_percent = 2.5;
  profile.datagram_loss_seed = 18446744073709551615U;
  profile.screen_height = 319;
  profile.page_size = 1024;
  profile.ram_used_pages = 0;
  profile.volumes = {{"\\Flash File Store", 33554432, true}, {"\\SDMMC Disk", 1ULL << 40, false}};
  profile.ac_line = 255;
  profile.battery_flag = 128;
  profile.processes = {{"explorer.exe"}, {"Explorer.exe"}, {" [odd] "}};
  profile.programs = {{"wceload.exe", {"./install --in=\"$ORVENIX_DEVICE\" [x] # y", 0, 0}},
                      {"flash writer.exe", {"", 7, 90000}}};
  profile.message_library = "";
  profile.message_library_lacks = "lapi_close";
  profile.message_queue_opens = false;
  profile.start_time = "1999-12-31 23:59:59";
  profile.utc_offset_minutes = -570;
  return profile;
}

TEST_F(ProfileTest, ComesBackFromItsFile) {
  for (const sim::Profile& saved : {sim::Profile{}, Unusual()}) {
    ASSERT_TRUE(sim::SaveProfile(file_, saved, error_)) << error_;
    const std::string text = Read();

    sim::Profile loaded;
    ASSERT_TRUE(sim::LoadProfile(file_, loaded, error_)) << error_;

    EXPECT_EQ(loaded.name, saved.name);
    EXPECT_EQ(loaded.configuration, saved.configuration);
    EXPECT_EQ(loaded.os_major, saved.os_major);
    EXPECT_EQ(loaded.host_name, saved.host_name);
    EXPECT_EQ(loaded.datagram_loss_percent, saved.datagram_loss_percent);
    EXPECT_EQ(loaded.volumes.size(), saved.volumes.size());
    EXPECT_EQ(loaded.programs.size(), saved.programs.size());
    EXPECT_EQ(loaded.message_library, saved.message_library);
    EXPECT_EQ(loaded.utc_offset_minutes, saved.utc_offset_minutes);
    // The text holds every setting, so the same text again means that nothing was lost.
    ASSERT_TRUE(sim::SaveProfile(file_, loaded, error_)) << error_;
    EXPECT_EQ(Read(), text);
  }
}

TEST_F(ProfileTest, KeepsTheUsualValuesOfWhatIsNotGiven) {
  const sim::Profile profile = Load("[screen]\nheight = 319\n");

  EXPECT_EQ(profile.screen_height, 319);
  EXPECT_EQ(profile.screen_width, 240);
  EXPECT_EQ(profile.platform, "Corvanta MR7");
}

TEST_F(ProfileTest, TakesCommentsBlanksAndForeignLineEnds) {
  const sim::Profile profile = Load(
      "; a comment\r\n\r\n  [ identity ]  \r\n\tserial=  A=B # C  \r\n"
      "[volume \\SD Card]\r\ncapacity = 1000\r\n[identity]\r\nconfiguration = \" TQ \"\r\n"
      "[processes]\r\nprocess = a.exe\r\nprocess = a.exe\r\n");

  EXPECT_EQ(profile.serial, "A=B # C");
}

TEST_F(ProfileTest, ReadsVolumesProcessesAndPrograms) {
  const sim::Profile profile = Load(
      "[volume \\Flash File Store]\ncapacity = 33554432\n"
      "[volume \\SD Card]\npresent = no\n"
      "[processes]\nprocess = shell.exe\nprocess = scan.exe\n"
      "[program WCELOAD.exe]\nexit_code = 3\nrun_ms = 500\n");

  ASSERT_EQ(profile.volumes.size(), 2U);
  EXPECT_EQ(profile.volumes[0].path, "\\Flash File Store");
  EXPECT_EQ(profile.volumes[0].capacity, 33554432U);
  EXPECT_TRUE(profile.volumes[0].present);
  EXPECT_FALSE(profile.volumes[1].present);
  ASSERT_EQ(profile.processes.size(), 2U);
  EXPECT_EQ(profile.processes[1].name, "scan.exe");
  ASSERT_EQ(profile.programs.count("wceload.exe"), 1U) << "found by its lower-case name";
  EXPECT_EQ(profile.programs.at("wceload.exe").exit_code, 3U);
  EXPECT_EQ(profile.programs.at("wceload.exe").run_ms, 500U);
}

TEST_F(ProfileTest, SaysWhereWhatAndWhatToDo) {
  EXPECT_EQ(ErrorOf("[power]\n\nbattery_flag = high\n"),
            "3: battery_flag = \"high\" is no number from 0 to 255; give one");
  EXPECT_EQ(ErrorOf("[identity]\nplatfrom = x\n"),
            "2: \"platfrom\" is no setting of [identity]; correct or remove it");
  EXPECT_EQ(ErrorOf("[colours]\n"),
            "1: \"[colours]\" is no section of a device profile; correct or remove it");
}

TEST_F(ProfileTest, RefusesEverythingElseInOneLine) {
  struct Case {
    const char* text;
    const char* error;
  };
  static constexpr Case kCases[] = {
      {"name = x\n", "stands in no section"},
      {"[device\n", "lacks its closing bracket"},
      {"[device]\nname\n", "neither a section nor a setting"},
      {"[device]\nname = a\nname = b\n", "is set twice"},
      {"[device]\nname = a\n[screen]\n[device]\nname = b\n", "is set twice"},
      {"[device x]\n", "is no section"},
      {"[]\n", "is no section"},
      {"[volume]\n", "a volume needs its folder"},
      {"[volume Flash]\n", "a volume needs its folder"},
      {"[volume \\]\n", "a volume needs its folder"},
      {"[volume \\a\\b]\n", "a volume needs its folder"},
      {"[volume \\SD Card]\n[volume \\sd card]\n", "stands here twice"},
      {"[volume \\SD Card]\ncapacity = -1\n", "is no number"},
      {"[volume \\SD Card]\npresent = maybe\n", "neither \"yes\" nor \"no\""},
      {"[volume \\SD Card]\nname = x\n", "is no setting of [volume]"},
      {"[program]\n", "a program needs its name"},
      {"[program a.exe]\n[program A.EXE]\n", "stands here twice"},
      {"[program a.exe]\nexit_code = 4294967296\n", "is no number"},
      {"[screen]\nwidth = 0\n", "is no number from 1"},
      {"[network]\ndatagram_loss_percent = 100.5\n", "is no number from 0 to 100"},
      {"[network]\ndatagram_loss_percent = nan\n", "is no number from 0 to 100"},
      {"[network]\ndatagram_loss_percent = 2 %\n", "is no number from 0 to 100"},
      {"[screen]\nwidth = 240.5\n", "is no number"},
      {"[screen]\nwidth =\n", "is no number"},
      {"[memory]\nstore_pages = 99999999999999999999\n", "is no number"},
      {"[time]\nutc_offset_minutes = -1441\n", "is no number from -1440 to 1440"},
      {"[time]\nstart = 2006-02-30 00:00:00\n", "is no time"},
      {"[identity]\nnetwork_id = 5E4D3C2B1A\n", "is no network address"},
      {"[identity]\nnetwork_id = 5E4D3C2B1A0G\n", "is no network address"},
      {"[messages]\nlibrary = kx\n", "is no library of the message queue"},
      {"[messages]\nlacks = lapi_read\n", "is no entry point of the message queue"},
      {"[messages]\nopens = never\n", "neither \"yes\" nor \"no\""},
      {"[network]\naddress = 127.0.0\n", "is no IPv4 address"},
      {"[network]\naddress = 127.0.0.256\n", "is no IPv4 address"},
      {"[network]\naddress = 127.0.0.1.1\n", "is no IPv4 address"},
      {"[network]\naddress = 127..0.1\n", "is no IPv4 address"},
      {"[network]\naddress =\n", "is no IPv4 address"},
      {"[processes]\nprogram = a.exe\n", "is no setting of [processes]"},
  };
  for (const Case& c : kCases) EXPECT_THAT(ErrorOf(c.text), HasSubstr(c.error)) << c.text;
}

TEST_F(ProfileTest, SurvivesAnyBytes) {
  std::string garbage;
  for (int i = 0; i < 100000; ++i) garbage += static_cast<char>(i * 7919 % 256);
  Write(garbage);
  sim::Profile profile;

  EXPECT_FALSE(sim::LoadProfile(file_, profile, error_));
}

TEST_F(ProfileTest, NamesAFileThatCannotBeReadOrWritten) {
  sim::Profile profile;
  const std::filesystem::path missing = folder_.path() / "none" / "device.profile";

  EXPECT_FALSE(sim::LoadProfile(missing, profile, error_));
  EXPECT_THAT(error_, HasSubstr(missing.string() + ": cannot be read"));
  EXPECT_FALSE(sim::SaveProfile(missing, profile, error_));
  EXPECT_THAT(error_, HasSubstr(missing.string() + ": cannot be written"));
}

TEST_F(ProfileTest, RefusesToWriteWhatNoLineCanHold) {
  sim::Profile profile;
  profile.serial = "two\nlines";

  EXPECT_FALSE(sim::SaveProfile(file_, profile, error_));

  EXPECT_THAT(error_, HasSubstr("serial holds a control character"));
  EXPECT_FALSE(std::filesystem::exists(file_));
}

}  // namespace

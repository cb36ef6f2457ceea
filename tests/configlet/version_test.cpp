#include "configlet/version/version.h"

#include <gmock/gmock.h>

#include <string>
#include <string_view>

#include "ce/errors.h"
#include "ce/files.h"
#include "configlet/configlet_test.h"
#include "trace/trace.h"

namespace configlet {
namespace {

using test::GetFile;
using ::testing::HasSubstr;
using ::testing::Optional;

constexpr WCHAR kKey[] = TEXT("Software\\Corvanta\\TWClient\\Subsystems");

class VersionFilesTest : public ConfigletTest {
 protected:
  VersionFilesTest() {
    CreateDirectoryW(TEXT("\\Tarnwell"), nullptr);
    CreateDirectoryW(TEXT("\\Tarnwell\\TWSubSystems"), nullptr);
  }

  static void SetPath(const void* data, std::size_t bytes, DWORD type = REG_SZ) {
    HKEY key = nullptr;
    ASSERT_EQ(RegCreateKeyExW(HKEY_LOCAL_MACHINE, kKey, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr,
                              &key, nullptr),
              0);
    ASSERT_EQ(RegSetValueExW(key, TEXT("Path"), 0, type, static_cast<const BYTE*>(data),
                             static_cast<DWORD>(bytes)),
              0);
    RegCloseKey(key);
  }
  static void SetPath(std::u16string_view path) {
    SetPath(std::u16string(path).c_str(), (path.size() + 1) * sizeof(WCHAR));
  }
};

constexpr char kContent[] = "Version=3.44";
static_assert(sizeof kContent == 13, "twelve bytes, no line end");
constexpr char kLogged[] = "Version=3.44\r\nVersion=3.44\r\n";

TEST_F(VersionFilesTest, StandInTheUsualFolder) {
  EXPECT_EQ(IcfgInitialize(), ICFG_OK);

  EXPECT_THAT(GetFile("\\Tarnwell\\TWSubSystems\\Orvenix.ini"), Optional(std::string(kContent)));
  EXPECT_THAT(GetFile("\\Tarnwell\\TWSubSystems\\MCFTP.ini"), Optional(std::string(kContent)));
  EXPECT_EQ(Log(), kLogged);
}

TEST_F(VersionFilesTest, AreWrittenAnewEachTime) {
  test::PutFile("\\Tarnwell\\TWSubSystems\\Orvenix.ini", "Version=something longer\r\n");

  IcfgInitialize();
  IcfgInitialize();

  EXPECT_THAT(GetFile("\\Tarnwell\\TWSubSystems\\Orvenix.ini"), Optional(std::string(kContent)));
  EXPECT_EQ(Log(), std::string(kLogged) + kLogged);
}

TEST_F(VersionFilesTest, StandInTheFolderThatTheRegistryNames) {
  CreateDirectoryW(TEXT("\\Elsewhere"), nullptr);
  SetPath(u"\\Elsewhere");

  IcfgInitialize();

  EXPECT_THAT(GetFile("\\Elsewhere\\Orvenix.ini"), Optional(std::string(kContent)));
  EXPECT_THAT(GetFile("\\Elsewhere\\MCFTP.ini"), Optional(std::string(kContent)));
  EXPECT_FALSE(test::Exists("\\Tarnwell\\TWSubSystems\\Orvenix.ini"));
}

TEST_F(VersionFilesTest, TakeTheValueWhateverItsType) {
  CreateDirectoryW(TEXT("\\Elsewhere"), nullptr);
  constexpr WCHAR kPath[] = TEXT("\\Elsewhere");
  SetPath(kPath, sizeof kPath - sizeof(WCHAR), REG_BINARY);  // and without its terminator

  IcfgInitialize();

  EXPECT_THAT(GetFile("\\Elsewhere\\MCFTP.ini"), Optional(std::string(kContent)));
}

TEST_F(VersionFilesTest, StandInTheUsualFolderWhenTheRegistrysIsEmptyOrTooLong) {
  SetPath(u"");
  IcfgInitialize();
  EXPECT_THAT(GetFile("\\Tarnwell\\TWSubSystems\\MCFTP.ini"), Optional(std::string(kContent)));

  DeleteFileW(TEXT("\\Tarnwell\\TWSubSystems\\MCFTP.ini"));
  SetPath(u'\\' + std::u16string(129, u'f'));  // 130 characters and the zero: one too many
  IcfgInitialize();
  EXPECT_THAT(GetFile("\\Tarnwell\\TWSubSystems\\MCFTP.ini"), Optional(std::string(kContent)));
}

TEST_F(VersionFilesTest, ReadAPathOf129Characters) {
  const std::u16string folder = u'\\' + std::u16string(128, u'f');
  CreateDirectoryW(folder.c_str(), nullptr);
  SetPath(folder);

  IcfgInitialize();

  EXPECT_THAT(GetFile('\\' + std::string(128, 'f') + "\\Orvenix.ini"),
              Optional(std::string(kContent)));
}

TEST_F(VersionFilesTest, ReadAPathOf130CharactersWithoutATerminator) {
  const std::u16string folder = u'\\' + std::u16string(129, u'g');  // 260 bytes
  CreateDirectoryW(folder.c_str(), nullptr);
  SetPath(folder.data(), folder.size() * sizeof(WCHAR));

  IcfgInitialize();

  EXPECT_THAT(GetFile('\\' + std::string(129, 'g') + "\\MCFTP.ini"),
              Optional(std::string(kContent)));
}

TEST_F(VersionFilesTest, StandInAFolderThatIsNamedWithABackslashAtItsEnd) {
  CreateDirectoryW(TEXT("\\Elsewhere"), nullptr);
  SetPath(u"\\Elsewhere\\");
  std::string calls;
  device().trace().SetSink([&calls](std::string_view line) { calls.append(line); });

  IcfgInitialize();

  device().trace().SetSink({});
  EXPECT_THAT(calls, HasSubstr(R"(\\Elsewhere\\\\Orvenix.ini)")) << "named as it is, not tidied";
  EXPECT_THAT(GetFile("\\Elsewhere\\Orvenix.ini"), Optional(std::string(kContent)));
  EXPECT_THAT(GetFile("\\Elsewhere\\MCFTP.ini"), Optional(std::string(kContent)));
  EXPECT_EQ(Log(), kLogged);
}

TEST_F(VersionFilesTest, StandInTheRootWhenTheFolderIsABackslash) {
  SetPath(u"\\");

  IcfgInitialize();

  EXPECT_THAT(GetFile("\\Orvenix.ini"), Optional(std::string(kContent)));
  EXPECT_THAT(GetFile("\\MCFTP.ini"), Optional(std::string(kContent)));
}

TEST_F(VersionFilesTest, LogOnlyWhatCouldBeMade) {
  SetPath(u"\\Missing");
  EXPECT_EQ(IcfgInitialize(), ICFG_OK);
  EXPECT_EQ(Log(), "");
  EXPECT_FALSE(test::Exists("\\Missing")) << "the folder is not made";

  SetPath(u"");
  test::PutFile("\\Tarnwell\\TWSubSystems\\Orvenix.ini", "old");
  test::SetAttributesOf("\\Tarnwell\\TWSubSystems\\Orvenix.ini", FILE_ATTRIBUTE_READONLY);
  EXPECT_EQ(IcfgInitialize(), ICFG_OK);
  EXPECT_EQ(Log(), "Version=3.44\r\n") << "the other file's";
  EXPECT_THAT(GetFile("\\Tarnwell\\TWSubSystems\\Orvenix.ini"), Optional(std::string("old")));
}

TEST_F(VersionFilesTest, LeakNothingWhicheverCallFails) {
  for (std::uint64_t nth = 1; nth < 30; ++nth) {
    device().faults().Clear();
    const std::size_t before = OpenHandles();
    const std::uint64_t fired = device().faults().fired();
    device().faults().Add({"*", nth, 1, 0});

    EXPECT_EQ(IcfgInitialize(), ICFG_OK);

    // What the system does not close when told stays open, whoever told it.
    const std::string failed = device().faults().last_fired();
    const bool is_new = device().faults().fired() > fired;
    const std::size_t left = is_new && failed == "CloseHandle" ? 1 : 0;
    EXPECT_EQ(OpenHandles(), before + left) << failed;
  }
}

}  // namespace
}  // namespace configlet

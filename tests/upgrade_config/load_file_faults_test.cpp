// Where a configuration file is looked for, what becomes of it, and what happens when reading it
// fails.
#include <gmock/gmock.h>

#include <filesystem>
#include <string>
#include <string_view>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "kernel/kernel.h"
#include "storage/storage.h"
#include "trace/trace.h"
#include "upgrade_config/configuration_test.h"

namespace {

using test::Downloads;
using test::Exists;
using test::kInFlashStore;
using test::kInSystemFolder;
using test::Packages;
using test::PutFile;
using test::Texts;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr char kPort81[] = "<Job><HTTPPort>81</HTTPPort></Job>";
constexpr char kPort82[] = "<Job><HTTPPort>82</HTTPPort></Job>";

/// Something for every list.
constexpr char kWholeFile[] =
    "<Job><BaseUrl>http://127.0.0.2</BaseUrl><StopProcesses><Process>p.exe</Process>"
    "</StopProcesses><Downloads><File SourceDir='a' DestDir='b'/></Downloads><DiskCleanup>"
    "<File Action='delete'>d</File><File Action='save'>s</File></DiskCleanup><Registry><Key>k"
    "</Key></Registry><OSFirmware><Package HardwareVersion='*' SourceDir='fw'"
    " AdditionalParms='Pass=1'/></OSFirmware><EndText>end</EndText></Job>";

class LoadFileFaultsTest : public test::ConfigurationTest {
 protected:
  [[nodiscard]] std::size_t Handles() { return device().kernel().OpenHandles(); }
  [[nodiscard]] std::filesystem::path HostPath(const char16_t* path) {
    return device().storage().HostPath(path).value();
  }

  /// Calls `action` when an API call of that name returns for the first time.
  template <typename Action>
  void After(std::string call, Action action) {
    device().trace().SetSink([call = "\"call\":\"" + std::move(call) + "\"", action,
                              done = false](std::string_view line) mutable {
      if (done || line.find(call) == std::string_view::npos) return;
      done = true;
      action();
    });
  }
};

std::size_t Listed(const UpgradeConfig& job) {
  return job.ProcessesToStop().size() + job.DownloadFiles().size() + job.FilesToDelete().size() +
         job.FilesToSave().size() + job.RegistryTests().size() + job.FirmwarePackages().size();
}

/// Lists that say that something is missing.
std::size_t Incomplete(const UpgradeConfig& job) {
  std::size_t lists = 0;
  for (const bool incomplete :
       {job.ProcessesToStop().incomplete(), job.DownloadFiles().incomplete(),
        job.FilesToDelete().incomplete(), job.FilesToSave().incomplete(),
        job.RegistryTests().incomplete(), job.FirmwarePackages().incomplete()}) {
    if (incomplete) ++lists;
  }
  return lists;
}

// ---- where it lies ----

TEST_F(LoadFileFaultsTest, PrefersTheSystemFolderAndDeletesTheFileThere) {
  PutFile(kInSystemFolder, kPort81);
  PutFile(kInFlashStore, kPort82);
  UpgradeConfig job;

  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_FALSE(Exists(kInSystemFolder));

  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 82);
  EXPECT_TRUE(Exists(kInFlashStore)) << "nothing is deleted there";
}

TEST_F(LoadFileFaultsTest, AnswersZeroForAFileThatIsNowhere) {
  PutFile("\\job.xml", kPort81);
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 0);
  EXPECT_EQ(job.LoadFromFile(u"\\job.xml"), 0) << "a path is a name below the two folders";
  EXPECT_EQ(job.LoadFromFile(u""), 0);
  EXPECT_EQ(job.LoadFromFile(nullptr), 0);
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_TRUE(Exists("\\job.xml"));
}

TEST_F(LoadFileFaultsTest, FindsAFileInAFolderBelow) {
  PutFile("\\windows\\jobs\\a.xml", kPort81);
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"jobs\\a.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_FALSE(Exists("\\windows\\jobs\\a.xml"));
}

TEST_F(LoadFileFaultsTest, TakesNoFolderForAFile) {
  CreateDirectoryW(u"\\windows", nullptr);
  ASSERT_NE(CreateDirectoryW(u"\\windows\\job.xml", nullptr), FALSE);
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 0);
  PutFile(kInFlashStore, kPort82);
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 82);
  EXPECT_TRUE(Exists(kInSystemFolder));
}

TEST_F(LoadFileFaultsTest, RefusesNamesThatNoPathHasRoomFor) {
  UpgradeConfig job;
  for (const std::size_t length : {241U, 242U, 250U, 251U, 259U, 260U, 5000U}) {
    EXPECT_EQ(job.LoadFromFile(std::u16string(length, u'x').c_str()), 0) << length;
  }
}

TEST_F(LoadFileFaultsTest, TakesTheLongestNamesThatAPathHasRoomFor) {
  // 9 characters of folder and 250 of name, 18 and 241: both 259.
  const std::string system = "\\windows\\" + std::string(200, 'd') + "\\" + std::string(49, 'n');
  PutFile(system, kPort81);
  UpgradeConfig job;
  const std::u16string name(system.begin() + 9, system.end());
  EXPECT_EQ(job.LoadFromFile(name.c_str()), 1);
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_FALSE(Exists(system));
  EXPECT_EQ(job.LoadFromFile(name.c_str()), 0) << "no room behind the other folder";

  const std::string flash =
      "\\Flash File Store\\" + std::string(200, 'd') + "\\" + std::string(40, 'n');
  PutFile(flash, kPort82);
  EXPECT_EQ(job.LoadFromFile(std::u16string(flash.begin() + 18, flash.end()).c_str()), 1);
  EXPECT_EQ(job.GetHTTPPort(), 82);
}

TEST_F(LoadFileFaultsTest, LosesCharactersThatTheCodePageLacks) {
  PutFile("\\windows\\j\xE4.xml", kPort81);  // a name of one byte a character
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"j\u6F22.xml"), 0);
  EXPECT_EQ(job.LoadFromFile(u"\U0001F600"), 0);
}

// ---- when opening or reading fails ----

TEST_F(LoadFileFaultsTest, DeletesAFileOfTheSystemFolderThatItCannotOpen) {
  PutFile(kInSystemFolder, kPort81);
  PutFile(kInFlashStore, kPort82);
  device().faults().Add({"CreateFileW", 1, 1, ERROR_SHARING_VIOLATION});
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 0);
  EXPECT_EQ(job.GetHTTPPort(), 80) << "the other file is not tried";
  EXPECT_FALSE(Exists(kInSystemFolder));
  EXPECT_TRUE(Exists(kInFlashStore));
}

TEST_F(LoadFileFaultsTest, LeavesAFileOfTheFlashStoreThatItCannotOpen) {
  PutFile(kInFlashStore, kPort82);
  device().faults().Add({"CreateFileW", 1, 1, ERROR_SHARING_VIOLATION});
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 0);
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_TRUE(Exists(kInFlashStore));
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 82);
}

TEST_F(LoadFileFaultsTest, TakesNoWildcardForAName) {
  PutFile(kInSystemFolder, kPort81);
  PutFile(kInFlashStore, kPort82);
  UpgradeConfig job;
  for (const char16_t* name : {u"j?b.xml", u"*.xml", u"*", u"job.xm?"}) {
    EXPECT_EQ(job.LoadFromFile(name), 0);
  }
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_TRUE(Exists(kInSystemFolder) && Exists(kInFlashStore));
}

TEST_F(LoadFileFaultsTest, LeavesAFileThatSomebodyElseHasOpen) {
  PutFile(kInSystemFolder, kPort81);
  HANDLE const other = CreateFileW(u"\\windows\\job.xml", GENERIC_WRITE, 0, nullptr, OPEN_EXISTING,
                                   FILE_ATTRIBUTE_NORMAL, nullptr);
  ASSERT_NE(other, INVALID_HANDLE_VALUE);
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 0);
  CloseHandle(other);
  EXPECT_TRUE(Exists(kInSystemFolder));
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
}

TEST_F(LoadFileFaultsTest, LoadsAReadOnlyFileAndCannotDeleteIt) {
  PutFile(kInSystemFolder, kPort81);
  test::SetAttributesOf(kInSystemFolder, FILE_ATTRIBUTE_READONLY);
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_TRUE(Exists(kInSystemFolder));
}

TEST_F(LoadFileFaultsTest, AddsNothingOfAFileThatItDoesNotUnderstand) {
  const std::string whole = kWholeFile;
  struct Case {
    std::string text;
    const char* why;
  };
  const Case cases[] = {
      {"", "empty"},
      {" \r\n", "blank"},
      {"HTTPPort=81", "no XML"},
      {"<?xml version='1.0'?>", "no root"},
      {whole.substr(0, whole.size() - 1), "not closed"},
      {whole.substr(0, whole.size() / 2), "cut"},
      {"<Job><HTTPPort>81</HTTPPort></job>", "another end"},
      {"<Job><HTTPPort>81</HTTPPort><A b></A></Job>", "an attribute without value"},
      {"<Job><HTTPPort>81</HTTPPort><![CDATA[x]]></Job>", "a section that is not known"},
      {std::string("<Job><HTTPPort>81</HTTPPort>\0</Job>", 36), "a zero byte"},
      {std::string("\xFF\xFE<\0J\0o\0b\0/\0>\0", 14), "UTF-16"},
  };
  for (const Case& c : cases) {
    PutFile(kInSystemFolder, c.text);
    UpgradeConfig job;
    EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1) << c.why;
    EXPECT_EQ(job.GetHTTPPort(), 80) << c.why;
    EXPECT_STREQ(job.GetBaseURL(), "") << c.why;
    EXPECT_EQ(Listed(job), 0U) << c.why;
    EXPECT_EQ(job.GetFirmwarePackageCount(), 0) << c.why;
    EXPECT_FALSE(Exists(kInSystemFolder)) << c.why;
  }
}

TEST_F(LoadFileFaultsTest, AddsNothingOfADocumentWithNothingBelowItsRoot) {
  for (const char* text : {"<Job/>", "<Job></Job>", "<HTTPPort>81</HTTPPort>",
                           "<Downloads SourceDir='a' DestDir='b'/>"}) {
    UpgradeConfig job;
    EXPECT_EQ(LoadText(job, text), 1);
    EXPECT_EQ(job.GetHTTPPort(), 80);
    EXPECT_EQ(Listed(job), 0U);
  }
}

TEST_F(LoadFileFaultsTest, AddsNothingWhenTheFileCannotBeRead) {
  PutFile(kInSystemFolder, kPort81);
  const std::size_t handles = Handles();
  device().faults().Add({"ReadFile", 1, 0, ERROR_GEN_FAILURE});
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_FALSE(Exists(kInSystemFolder));
  EXPECT_EQ(Handles(), handles);
}

TEST_F(LoadFileFaultsTest, UnderstandsWhatItCouldReadBeforeTheFileEndedOrFailed) {
  const std::string whole = kPort81;
  const std::string longer = whole + std::string(50, ' ');
  for (const bool fails : {false, true}) {
    PutFile(kInFlashStore, longer);
    const std::filesystem::path host = HostPath(u"\\Flash File Store\\job.xml");
    After("GetFileSize", [&] { std::filesystem::resize_file(host, whole.size()); });
    if (fails) device().faults().Add({"ReadFile", 2, 0, ERROR_GEN_FAILURE});
    UpgradeConfig job;
    EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
    EXPECT_EQ(job.GetHTTPPort(), 81);
    EXPECT_EQ(device().faults().Count("ReadFile"), fails ? 4U : 2U);
  }
  device().trace().SetSink({});
}

TEST_F(LoadFileFaultsTest, ReadsNoMoreThanTheFileHadWhenItGrowsMeanwhile) {
  PutFile(kInFlashStore, "<Job/>");
  const std::filesystem::path host = HostPath(u"\\Flash File Store\\job.xml");
  After("GetFileSize", [&] { std::filesystem::resize_file(host, 5000); });
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  device().trace().SetSink({});
}

// ---- large files ----

TEST_F(LoadFileFaultsTest, KeepsAFileThatIsTooLargeForItsMemory) {
  for (const std::uintmax_t size :
       {std::uintmax_t{100} << 20U, (std::uintmax_t{1} << 31U) - 1, std::uintmax_t{1} << 31U,
        (std::uintmax_t{1} << 32U) - 1, std::uintmax_t{1} << 32U, std::uintmax_t{9} << 30U}) {
    PutFile(kInSystemFolder, kPort81);
    const std::filesystem::path host = HostPath(u"\\windows\\job.xml");
    std::filesystem::resize_file(host, size);  // a hole: it takes no room
    const std::size_t blocks = Blocks();
    UpgradeConfig job;
    EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1) << size;
    EXPECT_EQ(job.GetHTTPPort(), 80) << size;
    EXPECT_TRUE(Exists(kInSystemFolder)) << size;
    EXPECT_EQ(Blocks(), blocks) << size;
    std::filesystem::resize_file(host, 0);
  }
}

TEST_F(LoadFileFaultsTest, KeepsAFileWhoseSizeItCannotLearn) {
  PutFile(kInSystemFolder, kPort81);
  device().faults().Add({"GetFileSize", 1, 1, ERROR_GEN_FAILURE});
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_TRUE(Exists(kInSystemFolder));
}

TEST_F(LoadFileFaultsTest, TakesEverythingOfALongFile) {
  std::string text = "<Downloads>";
  for (int i = 0; i < 3000; ++i) text += "<File SourceDir='s' DestDir='d'/>";
  text += "</Downloads><DiskCleanup>";
  for (int i = 0; i < 3000; ++i) text += "<File Action='delete'>\\Temp</File>";
  text += "</DiskCleanup><OSFirmware>";
  for (int i = 0; i < 3000; ++i) text += "<Package HardwareVersion='MR'/>";
  const std::size_t blocks = Blocks();
  {
    UpgradeConfig job;
    EXPECT_EQ(Load(job, text + "</OSFirmware><EndText>end</EndText>"), 1);
    EXPECT_THAT(job.DownloadFiles(), SizeIs(3000));
    EXPECT_THAT(job.FilesToDelete(), SizeIs(3000));
    EXPECT_EQ(job.GetFirmwarePackageCount(), 3000);
    EXPECT_STREQ(job.GetUpgEndMsg(), "end");
  }
  EXPECT_EQ(Blocks(), blocks);
}

TEST_F(LoadFileFaultsTest, TakesOneElementOfManyAttributesAndPieces) {
  std::string pieces;
  std::string attributes;
  for (int i = 0; i < 50000; ++i) pieces += "MR41,";
  for (int i = 0; i < 20000; ++i) attributes += " a='1'";
  UpgradeConfig job;
  EXPECT_EQ(Load(job, "<OSFirmware><Package" + attributes + " HardwareVersion='" + pieces +
                          "TQ' SourceDir='fw'/></OSFirmware>"),
            1);
  EXPECT_THAT(Packages(job), SizeIs(1));
}

// ---- without memory ----

TEST_F(LoadFileFaultsTest, KeepsTheFileWhenThereIsNoMemoryToReadIt) {
  PutFile(kInSystemFolder, kPort81);
  const std::size_t handles = Handles();
  device().faults().Add({"LocalAlloc", 1, 1, ERROR_OUTOFMEMORY});
  UpgradeConfig job;
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_TRUE(Exists(kInSystemFolder));
  EXPECT_EQ(Handles(), handles);
  EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 81);
}

TEST_F(LoadFileFaultsTest, TakesAsManyElementsAsThereIsMemoryFor) {
  std::string text = "<Downloads>";
  for (int i = 0; i < 5000; ++i) text += "<File SourceDir='' DestDir=''/>";
  text += "</Downloads><EndText>end</EndText>";
  const std::size_t blocks = Blocks();
  {
    UpgradeConfig job;
    device().faults().Add({"LocalAlloc", 1000, 0, ERROR_OUTOFMEMORY});  // from then on
    EXPECT_EQ(Load(job, text), 1);
    EXPECT_GT(device().faults().fired(), 4000U) << "it reads on";
    device().faults().Clear();
    EXPECT_GT(job.DownloadFiles().size(), 900U);
    EXPECT_LT(job.DownloadFiles().size(), 1000U);
    EXPECT_TRUE(job.DownloadFiles().incomplete());
    EXPECT_STREQ(job.GetUpgEndMsg(), "end") << "what needs no memory is taken";
  }
  EXPECT_EQ(Blocks(), blocks);
  EXPECT_EQ(BadFrees(), 0U);
}

TEST_F(LoadFileFaultsTest, LosesOnlyWhatThereIsNoMemoryForAndLeaksNothing) {
  const std::size_t blocks = Blocks();
  const std::size_t handles = Handles();
  std::uint64_t nth = 0;
  for (bool fired = true; fired;) {
    ++nth;
    PutFile(kInSystemFolder, kWholeFile);
    {
      UpgradeConfig job;
      const std::uint64_t before = device().faults().fired();
      device().faults().Add({"LocalAlloc", nth, 1, ERROR_OUTOFMEMORY});
      EXPECT_EQ(job.LoadFromFile(u"job.xml"), 1) << nth;
      fired = device().faults().fired() != before;
      device().faults().Clear();

      const std::size_t listed = Listed(job);
      const bool understood = *job.GetUpgEndMsg() != '\0';
      EXPECT_EQ(understood, *job.GetBaseURL() != '\0') << nth << ": all or nothing of a document";
      EXPECT_EQ(listed, !understood ? 0U : fired ? 5U : 6U) << nth;
      EXPECT_EQ(Incomplete(job), understood && fired ? 1U : 0U) << nth << ": what is lost is known";
      EXPECT_EQ(job.IsMultiPass(), static_cast<int>(job.FirmwarePackages().size())) << nth;
      EXPECT_EQ(job.GetFirmwarePackageCount(), understood ? 1 : 0) << nth;
      EXPECT_EQ(job.RegistryTests().incomplete(), understood && job.RegistryTests().empty())
          << nth << ": a device is not upgraded untested";
      EXPECT_EQ(job.FilesToSave().incomplete(), understood && job.FilesToSave().empty()) << nth;
      EXPECT_EQ(Exists(kInSystemFolder), nth == 1) << nth;
    }
    EXPECT_EQ(Blocks(), blocks) << nth;
    EXPECT_EQ(Handles(), handles) << nth;
    EXPECT_EQ(BadFrees(), 0U) << nth;
  }
  EXPECT_GE(nth, 15U) << "a buffer, a document, six records and their lists";
}

TEST_F(LoadFileFaultsTest, SurvivesTheFailureOfAnyCall) {
  const std::size_t blocks = Blocks();
  std::string call;
  for (std::uint64_t nth = 1; nth == 1 || !call.empty(); ++nth) {
    const std::string name = "job" + std::to_string(nth);  // a handle may be kept to the last one
    PutFile("\\windows\\" + name, kWholeFile);
    const std::size_t handles = Handles();
    const std::uint64_t before = device().faults().fired();
    {
      UpgradeConfig job;
      device().faults().Add({"*", nth, 1, 0});
      const int result = job.LoadFromFile(std::u16string(name.begin(), name.end()).c_str());
      call = device().faults().fired() == before ? "" : device().faults().last_fired();
      device().faults().Clear();
      const bool finds = call == "CreateFileW" || call == "GetFileAttributesW" ||
                         call == "WideCharToMultiByte" || call == "MultiByteToWideChar";
      EXPECT_TRUE(result == 1 || (result == 0 && finds)) << nth << " " << call;
      EXPECT_TRUE(Listed(job) == 6U || !call.empty());
    }
    EXPECT_EQ(Blocks(), blocks) << nth << " " << call;
    EXPECT_EQ(BadFrees(), 0U) << nth << " " << call;
    EXPECT_EQ(Handles(), handles + (call == "CloseHandle" ? 1 : 0)) << nth << " " << call;
  }
}

}  // namespace

#include "tools/bundle.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <zlib.h>

#include <fstream>
#include <iterator>

#include "server/scratch_folder.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/job_file.h"

namespace tools {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::Not;

std::uint32_t ZlibCrc(const std::string& text) {
  return static_cast<std::uint32_t>(
      crc32(0, reinterpret_cast<const Bytef*>(text.data()), static_cast<uInt>(text.size())));
}

class BundleTest : public ::testing::Test {
 protected:
  BundleOptions Options() const {
    BundleOptions options;
    options.folder = scratch_.path() / "in";
    options.out = scratch_.path() / "out";
    options.address = "127.0.0.2";
    options.port = 8080;
    return options;
  }
  std::string Read(const std::string& name) const { return ReadWholeFile(scratch_.path() / name); }
  /// What MakeBundle complains about, with its code.
  std::string Complaint(const BundleOptions& options, ExitCode code) const {
    try {
      MakeBundle(options);
    } catch (const Failure& failure) {
      EXPECT_EQ(failure.code(), code) << failure.what();
      return failure.what();
    }
    return "nothing";
  }

  ScratchFolder scratch_;
};

TEST_F(BundleTest, WritesTheListFileInTheOrderOfNamesWithChecksumsInUnsignedDecimal) {
  scratch_.Write("in/b.txt", "123456789");
  scratch_.Write("in/a dir/file one.bin", "x");

  MakeBundle(Options());

  EXPECT_EQ(Read("out/tree/bundle.lst"),
            "bundle/a dir/file one.bin,\\Application\\a dir\\file one.bin,*,2363233923,1\r\n"
            "bundle/b.txt,\\Application\\b.txt,*,3421780262,9\r\n");
  EXPECT_EQ(Read("out/tree/bundle/a dir/file one.bin"), "x");
}

TEST_F(BundleTest, AgreesWithZlibAboutEveryChecksum) {
  std::string content;
  for (int i = 0; i < 100'000; ++i) content += static_cast<char>(i * 7 + i / 251);
  scratch_.Write("in/large.bin", content);

  const Bundle bundle = MakeBundle(Options());

  EXPECT_EQ(bundle.files.at(0).crc32, ZlibCrc(content));
  EXPECT_EQ(bundle.list.crc32, ZlibCrc(Read("out/tree/bundle.lst")));
}

TEST_F(BundleTest, ListsAnEmptyFileWithAChecksumThatMakesDevicesFetchIt) {
  scratch_.Write("in/empty", "");

  const Bundle bundle = MakeBundle(Options());

  EXPECT_EQ(bundle.files.at(0).crc32, 0U) << "0 in a list means: never look at this file";
  EXPECT_EQ(Read("out/tree/bundle.lst"), "bundle/empty,\\Application\\empty,*,1,0\r\n");
}

TEST_F(BundleTest, WritesTheSameBundleForTheSameInput) {
  scratch_.Write("in/z", "z");
  scratch_.Write("in/a/b/c", "c");
  BundleOptions options = Options();
  MakeBundle(options);
  options.out = scratch_.path() / "again";

  MakeBundle(options);

  for (const char* name : {"bundle.json", "job.xml", "tree/bundle.lst", "tree/bundle/z"}) {
    EXPECT_EQ(Read(std::string("out/") + name), Read(std::string("again/") + name)) << name;
    if (std::string_view(name).substr(0, 4) == "tree") {
      EXPECT_EQ(fs::last_write_time(scratch_.path() / "out" / name),
                fs::last_write_time(scratch_.path() / "again" / name))
          << name << ": the server tells this time";
    }
  }
}

TEST_F(BundleTest, WritesAJobThatMakesADeviceFetchTheListAndClosesUpgradeLast) {
  scratch_.Write("in/a & b.txt", "12345");
  BundleOptions options = Options();
  options.destination = "\\Storage Card\\New";
  options.begin_text = "Upgrade begins";
  options.syslog_address = "10.0.0.9";
  const Bundle bundle = MakeBundle(options);

  const Job job = ReadJob(scratch_.path() / "out/job.xml");

  ASSERT_EQ(job.groups.size(), 1U);
  EXPECT_EQ(job.groups[0].name, "Orvenix");
  ASSERT_EQ(job.groups[0].children.size(), 1U);
  EXPECT_EQ(std::get<JobGroup>(job.groups[0].children[0]).name, "Upgrade");
  EXPECT_EQ(FindField(job, "HTTPServer", "IPAddress"), "127.0.0.2");
  EXPECT_EQ(FindField(job, "HTTPServer", "HTTPPort"), "8080");
  EXPECT_EQ(FindField(job, "HTTPServer", "BaseURL"), "http://127.0.0.2");
  EXPECT_EQ(FindField(job, "FileList", "Source"), "bundle.lst");
  EXPECT_EQ(FindField(job, "FileList", "Dest"), "\\Orvenix\\bundle.lst");
  EXPECT_EQ(FindField(job, "FileList", "CRC"), std::to_string(bundle.list.crc32));
  EXPECT_EQ(FindField(job, "Store", "Name"), "\\Storage Card");
  EXPECT_EQ(FindField(job, "Store", "RequiredSpace"), "5");
  EXPECT_EQ(FindField(job, "Syslog", "Address"), "10.0.0.9");
  EXPECT_EQ(FindField(job, "Syslog", "Port"), "514");
  EXPECT_EQ(FindField(job, "AlternateRTWReason", "BeginText"), "Upgrade begins");
  EXPECT_EQ(FindField(job, "Upgrade", "ShowGUI"), "true");
}

TEST_F(BundleTest, TurnsSyslogOffInsteadOfLeavingItOpen) {
  scratch_.Write("in/a", "a");
  MakeBundle(Options());

  EXPECT_EQ(FindField(ReadJob(scratch_.path() / "out/job.xml"), "Syslog", "Port"), "0");
}

TEST_F(BundleTest, IsReadAgainAsItWasMade) {
  scratch_.Write("in/a.ini", "a");
  scratch_.Write("in/sub/b.INI", "b");
  BundleOptions options = Options();
  options.attributes = {{"*.ini", "read-only,hidden"}};
  const Bundle made = MakeBundle(options);

  const Bundle read = ReadBundle(options.out);

  EXPECT_EQ(read.name, made.name);
  EXPECT_EQ(read.address, "127.0.0.2");
  EXPECT_EQ(read.port, 8080);
  EXPECT_EQ(read.total_size, 2U);
  ASSERT_EQ(read.files.size(), 2U);
  EXPECT_EQ(read.files[0].attributes, 3U);
  EXPECT_EQ(read.files[0].crc32, made.files[0].crc32);
  EXPECT_EQ(read.files[1].destination, "\\Application\\sub\\b.INI");
  EXPECT_EQ(read.files[1].attributes, 0U);
}

TEST_F(BundleTest, TellsServerAndDevicesTheSameOfAMulticast) {
  scratch_.Write("in/a.txt", "12345");
  BundleOptions options = Options();
  options.multicast = ParseMulticastSetup("239.1.1.255:7001");
  options.multicast->device_text = "TQ52";
  options.multicast->block_size = 512;
  options.multicast->encrypt = true;
  MakeBundle(options);

  const Job job = ReadJob(options.out / "job.xml");
  const Bundle read = ReadBundle(options.out);

  EXPECT_EQ(FindField(job, "MulticastClient", "Parameters"), "-A=239.1.1.255 -P=7001 -HV=TQ52");
  EXPECT_EQ(FindField(job, "MultiCast", "MulticastIP"), "239.1.1.255");
  EXPECT_EQ(FindField(job, "MultiCast", "UDPPort"), "7001");
  EXPECT_EQ(FindField(job, "MultiCast", "UDPBlockSize"), "512");
  ASSERT_TRUE(read.multicast);
  EXPECT_EQ(read.multicast->group, "239.1.1.255");
  EXPECT_EQ(read.multicast->private_group, "239.1.2.0") << "the next address";
  EXPECT_EQ(read.multicast->port, 7001);
  EXPECT_EQ(read.multicast->block_size, 512U);
  EXPECT_EQ(read.multicast->device_text, "TQ52");
  EXPECT_TRUE(read.multicast->encrypt);
}

TEST_F(BundleTest, SaysNothingOfMulticastUnlessItIsWanted) {
  scratch_.Write("in/a.txt", "12345");
  MakeBundle(Options());

  EXPECT_FALSE(ReadBundle(Options().out).multicast);
  EXPECT_THAT(Read("out/job.xml"), Not(HasSubstr("ulti")));
  EXPECT_THAT(Read("out/bundle.json"), Not(HasSubstr("multicast")));
}

TEST_F(BundleTest, AnnouncesFoldersBeforeWhatLiesInThemAndTheListLast) {
  scratch_.Write("in/a/b/deep", "1");
  scratch_.Write("in/a/file", "2");
  scratch_.Write("in/top", "3");
  scratch_.Write("in/empty", "");
  scratch_.Write("in/only/by/http.ini", "4");
  BundleOptions options = Options();
  options.multicast = MulticastSetup{};
  options.http_only = {"*.ini"};
  MakeBundle(options);

  std::vector<std::string> announced;
  for (const BundleFile& file : AnnouncedFiles(ReadBundle(options.out))) {
    announced.push_back(file.destination);
  }

  EXPECT_THAT(announced,
              ::testing::ElementsAre("\\Application\\top", "\\Application\\a\\file",
                                     "\\Application\\a\\b\\deep", "\\Orvenix\\bundle.lst"));
}

TEST_F(BundleTest, GivesFilesMasksOfTheirOwn) {
  scratch_.Write("in/all", "1");
  scratch_.Write("in/other/some", "2");
  BundleOptions options = Options();
  options.file_masks = {{"other/*", "MV?? MR41"}, {"*", "TQ5*"}};
  MakeBundle(options);

  EXPECT_THAT(Read("out/tree/bundle.lst"), HasSubstr("bundle/all,\\Application\\all,TQ5*,"));
  EXPECT_THAT(Read("out/tree/bundle.lst"), HasSubstr("\\some,MV?? MR41,"));
}

TEST_F(BundleTest, RefusesAMulticastThatDevicesCouldNotFollow) {
  scratch_.Write("in/a", "a");
  const auto complaint = [this](auto change) {
    BundleOptions options = Options();
    options.multicast = MulticastSetup{};
    change(options);
    return Complaint(options, ExitCode::kUsage);
  };
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->group = "10.0.0.1"; }),
              HasSubstr("\"10.0.0.1\" is no multicast address"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->private_group = "239.1.1"; }),
              HasSubstr("--private-group"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->private_group = "239.1.1.1"; }),
              HasSubstr("is the group of the announcements"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->block_size = 65001; }),
              HasSubstr("--block-size"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->device_text = "TQ52-A1"; }),
              HasSubstr("holds a '-'"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->device_text = "TQ 52"; }),
              HasSubstr("holds a ' '"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.multicast->device_text = std::string(64, 'x'); }),
              HasSubstr("devices keep 63"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.masks = "TQ5*"; }),
              HasSubstr("some files are for certain devices only"));
  EXPECT_THAT(complaint([](BundleOptions& o) {
                o.file_masks = {{"*", "A,B"}};
              }),
              HasSubstr("--masks-for"));
  for (const char* port : {"0", "65536", "many", "-1", "700000"}) {
    EXPECT_THROW(static_cast<void>(ParseMulticastSetup(std::string("239.1.1.1:") + port)), Failure)
        << port;
  }
  EXPECT_EQ(ParseMulticastSetup("239.1.1.1").port, 7000);
}

struct NameCase {
  std::string name;
  const char* complaint;
};

TEST_F(BundleTest, RefusesNamesThatNoListOrDeviceCanCarryBeforeItWritesAnything) {
  const NameCase kCases[] = {
      {"a,b", "holds a ','"},
      {"a\nb", "holds a character"},
      {"a\rb", "holds a character"},
      {"a\\b", "holds a backslash"},
      {"a:b", "holds a ':'"},
      {"what?", "holds a character"},
      {"a*b", "holds a '*'"},
      {"caf\xC3\xA9", "holds a character"},
      {std::string(128, 'd') + "/" + std::string(128, 'f'), "has 264 characters"},
  };
  for (const NameCase& c : kCases) {
    const fs::path file = scratch_.Write("in/" + c.name, "x");
    EXPECT_THAT(Complaint(Options(), ExitCode::kBadInput), HasSubstr(c.complaint)) << c.name;
    EXPECT_FALSE(fs::exists(scratch_.path() / "out")) << c.name;
    fs::remove(file);
  }
}

TEST_F(BundleTest, AcceptsTheLongestPathsThatFit) {
  // "\Application\" has 13 characters, and devices keep 259.
  const std::string name = std::string(120, 'd') + "/" + std::string(125, 'f');
  scratch_.Write("in/" + name, "x");

  EXPECT_EQ(MakeBundle(Options()).files.at(0).destination.size(), 259U);
}

TEST_F(BundleTest, RefusesTwoNamesThatADeviceTakesForOne) {
  scratch_.Write("in/Read.me", "x");
  scratch_.Write("in/READ.ME", "y");

  EXPECT_THAT(Complaint(Options(), ExitCode::kBadInput), HasSubstr("in letter case only"));
}

TEST_F(BundleTest, RefusesFilesThatADeviceCannotCount) {
  fs::resize_file(scratch_.Write("in/huge", ""), std::uintmax_t{1} << 31U);
  EXPECT_THAT(Complaint(Options(), ExitCode::kBadInput), HasSubstr("is larger than 2 GiB"));

  fs::resize_file(scratch_.path() / "in/huge", (std::uintmax_t{1} << 31U) - 1);
  scratch_.Write("in/one more", "x");
  EXPECT_THAT(Complaint(Options(), ExitCode::kBadInput), HasSubstr("larger than 2 GiB together"));
}

TEST_F(BundleTest, RefusesLinksAndEmptyFolders) {
  fs::create_directories(scratch_.path() / "in");
  EXPECT_THAT(Complaint(Options(), ExitCode::kBadInput), HasSubstr("there is no file"));

  fs::create_symlink("/etc/passwd", scratch_.path() / "in/link");
  EXPECT_THAT(Complaint(Options(), ExitCode::kBadInput), HasSubstr("is not a regular file"));
}

TEST_F(BundleTest, RefusesOptionsThatDevicesCannotUse) {
  scratch_.Write("in/a", "a");
  const auto complaint = [this](auto change) {
    BundleOptions options = Options();
    change(options);
    return Complaint(options, ExitCode::kUsage);
  };
  EXPECT_THAT(complaint([](BundleOptions& o) { o.name = "7up"; }),
              HasSubstr("begin with a letter"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.name = "a/b"; }), HasSubstr("not a plain name"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.address = "http://x"; }), HasSubstr("--address"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.port = 0; }), HasSubstr("0 is no port"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.destination = "/app"; }), HasSubstr("--dest"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.masks = "A,B"; }), HasSubstr("--masks"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.masks = " ; "; }), HasSubstr("--masks"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.end_text = std::string(64, 'e'); }),
              HasSubstr("devices keep 63"));
  EXPECT_THAT(complaint([](BundleOptions& o) { o.syslog_address = "loghost"; }),
              HasSubstr("no IPv4 address"));
  EXPECT_THAT(complaint([](BundleOptions& o) {
                o.attributes = {{"*", "purple"}};
              }),
              HasSubstr("no attribute"));
}

TEST_F(BundleTest, ReplacesABundleButNothingElse) {
  scratch_.Write("in/a", "a");
  scratch_.Write("out/precious.txt", "mine");
  EXPECT_THAT(Complaint(Options(), ExitCode::kCannotWrite), HasSubstr("is not a bundle"));
  EXPECT_EQ(Read("out/precious.txt"), "mine");
  fs::remove_all(scratch_.path() / "out");
  MakeBundle(Options());
  fs::remove(scratch_.path() / "in/a");
  scratch_.Write("in/b", "b");

  MakeBundle(Options());

  EXPECT_FALSE(fs::exists(scratch_.path() / "out/tree/bundle/a"));
  EXPECT_TRUE(fs::exists(scratch_.path() / "out/tree/bundle/b"));
}

TEST_F(BundleTest, NeverPutsABundleIntoItsOwnInput) {
  scratch_.Write("in/a", "a");
  BundleOptions options = Options();
  options.out = options.folder / "out";

  EXPECT_THAT(Complaint(options, ExitCode::kUsage), HasSubstr("lie in one another"));
}

TEST_F(BundleTest, SaysWhatIsWrongWithAManifest) {
  for (const char* text : {"", "{", "[]", "{\"format\":\"other\"}", "{\"format\":7}",
                           "{\"format\":\"orvenix-bundle-1\",\"name\":[]}"}) {
    scratch_.Write("bad/bundle.json", text);
    EXPECT_THROW(static_cast<void>(ReadBundle(scratch_.path() / "bad")), Failure) << text;
  }
}

}  // namespace
}  // namespace tools

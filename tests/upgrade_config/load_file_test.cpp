// What each element of a configuration file puts into a job.
#include <gmock/gmock.h>

#include <fstream>
#include <iterator>
#include <string>

#include "upgrade_config/configuration_test.h"

namespace {

using test::Downloads;
using test::GetFile;
using test::Package;
using test::Packages;
using test::Texts;
using ::testing::ElementsAre;
using ::testing::SizeIs;

using LoadFileTest = test::ConfigurationTest;

// ---- single values ----

using U = UpgradeConfig;

struct NumberCase {
  const char* element;
  int (U::*get)() const noexcept;
};
const NumberCase kNumbers[] = {{"HTTPPort", &U::GetHTTPPort},
                               {"FilePacketXferSize", &U::GetXferPacketSize},
                               {"DownloadLoopCnt", &U::GetDownloadLoopCount}};

std::string Element(const std::string& name, const std::string& text) {
  return "<" + name + ">" + text + "</" + name + ">";
}

TEST_F(LoadFileTest, TakesNumbersAsTheDeviceReadsThem) {
  struct Case {
    const char* text;
    int number;
  };
  for (const NumberCase& field : kNumbers) {
    for (const Case& c : {Case{"8080", 8080}, Case{"0", 0}, Case{"-7", -7}, Case{" \t12x", 12},
                          Case{"x", 0}, Case{"0x10", 0}, Case{"4294967297", 1}}) {
      UpgradeConfig job;
      EXPECT_EQ(Load(job, Element(field.element, c.text)), 1);
      EXPECT_EQ((job.*field.get)(), c.number) << field.element << " " << c.text;
    }
  }
}

TEST_F(LoadFileTest, PassesOverElementsWithoutText) {
  for (const NumberCase& field : kNumbers) {
    const UpgradeConfig untouched;
    for (const std::string& element :
         {Element(field.element, ""), "<" + std::string(field.element) + "/>",
          "<" + std::string(field.element) + " Value='1'/>",
          "<" + std::string(field.element) + ">5<Inner/></" + field.element + ">"}) {
      UpgradeConfig job;
      EXPECT_EQ(Load(job, element), 1);
      EXPECT_EQ((job.*field.get)(), (untouched.*field.get)()) << element;
    }
  }
}

struct TextCase {
  const char* before;
  const char* behind;
  const char* (U::*get)() const noexcept;
  std::size_t size;
};
const TextCase kTexts[] = {
    {"<UpgradeConfig Version='", "'/>", &U::GetVersion, 64},
    {"<BaseUrl>", "</BaseUrl>", &U::GetBaseURL, 256},
    {"<Syslog Address='", "'/>", &U::GetSysLogIP, 32},
    {"<FlashFileDir>", "</FlashFileDir>", &U::GetFlashFileFolder, 128},
    {"<InfFile>", "</InfFile>", &U::GetINFFileSrc, 260},
    {"<InfFile>", "</InfFile>", &U::GetINFFile, 64},
    {"<FlashWriter Name='", "'/>", &U::GetProcessName, 260},
    {"<FlashWriter CmdLine='", "'/>", &U::GetProcessParms, 260},
    {"<BeginText>", "</BeginText>", &U::GetUpgBeginMsg, 64},
    {"<EndText>", "</EndText>", &U::GetUpgEndMsg, 64},
};

TEST_F(LoadFileTest, TakesTextsAsTheyStandAndCutsThemToTheirField) {
  for (const TextCase& field : kTexts) {
    UpgradeConfig job;
    Load(job, field.before + std::string(" a &amp; b% ") + field.behind);
    EXPECT_STREQ((job.*field.get)(), " a & b% ") << field.before;

    UpgradeConfig cut;
    Load(cut, field.before + std::string(1000, 'x') + field.behind);
    EXPECT_EQ((cut.*field.get)(), std::string(field.size - 1, 'x')) << field.before;
    EXPECT_STREQ(cut.GetMfgString(), "TQ52-A1") << field.before;
    EXPECT_EQ(cut.GetSysLogPort(), 0) << field.before;
    EXPECT_TRUE(cut.FirmwarePackages().empty() && cut.RegistryTests().empty()) << field.before;
  }
}

TEST_F(LoadFileTest, KeepsTextsOfElementsThatHaveNone) {
  UpgradeConfig job;
  job.SetUpgBeginMsg("begin");
  job.SetUpgEndMsg("end");
  job.SetShowGUI(0);
  Load(job, "<BeginText/><EndText></EndText><ShowGUI/><InfFile/><FlashFileDir/>");
  EXPECT_STREQ(job.GetUpgBeginMsg(), "begin");
  EXPECT_STREQ(job.GetUpgEndMsg(), "end");
  EXPECT_EQ(job.GetShowGUI(), 0);
}

TEST_F(LoadFileTest, KeepsTheBaseUrlOfTheHost) {
  UpgradeConfig job;
  job.SetBaseURL("http://host");
  Load(job, "<BaseUrl>http://file</BaseUrl>");
  EXPECT_STREQ(job.GetBaseURL(), "http://host");

  UpgradeConfig unset;
  Load(unset, "<BaseUrl>http://first</BaseUrl><BaseUrl>http://second</BaseUrl>");
  EXPECT_STREQ(unset.GetBaseURL(), "http://first");
}

TEST_F(LoadFileTest, TakesTheLastOfSeveralOtherValues) {
  UpgradeConfig job;
  job.SetHTTPPort(1);
  Load(job, "<HTTPPort>2</HTTPPort><EndText>a</EndText><EndText>b</EndText><HTTPPort>3</HTTPPort>");
  EXPECT_EQ(job.GetHTTPPort(), 3);
  EXPECT_STREQ(job.GetUpgEndMsg(), "b");
}

TEST_F(LoadFileTest, LooksAtTheVersionBelowTheRootOnly) {
  UpgradeConfig job;
  EXPECT_EQ(LoadText(job, "<UpgradeConfig Version='1'><HTTPPort>5</HTTPPort></UpgradeConfig>"), 1);
  EXPECT_STREQ(job.GetVersion(), "");
  EXPECT_EQ(job.GetHTTPPort(), 5);

  LoadText(job, "<Any><UpgradeConfig/><UpgradeConfig Version='2'/><UpgradeConfig/></Any>");
  EXPECT_STREQ(job.GetVersion(), "2");
}

TEST_F(LoadFileTest, TakesEachSyslogAttributeByItself) {
  UpgradeConfig job;
  Load(job, "<Syslog Port='70000'>514</Syslog>");
  EXPECT_EQ(job.GetSysLogPort(), 4464) << "16 bits";
  EXPECT_STREQ(job.GetSysLogIP(), "");

  Load(job, "<Syslog Address='127.0.0.3'/>");
  EXPECT_EQ(job.GetSysLogPort(), 4464);
  EXPECT_STREQ(job.GetSysLogIP(), "127.0.0.3");

  Load(job, "<Syslog address='x' port='1'/><Syslog/>");
  EXPECT_EQ(job.GetSysLogPort(), 4464);

  Load(job, "<Syslog Address='' Port=''/>");
  EXPECT_EQ(job.GetSysLogPort(), 0);
  EXPECT_STREQ(job.GetSysLogIP(), "");
}

TEST_F(LoadFileTest, SplitsTheFileNameOffTheInfFile) {
  struct Case {
    const char* path;
    const char* name;
  };
  for (const Case& c : {Case{"apps\\job.inf", "job.inf"}, Case{"apps/job.inf", "job.inf"},
                        Case{"a\\b/c.d.e", "c.d.e"}, Case{"job.inf", "job.inf"},
                        Case{"C:job.inf", "job.inf"}, Case{"apps\\", ""}, Case{"\\", ""}}) {
    UpgradeConfig job;
    Load(job, Element("InfFile", c.path));
    EXPECT_STREQ(job.GetINFFileSrc(), c.path);
    EXPECT_STREQ(job.GetINFFile(), c.name) << c.path;
  }
}

TEST_F(LoadFileTest, FindsTheInfFilesNameBehindAPathThatIsCut) {
  UpgradeConfig job;
  Load(job, Element("InfFile", std::string(300, 'p') + "\\job.inf"));
  EXPECT_EQ(job.GetINFFileSrc(), std::string(259, 'p'));
  EXPECT_STREQ(job.GetINFFile(), "job.inf");
}

TEST_F(LoadFileTest, WaitsForTheWriterUnlessItSaysExactlyFalse) {
  for (const char* wait : {"true", "False", "FALSE", "0", "", " false", "falsehood"}) {
    UpgradeConfig job;
    Load(job, "<FlashWriter Wait='" + std::string(wait) + "'/>");
    EXPECT_EQ(job.GetProcessWait(), 1) << wait;
  }
  UpgradeConfig job;
  Load(job, "<FlashWriter Wait='false'/><FlashWriter Wait='true' Name='w.exe'/>");
  EXPECT_EQ(job.GetProcessWait(), 0) << "nothing in a file sets it again";
  EXPECT_STREQ(job.GetProcessName(), "w.exe");
  EXPECT_STREQ(job.GetProcessParms(), "");
}

TEST_F(LoadFileTest, ShowsTheWindowUnlessTheTextIsFalseInAnyLetterCase) {
  struct Case {
    const char* element;
    int show;
  };
  for (const Case& c :
       {Case{"<ShowGUI>false</ShowGUI>", 0}, Case{"<ShowGUI>FALSE</ShowGUI>", 0},
        Case{"<showgui>False</showgui>", 0}, Case{"<SHOWGUI>fAlSe</SHOWGUI>", 0},
        Case{"<ShowGUI>true</ShowGUI>", 1}, Case{"<ShowGUI>0</ShowGUI>", 1},
        Case{"<ShowGUI> false</ShowGUI>", 1}, Case{"<showGui>anything</showGui>", 1}}) {
    UpgradeConfig job;
    job.SetShowGUI(7);
    Load(job, c.element);
    EXPECT_EQ(job.GetShowGUI(), c.show) << c.element;
  }
}

TEST_F(LoadFileTest, KnowsNamesInTheirExactLettersOnly) {
  UpgradeConfig job;
  Load(job,
       "<httpport>1</httpport><BaseURL>x</BaseURL><INFFile>x</INFFile><StopProcess>"
       "<Process>x</Process></StopProcess><Download><File SourceDir='a' DestDir='b'/></Download>"
       "<downloads><File SourceDir='a' DestDir='b'/></downloads><begintext>x</begintext>"
       "<RegistryTests><Root>x</Root></RegistryTests><FlashFileStore>x</FlashFileStore>"
       "<OsFirmware><Package HardwareVersion='*' SourceDir='a'/></OsFirmware>"
       "<x:HTTPPort>1</x:HTTPPort><HTTPPorts>1</HTTPPorts><HTTPPor>1</HTTPPor>"
       "<File SourceDir='a' DestDir='b'/><Process>x</Process>"
       "<Package HardwareVersion='*' SourceDir='a'/><Root>x</Root>");
  EXPECT_EQ(job.GetHTTPPort(), 80);
  EXPECT_STREQ(job.GetBaseURL(), "");
  EXPECT_STREQ(job.GetINFFileSrc(), "");
  EXPECT_STREQ(job.GetUpgBeginMsg(), "");
  EXPECT_STREQ(job.GetFlashFileStore(), "") << "the file says nothing about it";
  EXPECT_TRUE(job.ProcessesToStop().empty() && job.DownloadFiles().empty());
  EXPECT_TRUE(job.FirmwarePackages().empty() && job.RegistryTests().empty());
  EXPECT_EQ(job.GetFirmwarePackageCount(), 0);
}

TEST_F(LoadFileTest, FindsElementsAtAnyDepth) {
  UpgradeConfig job;
  std::string text = "<HTTPPort>81</HTTPPort>";
  for (int level = 0; level < 62; ++level) text = "<Level>" + text + "</Level>";
  EXPECT_EQ(Load(job, text + "<Other><DownloadLoopCnt>3</DownloadLoopCnt></Other>"), 1);
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_EQ(job.GetDownloadLoopCount(), 3);
}

TEST_F(LoadFileTest, FindsElementsInsideOthersThatItKnows) {
  UpgradeConfig job;
  EXPECT_EQ(LoadText(job,
                     "<Any><UpgradeConfig Version='1'><HTTPPort>81</HTTPPort><Syslog Port='5'>"
                     "<FlashWriter Name='w'><EndText>e</EndText></FlashWriter></Syslog>"
                     "<Downloads><File SourceDir='a' DestDir='b'/></Downloads></UpgradeConfig>"
                     "<BeginText>lost<DownloadLoopCnt>4</DownloadLoopCnt></BeginText></Any>"),
            1);
  EXPECT_STREQ(job.GetVersion(), "1");
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_EQ(job.GetSysLogPort(), 5);
  EXPECT_STREQ(job.GetProcessName(), "w");
  EXPECT_STREQ(job.GetUpgEndMsg(), "e");
  EXPECT_THAT(Downloads(job), ElementsAre("a -> b"));
  EXPECT_STREQ(job.GetUpgBeginMsg(), "") << "an element with children has no text";
  EXPECT_EQ(job.GetDownloadLoopCount(), 4);
}

// ---- lists ----

TEST_F(LoadFileTest, ListsProcessesToStop) {
  UpgradeConfig job;
  job.AddStopProcess("host.exe");
  Load(job,
       "<StopProcesses><Process>a.exe</Process><Process/><process>no.exe</process>"
       "<Other>no.exe</Other><Process>b &lt;1&gt;.exe</Process></StopProcesses>"
       "<StopProcesses/><StopProcesses><Process>a.exe</Process></StopProcesses>");
  EXPECT_THAT(Texts(job.ProcessesToStop()), ElementsAre("host.exe", "a.exe", "b <1>.exe", "a.exe"));
}

TEST_F(LoadFileTest, ListsDownloadsThatHaveBothEnds) {
  UpgradeConfig job;
  Load(job,
       "<Downloads><File SourceDir='a\\b' DestDir='\\c d'/><File SourceDir='only'/>"
       "<File DestDir='only'/><File/><file SourceDir='x' DestDir='y'/>"
       "<File sourcedir='x' DestDir='y'/><File SourceDir='' DestDir=''>text</File></Downloads>");
  EXPECT_THAT(Downloads(job), ElementsAre("a\\b -> \\c d", " -> "));
  const tagDownloadFile& file = *job.DownloadFiles()[0];
  for (const char* empty : {file.crc, file.masks, file.size}) EXPECT_STREQ(empty, "");
  EXPECT_THAT(file.work_area, ::testing::Each(0));
}

TEST_F(LoadFileTest, CutsTheEndsOfADownloadToTheirFields) {
  UpgradeConfig job;
  Load(job, "<Downloads><File SourceDir='" + std::string(300, 's') + "' DestDir='" +
                std::string(300, 'd') + "'/></Downloads>");
  EXPECT_THAT(Downloads(job), ElementsAre(std::string(259, 's') + " -> " + std::string(259, 'd')));
  EXPECT_STREQ(job.DownloadFiles()[0]->crc, "");
}

TEST_F(LoadFileTest, ListsWhatToDeleteAndWhatToSave) {
  UpgradeConfig job;
  Load(job,
       "<DiskCleanup><File Action='delete'>\\Temp</File><File Action='SAVE'>\\Temp\\a</File>"
       "<File Action='Delete'> </File><File Action='keep'>\\x</File><File>\\x</File>"
       "<File Action='delete'/><File action='delete'>\\x</File><File Action=''>\\x</File>"
       "<Folder Action='delete'>\\x</Folder></DiskCleanup>");
  EXPECT_THAT(Texts(job.FilesToDelete()), ElementsAre("\\Temp", " "));
  EXPECT_THAT(Texts(job.FilesToSave()), ElementsAre("\\Temp\\a"));
}

TEST_F(LoadFileTest, TakesPathsOfAnyLengthForDiskCleanup) {
  UpgradeConfig job;
  const std::string path(5000, 'p');
  Load(job, "<DiskCleanup><File Action='delete'>" + path + "</File></DiskCleanup>");
  EXPECT_THAT(Texts(job.FilesToDelete()), ElementsAre(path));
}

TEST_F(LoadFileTest, MakesOneTestOfEachRegistryElement) {
  UpgradeConfig job;
  Load(job,
       "<Registry><Root>HKEY_CURRENT_USER</Root><Key>Software\\A</Key><ValueName>V</ValueName>"
       "<Type>REG_SZ</Type><Operator>EQ</Operator><Value>1</Value><ErrorMsg>no V</ErrorMsg>"
       "<Other>x</Other></Registry><Registry/>");
  ASSERT_THAT(job.RegistryTests(), SizeIs(2));
  const tagRegistryTest& test = *job.RegistryTests()[0];
  EXPECT_STREQ(test.root, "HKEY_CURRENT_USER");
  EXPECT_STREQ(test.key, "Software\\A");
  EXPECT_STREQ(test.value_name, "V");
  EXPECT_STREQ(test.type, "REG_SZ");
  EXPECT_STREQ(test.operation, "EQ");
  EXPECT_STREQ(test.value, "1");
  EXPECT_STREQ(test.error_message, "no V");
  const tagRegistryTest& empty = *job.RegistryTests()[1];
  for (const char* text : {empty.root, empty.key, empty.value_name, empty.type, empty.operation,
                           empty.value, empty.error_message}) {
    EXPECT_STREQ(text, "") << "no defaults";
  }
}

TEST_F(LoadFileTest, CutsEachTextOfATestToItsField) {
  struct Case {
    const char* element;
    std::size_t size;
    const char* (*get)(const tagRegistryTest& test);
  };
  using T = tagRegistryTest;
  const Case cases[] = {
      {"Root", 260, [](const T& t) -> const char* { return t.root; }},
      {"Key", 260, [](const T& t) -> const char* { return t.key; }},
      {"ValueName", 260, [](const T& t) -> const char* { return t.value_name; }},
      {"Value", 260, [](const T& t) -> const char* { return t.value; }},
      {"Type", 24, [](const T& t) -> const char* { return t.type; }},
      {"ErrorMsg", 256, [](const T& t) -> const char* { return t.error_message; }},
      {"Operator", 12, [](const T& t) -> const char* { return t.operation; }},
  };
  for (const Case& c : cases) {
    UpgradeConfig job;
    Load(job, "<Registry>" + Element(c.element, std::string(999, 'x')) + "</Registry>");
    ASSERT_THAT(job.RegistryTests(), SizeIs(1));
    EXPECT_EQ(c.get(*job.RegistryTests()[0]), std::string(c.size - 1, 'x')) << c.element;
    std::size_t filled = 0;
    for (const Case& other : cases) filled += *other.get(*job.RegistryTests()[0]) != '\0' ? 1 : 0;
    EXPECT_EQ(filled, 1U) << c.element;
  }
}

TEST_F(LoadFileTest, KeepsATestsTextWhenALaterElementOfItsNameHasNone) {
  UpgradeConfig job;
  Load(job, "<Registry><Key>a</Key><Key>b</Key><Key/></Registry>");
  ASSERT_THAT(job.RegistryTests(), SizeIs(1));
  EXPECT_STREQ(job.RegistryTests()[0]->key, "b");
}

TEST_F(LoadFileTest, LogsTheTestsThatItAdds) {
  UpgradeConfig job;
  Load(job, "<Registry/><HTTPPort>1</HTTPPort><Registry><Key>a</Key></Registry>");
  EXPECT_EQ(GetFile("\\FileXfer.log"),
            "UpgradeConfig - Registry\r\nUpgradeConfig - Adding Registry Item\r\n"
            "UpgradeConfig - Registry\r\nUpgradeConfig - Adding Registry Item\r\n");
}

TEST_F(LoadFileTest, TakesNothingButItsOwnChildrenInsideAList) {
  UpgradeConfig job;
  for (const char* list : {"StopProcesses", "Downloads", "DiskCleanup", "Registry", "OSFirmware"}) {
    Load(job, Element(list,
                      "<HTTPPort>1</HTTPPort><BaseUrl>x</BaseUrl><InfFile>x</InfFile>"
                      "<UpgradeConfig Version='1'/><FlashWriter Name='x'/><ShowGUI>false</ShowGUI>"
                      "<EndText>x</EndText><Syslog Port='1'/><BeginText>x</BeginText>"));
    EXPECT_EQ(job.GetHTTPPort(), 80) << list;
    EXPECT_EQ(job.GetShowGUI(), 1) << list;
    EXPECT_EQ(job.GetSysLogPort(), 0) << list;
    for (const char* text : {job.GetBaseURL(), job.GetINFFileSrc(), job.GetVersion(),
                             job.GetProcessName(), job.GetUpgEndMsg(), job.GetUpgBeginMsg()}) {
      EXPECT_STREQ(text, "") << list;
    }
  }
}

TEST_F(LoadFileTest, TakesAListsChildrenAtAnyDepth) {
  UpgradeConfig job;
  Load(job,
       "<Downloads><Group><File SourceDir='a' DestDir='b'><File SourceDir='c' DestDir='d'/></File>"
       "</Group></Downloads><StopProcesses><x><Process>p</Process></x></StopProcesses>"
       "<Registry><Key>outer<Value>inner</Value></Key></Registry>");
  EXPECT_THAT(Downloads(job), ElementsAre("a -> b", "c -> d"));
  EXPECT_THAT(Texts(job.ProcessesToStop()), ElementsAre("p"));
  EXPECT_STREQ(job.RegistryTests()[0]->key, "") << "an element with children has no text";
  EXPECT_STREQ(job.RegistryTests()[0]->value, "inner");
}

TEST_F(LoadFileTest, EndsAListWithTheFirstElementOfItsNameThatEnds) {
  UpgradeConfig job;
  Load(job,
       "<Downloads><File SourceDir='a' DestDir='b'/><Downloads/><File SourceDir='c' DestDir='d'/>"
       "<HTTPPort>81</HTTPPort></Downloads><EndText>end</EndText>");
  EXPECT_THAT(Downloads(job), ElementsAre("a -> b"));
  EXPECT_EQ(job.GetHTTPPort(), 81) << "outside of the list";
  EXPECT_STREQ(job.GetUpgEndMsg(), "end");
}

TEST_F(LoadFileTest, DoesNotBeginAListInsideAnother) {
  UpgradeConfig job;
  Load(job,
       "<Downloads><StopProcesses><Process>p</Process></StopProcesses>"
       "<DiskCleanup><File Action='delete' SourceDir='a' DestDir='b'>x</File></DiskCleanup>"
       "<Registry><Key>k</Key></Registry></Downloads>");
  EXPECT_TRUE(job.ProcessesToStop().empty() && job.FilesToDelete().empty());
  EXPECT_TRUE(job.RegistryTests().empty());
  EXPECT_THAT(Downloads(job), ElementsAre("a -> b")) << "a File like any other";
}

TEST_F(LoadFileTest, ReadsOnBehindEveryList) {
  UpgradeConfig job;
  Load(job,
       "<StopProcesses/><DownloadLoopCnt>1</DownloadLoopCnt><OSFirmware></OSFirmware>"
       "<Group><Downloads> </Downloads></Group><HTTPPort>2</HTTPPort><DiskCleanup/>"
       "<EndText>3</EndText><Registry/>");
  EXPECT_EQ(job.GetDownloadLoopCount(), 1);
  EXPECT_EQ(job.GetHTTPPort(), 2);
  EXPECT_STREQ(job.GetUpgEndMsg(), "3");
  EXPECT_THAT(job.RegistryTests(), SizeIs(1));
}

// ---- whole files ----

TEST_F(LoadFileTest, AddsToWhatTheHostHasSet) {
  UpgradeConfig job;
  job.SetHTTPIPAddress("127.0.0.2");
  job.SetHTTPPort(8080);
  job.SetProcessParms("host");
  job.SetShowGUI(0);
  job.SetProcessWait(0);
  job.AddFileDelete("\\host");
  Load(job, "<DiskCleanup><File Action='delete'>\\file</File></DiskCleanup><EndText>e</EndText>");
  EXPECT_STREQ(job.GetHTTPIPAddress(), "127.0.0.2");
  EXPECT_EQ(job.GetHTTPPort(), 8080);
  EXPECT_STREQ(job.GetProcessParms(), "host");
  EXPECT_EQ(job.GetShowGUI(), 0);
  EXPECT_EQ(job.GetProcessWait(), 0);
  EXPECT_THAT(Texts(job.FilesToDelete()), ElementsAre("\\host", "\\file"));
}

TEST_F(LoadFileTest, AddsASecondFileToTheFirst) {
  UpgradeConfig job;
  const std::string text = "<Downloads><File SourceDir='a' DestDir='b'/></Downloads>" +
                           Package("HardwareVersion='*' SourceDir='fw' AdditionalParms='Pass=1'") +
                           "<Registry/>";
  Load(job, text);
  Load(job, text + "<HTTPPort>81</HTTPPort>");
  EXPECT_THAT(Downloads(job), SizeIs(2));
  EXPECT_THAT(Packages(job), SizeIs(2));
  EXPECT_THAT(job.RegistryTests(), SizeIs(2));
  EXPECT_EQ(job.GetFirmwarePackageCount(), 2);
  EXPECT_EQ(job.GetHTTPPort(), 81);
  EXPECT_EQ(job.IsMultiPass(), 1);
}

TEST_F(LoadFileTest, ReadsAFileOfEveryStyle) {
  for (const char* text :
       {"\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"utf-8\"?>\r\n<Job>\r\n\t<HTTPPort>81"
        "</HTTPPort>\r\n\t<!-- <HTTPPort>1</HTTPPort> -->\r\n</Job>\r\n",
        "<Job ><HTTPPort >81</HTTPPort ></Job >trailing <HTTPPort>1</HTTPPort>",
        "\n\n<?xml?><Job><?pi <HTTPPort?><HTTPPort>81</HTTPPort></Job>"}) {
    UpgradeConfig job;
    EXPECT_EQ(LoadText(job, text), 1);
    EXPECT_EQ(job.GetHTTPPort(), 81) << text;
  }
}

TEST_F(LoadFileTest, TakesBytesOfOtherAlphabetsAsTheyAre) {
  UpgradeConfig job;
  Load(job, "<EndText>f\xC3\xBCr \xFF</EndText>");
  EXPECT_STREQ(job.GetUpgEndMsg(), "f\xC3\xBCr \xFF");
}

std::string Read(const std::string& path) {
  std::ifstream stream(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
}

TEST_F(LoadFileTest, ReadsTheExampleOfTheDocumentation) {
  const std::string page = Read(ORVENIX_TESTS_FOLDER "/../docs/formats/configuration.md");
  const std::size_t begin = page.find("```xml\n");
  ASSERT_NE(begin, std::string::npos);
  const std::size_t end = page.find("```\n", begin + 7);
  UpgradeConfig job;

  EXPECT_EQ(LoadText(job, page.substr(begin + 7, end - begin - 7)), 1);

  EXPECT_STREQ(job.GetVersion(), "2.1");
  EXPECT_STREQ(job.GetBaseURL(), "http://127.0.0.2");
  EXPECT_EQ(job.GetHTTPPort(), 8080);
  EXPECT_STREQ(job.GetSysLogIP(), "127.0.0.3");
  EXPECT_EQ(job.GetSysLogPort(), 514);
  EXPECT_STREQ(job.GetUpgBeginMsg(), "Upgrade begins");
  EXPECT_STREQ(job.GetUpgEndMsg(), "Upgrade ends");
  EXPECT_EQ(job.GetShowGUI(), 0);
  EXPECT_STREQ(job.GetINFFileSrc(), "apps\\stock.inf");
  EXPECT_STREQ(job.GetINFFile(), "stock.inf");
  EXPECT_STREQ(job.GetFlashFileFolder(), "\\Flash File Store\\images");
  EXPECT_EQ(job.GetXferPacketSize(), 8192);
  EXPECT_EQ(job.GetDownloadLoopCount(), 3);
  EXPECT_STREQ(job.GetProcessName(), "\\Windows\\writer.exe");
  EXPECT_STREQ(job.GetProcessParms(), "-quiet");
  EXPECT_EQ(job.GetProcessWait(), 0);
  EXPECT_THAT(Texts(job.ProcessesToStop()), ElementsAre("scanner.exe"));
  EXPECT_THAT(Downloads(job), ElementsAre("misc/readme.txt -> \\Application\\readme.txt"));
  EXPECT_THAT(Texts(job.FilesToDelete()), ElementsAre("\\Temp"));
  EXPECT_THAT(Texts(job.FilesToSave()), ElementsAre("\\Temp\\stock.db"));
  ASSERT_THAT(job.RegistryTests(), SizeIs(1));
  EXPECT_STREQ(job.RegistryTests()[0]->operation, "GTE");
  EXPECT_STREQ(job.RegistryTests()[0]->error_message, "Radio firmware is too old");
  EXPECT_THAT(Packages(job), ElementsAre("fw\\|os|\\Flash File Store\\"));
  EXPECT_EQ(job.FirmwarePackages()[0]->count, 2);
  EXPECT_EQ(job.GetFirmwarePackageCount(), 2);
}

}  // namespace

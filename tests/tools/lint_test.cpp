// What `orvenix job lint` finds: for every rule a job that breaks it, and jobs that break none.

#include "tools/lint/lint.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>
#include <sstream>

#include "server/site.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/job_file.h"
#include "tools/lint_jobs.h"

namespace tools {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

constexpr auto kAfterConfigurations = static_cast<std::size_t>(Rule::kNoStorage);

struct LintCase {
  std::string id;
  std::string job;
  std::string found = "";  ///< part of what is said
};

std::vector<LintCase> CasesOfTheWalk() {
  return {
      {"unknown-group", With(Group("Sislog", "")), "no group \"Sislog\""},
      {"unknown-field", With(Field("Colour", "red")), "no field \"Colour\""},
      {"unknown-field", With(Test(Field("Val", "1")))},
      {"no-upgrade", Group("Orvenix", kServer)},
      {"no-upgrade", Group("Upgrade", kServer), "not stand inside"},
      {"two-upgrades",
       Group("Orvenix", Group("Upgrade", kServer + kStore + kList) + Group("Upgrade", ""))},
      {"lost-setting", kServer + With(""), "before the beginning"},
      {"lost-setting",
       Group("Orvenix",
             Group("Upgrade", kServer + kStore + kList) + Group("Syslog", Field("Port", "0"))),
       "behind the end"},
      {"stray-field", With(Field("RequiredSpace", "5")), "\"Store\""},
      {"stray-field", With(Field("Operator", "EQ")), "\"Registry\""},
      {"ignored-field", With(Field("Source", "a")), "Source has no meaning"},
      {"ignored-field", With(Group("Syslog", Field("Wait", "false")))},
      {"ignored-field", With(Group("Process", Field("Process", "a.exe")))},
      {"group-case", With(Group("DiskCleanup", Group("FILE", Field("Action", "Save"))))},
      {"group-case", With(Group("multicastclient", Field("Parameters", "-A=1")))},
      {"short-name", With(Group("Syslog", Field("P", "0"))), "\"P\" sets \"Port\""},
      {"idle-file", With(Group("File", ""))},
      {"cut-text", With(Group("AlternateRTWReason", Field("BeginText", std::string(64, 'x')))),
       "64 characters, the device keeps 63"},
      {"not-ascii", With(Group("AlternateRTWReason", Field("BeginText", "gr\xC3\xBC\xC3\x9F")))},
      {"outer-blanks", With(Group("StopProcess", Field("Process", " a.exe")))},
      {"switch-text", With(Field("ShowGUI", "False")), "ShowGUI is \"False\""},
      {"switch-text", With(Group("StartProcess", Field("Process", "a") + Field("Wait", "no")))},
  };
}

std::vector<LintCase> CasesOfTheDevice() {
  return {
      {"no-storage", Upgrade(kServer + kList)},
      {"storage-unnamed", With(Group("Store", Field("RequiredSpace", "1")))},
      {"storage-number",
       With(Group("Store", Field("Name", "\\") + Field("RequiredSpace", "2147483648")))},
      {"storage-number", With(Group("Store", Field("Name", "\\")))},
      {"storage-last", With(Group("Store", Field("Name", "\\Temp") + Field("RequiredSpace", "1"))),
       "\"\\Temp\" comes last"},
      {"storage-last-ram",
       With(Group("Store", Field("Name", "RAM:") + Field("RequiredSpace", "1")))},
      {"storage-second-ram",
       With(Group("Store", Field("Name", "RAM:") + Field("RequiredSpace", "1")) +
            Group("Store", Field("Name", "RAM:x") + Field("RequiredSpace", "1")) + kStore)},
      {"test-no-type", With(GoodTestWithout("Type")), "the test of \"V\" has no Type"},
      {"test-type", With(GoodTestWithout("Type", Field("Type", "String")))},
      {"test-type", With(GoodTestWithout("Type", Field("Type", "reg_sz")))},
      {"test-operator", With(GoodTestWithout("Operator"))},
      {"test-operator", With(GoodTestWithout("Operator", Field("Operator", "eq")))},
      {"test-root", With(GoodTestWithout("", Field("Root", "HKLM"))), "\"HKLM\""},
      {"test-no-key", With(GoodTestWithout("Key"))},
      {"test-number", With(GoodTestWithout("Value", Field("Value", "-1")))},
      {"test-number", With(GoodTestWithout("Value", Field("Value", "0x10")))},
      {"test-no-message", With(GoodTestWithout("ErrorMsg"))},
      {"syslog-address",
       With(Group("Syslog", Field("Port", "514") + Field("Address", "logs.local")))},
      {"syslog-address", With(Group("Syslog", Field("Port", "514"))), "port 514 of \"\""},
      {"syslog-address",
       With(Group("Syslog", Field("Port", "514") + Field("Address", "10.0.0.256")))},
      {"syslog-port", With(Group("Syslog", Field("Port", "65536"))), "kept as 0"},
      {"end-without-begin", With(Field("EndText", "Done"))},
      {"markup-in-text", With(Field("BeginText", "A &amp; B"))},
      {"markup-in-text", With(GoodTestWithout("ErrorMsg", Field("ErrorMsg", "a &lt; b")))},
      {"url-missing", Upgrade(kStore + kList)},
      {"url-scheme", Upgrade(kStore + kList + Field("BaseURL", "https://10.0.0.2"))},
      {"url-scheme", Upgrade(kStore + kList + Field("BaseURL", "10.0.0.2"))},
      {"url-path-without-port", Upgrade(kStore + kList + Field("BaseURL", "http://10.0.0.2/"))},
      {"url-path-without-port", Upgrade(kStore + kList + Field("BaseURL", "http://10.0.0.2/dir"))},
      {"url-own-port-joined", Upgrade(kStore + kList + Field("BaseURL", "http://10.0.0.2:8080"))},
      {"url-own-port", Upgrade(kStore + kList + Field("BaseURL", "http://10.0.0.2:8080/"))},
      {"http-port", With(Field("HTTPPort", "0"))},
      {"http-port", With(Field("HTTPPort", "70000"))},
      {"address-differs", With(Field("IPAddress", "10.0.0.3"))},
      {"multicast-parameters",
       With(Group("MulticastClient", Field("Parameters", "-A=239.1.1.1 -X=1")))},
  };
}

std::string Multicast(const std::string& parameters, const std::string& fields = "") {
  return With(Group("MultiCast", fields) +
              Group("MulticastClient", Field("Parameters", parameters)));
}

std::vector<LintCase> CasesOfMulticast() {
  const std::string good = "-A=239.1.1.1 -P=7000 -HV=TQ52";
  return {
      {"multicast-parameters", Multicast(good + "-BE"), "-HV=TQ52-BE"},
      {"multicast-text", Multicast(good + "-BE"), "behind -HV=TQ52 stands \"-BE\""},
      {"multicast-text", Multicast(good + "/A1")},
      {"multicast-text", Multicast(good + std::string(60, 'x')), "has 64 characters"},
      {"multicast-group", Multicast("-P=7000 -HV=TQ52"), "there is no -A"},
      {"multicast-group", Multicast("-A=10.0.0.2 -P=7000 -HV=TQ52"), "-A is \"10.0.0.2\""},
      {"multicast-group", Multicast(" "), "there is no -A"},
      {"multicast-port", Multicast("-A=239.1.1.1 -HV=TQ52"), "there is no -P"},
      {"multicast-port", Multicast("-A=239.1.1.1 -P=0 -HV=TQ52"), "-P is \"0\""},
      {"multicast-port", Multicast("-A=239.1.1.1 -P=70000 -HV=TQ52")},
      {"multicast-option", Multicast(good + " -PORT=1"), "\"PORT=1\""},
      {"multicast-option", Multicast(good + " -A"), "\"A\""},
      {"multicast-option", Multicast(good + " -UX=1")},
      {"multicast-no-text", Multicast("-A=239.1.1.1 -P=7000")},
      {"multicast-status", Multicast(good + " -UA=127.0.0.1 -UP=5655")},
      {"multicast-differs", Multicast(good, Field("MulticastIP", "239.1.1.9")), "239.1.1.9"},
      {"multicast-differs", Multicast(good, Field("UDPPort", "7001")), "UDPPort is \"7001\""},
      {"cut-text", Multicast(good + std::string(240, ' ')), "the device keeps 259"},
  };
}

std::vector<LintCase> CasesOfFilesAndCleanup() {
  return {
      {"nothing-to-fetch", Upgrade(kServer + kStore)},
      {"file-no-source", With(Download("", "\\a"))},
      {"file-no-destination", With(Download("a", ""))},
      {"file-no-mask", With(Download("a", "\\a", " ; "))},
      {"path-no-letter", With(Download("/123", "\\a")), "\"/123\""},
      {"path-leading", With(Download("1st", "\\a")), "\"1st\""},
      {"destination-name", With(Download("a", "\\a?"))},
      {"destination-folder", With(Download("a", "\\folder\\"))},
      {"destination-relative", With(Download("a", "a"))},
      {"duplicate-destination", With(Download("a", "\\A") + Download("b", "\\a")),
       "comes from job.xml:1"},
      {"duplicate-destination", With(Download("a", "\\A", "MR*") + Download("b", "\\a", "*"))},
      {"duplicate-for-others", With(Download("a", "\\A", "MR*") + Download("b", "\\a", "TQ*"))},
      {"rename-target", With(Download("a", "\\a.rename") + Download("b", "\\a"))},
      {"crc-zero", With(Download("a", "\\a", "*", "0"))},
      {"crc-number", With(Download("a", "\\a", "*", "0x12"))},
      {"ram-without-store", With(Download("a", "RAM:a"))},
      {"ram-name", With(Download("a", "RAM:image-of-the-loader.nb0"))},
      {"ram-case", With(Download("a", "Ram:os.nb0"))},
      {"destination-macro", With(Download("a", "\\%CE2%\\a.dll"))},
      {"delete-root", With(Cleanup("Delete", "\\"))},
      {"delete-root", With(Cleanup("delete", "\\\\"))},
      {"delete-wildcard", With(Cleanup("Delete", "\\Temp\\*.*"))},
      {"delete-dot-folder", With(Cleanup("Delete", "\\My.App\\"))},
      {"delete-dot-folder", With(Cleanup("Delete", "\\My.App\\data"))},
      {"delete-relative", With(Cleanup("Delete", "Temp"))},
      {"cleanup-idle", With(Cleanup("Delete", "")), "without a Name"},
      {"cleanup-idle", With(Cleanup("Remove", "\\Temp")), "without Delete or Save"},
      {"save-double-backslash",
       With(Cleanup("Delete", "\\Temp\\") + Cleanup("Save", "\\Temp\\a.txt"))},
      {"save-direct", With(Cleanup("Delete", "\\Temp\\a.txt") + Cleanup("Save", "\\temp\\A.TXT"))},
      {"save-nothing", With(Cleanup("Save", "\\Temp\\a.txt"))},
      {"save-nothing", With(Cleanup("Delete", "\\Temp") + Cleanup("Save", "\\Temp"))},
      {"save-nothing", With(Cleanup("Delete", "\\Temp") + Cleanup("Save", "\\Temp/a.txt"))},
      {"save-nothing", With(Cleanup("Delete", "\\Temp") + Cleanup("Save", "\\Temp\\sub\\"))},
      {"save-nothing", With(Cleanup("Delete", "\\Temp") + Cleanup("Save", "\\Temper\\a.txt"))},
      {"save-nothing", With(Cleanup("Delete", "\\Temp") + Cleanup("Save", "\\Temp\\x.y\\a.txt"))},
      {"stop-path", With(Group("StopProcess", Field("Process", "\\Windows\\a.exe")))},
      {"stop-name", With(Group("StopProcess", Field("Process", "scanner")))},
      {"stop-system", With(Group("StopProcess", Field("Process", "GWES.exe")))},
      {"start-no-program", With(Group("StartProcess", Field("Parameters", "x")))},
      {"installer-blank", With(Group("StartProcess", Field("Process", "\\Windows\\wceload.exe") +
                                                         Field("Parameters", "\\a.cab")))},
      {"installer-case", With(Group("StartProcess", Field("Process", "WCELOAD.EXE")))},
  };
}

TEST(LintTest, FindsNothingInAJobWithoutAFault) {
  EXPECT_THAT(Ids(LintText(With(""))), IsEmpty());
  EXPECT_THAT(
      Ids(LintText(With(
          GoodTestWithout("") +
          Group("Syslog", Field("Port", "514") + Field("Address", "10.0.0.5")) +
          Cleanup("Delete", "\\Temp") + Cleanup("SAVE", "\\temp\\sub\\Keep.txt") +
          Cleanup("Delete", "\\old.txt") + Group("StopProcess", Field("Process", "Scanner.exe")) +
          Group("StartProcess", Field("Process", "\\Windows\\wceload.exe") +
                                    Field("Parameters", "/noui \\a.cab") + Field("Wait", "false")) +
          Group("MulticastClient", Field("Parameters", "-A=239.1.1.1 -p=7000 /HV=MR41")) +
          Download("folder/a", "\\a.rename", "MR* TQ*")))),
      IsEmpty());
}

TEST(LintTest, FindsWhatEachRuleIsAbout) {
  std::set<std::string> seen;
  for (const auto& cases :
       {CasesOfTheWalk(), CasesOfTheDevice(), CasesOfMulticast(), CasesOfFilesAndCleanup()}) {
    for (const LintCase& c : cases) {
      const Findings findings = LintText(c.job);
      EXPECT_THAT(Ids(findings), Contains(c.id)) << c.job;
      seen.insert(c.id);
      for (const Finding& finding : findings.all()) {
        if (RowOf(finding.rule).id != c.id) continue;
        EXPECT_THAT(finding.found, HasSubstr(c.found));
        EXPECT_EQ(finding.where, "job.xml:1");
      }
    }
  }
  // The rules about the server's files and about configuration files have tests of their own.
  for (const char* id :
       {"list-missing", "list-crc", "list-shift", "list-zero-byte", "list-field-long",
        "size-number", "file-missing", "file-crc", "file-size", "size-short", "size-reserve",
        "file-unlisted", "multicast-folder", "cabinet-broken", "cabinet-compressed",
        "cabinet-files", "cabinet-macro"}) {
    seen.insert(id);
  }
  for (auto i = static_cast<std::size_t>(Rule::kUnknownElement); i < kAfterConfigurations; ++i) {
    seen.insert(RowOf(static_cast<Rule>(i)).id);
  }
  for (std::size_t i = 0; i < static_cast<std::size_t>(Rule::kCount); ++i) {
    const RuleRow& rule = RowOf(static_cast<Rule>(i));
    EXPECT_EQ(seen.count(rule.id), 1U) << rule.id << " has no case";
    EXPECT_STRNE(rule.device, "");
    EXPECT_STRNE(rule.fix, "");
  }
}

TEST(LintTest, HasTheRulesThatItsDocumentLists) {
  const std::string document = ReadWholeFile(ORVENIX_LINT_DOCUMENT);
  std::string table = "|---|---|---|\n";
  for (std::size_t i = 0; i < static_cast<std::size_t>(Rule::kCount); ++i) {
    const RuleRow& rule = RowOf(static_cast<Rule>(i));
    table +=
        std::string("| ") + rule.id + " | " + NameOf(rule.level) + " | " + rule.device + " |\n";
  }

  EXPECT_THAT(document, HasSubstr(table));
}

TEST(LintTest, TakesALargeJobAtOnce) {
  std::string cleanup;
  for (int i = 0; i < 20'000; ++i) {
    const std::string name = "\\Folder" + std::to_string(i);
    cleanup += "\n" + Group("File", Field("Name", name) + Field("Action", "Delete")) +
               Group("File", Field("Name", name + "\\keep.txt") + Field("Action", "Save"));
  }

  const Findings findings = LintText(With(Group("DiskCleanup", cleanup) + Cleanup("Save", "\\x")));

  ASSERT_EQ(findings.all().size(), 1U);
  EXPECT_EQ(findings.all()[0].where, "job.xml:20001");
}

TEST(LintTest, NamesTheLineAndKeepsWhatFitsAsTheDeviceDoes) {
  const Findings findings =
      LintText("<Group Name='Orvenix'>\n<Group Name='Upgrade'>\n" + kServer + kStore + kList +
               "\n" + Group("StartProcess", "\n" + Field("Process", "a") + Field("Wait", "FALSE")) +
               "</Group></Group>");

  ASSERT_EQ(findings.all().size(), 1U);
  EXPECT_EQ(findings.all()[0].where, "job.xml:5");
}

TEST(LintTest, TakesWhatBundlesSayOfMulticast) {
  const std::string fields = Field("MulticastIP", "239.1.1.1") + Field("UDPPort", "7000");

  EXPECT_THAT(Ids(LintText(Multicast("-A=239.1.1.1 -P=7000 -HV=TQ52", fields))), IsEmpty());
  EXPECT_THAT(Ids(LintText(Multicast("/a=239.1.1.1-p=7000-hv=TQ52 -DA=10.0.0.1 -DP=514"))),
              IsEmpty());
}

TEST(LintTest, DoesNotTakeTheCrcOfTheListForLeftOut) {
  const std::string list =
      Group("FileList", Field("Source", "l") + Field("Dest", "\\l") + Field("CRC", "0"));

  EXPECT_THAT(Ids(LintText(Upgrade(kServer + kStore + list))), ElementsAre("list-crc"));
}

TEST(LintOutputTest, GroupsFindingsByRuleWithTheWorstFirst) {
  std::string tests;
  for (int i = 0; i < 7; ++i) tests += GoodTestWithout("Type");
  const Findings findings = LintText(With(tests + Field("EndText", "Done")));

  std::ostringstream out;
  PrintFindings(out, "job.xml", findings);

  EXPECT_EQ(
      out.str(),
      "job.xml: 7 errors, 1 warning\n"
      "\nerror  test-no-type\n"
      "  job.xml:1  the test of \"V\" has no Type\n"
      "  job.xml:1  the test of \"V\" has no Type\n"
      "  job.xml:1  the test of \"V\" has no Type\n"
      "  job.xml:1  the test of \"V\" has no Type\n"
      "  job.xml:1  the test of \"V\" has no Type\n"
      "  and 2 more\n"
      "  device: presets the type \"String\", which names no registry type: the test always "
      "fails\n"
      "  fix:    add Type REG_SZ or REG_DWORD\n"
      "\nwarning  end-without-begin\n"
      "  job.xml:1  EndText is \"Done\"\n"
      "  device: ends with \"Upgrade Complete\": the end text is used only with a begin text\n"
      "  fix:    add a BeginText, or leave the EndText out\n");
}

TEST(LintOutputTest, TellsTheSameInJson) {
  const auto json = FindingsJson("job.xml", LintText(Upgrade(kServer + kList)));

  EXPECT_EQ(json.at("event"), "linted");
  EXPECT_EQ(json.at("errors"), 1);
  EXPECT_EQ(json.at("warnings"), 0);
  const auto& finding = json.at("findings").at(0);
  EXPECT_EQ(finding.at("id"), "no-storage");
  EXPECT_EQ(finding.at("level"), "error");
  EXPECT_EQ(finding.at("where"), "job.xml:1");
  EXPECT_THAT(finding.at("device").get<std::string>(), HasSubstr("0xC4111002"));
}

TEST(LintOutputTest, NamesTheRulesOfARefusedJob) {
  const Findings findings = LintText(Upgrade(kList + Group("Syslog", Field("Port", "514"))));

  try {
    RefuseErrors("job.xml", findings, "mend them");
    FAIL() << "the job has errors";
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.code(), ExitCode::kBadInput);
    EXPECT_STREQ(
        failure.what(),
        "job.xml: 3 errors in the job: no-storage, syslog-address, url-missing; mend them");
  }
}

}  // namespace
}  // namespace tools

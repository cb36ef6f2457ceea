#include "tools/job_file.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tools/failure.h"

namespace tools {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

std::string InSubsystem(const std::string& groups) {
  return "<DevInfo><Subsystem Name=\"Orvenix\">" + groups + "</Subsystem></DevInfo>";
}

/// The walk over a job: "+group", "field=value", "-group".
void Walk(const JobGroup& group, std::vector<std::string>& steps) {
  steps.push_back("+" + group.name);
  for (const JobGroup::Child& child : group.children) {
    if (const auto* inner = std::get_if<JobGroup>(&child)) {
      Walk(*inner, steps);
    } else {
      const auto& field = std::get<JobField>(child);
      steps.push_back(field.name + "=" + field.value);
    }
  }
  steps.push_back("-" + group.name);
}

std::vector<std::string> Walk(const Job& job) {
  std::vector<std::string> steps;
  for (const JobGroup& group : job.groups) Walk(group, steps);
  return steps;
}

std::string Complaint(const std::string& text) {
  try {
    static_cast<void>(ParseJob(text, "job.xml"));
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.code(), ExitCode::kBadInput);
    return failure.what();
  }
  return "nothing";
}

TEST(JobFileTest, IsWalkedInDocumentOrder) {
  const Job job = ParseJob(InSubsystem("<Group Name='Orvenix'><Group Name='Upgrade'>"
                                       "<Field Name='A'>1</Field><Group Name='G'/>"
                                       "<Field Name='B'>2</Field></Group></Group>"),
                           "job.xml");

  EXPECT_THAT(Walk(job), ElementsAre("+Orvenix", "+Upgrade", "A=1", "+G", "-G", "B=2", "-Upgrade",
                                     "-Orvenix"));
}

TEST(JobFileTest, TakesAFieldsTextAsItStands) {
  const Job job = ParseJob(InSubsystem("<Group Name='G'><Field Name='A'> x </Field>"
                                       "<Field Name='B'>a&amp;b&lt;<![CDATA[c & d]]></Field>"
                                       "<Field Name='C'> </Field><Field Name='D'/></Group>"),
                           "job.xml");

  EXPECT_THAT(Walk(job), ElementsAre("+G", "A= x ", "B=a&b<c & d", "C= ", "D=", "-G"));
}

TEST(JobFileTest, PassesOverOtherSubsystems) {
  const Job job = ParseJob(
      "<DevInfo><Subsystem Name='Other'><Thing/></Subsystem>"
      "<Subsystem Name='ORVENIX'><Group Name='G'/></Subsystem></DevInfo>",
      "job.xml");

  EXPECT_THAT(Walk(job), ElementsAre("+G", "-G"));
}

TEST(JobFileTest, IsWrittenAndReadAgainWithoutLoss) {
  Job job;
  job.groups.push_back({"Orvenix", {}, 0});
  JobGroup& group = job.groups[0].AddGroup("A \"quoted\" <group>");
  group.AddField("Dest", "\\a & b\\ file ");
  group.AddField("Empty", "");
  group.AddField("Blank", " ");

  EXPECT_EQ(Walk(ParseJob(FormatJob(job), "job.xml")), Walk(job));
  EXPECT_EQ(FormatJob(job), FormatJob(job));
}

TEST(JobFileTest, NamesTheLineOfWhatIsWrong) {
  EXPECT_THAT(
      Complaint("<DevInfo>\n<Subsystem Name='Orvenix'>\n<Group>\n</Group></Subsystem></DevInfo>"),
      HasSubstr("job.xml:3: <Group> has no Name; write <Group Name="));
  EXPECT_THAT(Complaint(InSubsystem("<Group Name='G'>\n<Fld Name='A'/></Group>")),
              HasSubstr("job.xml:2: unknown element <Fld>"));
  EXPECT_THAT(Complaint(InSubsystem("<Group Name='G'><Field Name='A'>x<b/></Field></Group>")),
              HasSubstr("job.xml:1: the field \"A\" holds an element <b>"));
  EXPECT_THAT(Complaint("<DevInfo>\n<Subsystem"), HasSubstr("job.xml:2: not well-formed XML"));
  EXPECT_THAT(Complaint(""), HasSubstr("not well-formed XML"));
  EXPECT_THAT(Complaint("<Other/>"), HasSubstr("not a <DevInfo>"));
  EXPECT_THAT(Complaint("<DevInfo/>"), HasSubstr("no <Subsystem Name=\"Orvenix\">"));
  EXPECT_THAT(Complaint(InSubsystem("")), HasSubstr("has no <Group>"));
}

TEST(JobFileTest, RefusesNestingThatNoHostHas) {
  std::string text;
  for (int i = 0; i < 5000; ++i) text += "<Group Name='G'>";
  for (int i = 0; i < 5000; ++i) text += "</Group>";

  EXPECT_THAT(Complaint(InSubsystem(text)), HasSubstr("nested too deeply"));
}

TEST(JobFileTest, SurvivesAnyDamage) {
  const std::string whole = FormatJob(
      ParseJob(InSubsystem("<Group Name='G'><Field Name='A'>v</Field></Group>"), "job.xml"));
  for (std::size_t at = 0; at < whole.size(); ++at) {
    for (const char damage : {'\0', '<', '>', '"', '&', '\xFF'}) {
      std::string text = whole;
      text[at] = damage;
      try {
        static_cast<void>(ParseJob(text, "job.xml"));
      } catch (const Failure& failure) {
        EXPECT_EQ(failure.code(), ExitCode::kBadInput);
      }
    }
    if (at + 1 == whole.size()) continue;  // only the last line end is missing
    EXPECT_NE(Complaint(whole.substr(0, at)), "nothing") << "cut at " << at;
  }
}

TEST(JobFileTest, FindsAFieldOfAGroupWithoutRegardToCase) {
  const Job job = ParseJob(InSubsystem("<Group Name='A'><Group Name='B'><Field Name='C'>1</Field>"
                                       "</Group></Group>"),
                           "job.xml");

  EXPECT_EQ(FindField(job, "b", "c"), "1");
  EXPECT_EQ(FindField(job, "B", "D"), "");
  EXPECT_EQ(FindField(job, "X", "C"), "");
}

}  // namespace
}  // namespace tools

// Texts of jobs, good ones and bad ones, and what is found in them.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "tools/job_file.h"
#include "tools/lint/lint.h"

namespace tools {

inline std::string Field(const std::string& name, const std::string& value) {
  return "<Field Name='" + name + "'>" + value + "</Field>";
}
inline std::string Group(const std::string& name, const std::string& content) {
  return "<Group Name='" + name + "'>" + content + "</Group>";
}

inline const std::string kUrl = Field("BaseURL", "http://10.0.0.2");
inline const std::string kServer = Group("HTTPServer", Field("HTTPPort", "8080") + kUrl);
inline const std::string kStore = Group("Store", Field("Name", "\\") + Field("RequiredSpace", "6"));
inline const std::string kList =
    Group("FileList", Field("Source", "bundle.lst") + Field("Dest", "\\bundle.lst") +
                          Field("CRC", "12") + Field("MCTMask", "*"));

inline std::string Test(const std::string& fields) {
  return Group("Registry", fields);
}
inline std::string GoodTestWithout(const std::string& left_out, const std::string& instead = "") {
  std::string fields = instead;
  for (const auto& [name, value] :
       std::vector<std::pair<std::string, std::string>>{{"Key", "Software"},
                                                        {"ValueName", "V"},
                                                        {"Type", "REG_DWORD"},
                                                        {"Operator", "EQ"},
                                                        {"Value", "1"},
                                                        {"ErrorMsg", "no V"}}) {
    if (name != left_out) fields += Field(name, value);
  }
  return Test(fields);
}
inline std::string Download(const std::string& source, const std::string& destination,
                            const std::string& masks = "*", const std::string& crc = "12") {
  return Group("Download", Group("File", Field("Source", source) + Field("Dest", destination) +
                                             Field("CRC", crc) + Field("MCTMask", masks)));
}
inline std::string Cleanup(const std::string& action, const std::string& name) {
  return Group("DiskCleanup", Group("File", Field("Name", name) + Field("Action", action)));
}
inline std::string Upgrade(const std::string& content) {
  return Group("Orvenix", Group("Upgrade", content));
}
/// A job without a fault, and `more` in it.
inline std::string With(const std::string& more) {
  return Upgrade(kServer + kStore + kList + more);
}

inline Findings LintText(const std::string& groups, server::Site* site = nullptr,
                         bool unlisted = false) {
  return LintJob(ParseJob("<DevInfo><Subsystem Name='Orvenix'>" + groups + "</Subsystem></DevInfo>",
                          "job.xml"),
                 "job.xml", site, unlisted);
}

inline std::vector<std::string> Ids(const Findings& findings) {
  std::vector<std::string> ids;
  for (const Finding& finding : findings.all()) ids.emplace_back(RowOf(finding.rule).id);
  return ids;
}

}  // namespace tools

// `orvenix job lint`: what a device would really do with a job, said before it is sent.
#pragma once

#include <filesystem>
#include <iosfwd>
#include <nlohmann/json.hpp>
#include <string>
#include <string_view>

#include "tools/job_file.h"
#include "tools/lint/finding.h"

namespace server {
class Site;
}

namespace tools {

/// The findings of `job`, sorted. `name` stands for its file. With `site`, the folder that a server
/// serves, the list file and the files in it are checked too.
/// @param unlisted  whether served files that no list names are worth a note
[[nodiscard]] Findings LintJob(const Job& job, const std::string& name,
                               server::Site* site = nullptr, bool unlisted = false);

/// The same for a configuration file, whose text is given. Throws Failure kBadInput when it is no
/// XML.
[[nodiscard]] Findings LintConfiguration(std::string_view text, const std::string& name,
                                         server::Site* site = nullptr, bool unlisted = false);

/// By rule: what was found and where, what the device does, how to mend it.
void PrintFindings(std::ostream& out, const std::string& name, const Findings& findings);
[[nodiscard]] nlohmann::ordered_json FindingsJson(const std::string& name,
                                                  const Findings& findings);

/// "2 errors, 1 warning"; "nothing found".
[[nodiscard]] std::string CountText(const Findings& findings);

/// Throws Failure kBadInput, naming the rules, when there are errors.
void RefuseErrors(const std::string& name, const Findings& findings, const std::string& advice);

struct LintOptions {
  std::filesystem::path file;    ///< a job file, a configuration file or a bundle
  std::filesystem::path served;  ///< a bundle or served folder; empty: the bundle the job lies in
  bool json = false;
};

/// Checks and prints. Throws Failure kBadInput when there are errors, or nothing to be read.
void Lint(const LintOptions& options);

}  // namespace tools

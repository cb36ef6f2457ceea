#include "tools/lint/lint.h"

#include <iostream>
#include <memory>
#include <optional>

#include "server/ledger.h"
#include "server/site.h"
#include "tools/bundle.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/lint/checks.h"
#include "tools/lint/device_configuration.h"
#include "tools/served_files.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kPlacesShown = 5;
constexpr std::size_t kTextShown = 200;

/// Where the job lies and what serves its files.
struct Source {
  std::vector<fs::path> jobs;  ///< a bundle may have one of each kind
  fs::path root;               ///< empty: the server is not at hand
  bool lists_all = false;      ///< the one job should name all that is served
};

/// The served folder of a bundle, or the folder itself.
void SetServed(Source& source, const fs::path& folder) {
  source.root = ServedFolder(folder);
  source.lists_all =
      fs::exists(folder / kBundleManifest) && !fs::exists(folder / kBundleConfiguration);
}

Source FindSource(const LintOptions& options) {
  Source source;
  fs::path beside = options.file.parent_path().empty() ? fs::path(".") : options.file.parent_path();
  if (fs::is_directory(options.file)) {
    beside = options.file;
    for (const char* name : {kBundleJob, kBundleConfiguration}) {
      if (fs::exists(beside / name)) source.jobs.push_back(beside / name);
    }
    if (source.jobs.empty()) {
      throw Failure(ExitCode::kBadInput, options.file.string(), "there is no job.xml in the folder",
                    "name a job file, or a bundle of 'orvenix bundle make'");
    }
  } else {
    source.jobs.push_back(options.file);
  }
  if (!options.served.empty()) {
    SetServed(source, options.served);
  } else if (fs::exists(beside / kBundleManifest)) {
    SetServed(source, beside);
  }
  return source;
}

std::string Amount(std::size_t count, const char* what) {
  return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

void PrintRule(std::ostream& out, const RuleRow& rule, const std::vector<const Finding*>& found) {
  out << "\n" << NameOf(rule.level) << "  " << rule.id << "\n";
  for (std::size_t i = 0; i < found.size() && i < kPlacesShown; ++i) {
    out << "  " << server::Printable(found[i]->where, kTextShown) << "  "
        << server::Printable(found[i]->found, kTextShown) << "\n";
  }
  if (found.size() > kPlacesShown) out << "  and " << found.size() - kPlacesShown << " more\n";
  out << "  device: " << rule.device << "\n  fix:    " << rule.fix << "\n";
}

/// What holds for jobs of both kinds.
void CheckAll(const JobCheck& check, server::Site* site, bool unlisted) {
  CheckTests(check);
  CheckMessages(check);
  CheckServer(check);
  CheckFiles(check, site, unlisted);
  CheckCleanup(check);
  CheckProcesses(check);
}

}  // namespace

Findings LintJob(const Job& job, const std::string& name, server::Site* site, bool unlisted) {
  Findings findings;
  const DeviceJob read = ReadAsDevice(job, name, findings);
  if (read.upgrade_line > 0) {
    const JobCheck check{read, name, findings};
    CheckStorage(check);
    CheckAll(check, site, unlisted);
    CheckMulticast(check);
  }
  findings.Sort();
  return findings;
}

Findings LintConfiguration(std::string_view text, const std::string& name, server::Site* site,
                           bool unlisted) {
  Findings findings;
  const DeviceJob read = ReadConfiguration(text, name, findings);
  CheckAll({read, name, findings}, site, unlisted);
  findings.Sort();
  return findings;
}

std::string CountText(const Findings& findings) {
  std::string text;
  for (const Level level : {Level::kError, Level::kWarning, Level::kNote}) {
    const std::size_t count = findings.Count(level);
    if (count > 0) text += (text.empty() ? "" : ", ") + Amount(count, NameOf(level));
  }
  return text.empty() ? "nothing found" : text;
}

void PrintFindings(std::ostream& out, const std::string& name, const Findings& findings) {
  out << server::Printable(name, kTextShown) << ": " << CountText(findings) << "\n";
  const std::vector<Finding>& all = findings.all();
  for (std::size_t i = 0; i < all.size();) {
    std::vector<const Finding*> same;
    const Rule rule = all[i].rule;
    for (; i < all.size() && all[i].rule == rule; ++i) same.push_back(&all[i]);
    PrintRule(out, RowOf(rule), same);
  }
  out << std::flush;
}

nlohmann::ordered_json FindingsJson(const std::string& name, const Findings& findings) {
  nlohmann::ordered_json json{{"event", "linted"},
                              {"job", name},
                              {"errors", findings.Count(Level::kError)},
                              {"warnings", findings.Count(Level::kWarning)},
                              {"notes", findings.Count(Level::kNote)}};
  json["findings"] = nlohmann::ordered_json::array();
  for (const Finding& finding : findings.all()) {
    const RuleRow& rule = RowOf(finding.rule);
    json["findings"].push_back({{"id", rule.id},
                                {"level", NameOf(rule.level)},
                                {"where", finding.where},
                                {"found", finding.found},
                                {"device", rule.device},
                                {"fix", rule.fix}});
  }
  return json;
}

void RefuseErrors(const std::string& name, const Findings& findings, const std::string& advice) {
  const std::size_t errors = findings.Count(Level::kError);
  if (errors == 0) return;
  throw Failure(ExitCode::kBadInput, name,
                Amount(errors, "error") + " in the job: " + findings.Ids(Level::kError), advice);
}

void Lint(const LintOptions& options) {
  const Source source = FindSource(options);
  std::optional<server::Site> site;
  if (!source.root.empty()) site.emplace(source.root);
  server::Site* const served = site ? &*site : nullptr;
  std::vector<std::pair<std::string, Findings>> all;
  for (const fs::path& job : source.jobs) {
    const std::string name = job.string();
    const std::string text = ReadWholeFile(job);
    all.emplace_back(name, IsConfiguration(text)
                               ? LintConfiguration(text, name, served, false)
                               : LintJob(ParseJob(text, name), name, served, source.lists_all));
    if (options.json) {
      std::cout << FindingsJson(name, all.back().second)
                       .dump(-1, ' ', false, nlohmann::json::error_handler_t::replace)
                << std::endl;
    } else {
      PrintFindings(std::cout, name, all.back().second);
    }
  }
  for (const auto& [name, findings] : all) {
    RefuseErrors(name, findings, "mend them before the job is sent");
  }
}

}  // namespace tools

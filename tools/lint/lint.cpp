#include "tools/lint/lint.h"

#include <iostream>
#include <memory>
#include <optional>

#include "server/ledger.h"
#include "server/site.h"
#include "tools/bundle.h"
#include "tools/failure.h"
#include "tools/lint/checks.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kPlacesShown = 5;
constexpr std::size_t kTextShown = 200;

/// Where the job lies and what serves its files.
struct Source {
  fs::path job;
  fs::path root;  ///< empty: the server is not at hand
  bool is_bundle = false;
};

/// The served folder of a bundle, or the folder itself.
void SetServed(Source& source, const fs::path& folder) {
  if (!fs::is_directory(folder)) {
    throw Failure(ExitCode::kBadInput, folder.string(), "there is no such bundle or folder",
                  "name a bundle, or the folder that is served");
  }
  source.is_bundle = fs::exists(folder / kBundleManifest);
  source.root = source.is_bundle ? folder / kBundleTree : folder;
}

Source FindSource(const LintOptions& options) {
  Source source;
  source.job = options.file;
  fs::path beside = options.file.parent_path().empty() ? fs::path(".") : options.file.parent_path();
  if (fs::is_directory(options.file)) {
    source.job = options.file / kBundleJob;
    beside = options.file;
    if (!fs::exists(source.job)) {
      throw Failure(ExitCode::kBadInput, options.file.string(), "there is no job.xml in the folder",
                    "name a job file, or a bundle of 'orvenix bundle make'");
    }
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

}  // namespace

Findings LintJob(const Job& job, const std::string& name, server::Site* site, bool unlisted) {
  Findings findings;
  const DeviceJob read = ReadAsDevice(job, name, findings);
  if (read.upgrade_line > 0) {
    const JobCheck check{read, name, findings};
    CheckStorage(check);
    CheckTests(check);
    CheckMessages(check);
    CheckServer(check);
    CheckFiles(check, site, unlisted);
    CheckCleanup(check);
    CheckProcesses(check);
    CheckMulticast(check);
  }
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
  const std::string name = source.job.string();
  const Job job = ReadJob(source.job);
  std::optional<server::Site> site;
  if (!source.root.empty()) site.emplace(source.root);
  const Findings findings = LintJob(job, name, site ? &*site : nullptr, source.is_bundle);
  if (options.json) {
    std::cout << FindingsJson(name, findings)
                     .dump(-1, ' ', false, nlohmann::json::error_handler_t::replace)
              << std::endl;
  } else {
    PrintFindings(std::cout, name, findings);
  }
  RefuseErrors(name, findings, "mend them before the job is sent");
}

}  // namespace tools

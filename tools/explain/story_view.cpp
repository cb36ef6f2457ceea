// A log's story for people and for scripts.
#include <ostream>

#include "server/request.h"
#include "tools/explain/explain.h"

namespace tools {
namespace {

constexpr std::size_t kTextShown = 160;
constexpr std::size_t kTroublesShown = 10;

std::string Clean(const std::string& text) {
  return server::Printable(text, kTextShown);
}

std::string Lines(std::size_t first, std::size_t last) {
  if (first == last) return "line " + std::to_string(first);
  return "lines " + std::to_string(first) + " to " + std::to_string(last);
}

std::string Amount(std::size_t count, const char* what) {
  return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

const CodeRow* ResultOf(const JobStory& job) {
  return job.result ? FindCode(CodeKind::kResult, *job.result) : nullptr;
}

/// In one sentence, what the end of the log means.
std::string EndText(const JobStory& job) {
  const CodeRow* result = ResultOf(job);
  switch (job.end) {
    case JobEnd::kNone: return "there is nothing of a job";
    case JobEnd::kNotStarted: return "the host set fields; the job was never started";
    case JobEnd::kRefused:
      return result == nullptr ? "" : std::string(result->name) + ": " + result->meaning;
    case JobEnd::kUnfinished:
      return "the log ends in the phase " + std::string(NameOf(job.stretches.back().phase)) +
             ": the upgrade still runs, or the device was reset or switched off";
    case JobEnd::kFailed: return "the upgrade failed";
    case JobEnd::kComplete: return "the upgrade ended well; " + Amount(job.files, "file") + " came";
  }
  return "";
}

std::string RemedyOf(const Trouble& trouble) {
  const CodeRow* code = trouble.code();
  return code != nullptr && *code->remedy != '\0' ? code->remedy : trouble.row->remedy;
}

std::string MeaningOf(const Trouble& trouble) {
  const CodeRow* code = trouble.code();
  std::string meaning = trouble.row->meaning;
  if (code != nullptr) meaning += "; " + std::string(code->name) + ": " + code->meaning;
  return meaning;
}

void PrintTrouble(std::ostream& out, const Trouble& trouble) {
  out << "  " << trouble.count << " x  " << Lines(trouble.first, trouble.last) << "  "
      << Clean(trouble.text) << "\n        " << MeaningOf(trouble) << "\n";
}

void PrintCause(std::ostream& out, const JobStory& job) {
  const CodeRow* result = ResultOf(job);
  std::string remedy = result != nullptr ? result->remedy : "";
  if (job.cause) {
    const Trouble& cause = job.troubles[*job.cause];
    out << "cause    " << MeaningOf(cause) << "\n         " << Lines(cause.first, cause.last)
        << ", " << Amount(cause.count, "time") << ": " << Clean(cause.text) << "\n";
    if (!RemedyOf(cause).empty()) remedy = RemedyOf(cause);
  }
  if (!job.message.empty()) out << "message  " << Clean(job.message) << "\n";
  if (!remedy.empty()) out << "remedy   " << remedy << "\n";
}

nlohmann::ordered_json TroubleJson(const Trouble& trouble) {
  nlohmann::ordered_json json{{"text", trouble.text},
                              {"count", trouble.count},
                              {"first", trouble.first},
                              {"last", trouble.last},
                              {"phase", NameOf(trouble.row->phase)},
                              {"meaning", trouble.row->meaning},
                              {"remedy", RemedyOf(trouble)}};
  if (trouble.number) json["number"] = *trouble.number;
  if (const CodeRow* code = trouble.code()) {
    json["number_name"] = code->name;
    json["number_meaning"] = code->meaning;
  }
  return json;
}

}  // namespace

void PrintStory(std::ostream& out, const std::string& name, const JobStory& job, std::size_t jobs) {
  out << Clean(name) << ": job " << job.number << " of " << jobs << ", "
      << Lines(job.first, job.last) << "\n\n"
      << "outcome  " << NameOf(job.end) << "\n         " << EndText(job) << "\n";
  PrintCause(out, job);
  out << "\nphases\n";
  for (const PhaseStretch& stretch : job.stretches) {
    std::string phase = NameOf(stretch.phase);
    phase.resize(10, ' ');
    out << "  " << phase << Lines(stretch.first, stretch.last);
    if (!stretch.time.empty()) out << ", from " << stretch.time;
    if (stretch.files > 0) out << ", " << Amount(stretch.files, "file");
    if (stretch.troubles > 0) out << ", " << Amount(stretch.troubles, "trouble");
    out << "\n";
  }
  if (!job.troubles.empty()) out << "\ntroubles\n";
  for (std::size_t i = 0; i < job.troubles.size() && i < kTroublesShown; ++i) {
    PrintTrouble(out, job.troubles[i]);
  }
  if (job.troubles.size() > kTroublesShown) {
    out << "  and " << job.troubles.size() - kTroublesShown << " more kinds\n";
  }
  if (!job.events.empty()) out << "\nevents\n";
  for (const LoggedEvent& event : job.events) {
    const CodeRow* code = FindCode(CodeKind::kEvent, event.code);
    out << "  line " << event.line << "  " << event.time << (event.time.empty() ? "" : "  ")
        << event.code << " " << (code == nullptr ? "" : code->name)
        << (event.text.empty() ? "" : "  ") << Clean(event.text) << "\n";
  }
  out << std::flush;
}

nlohmann::ordered_json StoryJson(const std::string& name, const JobStory& job, std::size_t jobs) {
  nlohmann::ordered_json json{
      {"event", "explained"},       {"file", name},        {"jobs", jobs},
      {"job", job.number},          {"first", job.first},  {"last", job.last},
      {"outcome", NameOf(job.end)}, {"text", EndText(job)}};
  if (const CodeRow* result = ResultOf(job)) {
    json["result"] = *job.result;
    json["result_name"] = result->name;
    json["remedy"] = result->remedy;
  }
  if (!job.message.empty()) json["message"] = job.message;
  if (job.cause) json["cause"] = TroubleJson(job.troubles[*job.cause]);
  json["files"] = job.files;
  json["phases"] = json["troubles"] = json["events"] = nlohmann::ordered_json::array();
  for (const PhaseStretch& stretch : job.stretches) {
    nlohmann::ordered_json phase{{"phase", NameOf(stretch.phase)}, {"first", stretch.first},
                                 {"last", stretch.last},           {"lines", stretch.lines},
                                 {"files", stretch.files},         {"troubles", stretch.troubles}};
    if (!stretch.time.empty()) phase["time"] = stretch.time;
    json["phases"].push_back(phase);
  }
  for (const Trouble& trouble : job.troubles) json["troubles"].push_back(TroubleJson(trouble));
  for (const LoggedEvent& event : job.events) {
    json["events"].push_back(
        {{"line", event.line}, {"code", event.code}, {"text", event.text}, {"time", event.time}});
  }
  return json;
}

}  // namespace tools

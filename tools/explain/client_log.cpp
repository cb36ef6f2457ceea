#include "tools/explain/client_log.h"

#include <algorithm>
#include <ostream>

#include "server/request.h"

namespace tools {
namespace {

constexpr std::size_t kMaxKinds = 200;
constexpr std::size_t kMaxText = 160;
constexpr std::string_view kFirst = "Command line parsed and multicast client instantiated";
constexpr std::string_view kStarted = "State machine thread created";
constexpr std::string_view kSwitchedOff = "Client configured NOT to load!";

std::string Clean(const std::string& text) {
  return server::Printable(text, kMaxText);
}

std::string EndText(const ClientRunStory& run) {
  switch (run.end) {
    case ClientEnd::kNone: return "there is nothing of a client";
    case ClientEnd::kSwitchedOff:
    case ClientEnd::kNotStarted: return run.lines[*run.failed].row->meaning;
    case ClientEnd::kBroken: return "the log ends before the client runs: the device was reset";
    case ClientEnd::kRan: return "the client ran; what it received stands in the transfer log";
  }
  return "";
}

std::string Lines(const ClientLine& line) {
  if (line.first == line.last) return "line " + std::to_string(line.first);
  return "lines " + std::to_string(line.first) + " to " + std::to_string(line.last);
}

bool IsTrouble(const ClientLine& line) {
  return line.row->weight == Weight::kTrouble || line.row->weight == Weight::kFatal;
}

}  // namespace

const char* NameOf(ClientEnd end) {
  switch (end) {
    case ClientEnd::kNone: return "none";
    case ClientEnd::kSwitchedOff: return "switched-off";
    case ClientEnd::kNotStarted: return "not-started";
    case ClientEnd::kBroken: return "broken";
    case ClientEnd::kRan: return "ran";
  }
  return "";
}

void ClientLog::BeginRun() {
  ++runs_;
  begun_ = true;
  if (!Keeps()) return;
  run_ = {};
  run_.number = runs_;
  run_.first = line_;
}

void ClientLog::Line(std::string_view line) {
  ++line_;
  if (line.empty()) return;
  const std::string_view text = SplitStamp(line).message;
  const TextRow* const row = matcher_.Find(text).row;
  if (row == nullptr) {
    if (runs_ > 0 && Keeps()) ++run_.unknown;
    return;
  }
  // A log server has the lines of a client from where its syslog begins.
  if (row->format == kFirst || runs_ == 0) BeginRun();
  if (row->format == kStarted) begun_ = false;
  if (!Keeps()) return;
  run_.last = line_;
  Add(*row, text);
}

void ClientLog::Add(const TextRow& row, std::string_view text) {
  auto& lines = run_.lines;
  auto known = std::find_if(lines.begin(), lines.end(),
                            [&row](const ClientLine& line) { return line.row == &row; });
  if (known == lines.end()) {
    if (lines.size() >= kMaxKinds) return;
    known = lines.insert(lines.end(),
                         ClientLine{&row, std::string(text.substr(0, kMaxText)), line_, line_, 0});
    if (row.weight == Weight::kFatal) run_.failed = lines.size() - 1;
  }
  known->last = line_;
  ++known->count;
}

ClientRunStory ClientLog::Finish() {
  if (run_.number == 0) return run_;
  const auto has = [this](std::string_view format) {
    return std::any_of(run_.lines.begin(), run_.lines.end(),
                       [format](const ClientLine& line) { return line.row->format == format; });
  };
  if (has(kSwitchedOff)) {
    run_.end = ClientEnd::kSwitchedOff;
  } else if (run_.failed) {
    run_.end = ClientEnd::kNotStarted;
  } else {
    const bool from_server = !has(kFirst);
    run_.end = has(kStarted) || from_server ? ClientEnd::kRan : ClientEnd::kBroken;
  }
  return run_;
}

void PrintClientRun(std::ostream& out, const std::string& name, const ClientRunStory& run,
                    std::size_t runs) {
  out << Clean(name) << ": run " << run.number << " of " << runs
      << " of the multicast client, lines " << run.first << " to " << run.last << "\n\n"
      << "outcome  " << NameOf(run.end) << "\n         " << EndText(run) << "\n";
  if (run.failed) {
    const char* const remedy = run.lines[*run.failed].row->remedy;
    if (*remedy != '\0') out << "remedy   " << remedy << "\n";
  }
  const auto print = [&out](const ClientLine& line) {
    out << "  " << line.count << " x  " << Lines(line) << "  " << Clean(line.text) << "\n        "
        << line.row->meaning << "\n";
    if (IsTrouble(line) && *line.row->remedy != '\0') {
      out << "        remedy: " << line.row->remedy << "\n";
    }
  };
  const bool troubled = std::any_of(run.lines.begin(), run.lines.end(), IsTrouble);
  if (troubled) out << "\ntroubles\n";
  for (const ClientLine& line : run.lines) {
    if (IsTrouble(line)) print(line);
  }
  out << "\nsteps\n";
  for (const ClientLine& line : run.lines) {
    if (!IsTrouble(line)) print(line);
  }
  out << std::flush;
}

nlohmann::ordered_json ClientRunJson(const std::string& name, const ClientRunStory& run,
                                     std::size_t runs) {
  nlohmann::ordered_json json{
      {"event", "explained"},       {"file", name},        {"runs", runs},
      {"run", run.number},          {"first", run.first},  {"last", run.last},
      {"outcome", NameOf(run.end)}, {"text", EndText(run)}};
  if (run.failed) json["remedy"] = run.lines[*run.failed].row->remedy;
  json["troubles"] = json["steps"] = nlohmann::ordered_json::array();
  for (const ClientLine& line : run.lines) {
    json[IsTrouble(line) ? "troubles" : "steps"].push_back({{"text", line.text},
                                                            {"count", line.count},
                                                            {"first", line.first},
                                                            {"last", line.last},
                                                            {"meaning", line.row->meaning},
                                                            {"remedy", line.row->remedy}});
  }
  return json;
}

}  // namespace tools

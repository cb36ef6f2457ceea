#include "tools/explain/log_story.h"

#include <algorithm>

#include "base/number.h"
#include "base/text.h"

namespace tools {
namespace {

constexpr std::size_t kMaxStretches = 200;
constexpr std::size_t kMaxTroubles = 100;
constexpr std::size_t kMaxEvents = 100;
constexpr std::size_t kMaxText = 200;

/// What a field of a logged event document holds.
std::optional<std::string_view> EventField(std::string_view document, std::string_view name) {
  const std::string start = "<Field Name=\"" + std::string(name) + "\">";
  const std::size_t at = document.find(start);
  if (at == std::string_view::npos) return std::nullopt;
  const std::string_view text = document.substr(at + start.size());
  return text.substr(0, text.find('<'));
}

}  // namespace

const char* NameOf(JobEnd end) {
  switch (end) {
    case JobEnd::kNone: return "none";
    case JobEnd::kNotStarted: return "not-started";
    case JobEnd::kRefused: return "refused";
    case JobEnd::kUnfinished: return "unfinished";
    case JobEnd::kFailed: return "failed";
    case JobEnd::kComplete: return "complete";
  }
  return "";
}

const CodeRow* Trouble::code() const {
  return number ? FindCode(row->number, *number) : nullptr;
}

void LogStory::Line(std::string_view line) {
  ++line_;
  if (line.empty()) {
    message_follows_ = false;  // the message was empty
    return;
  }
  Text(line, {});
}

/// One line may hold several texts: some of them end without a line end.
void LogStory::Text(std::string_view text, std::string_view time) {
  while (!text.empty()) {
    const TextMatch match = matcher_.Find(text);
    if (match.row != nullptr) {
      Known(match, text, time);
      text = match.rest;
      continue;
    }
    const StampedLine stamped = SplitStamp(text);
    if (stamped.time.empty() || !time.empty()) {
      Unknown(text);
      return;
    }
    time = stamped.time;
    time_ = stamped.time;
    text = stamped.message;
  }
}

void LogStory::BeginJob() {
  ++jobs_;
  thread_seen_ = false;
  time_.clear();
  if (!Keeps()) return;
  job_ = {};
  job_.number = jobs_;
  job_.first = line_;
  marks_ = {};
  since_good_.reset();
  message_follows_ = false;
}

void LogStory::Known(const TextMatch& match, std::string_view text, std::string_view time) {
  const std::string_view format = match.row->format;
  // Written when the configlet is loaded, before any job.
  if (jobs_ == 0 && format == "Version=%s\r\n") return;
  const bool starts = format == "Orvenix thread - Started\r\n";
  if (base::EqualIgnoringCase(text, "IcfgBeginGroup - Orvenix") || jobs_ == 0 ||
      (starts && thread_seen_)) {
    BeginJob();
  }
  if (starts) thread_seen_ = true;
  if (!Keeps()) return;
  message_follows_ = false;
  job_.last = line_;
  Note(format);
  AddToPhase(*match.row, time);
  if (match.row->weight == Weight::kGood) since_good_.reset();
  if (match.row->weight == Weight::kTrouble || match.row->weight == Weight::kFatal) {
    AddTrouble(match, text);
  }
}

void LogStory::Note(std::string_view format) {
  static constexpr std::pair<std::string_view, bool Marks::*> kMarks[] = {
      {"Upgrade already in progress\r\n", &Marks::running},
      {"Orvenix - PerformTests\r\n", &Marks::tests},
      {"Orvenix - PerformTests - failed test\r\n", &Marks::failed_test},
      {"Orvenix - CheckSpace\r\n", &Marks::space},
      {"Orvenix - SetTransferBytes\r\n", &Marks::enough},
      {"Orvenix thread - Started\r\n", &Marks::started},
      {"Orvenix - UpgradeThread - Exiting\r\n", &Marks::exiting},
      {"Orvenix - SendDeviceEvent - entering\r\n", &Marks::event},
  };
  for (const auto& [text, mark] : kMarks) {
    if (format == text) marks_.*mark = true;
  }
  message_follows_ = format == "Orvenix - PerformTests - failed test\r\n";
}

void LogStory::Unknown(std::string_view text) {
  if (jobs_ == 0 || !Keeps()) return;
  job_.last = line_;
  if (!job_.stretches.empty()) {
    job_.stretches.back().last = line_;
    ++job_.stretches.back().lines;
  }
  if (message_follows_) job_.message = text.substr(0, kMaxText);
  message_follows_ = false;
  const auto code = EventField(text, "msgNum");
  if (!code || job_.events.size() >= kMaxEvents) return;
  job_.events.push_back({line_, base::LeadingNumber(*code), {}, time_});
  if (const auto words = EventField(text, "optArgArrayElement")) {
    job_.events.back().text = words->substr(0, kMaxText);
  }
}

void LogStory::AddToPhase(const TextRow& row, std::string_view time) {
  auto& stretches = job_.stretches;
  const bool stays =
      !stretches.empty() && (row.phase == Phase::kAny || row.phase == stretches.back().phase ||
                             stretches.size() >= kMaxStretches);
  if (!stays) {
    const Phase phase = row.phase == Phase::kAny ? Phase::kSettings : row.phase;
    stretches.push_back({phase, line_, line_, 0, 0, 0, std::string(time)});
  }
  PhaseStretch& stretch = stretches.back();
  stretch.last = line_;
  ++stretch.lines;
  const std::string_view format = row.format;
  if (format == "Orvenix - good CRC\r\n" ||
      format == "Orvenix - httpClient - file complete in first frame\r\n" ||
      format == "Orvenix - after OpenForWriting - zero length file, !%s%%\r\n") {
    ++stretch.files;
    ++job_.files;
  }
}

void LogStory::AddTrouble(const TextMatch& match, std::string_view text) {
  ++job_.stretches.back().troubles;
  auto& troubles = job_.troubles;
  auto known = std::find_if(troubles.begin(), troubles.end(), [&match](const Trouble& trouble) {
    return trouble.row == match.row && trouble.number == match.number;
  });
  if (known == troubles.end()) {
    if (troubles.size() >= kMaxTroubles) return;
    known = troubles.insert(troubles.end(), Trouble{match.row, match.number, {}, line_, line_, 0});
    known->text = text.substr(0, std::min(kMaxText, text.size() - match.rest.size()));
  }
  known->last = line_;
  ++known->count;
  if (!since_good_) since_good_ = static_cast<std::size_t>(known - troubles.begin());
}

/// The checks come in a fixed order, so the first that is missing is the one that said no.
void LogStory::FindEnd() {
  constexpr std::uint32_t kRunning = 0xC4111001, kNoSpace = 0xC4111002, kNoPower = 0xC4111003,
                          kTestFailed = 0xC4111005;
  const auto refuse = [this](std::uint32_t result) {
    job_.end = JobEnd::kRefused;
    job_.result = result;
  };
  const Marks& m = marks_;
  const bool failed_event = std::any_of(job_.events.begin(), job_.events.end(),
                                        [](const LoggedEvent& e) { return e.code == 205180; });
  if (m.running) return refuse(kRunning);
  if (m.started) {
    job_.end = !m.exiting                      ? JobEnd::kUnfinished
               : m.failed_test || failed_event ? JobEnd::kFailed
                                               : JobEnd::kComplete;
    return;
  }
  if (m.failed_test) return refuse(kTestFailed);
  if (m.event && m.space && !m.enough) return refuse(kNoSpace);
  if (m.event && !m.tests) return refuse(kNoPower);
  job_.end = m.tests ? JobEnd::kUnfinished : JobEnd::kNotStarted;
}

void LogStory::FindCause() {
  const auto& troubles = job_.troubles;
  const auto first_of = [&troubles](auto wanted) -> std::optional<std::size_t> {
    const auto found = std::find_if(troubles.begin(), troubles.end(), wanted);
    if (found == troubles.end()) return std::nullopt;
    return static_cast<std::size_t>(found - troubles.begin());
  };
  switch (job_.end) {
    case JobEnd::kRefused:
    case JobEnd::kFailed:
      job_.cause = first_of([](const Trouble& t) { return t.row->weight == Weight::kFatal; });
      return;
    case JobEnd::kUnfinished:
      job_.cause = since_good_;
      if (!job_.cause && !troubles.empty()) {
        const auto most =
            std::max_element(troubles.begin(), troubles.end(),
                             [](const Trouble& a, const Trouble& b) { return a.count < b.count; });
        job_.cause = static_cast<std::size_t>(most - troubles.begin());
      }
      return;
    case JobEnd::kComplete:
      // What a phase gave up, as opposed to what was tried again.
      job_.cause = first_of([](const Trouble& t) { return t.row->phase == Phase::kFiles; });
      return;
    case JobEnd::kNone:
    case JobEnd::kNotStarted: return;
  }
}

JobStory LogStory::Finish() {
  if (job_.number > 0) {
    FindEnd();
    FindCause();
  }
  return job_;
}

}  // namespace tools

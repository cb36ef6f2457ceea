// What a transfer log tells: jobs, their phases, how each ended and why.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/explain/catalogue.h"
#include "tools/explain/text_match.h"

namespace tools {

/// How a job ended, as far as its log goes.
enum class JobEnd : std::uint8_t {
  kNone,        ///< no line of this system
  kNotStarted,  ///< the host set fields, and the job was never started
  kRefused,     ///< a check said no; see the code
  kUnfinished,  ///< still running, or the device was reset or switched off
  kFailed,
  kComplete,
};
[[nodiscard]] const char* NameOf(JobEnd end);

/// A stretch of lines in one phase.
struct PhaseStretch {
  Phase phase = Phase::kAny;
  std::size_t first = 0, last = 0;  ///< lines, from 1
  std::size_t lines = 0;
  std::size_t troubles = 0;
  std::size_t files = 0;  ///< that came whole
  std::string time;       ///< of the first line, where the log has times
};

struct Trouble {
  const TextRow* row = nullptr;
  std::optional<std::uint32_t> number;
  std::string text;  ///< the first such line
  std::size_t first = 0, last = 0;
  std::size_t count = 0;

  /// What the number says; null when nothing.
  [[nodiscard]] const CodeRow* code() const;
};

/// A device event as the log shows it.
struct LoggedEvent {
  std::size_t line = 0;
  std::uint32_t code = 0;
  std::string text;
  std::string time;  ///< empty: the log does not say
};

struct JobStory {
  std::size_t number = 0;  ///< from 1
  std::size_t first = 0, last = 0;
  JobEnd end = JobEnd::kNone;
  std::optional<std::uint32_t> result;  ///< of the configlet, for a refused job
  std::string message;                  ///< of the failed test
  std::vector<PhaseStretch> stretches;
  std::vector<Trouble> troubles;
  std::vector<LoggedEvent> events;
  std::optional<std::size_t> cause;  ///< in `troubles`
  std::size_t files = 0;             ///< that came whole
};

/// Reads a log line by line and keeps one job of it. What is kept is bounded, however long the log
/// is and whatever it holds.
class LogStory {
 public:
  /// @param wanted  number of the job to keep, from 1; 0: the last one
  explicit LogStory(std::size_t wanted = 0) : wanted_(wanted) {}

  /// @param line  without its line end; may be empty
  void Line(std::string_view line);
  /// The kept job. Its number is 0 when there is none.
  [[nodiscard]] JobStory Finish();
  [[nodiscard]] std::size_t jobs() const { return jobs_; }

 private:
  void Text(std::string_view text, std::string_view time);
  void Known(const TextMatch& match, std::string_view text, std::string_view time);
  void Unknown(std::string_view text);
  void BeginJob();
  [[nodiscard]] bool Keeps() const { return wanted_ == 0 || jobs_ == wanted_; }
  void AddToPhase(const TextRow& row, std::string_view time);
  void AddTrouble(const TextMatch& match, std::string_view text);
  void Note(std::string_view format);
  void FindEnd();
  void FindCause();

  /// Marks that decide how the job ended.
  struct Marks {
    bool running = false, tests = false, failed_test = false, space = false;
    bool enough = false, started = false, exiting = false, event = false;
  };

  TextMatcher matcher_;
  std::size_t wanted_;
  std::size_t jobs_ = 0;
  std::size_t line_ = 0;
  JobStory job_;
  Marks marks_;
  bool thread_seen_ = false;  ///< of the job that the log is in, kept or not
  bool message_follows_ = false;
  std::string time_;                       ///< the last one in the log
  std::optional<std::size_t> since_good_;  ///< the first trouble since something came about
};

}  // namespace tools

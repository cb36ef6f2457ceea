// `orvenix explain`: what a number, a text or a whole log of the system means.
#pragma once

#include <cstdint>
#include <filesystem>
#include <iosfwd>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

#include "tools/explain/catalogue.h"
#include "tools/explain/log_story.h"

namespace tools {

/// Reads "205180", "-1005514750", "0xC4111002" or, with eight digits, "C4111002".
[[nodiscard]] std::optional<std::uint32_t> ParseCode(const std::string& text);

/// Everything that a number may be, in the order of the kinds.
[[nodiscard]] std::vector<const CodeRow*> MeaningsOf(std::uint32_t code);

/// The job of a log that `wanted` names (0: the last), read block by block. Lines longer than a
/// device writes are cut. Throws Failure kBadInput when the file cannot be read.
[[nodiscard]] LogStory ReadLog(const std::filesystem::path& file, std::size_t wanted);

void PrintStory(std::ostream& out, const std::string& name, const JobStory& job, std::size_t jobs);
[[nodiscard]] nlohmann::ordered_json StoryJson(const std::string& name, const JobStory& job,
                                               std::size_t jobs);

struct ExplainOptions {
  std::string what;     ///< a code, a log file, or a line of a log or screen
  std::size_t job = 0;  ///< of a log, from 1; 0: the last one
  bool json = false;
};

/// Prints what it means. Throws Failure kBadInput for what nobody knows.
void Explain(const ExplainOptions& options);

}  // namespace tools

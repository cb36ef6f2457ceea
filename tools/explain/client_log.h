// What a multicast client's log tells: \mcast.log, or its lines at a log server.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/explain/catalogue.h"
#include "tools/explain/text_match.h"

namespace tools {

/// How one run of the client went, as far as its log goes.
enum class ClientEnd : std::uint8_t {
  kNone,         ///< no line of a client
  kSwitchedOff,  ///< the registry forbids it
  kNotStarted,   ///< something that it needs could not be had
  kBroken,       ///< the log ends before the client ran: the device was reset
  kRan,          ///< its thread was started
};
[[nodiscard]] const char* NameOf(ClientEnd end);

/// One kind of line of a run, with its first text.
struct ClientLine {
  const TextRow* row = nullptr;
  std::string text;
  std::size_t first = 0, last = 0;  ///< lines, from 1
  std::size_t count = 0;
};

struct ClientRunStory {
  std::size_t number = 0;  ///< from 1
  std::size_t first = 0, last = 0;
  ClientEnd end = ClientEnd::kNone;
  std::optional<std::size_t> failed;  ///< the line that the client ended of, in `lines`
  std::vector<ClientLine> lines;      ///< by their first occurrence
  std::size_t unknown = 0;            ///< lines of something else
};

/// Reads such a log line by line and keeps one run of it. What is kept is bounded.
class ClientLog {
 public:
  /// @param wanted  number of the run to keep, from 1; 0: the last one
  explicit ClientLog(std::size_t wanted = 0) : matcher_(false, ClientTexts()), wanted_(wanted) {}

  /// @param line  without its line end; may be empty
  void Line(std::string_view line);
  /// The kept run. Its number is 0 when there is none.
  [[nodiscard]] ClientRunStory Finish();
  [[nodiscard]] std::size_t runs() const { return runs_; }

 private:
  void BeginRun();
  void Add(const TextRow& row, std::string_view text);
  [[nodiscard]] bool Keeps() const { return wanted_ == 0 || runs_ == wanted_; }

  TextMatcher matcher_;
  std::size_t wanted_;
  std::size_t runs_ = 0;
  std::size_t line_ = 0;
  bool begun_ = false;  ///< a run's first line has been read and its thread not been started
  ClientRunStory run_;
};

void PrintClientRun(std::ostream& out, const std::string& name, const ClientRunStory& run,
                    std::size_t runs);
[[nodiscard]] nlohmann::ordered_json ClientRunJson(const std::string& name,
                                                   const ClientRunStory& run, std::size_t runs);

}  // namespace tools

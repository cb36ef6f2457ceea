// What somebody at the terminal sees of a running upgrade.
#pragma once

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

#include "tools/message_view.h"
#include "tools/multicast_watch.h"
#include "window/progress_view.h"

namespace tools {

/// The lines of `now` that came after `before`, when lines enter a list at its end and leave it at
/// its beginning. Lines that stand in both count as the same as far as the order allows.
[[nodiscard]] std::vector<std::string> NewLines(const std::vector<std::string>& before,
                                                const std::vector<std::string>& now);

/// "[#####.....]  50%".
[[nodiscard]] std::string FormatBar(const sim::BarView& bar, int width);
[[nodiscard]] int Percent(const sim::BarView& bar);

/// Shows an upgrade while it runs: status lines as they come, both bars in the last line of a
/// terminal (elsewhere a line whenever the upper bar has moved), messages and remarks; with JSON
/// one object a line. Any thread may call any of it.
class RunView {
 public:
  enum class Style : std::uint8_t { kTerminal, kPlain, kJson };

  /// @param record  file that gets every event as JSON does, whatever the style; empty: none
  /// @param append  it goes on behind what is there
  /// Throws Failure kCannotWrite.
  explicit RunView(Style style, const std::filesystem::path& record = {}, bool append = false);
  /// Ends the line of the bars.
  ~RunView();
  RunView(const RunView&) = delete;
  RunView& operator=(const RunView&) = delete;

  void ShowProgress(const sim::ProgressView& view);
  void ShowMessage(const Message& message);
  void ShowMulticast(const ReceptionEvent& event);
  /// The block map of a file that comes by multicast; shown when it has changed.
  void ShowBlocks(const Reception& state);
  /// Progress and messages that come from now on are not shown: threads of an upgrade that has not
  /// ended in time go on, and the last word is the program's.
  void EndUpgrade();
  /// A line of the program's own. With JSON it is left out; the events say the same.
  void ShowRemark(const std::string& text);
  /// An object of its own; shown with JSON only, and recorded.
  void ShowEvent(const nlohmann::ordered_json& event);

  /// The window as it was seen last.
  [[nodiscard]] std::optional<sim::ProgressView> last() const;

 private:
  void Line(const std::string& text);
  void Bars(const sim::ProgressView& view);
  /// Records the event, and prints it in JSON.
  void Tell(const nlohmann::ordered_json& event);

  const Style style_;
  std::ofstream record_;
  mutable std::mutex mutex_;
  std::optional<sim::ProgressView> last_;
  std::string blocks_;  ///< beside the upper bar; empty: the lower bar stands there
  bool bars_shown_ = false;
  bool is_over_ = false;
};

}  // namespace tools

// The opt-in record of a device's API calls: one JSON line a call.
#pragma once

#include <cstdint>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>

namespace sim {

class Trace {
 public:
  /// Every line, without its line end, goes to `sink`; an empty function turns the trace off.
  void SetSink(std::function<void(std::string_view)> sink);
  [[nodiscard]] bool on() const;
  void Write(std::string_view line);

 private:
  mutable std::mutex mutex_;
  std::function<void(std::string_view)> sink_;
};

/// Appends `text` as a JSON string, quotes included.
void AppendJsonText(std::string& out, std::string_view text);

}  // namespace sim

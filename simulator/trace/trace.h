// The opt-in record of a device's API calls: one JSON line a call, written when the call returns.
//
//   {"us":2000,"thread":258,"call":"SetEvent","args":{"handle":20},"result":1,"error":0}
//
// "us" is the world's time, "error" the thread's last error after the call. A call that was made to
// fail has "fault":true; one that its thread did not come back from has "ended":true and neither
// result nor error. In a virtual world equal seeds give equal lines.
#pragma once

#include <atomic>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>

namespace sim {

class Trace {
 public:
  /// Every line, without its line end, goes to `sink`; an empty function turns the trace off. The
  /// sink is called by the thread that made the call, one at a time.
  void SetSink(std::function<void(std::string_view)> sink);
  [[nodiscard]] bool on() const { return on_.load(std::memory_order_relaxed); }
  void Write(std::string_view line);

 private:
  std::atomic<bool> on_{false};
  mutable std::mutex mutex_;
  std::function<void(std::string_view)> sink_;
};

/// Appends `text` as a JSON string, quotes included. Bytes above 127 appear as the character of the
/// same number, as in the device's code page.
void AppendJsonText(std::string& out, std::string_view text);
/// The same for UTF-16.
void AppendJsonText(std::string& out, std::u16string_view text);

}  // namespace sim

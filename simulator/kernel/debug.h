// What a device's programs tell a debugger.
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "world/world.h"

namespace sim {

class Device;

/// The two routes stay apart: OutputDebugStringW is the programs' own debugger output,
/// NKDbgPrintfW the kernel's console.
class Debug {
 public:
  struct Record {
    Micros at;
    std::uint32_t thread;  ///< id
    std::u16string text;
  };
  using Listener = std::function<void(std::string_view text)>;

  explicit Debug(Device& /*device*/) {}

  /// The most recent records of a route (65,536 at most), oldest first.
  [[nodiscard]] std::vector<Record> OutputRecords() const;
  [[nodiscard]] std::vector<Record> KernelRecords() const;
  /// All text of a route in one piece, as UTF-8.
  [[nodiscard]] std::string OutputText() const;
  [[nodiscard]] std::string KernelText() const;
  /// What programs wrote to their console.
  [[nodiscard]] std::string ConsoleText() const;
  void Clear();

  /// Gets every text of OutputDebugStringW as UTF-8, from the thread that put it out; an empty
  /// function ends that. It must not call this class.
  void SetListener(Listener listener);

  // For the API functions.
  void AddOutput(Record record);
  void AddKernel(Record record);
  /// Keeps the most recent 65,536 bytes or more.
  void AddConsole(std::string_view text);

 private:
  mutable std::mutex mutex_;
  std::deque<Record> output_;
  std::deque<Record> kernel_;
  std::string console_;
  Listener listener_;
};

}  // namespace sim

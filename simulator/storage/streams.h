// The streams that fopen has given out.
#pragma once

#include <map>
#include <memory>
#include <mutex>

#include "ce/files.h"

namespace sim {

class OpenFile;

/// A stream is a file opened with the device's sharing rules. What is written reaches the file at
/// once and byte for byte; a text mode changes no line ends. Any thread.
class Streams {
 public:
  Streams();
  ~Streams();
  Streams(const Streams&) = delete;
  Streams& operator=(const Streams&) = delete;

  ce_FILE* Add(std::shared_ptr<OpenFile> file);
  /// The programs' console: always open, without a file.
  [[nodiscard]] ce_FILE* console() const { return console_.get(); }
  /// @return the stream's file, null for what is no open stream of the device.
  [[nodiscard]] std::shared_ptr<OpenFile> Find(const ce_FILE* stream) const;
  /// Closes the stream. @return false when it was none.
  bool Remove(ce_FILE* stream);
  void Clear();
  /// Streams that nobody has closed.
  [[nodiscard]] std::size_t open() const;

 private:
  using Map = std::map<const ce_FILE*, std::unique_ptr<ce_FILE>>;
  const std::unique_ptr<ce_FILE> console_;
  mutable std::mutex mutex_;
  Map streams_;
};

}  // namespace sim

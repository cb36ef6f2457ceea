// What somebody says to a server that runs: keys on a terminal, lines from a script.
#pragma once

#include <asio/io_context.hpp>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace tools {

struct ServeCommand {
  enum class Kind : std::uint8_t {
    kRate,    ///< "rate 10M"
    kFaster,  ///< "+": a quarter more
    kSlower,  ///< "-": a fifth less
    kStart,   ///< "start", the key s: begin with the devices that are there
  };
  Kind kind{};
  std::uint64_t rate = 0;  ///< bits per second, of kRate
};

/// Nothing for a line that is no command.
[[nodiscard]] std::optional<ServeCommand> ParseServeCommand(std::string_view line);

/// Reads the standard input while a loop runs. A terminal gives its keys at once, as long as this
/// program has it in the foreground; anything else gives lines. The end of the input, or an input
/// that cannot be waited for, only ends the reading.
class ServeControl {
 public:
  using OnCommand = std::function<void(const ServeCommand&)>;

  /// @param unknown  told of lines that are no command
  ServeControl(asio::io_context& loop, OnCommand command,
               std::function<void(const std::string&)> unknown);
  /// Puts the terminal back as it was.
  ~ServeControl();
  ServeControl(const ServeControl&) = delete;
  ServeControl& operator=(const ServeControl&) = delete;

  /// Ends the reading, so that the loop runs out of work.
  void Stop();

 private:
  class Reader;
  std::shared_ptr<Reader> reader_;
};

}  // namespace tools

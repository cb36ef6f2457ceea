#include "tools/serve_control.h"

#include <termios.h>
#include <unistd.h>

#include <array>
#include <asio/posix/stream_descriptor.hpp>
#include <utility>

#include "tools/failure.h"
#include "tools/multicast_table.h"

namespace tools {
namespace {

constexpr std::size_t kLongestLine = 200;

std::string_view Trim(std::string_view text) {
  const std::size_t first = text.find_first_not_of(" \t\r");
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(" \t\r") - first + 1);
}

/// Keys come one by one, unseen, while this stands.
class KeyMode {
 public:
  KeyMode() {
    if (::isatty(STDIN_FILENO) == 0 || ::tcgetattr(STDIN_FILENO, &before_) != 0) return;
    termios keys = before_;
    keys.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO);
    changed_ = ::tcsetattr(STDIN_FILENO, TCSANOW, &keys) == 0;
  }
  ~KeyMode() {
    if (changed_) static_cast<void>(::tcsetattr(STDIN_FILENO, TCSANOW, &before_));
  }
  KeyMode(const KeyMode&) = delete;
  KeyMode& operator=(const KeyMode&) = delete;

  [[nodiscard]] bool on() const { return changed_; }

 private:
  termios before_{};
  bool changed_ = false;
};

/// A program in the background that touches its terminal is stopped.
bool MayRead() {
  return ::isatty(STDIN_FILENO) == 0 || ::tcgetpgrp(STDIN_FILENO) == ::getpgrp();
}

}  // namespace

std::optional<ServeCommand> ParseServeCommand(std::string_view line) {
  using Kind = ServeCommand::Kind;
  const std::string_view text = Trim(line);
  if (text == "+") return ServeCommand{Kind::kFaster};
  if (text == "-") return ServeCommand{Kind::kSlower};
  if (text == "start" || text == "s") return ServeCommand{Kind::kStart};
  constexpr std::string_view kRate = "rate ";
  if (text.substr(0, kRate.size()) != kRate) return std::nullopt;
  try {
    return ServeCommand{Kind::kRate, ParseRate(std::string(Trim(text.substr(kRate.size()))))};
  } catch (const Failure&) {
    return std::nullopt;
  }
}

class ServeControl::Reader : public std::enable_shared_from_this<Reader> {
 public:
  Reader(asio::io_context& loop, OnCommand command, std::function<void(const std::string&)> unknown)
      : input_(loop), command_(std::move(command)), unknown_(std::move(unknown)) {}

  void Start() {
    asio::error_code error;
    input_.assign(::dup(STDIN_FILENO), error);  // its end must not close the program's own
    if (!error) Read();
  }

  void Stop() {
    stopped_ = true;
    asio::error_code ignored;
    input_.close(ignored);
  }

 private:
  /// Waits and then reads plainly: the terminal's mode belongs to the output as well, which could
  /// not cope with calls that do not block.
  void Read() {
    input_.async_wait(asio::posix::stream_descriptor::wait_read,
                      [self = shared_from_this()](const asio::error_code& error) {
                        if (error || self->stopped_) return;
                        const ssize_t got = ::read(self->input_.native_handle(),
                                                   self->bytes_.data(), self->bytes_.size());
                        if (got <= 0) return;
                        for (ssize_t i = 0; i < got; ++i) {
                          self->Take(self->bytes_[static_cast<std::size_t>(i)]);
                        }
                        self->Read();
                      });
  }

  void Take(char letter) {
    if (keys_.on()) {
      // Any other key is a slip of the hand.
      if (const auto command = ParseServeCommand({&letter, 1})) command_(*command);
      return;
    }
    if (letter != '\n') {
      if (line_.size() < kLongestLine) line_ += letter;
      return;
    }
    const std::string line = std::exchange(line_, {});
    if (const auto command = ParseServeCommand(line)) {
      command_(*command);
    } else if (!Trim(line).empty()) {
      unknown_(line);
    }
  }

  KeyMode keys_;
  asio::posix::stream_descriptor input_;
  OnCommand command_;
  std::function<void(const std::string&)> unknown_;
  std::array<char, 256> bytes_{};
  std::string line_;
  bool stopped_ = false;
};

ServeControl::ServeControl(asio::io_context& loop, OnCommand command,
                           std::function<void(const std::string&)> unknown) {
  if (!MayRead()) return;
  reader_ = std::make_shared<Reader>(loop, std::move(command), std::move(unknown));
  reader_->Start();
}

ServeControl::~ServeControl() {
  Stop();
}

void ServeControl::Stop() {
  if (reader_ != nullptr) reader_->Stop();
}

}  // namespace tools

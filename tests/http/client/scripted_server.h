// An upgrade server of a virtual world that answers by a script.
#pragma once

#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "net/virtual/virtual_server.h"

namespace test {

/// Something that the server does a while after the step before it, or after the request.
struct Step {
  enum class Then { kGoOn, kClose, kReset };

  std::chrono::milliseconds after{0};
  std::string bytes;
  Then then = Then::kGoOn;
};
using Answer = std::vector<Step>;

/// The head that announces `body`, CRC-32 included. `more` are whole further lines.
std::string HeadFor(std::string_view body, std::string_view more = "");

/// What the server sends: the head at once and the body 50 ms later.
Answer Served(std::string_view body, std::string_view more = "");

/// Printable bytes without a pattern.
std::string Noise(std::size_t size);

/// Takes connections on one port, keeps the requests and gives each the next answer. Without an
/// answer it stays silent. Closes when the device ends its stream.
class ScriptedServer {
 public:
  ScriptedServer(sim::World& world, const sim::Endpoint& local);

  void Add(Answer answer) { script_.answers.push_back(std::move(answer)); }
  /// For every request that finds no other.
  void SetLast(Answer answer) { script_.last = std::move(answer); }
  /// Done to each connection as soon as it stands.
  void SetGreeting(Answer greeting) { script_.greeting = std::move(greeting); }
  /// A stubborn server does not close when the device ends its stream.
  void set_stubborn(bool stubborn) { script_.stubborn = stubborn; }
  /// A deaf server takes nothing from its receive buffer.
  void SetDeaf(bool deaf);

  /// Everything received up to and with an empty line, one by one.
  [[nodiscard]] const std::vector<std::string>& requests() const { return script_.requests; }
  /// What came since the last whole request.
  [[nodiscard]] const std::string& unfinished() const { return script_.unfinished; }
  [[nodiscard]] std::uint64_t connections() const { return server_.accepted(); }
  /// Connections whose stream the device has ended.
  [[nodiscard]] int goodbyes() const { return script_.goodbyes; }
  void StopAccepting() { server_.StopAccepting(); }

 private:
  struct Script {
    std::deque<Answer> answers;
    std::optional<Answer> last;
    Answer greeting;
    bool stubborn = false;
    bool deaf = false;
    int goodbyes = 0;
    std::vector<std::string> requests;
    std::string unfinished;
    std::vector<sim::StreamEnd*> ends;
  };
  class Program;

  Script script_;
  sim::VirtualServer server_;
};

}  // namespace test

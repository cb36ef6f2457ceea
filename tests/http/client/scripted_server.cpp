#include "http/client/scripted_server.h"

#include <zlib.h>

#include <algorithm>
#include <random>
#include <utility>

namespace test {

std::string HeadFor(std::string_view body, std::string_view more) {
  const auto* bytes = reinterpret_cast<const Bytef*>(body.data());
  const auto crc = crc32(0, bytes, static_cast<uInt>(body.size()));
  return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) +
         "\r\nContent-CRC32: " + std::to_string(crc) + "\r\n" + std::string(more) + "\r\n";
}

Answer Served(std::string_view body, std::string_view more) {
  return {{std::chrono::milliseconds(0), HeadFor(body, more), Step::Then::kGoOn},
          {std::chrono::milliseconds(50), std::string(body), Step::Then::kGoOn}};
}

std::string Noise(std::size_t size) {
  std::mt19937 random(42);
  std::string bytes(size, '\0');
  for (char& byte : bytes) byte = static_cast<char>('0' + random() % 75);
  return bytes;
}

/// One connection.
class ScriptedServer::Program : public sim::StreamProgram {
 public:
  explicit Program(Script& script) : script_(script) {}

  void OnOpen(sim::StreamEnd& end) override {
    script_.ends.push_back(&end);
    if (script_.deaf) end.SetPaused(true);
    Begin(end, script_.greeting);
  }

  void OnBytes(sim::StreamEnd& end, std::string_view bytes) override {
    script_.unfinished += bytes;
    for (std::size_t at = 0;
         (at = script_.unfinished.find("\r\n\r\n")) != std::string::npos && !end.closed();) {
      script_.requests.push_back(script_.unfinished.substr(0, at + 4));
      script_.unfinished.erase(0, at + 4);
      if (!script_.answers.empty()) {
        Answer answer = std::move(script_.answers.front());
        script_.answers.pop_front();
        Begin(end, std::move(answer));
      } else if (script_.last) {
        Begin(end, *script_.last);
      }
    }
  }

  void OnTime(sim::StreamEnd& end) override {
    const Step step = std::move(steps_.front());
    steps_.pop_front();
    pending_ += step.bytes;
    Push(end);
    if (step.then == Step::Then::kClose) return Leave(end, &sim::StreamEnd::Close);
    if (step.then == Step::Then::kReset) return Leave(end, &sim::StreamEnd::Reset);
    Arm(end);
  }

  void OnRoom(sim::StreamEnd& end) override { Push(end); }

  void OnEnd(sim::StreamEnd& end) override {
    ++script_.goodbyes;
    if (!script_.stubborn) Leave(end, &sim::StreamEnd::Close);
  }

  void OnBroken(sim::StreamEnd& end, int /*winsock_error*/) override { Forget(end); }

 private:
  void Begin(sim::StreamEnd& end, Answer answer) {
    const bool idle = steps_.empty();
    for (Step& step : answer) steps_.push_back(std::move(step));
    if (idle) Arm(end);
  }
  void Arm(sim::StreamEnd& end) {
    if (!steps_.empty()) end.SetTimer(end.now() + steps_.front().after);
  }
  void Push(sim::StreamEnd& end) { pending_.erase(0, end.Send(pending_)); }
  void Leave(sim::StreamEnd& end, void (sim::StreamEnd::*how)()) {
    Forget(end);
    (end.*how)();
  }
  void Forget(sim::StreamEnd& end) {
    auto& ends = script_.ends;
    ends.erase(std::remove(ends.begin(), ends.end(), &end), ends.end());
  }

  Script& script_;
  std::deque<Step> steps_;
  std::string pending_;
};

ScriptedServer::ScriptedServer(sim::World& world, const sim::Endpoint& local)
    : server_(world, local,
              [this](const sim::Endpoint&) { return std::make_unique<Program>(script_); }) {}

void ScriptedServer::SetDeaf(bool deaf) {
  script_.deaf = deaf;
  for (sim::StreamEnd* end : script_.ends) end->SetPaused(deaf);
}

}  // namespace test

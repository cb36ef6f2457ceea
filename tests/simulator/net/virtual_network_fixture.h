// A virtual network with servers that are written as functions, and a device on it.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "net/virtual/virtual_network.h"
#include "net/virtual/virtual_server.h"
#include "simulator/net/sockets.h"

namespace test {

inline constexpr sim::Endpoint kPort80{kServer, 80};

/// A program made of functions; what has none does nothing.
struct Script {
  std::function<void(sim::StreamEnd&)> open;
  std::function<void(sim::StreamEnd&, std::string_view)> bytes;
  std::function<void(sim::StreamEnd&)> room;
  std::function<void(sim::StreamEnd&)> end;
  std::function<void(int)> broken;
  std::function<void(sim::StreamEnd&)> time;
};

class Scripted final : public sim::StreamProgram {
 public:
  explicit Scripted(const Script& script) : script_(script) {}

 private:
  void OnOpen(sim::StreamEnd& end) override {
    if (script_.open) script_.open(end);
  }
  void OnBytes(sim::StreamEnd& end, std::string_view bytes) override {
    if (script_.bytes) script_.bytes(end, bytes);
  }
  void OnRoom(sim::StreamEnd& end) override {
    if (script_.room) script_.room(end);
  }
  void OnEnd(sim::StreamEnd& end) override {
    if (script_.end) script_.end(end);
  }
  void OnBroken(sim::StreamEnd& /*end*/, int error) override {
    if (script_.broken) script_.broken(error);
  }
  void OnTime(sim::StreamEnd& end) override {
    if (script_.time) script_.time(end);
  }

  const Script& script_;
};

class VirtualNetworkTest : public DeviceTest {
 protected:
  VirtualNetworkTest() : network_(world()) { StartWinsock(); }

  /// A server at kPort80 that does what `script_` says when it happens.
  sim::VirtualServer& Serve() {
    server_ = std::make_unique<sim::VirtualServer>(world(), kPort80, [this](const sim::Endpoint&) {
      return std::make_unique<Scripted>(script_);
    });
    return *server_;
  }
  /// A server that sends `bytes` to whoever connects, and closes.
  void ServeBytes(const std::string& bytes) {
    content_ = bytes;
    const auto pour = [this](sim::StreamEnd& end) {
      poured_ += end.Send(std::string_view(content_).substr(poured_));
      if (poured_ == content_.size()) end.Close();
    };
    script_.open = pour;
    script_.room = pour;
    Serve();
  }
  SOCKET ConnectedSocket() {
    const SOCKET socket = Tcp();
    EXPECT_EQ(Connect(socket, kServer, 80), 0) << ce_WSAGetLastError();
    return socket;
  }
  [[nodiscard]] sim::Micros now() { return world().now(); }

  sim::VirtualNetwork network_;
  Script script_;
  std::string content_;
  std::size_t poured_ = 0;
  std::unique_ptr<sim::VirtualServer> server_;
};

}  // namespace test

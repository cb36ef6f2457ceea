// A device's UDP socket in the virtual world.
#pragma once

#include <deque>
#include <memory>
#include <string>
#include <vector>

#include "net/transport.h"
#include "net/virtual/fabric.h"

namespace sim {

class VirtualDatagramTransport final : public Transport, private DatagramSink {
 public:
  VirtualDatagramTransport(Fabric& fabric, Address own) : fabric_(fabric), own_(own) {}
  ~VirtualDatagramTransport() override;

  int Bind(const Endpoint& local) override;
  int Connect(const Endpoint& peer) override;
  int ConnectResult() override { return 0; }
  int Listen(int backlog) override;
  int Accept(std::unique_ptr<Transport>& accepted) override;
  int Send(const char* bytes, std::size_t size, std::size_t& sent) override;
  int SendTo(const Endpoint& to, const char* bytes, std::size_t size) override;
  int Receive(char* bytes, std::size_t size, bool peek, Received& result) override;
  int ShutdownSend() override { return 0; }
  int Pending(std::uint32_t& bytes) override;
  int Join(Address group) override;
  int Leave(Address group) override;
  int Tune(Tuning what, int value) override;
  unsigned Ready(unsigned interest) override;
  void Watch(unsigned /*interest*/, std::vector<pollfd>& /*files*/) const override {}
  [[nodiscard]] Endpoint local() const override { return local_; }
  [[nodiscard]] Endpoint peer() const override { return peer_; }
  void Abort() override {}

 private:
  struct Datagram {
    Endpoint from;
    Payload payload;
    [[nodiscard]] const std::string& bytes() const { return *payload; }
  };

  void Arrived(const Endpoint& from, const Payload& bytes) override;

  Fabric& fabric_;
  const Address own_;
  Endpoint local_;
  bool bound_ = false;
  bool shares_port_ = false;
  Endpoint peer_;  ///< port 0: any sender is heard
  std::vector<Address> groups_;
  Fabric::SendOptions send_options_;
  std::size_t room_ = 32768;
  std::size_t used_ = 0;
  std::deque<Datagram> received_;
};

}  // namespace sim

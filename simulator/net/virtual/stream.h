// A device's TCP socket in the virtual world.
#pragma once

#include <deque>
#include <memory>
#include <vector>

#include "net/transport.h"
#include "net/virtual/fabric.h"
#include "net/virtual/tcp.h"

namespace sim {

class VirtualStreamTransport final : public Transport, private TcpObserver, private TcpListener {
 public:
  VirtualStreamTransport(Fabric& fabric, Address own) : fabric_(fabric), own_(own) {}
  ~VirtualStreamTransport() override;

  int Bind(const Endpoint& local) override;
  int Connect(const Endpoint& peer) override;
  int ConnectResult() override;
  int Listen(int backlog) override;
  int Accept(std::unique_ptr<Transport>& accepted) override;
  int Send(const char* bytes, std::size_t size, std::size_t& sent) override;
  int SendTo(const Endpoint& to, const char* bytes, std::size_t size) override;
  int Receive(char* bytes, std::size_t size, bool peek, Received& result) override;
  int ShutdownSend() override;
  int Pending(std::uint32_t& bytes) override;
  int Join(Address group) override;
  int Leave(Address group) override;
  int Tune(Tuning what, int value) override;
  unsigned Ready(unsigned interest) override;
  void Watch(unsigned /*interest*/, std::vector<pollfd>& /*files*/) const override {}
  [[nodiscard]] Endpoint local() const override { return local_; }
  [[nodiscard]] Endpoint peer() const override;
  void Abort() override { abort_ = true; }

 private:
  void Changed() override;
  [[nodiscard]] bool full() const override { return waiting_.size() >= backlog_; }
  void Arrived(std::shared_ptr<TcpConnection> connection) override;

  Fabric& fabric_;
  const Address own_;
  Endpoint local_;
  bool owns_port_ = false;
  bool abort_ = false;
  std::size_t send_buffer_ = TcpConnection::kDefaultBuffer;
  std::size_t receive_buffer_ = TcpConnection::kDefaultBuffer;

  std::shared_ptr<TcpConnection> connection_;
  TcpConnection::Side side_ = 0;

  std::size_t backlog_ = 0;  ///< 0: does not listen
  std::deque<std::shared_ptr<TcpConnection>> waiting_;
};

}  // namespace sim

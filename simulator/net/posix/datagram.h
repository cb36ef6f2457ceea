// UDP in the real world.
#pragma once

#include <map>
#include <memory>
#include <vector>

#include "net/posix/file.h"
#include "net/transport.h"

namespace sim {

/// One file for the device's own address and one for each group it has joined. The host gives a
/// datagram for "any" address to whichever socket it likes; sockets that are tied to one address
/// each let devices and servers on one host share a port without taking each other's datagrams.
class PosixDatagram final : public Transport {
 public:
  PosixDatagram(SocketFile file, Address own);

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
  void Watch(unsigned interest, std::vector<pollfd>& files) const override;
  [[nodiscard]] Endpoint local() const override { return file_.Local(); }
  [[nodiscard]] Endpoint peer() const override { return peer_; }
  void Abort() override {}

 private:
  int OpenGroup(Address group, SocketFile& file);
  [[nodiscard]] SocketFile* FirstReadable();
  void DropStrangers();

  SocketFile file_;
  std::map<Address, SocketFile> groups_;  ///< closed files until the socket is bound
  const Address own_;
  bool bound_ = false;
  Endpoint peer_;  ///< port 0: any sender is heard
  int receive_buffer_ = 0;
};

}  // namespace sim

// UDP in the real world.
#pragma once

#include <map>
#include <memory>
#include <vector>

#include "net/posix/device_sockets.h"
#include "net/posix/file.h"
#include "net/posix/inbox.h"
#include "net/transport.h"

namespace sim {

/// One file for the device's own address and one for each group it has joined. The host gives a
/// datagram for "any" address to whichever socket it likes; sockets that are tied to one address
/// each let devices and servers on one host share a port without taking each other's datagrams.
class PosixDatagram final : public Transport {
 public:
  PosixDatagram(SocketFile file, DeviceSockets& device);
  ~PosixDatagram() override;

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
  [[nodiscard]] Endpoint local() const override { return own_box_.file().Local(); }
  [[nodiscard]] Endpoint peer() const override { return peer_; }
  void Abort() override {}

 private:
  int OpenGroup(Address group, Inbox& inbox);
  [[nodiscard]] Inbox* FirstReadable();
  [[nodiscard]] Inbox* FirstInLine();
  void ListOpenInboxes();
  [[nodiscard]] bool MustFill() const;
  bool FillEmptyInboxes();
  void DropUnheard(Inbox& inbox);

  Inbox own_box_;
  std::map<Address, Inbox> groups_;  ///< closed files until the socket is bound
  std::vector<Inbox*> inboxes_;      ///< those whose files are open, for one call
  std::vector<pollfd> polled_;       ///< files of some of them, for one call
  std::uint64_t round_ = 0;          ///< looks at the host's files
  int error_ = 0;                    ///< what the host had instead of a datagram
  DeviceSockets& device_;
  bool bound_ = false;
  std::uint16_t port_ = 0;  ///< once it is bound
  Endpoint peer_;           ///< port 0: any sender is heard
  int receive_buffer_ = 0;
};

}  // namespace sim

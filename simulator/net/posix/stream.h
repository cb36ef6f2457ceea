// TCP in the real world.
#pragma once

#include <memory>
#include <vector>

#include "net/posix/file.h"
#include "net/transport.h"

namespace sim {

class PosixStream final : public Transport {
 public:
  PosixStream(SocketFile file, Address own) : file_(std::move(file)), own_(own) {}
  ~PosixStream() override;
  PosixStream(const PosixStream&) = delete;
  PosixStream& operator=(const PosixStream&) = delete;

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
  void Watch(unsigned interest, std::vector<pollfd>& files) const override;
  [[nodiscard]] Endpoint local() const override { return file_.Local(); }
  [[nodiscard]] Endpoint peer() const override { return file_.Peer(); }
  void Abort() override;

 private:
  /// Takes bytes of ahead_. @return how many
  std::size_t TakeAhead(char* bytes, std::size_t size, bool peek);
  int ReceiveFromHost(char* bytes, std::size_t size, Received& result);

  SocketFile file_;
  const Address own_;
  bool bound_ = false;
  /// What came from the host with an earlier receive and has not been asked for yet: a program that
  /// reads in small pieces, and looks before each, costs the host one call for several of them.
  std::unique_ptr<char[]> ahead_;
  std::size_t ahead_begin_ = 0;
  std::size_t ahead_end_ = 0;
};

}  // namespace sim

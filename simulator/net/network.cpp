#include "net/network.h"

#include <poll.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>

#include "device/device.h"
#include "faults/faults.h"
#include "net/posix/posix_transport.h"
#include "net/virtual/fabric.h"

namespace sim {
namespace {

constexpr Micros kMoment{1};

Address OwnAddress(const Device& device) {
  const auto address = ParseAddress(device.profile().address);
  if (!address || *address == kAnyAddress || IsMulticast(*address)) {
    std::fprintf(stderr, "cesim: \"%s\" is no address for a device\n",
                 device.profile().address.c_str());
    std::abort();
  }
  return *address;
}

bool SameHost(std::string_view a, std::string_view b) {
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; };
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [&](char x, char y) { return lower(x) == lower(y); });
}

}  // namespace

Network::Network(Device& device)
    : device_(device),
      own_(OwnAddress(device)),
      host_sockets_(own_, device.profile().datagram_loss_percent,
                    device.profile().datagram_loss_seed) {
  if (!device.world().is_virtual()) return;
  const World::Lock lock = device.world().Acquire();
  device.world().Shared<Fabric>().AddHost(own_);
}

Network::~Network() {
  const World::Lock lock = device_.world().Acquire();
  while (!sockets_.empty()) Close(sockets_.begin()->first);
}

void Network::FillSendBuffer(std::uint64_t calls) {
  if (calls > 0) device_.faults().Add({"send", 1, calls, WSAEWOULDBLOCK});
}

std::size_t Network::open_sockets() const {
  const World::Lock lock = device_.world().Acquire();
  return sockets_.size();
}

void Network::ListenToDatagrams(DatagramListener listener) {
  const World::Lock lock = device_.world().Acquire();
  listener_ = std::move(listener);
}

std::uint64_t Network::datagrams_lost() const {
  const World::Lock lock = device_.world().Acquire();
  return host_sockets_.loss.lost();
}

void Network::CleanUp() {
  if (--started_ > 0) return;
  while (!sockets_.empty()) Close(sockets_.begin()->first);
}

// ---- the table ----

int Network::Open(SocketKind kind, SOCKET& number) {
  std::unique_ptr<Transport> transport;
  if (device_.world().is_virtual()) {
    transport = device_.world().Shared<Fabric>().NewTransport(kind, own_);
  } else {
    const int error = MakePosixTransport(kind, host_sockets_, transport);
    if (error != 0) return error;
  }
  number = Add(std::make_unique<Socket>(kind, std::move(transport), own_, listener_));
  return 0;
}

SOCKET Network::Add(std::unique_ptr<Socket> socket) {
  const SOCKET number = next_number_;
  next_number_ += 4;
  sockets_.emplace(number, std::move(socket));
  return number;
}

Socket* Network::Find(SOCKET number) const {
  const auto found = sockets_.find(number);
  return found == sockets_.end() ? nullptr : found->second.get();
}

bool Network::Close(SOCKET number) {
  const auto found = sockets_.find(number);
  if (found == sockets_.end()) return false;
  const std::unique_ptr<Socket> socket = std::move(found->second);
  sockets_.erase(found);
  device_.world().Notify(socket->queue());
  socket->PrepareClose();
  return true;
}

// ---- waiting ----

void Network::Wait(World::Lock& lock, const std::vector<Watched>& sockets,
                   std::optional<Micros> deadline) {
  World::Queues queues;
  std::vector<pollfd> files;
  for (const Watched& watched : sockets) {
    Socket* socket = Find(watched.number);
    queues.push_back(&socket->queue());
    socket->Watch(watched.interest, files);
  }
  std::sort(queues.begin(), queues.end());
  queues.erase(std::unique(queues.begin(), queues.end()), queues.end());
  World& world = device_.world();
  if (files.empty()) {
    world.Block(lock, queues, deadline);
  } else {
    world.BlockOnFiles(lock, files.data(), files.size(), queues, deadline);
  }
}

void Network::LetTimePass(World::Lock& lock) {
  World& world = device_.world();
  if (world.is_virtual()) world.Block(lock, {}, world.now() + kMoment);
}

// ---- names ----

std::optional<Address> Network::Resolve(std::string_view name) const {
  if (name.empty() || SameHost(name, device_.profile().host_name)) return own_;
  if (SameHost(name, "localhost")) return kLocalHost;
  if (!device_.world().is_virtual()) return std::nullopt;
  return device_.world().Shared<Fabric>().FindName(name);
}

}  // namespace sim

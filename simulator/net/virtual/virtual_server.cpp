#include "net/virtual/virtual_server.h"

#include <cstdio>
#include <cstdlib>
#include <utility>

#include "ce/winsock.h"

namespace sim {
namespace {

constexpr std::size_t kServerBuffer = 65536;

[[noreturn]] void DieOfPort(const Endpoint& local) {
  std::fprintf(stderr, "cesim: the virtual network's %s is taken\n", ToText(local).c_str());
  std::abort();
}

}  // namespace

// ---- StreamEnd ----

StreamEnd::StreamEnd(VirtualNetwork network, std::unique_ptr<StreamProgram> program)
    : network_(network), program_(std::move(program)) {}

StreamEnd::~StreamEnd() {
  const World::Lock lock = network_.Enter();
  StopTimer();
  if (connection_ != nullptr && !closed_) connection_->Close(side_, /*abort=*/true);
}

void StreamEnd::Accept(std::shared_ptr<TcpConnection> connection, std::function<void()> ended) {
  connection_ = std::move(connection);
  ended_ = std::move(ended);
  side_ = 1;
  connection_->SetObserver(side_, this);
  connection_->SetBuffers(side_, kServerBuffer, kServerBuffer);
  Changed();
}

void StreamEnd::Connect(const Endpoint& local, const Endpoint& peer, std::function<void()> ended) {
  connection_ = std::make_shared<TcpConnection>(network_.fabric(), local, peer);
  ended_ = std::move(ended);
  connection_->SetBuffers(side_, kServerBuffer, kServerBuffer);
  connection_->Start(*this);
}

/// Tells the program what has happened, in its order.
void StreamEnd::Changed() {
  if (closed_ || std::exchange(changing_, true)) return;
  const std::shared_ptr<TcpConnection> connection = connection_;
  if (!open_ && connection->established(side_)) {
    open_ = true;
    program_->OnOpen(*this);
  }
  TakeBytes();
  if (!closed_ && connection->AtEnd(side_) && !std::exchange(end_told_, true)) {
    program_->OnEnd(*this);
  }
  const bool room = connection->Room(side_) > 0;
  if (!closed_ && room && std::exchange(wants_room_, false)) program_->OnRoom(*this);
  changing_ = false;
  if (!closed_ && connection->error(side_) != 0) {
    Finish();
    program_->OnBroken(*this, connection->error(side_));
  }
}

void StreamEnd::TakeBytes() {
  while (!closed_ && !paused_ && !connection_->Unread(side_).empty()) {
    const std::string bytes(connection_->Unread(side_));
    connection_->TakeRead(side_, bytes.size());
    program_->OnBytes(*this, bytes);
  }
}

std::size_t StreamEnd::Send(std::string_view bytes) {
  if (closed_) return 0;
  const std::size_t sent = connection_->Write(side_, bytes);
  if (sent < bytes.size()) wants_room_ = true;
  return sent;
}

void StreamEnd::ShutdownSend() {
  if (!closed_) connection_->ShutdownSend(side_);
}

void StreamEnd::Close() {
  if (closed_) return;
  connection_->Close(side_, /*abort=*/false);
  Finish();
}

void StreamEnd::Reset() {
  if (closed_) return;
  connection_->Close(side_, /*abort=*/true);
  Finish();
}

void StreamEnd::Finish() {
  closed_ = true;
  connection_->SetObserver(side_, nullptr);
  StopTimer();
  if (ended_) ended_();
}

void StreamEnd::SetPaused(bool paused) {
  paused_ = paused;
  if (!paused) Changed();
}

void StreamEnd::SetTimer(Micros when) {
  StopTimer();
  timer_ = network_.fabric().At(when, [this] {
    timer_ = 0;
    program_->OnTime(*this);
  });
}

void StreamEnd::StopTimer() {
  if (timer_ != 0) network_.world().Cancel(std::exchange(timer_, 0));
}

// ---- VirtualServer ----

/// The ends of a server's connections. Kept by the actions that clear away those that have ended.
struct VirtualServer::Ends {
  std::map<std::uint64_t, std::unique_ptr<StreamEnd>> open;
  std::uint64_t accepted = 0;
};

VirtualServer::VirtualServer(World& world, const Endpoint& local, Factory factory)
    : network_(world),
      local_(local),
      factory_(std::move(factory)),
      ends_(std::make_shared<Ends>()) {
  const World::Lock lock = network_.Enter();
  network_.fabric().AddHost(local_.address);
  if (network_.fabric().BindStream(local_) != 0) DieOfPort(local_);
  accepting_ = network_.fabric().Listen(local_, *this) == 0;
}

VirtualServer::~VirtualServer() {
  StopAccepting();
  decltype(ends_->open) left;
  {
    const World::Lock lock = network_.Enter();
    network_.fabric().UnbindStream(local_);
    left.swap(ends_->open);
  }
}

void VirtualServer::StopAccepting() {
  const World::Lock lock = network_.Enter();
  if (std::exchange(accepting_, false)) network_.fabric().StopListening(local_);
}

void VirtualServer::StartAccepting() {
  const World::Lock lock = network_.Enter();
  if (!accepting_) accepting_ = network_.fabric().Listen(local_, *this) == 0;
}

std::size_t VirtualServer::open_connections() const {
  const World::Lock lock = network_.Enter();
  return ends_->open.size();
}

std::uint64_t VirtualServer::accepted() const {
  const World::Lock lock = network_.Enter();
  return ends_->accepted;
}

void VirtualServer::Arrived(std::shared_ptr<TcpConnection> connection) {
  const std::uint64_t number = ++ends_->accepted;
  auto end = std::make_unique<StreamEnd>(network_, factory_(connection->endpoint(0)));
  StreamEnd& kept = *end;
  ends_->open.emplace(number, std::move(end));
  // Not at once: the end is being called.
  kept.Accept(std::move(connection), [network = network_, ends = std::weak_ptr(ends_), number] {
    network.fabric().At(network.now(), [ends, number] {
      if (const auto left = ends.lock()) left->open.erase(number);
    });
  });
}

// ---- VirtualClient ----

VirtualClient::VirtualClient(World& world, Address local, const Endpoint& peer,
                             std::unique_ptr<StreamProgram> program)
    : network_(world),
      local_{local, 0},
      end_(std::make_unique<StreamEnd>(network_, std::move(program))) {
  const World::Lock lock = network_.Enter();
  network_.fabric().AddHost(local);
  if (network_.fabric().BindStream(local_) != 0) DieOfPort(local_);
  end_->Connect(local_, peer, {});
}

VirtualClient::~VirtualClient() {
  end_.reset();
  const World::Lock lock = network_.Enter();
  network_.fabric().UnbindStream(local_);
}

// ---- VirtualPort ----

VirtualPort::VirtualPort(World& world, const Endpoint& local, OnDatagram on_datagram)
    : network_(world), local_(local), on_datagram_(std::move(on_datagram)) {
  const World::Lock lock = network_.Enter();
  network_.fabric().AddHost(local_.address);
  if (network_.fabric().BindDatagram(local_, *this, /*share=*/false) != 0) DieOfPort(local_);
}

VirtualPort::~VirtualPort() {
  const World::Lock lock = network_.Enter();
  network_.fabric().UnbindDatagram(local_, *this);
}

void VirtualPort::Send(const Endpoint& to, std::string_view bytes) {
  const World::Lock lock = network_.Enter();
  network_.fabric().SendDatagram(local_, to, bytes, {});
}

void VirtualPort::Join(Address group) {
  const World::Lock lock = network_.Enter();
  network_.fabric().Join(local_, *this, group);
}

void VirtualPort::Leave(Address group) {
  const World::Lock lock = network_.Enter();
  network_.fabric().Leave(local_, *this, group);
}

void VirtualPort::Arrived(const Endpoint& from, const Payload& bytes) {
  on_datagram_(*this, from, *bytes);
}

}  // namespace sim

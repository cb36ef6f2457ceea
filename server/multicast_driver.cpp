#include "server/multicast_driver.h"

#include <array>
#include <asio/buffer.hpp>
#include <asio/io_context.hpp>
#include <asio/ip/multicast.hpp>
#include <asio/ip/udp.hpp>
#include <asio/post.hpp>
#include <asio/steady_timer.hpp>
#include <chrono>
#include <stdexcept>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

namespace server {
namespace {

using asio::ip::udp;
using ErrorCode = asio::error_code;

/// Datagrams of one kind in a row, before the other kind has its turn.
constexpr int kTurn = 32;
constexpr int kReceiveBuffer = 4 * 1024 * 1024;
constexpr int kAttempts = 16;
/// After a refusal that no event ends: the system is short of memory for the network.
constexpr std::chrono::milliseconds kRefusedPause{2};
/// What a run that was stopped has still to say finds room in this time or not at all.
constexpr std::chrono::seconds kLongestRest{1};

void Check(const ErrorCode& error, const std::string& what) {
  if (error) throw std::system_error(error.value(), std::generic_category(), what);
}

udp::endpoint ToEndpoint(const Peer& peer) {
  return {asio::ip::address_v4(peer.address), peer.port};
}

Peer ToPeer(const udp::endpoint& endpoint) {
  return {endpoint.address().to_v4().to_uint(), endpoint.port()};
}

}  // namespace

class MulticastDriver::Socket : public std::enable_shared_from_this<Socket> {
 public:
  Socket(asio::io_context& loop, MulticastRun& run)
      : run_(run), socket_(loop), ears_(loop), timer_(loop) {}

  void Open(const MulticastSocketOptions& options);
  void Start(std::function<void()> ended);
  void Pump();
  void SendRest();
  void Close();

  [[nodiscard]] Peer local() const { return local_; }
  [[nodiscard]] const MulticastSocketFigures& figures() const { return figures_; }

 private:
  enum class Sending : std::uint8_t { kIdle, kFull, kMore };

  bool CanHave(const asio::ip::address_v4& address, std::uint16_t port);
  bool Bind(const asio::ip::address_v4& address, std::uint16_t port);
  void OpenEars(const asio::ip::address_v4& address);
  void WaitToOverhear();
  bool Receive();
  Sending Send();
  void WaitToSend();
  void WaitToReceive();
  void RestFromReceiving();
  void SetTimer();
  void Again();

  MulticastRun& run_;
  udp::socket socket_;
  udp::socket ears_;  ///< hears what is said on the public group, and says nothing
  asio::steady_timer timer_;
  Peer local_;
  MulticastSocketFigures figures_;
  std::function<void()> ended_;
  std::function<void(const Peer&, const Peer&, std::string_view)> tap_;
  const Outgoing* kept_ = nullptr;  ///< what did not fit the socket's buffer
  bool full_ = false;               ///< waiting for room
  bool listening_ = false;          ///< waiting for a datagram
  bool resting_ = false;            ///< looks for datagrams again in a moment
  bool again_ = false;              ///< Pump will come back by itself
  bool closed_ = false;
  bool timer_set_ = false;
  Micros timer_at_{0};
  std::array<char, 65536> buffer_{};
};

void MulticastDriver::Socket::Open(const MulticastSocketOptions& options) {
  ErrorCode error;
  const auto address = asio::ip::make_address_v4(options.address, error);
  if (error) throw std::invalid_argument("\"" + options.address + "\" is no IPv4 address");
  const std::uint16_t public_port = run_.options().public_group.port;
  if (options.port == public_port) {
    throw std::invalid_argument("port " + std::to_string(public_port) +
                                " is where clients listen; the server needs another one");
  }
  bool bound = options.port == 0 && run_.former_port() != 0 && CanHave(address, run_.former_port());
  for (int attempt = 0; !bound && attempt < kAttempts; ++attempt) {
    bound = Bind(address, options.port);
  }
  if (!bound) throw std::invalid_argument("no free port but the public one");
  socket_.set_option(asio::ip::multicast::outbound_interface(address), error);
  Check(error, options.address + " cannot send to multicast groups");
  socket_.set_option(asio::ip::multicast::hops(options.ttl), error);
  Check(error, "a multicast TTL of " + std::to_string(options.ttl));
  socket_.set_option(asio::ip::multicast::enable_loopback(options.loop_back), error);
  Check(error, "the multicast loop-back");
  socket_.set_option(asio::socket_base::receive_buffer_size(kReceiveBuffer), error);
  socket_.non_blocking(true);
  local_ = ToPeer(socket_.local_endpoint());
  tap_ = options.tap;
  OpenEars(address);
}

/// Without them the run goes on as well: it does not find out that there is another server.
void MulticastDriver::Socket::OpenEars(const asio::ip::address_v4& address) {
  const asio::ip::address_v4 group(run_.options().public_group.address);
  ErrorCode error;
  ears_.open(udp::v4(), error);
  if (!error) ears_.set_option(asio::socket_base::reuse_address(true), error);
  // Bound to the group itself: what is meant for a client on this machine goes to the client.
  if (!error) ears_.bind(udp::endpoint(group, run_.options().public_group.port), error);
  if (!error) ears_.set_option(asio::ip::multicast::join_group(group, address), error);
  if (!error) ears_.non_blocking(true, error);
  if (error) ears_.close(error);
}

void MulticastDriver::Socket::WaitToOverhear() {
  if (closed_ || !ears_.is_open()) return;
  ears_.async_wait(udp::socket::wait_read, [self = shared_from_this()](ErrorCode error) {
    for (int i = 0; !error && i < kTurn; ++i) {
      udp::endpoint from;
      const std::size_t size =
          self->ears_.receive_from(asio::buffer(self->buffer_), from, 0, error);
      if (error) break;
      self->run_.OnOverheard(ToPeer(from), {self->buffer_.data(), size}, NowMicros());
    }
    const bool quiet = error == asio::error::would_block || error == asio::error::try_again;
    if (!error || quiet) self->WaitToOverhear();
  });
}

bool MulticastDriver::Socket::CanHave(const asio::ip::address_v4& address, std::uint16_t port) {
  try {
    return Bind(address, port);
  } catch (const std::system_error&) {
    return false;  // somebody else has it by now
  }
}

/// @return false when the system has chosen the public port
bool MulticastDriver::Socket::Bind(const asio::ip::address_v4& address, std::uint16_t port) {
  ErrorCode error;
  if (socket_.is_open()) socket_.close(error);
  socket_.open(udp::v4(), error);
  Check(error, "a UDP socket");
  socket_.bind(udp::endpoint(address, port), error);
  Check(error, "the address " + address.to_string() + ":" + std::to_string(port));
  return socket_.local_endpoint().port() != run_.options().public_group.port;
}

void MulticastDriver::Socket::Start(std::function<void()> ended) {
  ended_ = std::move(ended);
  run_.Start(local_, NowMicros());
  WaitToOverhear();
  Pump();
}

/// Does whatever is to be done now, in turns, and sets the waits for the rest.
void MulticastDriver::Socket::Pump() {
  if (closed_) return;
  run_.OnTime(NowMicros());
  const bool more_to_read = Receive();
  const Sending sending = full_ ? Sending::kFull : Send();
  if (run_.finished() && kept_ == nullptr) {
    Close();
    if (ended_) std::exchange(ended_, nullptr)();
    return;
  }
  if (sending == Sending::kFull) WaitToSend();
  if (more_to_read || sending == Sending::kMore) {
    Again();
  } else {
    SetTimer();
  }
  WaitToReceive();
}

bool MulticastDriver::Socket::Receive() {
  for (int i = 0; i < kTurn; ++i) {
    udp::endpoint from;
    ErrorCode error;
    const std::size_t size = socket_.receive_from(asio::buffer(buffer_), from, 0, error);
    if (error == asio::error::would_block || error == asio::error::try_again) return false;
    if (error) {
      // A device's system has refused a datagram; or the road is gone, which fails at once again.
      RestFromReceiving();
      return false;
    }
    const std::string_view bytes(buffer_.data(), size);
    if (tap_) tap_(ToPeer(from), local_, bytes);
    run_.OnDatagram(ToPeer(from), bytes, NowMicros());
  }
  return true;
}

MulticastDriver::Socket::Sending MulticastDriver::Socket::Send() {
  for (int i = 0; i < kTurn; ++i) {
    if (kept_ == nullptr) kept_ = run_.Next(NowMicros());
    if (kept_ == nullptr) return Sending::kIdle;
    ErrorCode error;
    socket_.send_to(asio::buffer(kept_->bytes.data(), kept_->bytes.size()), ToEndpoint(kept_->to),
                    0, error);
    if (error == asio::error::would_block || error == asio::error::try_again ||
        error == asio::error::no_buffer_space) {
      ++figures_.waits;
      return Sending::kFull;
    }
    if (error) {
      ++figures_.send_errors;
      run_.OnRefused(error.value(), NowMicros());
    }
    if (!error && tap_) tap_(local_, kept_->to, kept_->bytes);
    kept_ = nullptr;
  }
  return Sending::kMore;
}

void MulticastDriver::Socket::SendRest() {
  const Micros end = NowMicros() + kLongestRest;
  while (!closed_ && run_.ended() && NowMicros() < end) {
    const Sending sending = Send();
    if (sending == Sending::kIdle) return;
    if (sending == Sending::kFull) std::this_thread::sleep_for(kRefusedPause);
  }
}

void MulticastDriver::Socket::WaitToSend() {
  if (full_) return;
  full_ = true;
  // The buffer of the socket may have room while that of the device below has none: a socket that
  // is writable at once would turn the loop into a busy one.
  auto pause = std::make_shared<asio::steady_timer>(socket_.get_executor(), kRefusedPause);
  pause->async_wait([self = shared_from_this(), pause](const ErrorCode& /*error*/) {
    self->full_ = false;
    self->Pump();
  });
}

void MulticastDriver::Socket::RestFromReceiving() {
  if (std::exchange(resting_, true)) return;
  auto pause = std::make_shared<asio::steady_timer>(socket_.get_executor(), kRefusedPause);
  pause->async_wait([self = shared_from_this(), pause](const ErrorCode& /*error*/) {
    self->resting_ = false;
    self->Pump();
  });
}

void MulticastDriver::Socket::WaitToReceive() {
  if (listening_ || closed_ || resting_) return;
  listening_ = true;
  socket_.async_wait(udp::socket::wait_read, [self = shared_from_this()](const ErrorCode& error) {
    self->listening_ = false;
    if (!error) self->Pump();
  });
}

void MulticastDriver::Socket::Again() {
  if (std::exchange(again_, true)) return;
  asio::post(socket_.get_executor(), [self = shared_from_this()] {
    self->again_ = false;
    self->Pump();
  });
}

/// Every block moves the deadline. The timer is only set again when the deadline has come nearer;
/// when it has gone further away, the timer finds out at its end.
void MulticastDriver::Socket::SetTimer() {
  const std::optional<Micros> deadline = run_.deadline(NowMicros());
  if (!deadline || kept_ != nullptr) return;
  if (timer_set_ && timer_at_ <= *deadline) return;
  timer_set_ = true;
  timer_at_ = *deadline;
  timer_.expires_at(std::chrono::steady_clock::time_point(*deadline));
  timer_.async_wait([self = shared_from_this()](const ErrorCode& error) {
    if (error) return;  // set anew, or over
    self->timer_set_ = false;
    self->Pump();
  });
}

void MulticastDriver::Socket::Close() {
  closed_ = true;
  kept_ = nullptr;
  ErrorCode ignored;
  socket_.close(ignored);
  ears_.close(ignored);
  timer_.cancel();
}

MulticastDriver::MulticastDriver(asio::io_context& loop, MulticastRun& run,
                                 const MulticastSocketOptions& options)
    : socket_(std::make_shared<Socket>(loop, run)) {
  socket_->Open(options);
}

MulticastDriver::~MulticastDriver() {
  socket_->Close();
}

void MulticastDriver::Start(std::function<void()> ended) {
  socket_->Start(std::move(ended));
}

void MulticastDriver::Wake() {
  socket_->Pump();
}

void MulticastDriver::Close() {
  socket_->SendRest();
  socket_->Close();
}

Peer MulticastDriver::local() const {
  return socket_->local();
}

const MulticastSocketFigures& MulticastDriver::figures() const {
  return socket_->figures();
}

Micros NowMicros() {
  return std::chrono::duration_cast<Micros>(std::chrono::steady_clock::now().time_since_epoch());
}

}  // namespace server

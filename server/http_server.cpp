#include "server/http_server.h"

#include <sys/resource.h>

#include <array>
#include <asio/buffer.hpp>
#include <asio/io_context.hpp>
#include <asio/ip/address.hpp>
#include <asio/ip/tcp.hpp>
#include <asio/steady_timer.hpp>
#include <exception>
#include <set>
#include <system_error>
#include <utility>

namespace server {
namespace {

using asio::ip::tcp;
using ErrorCode = asio::error_code;

constexpr std::size_t kReadSize = 8192;
constexpr std::chrono::milliseconds kAcceptPause{100};

}  // namespace

class HttpServer::Listener : public std::enable_shared_from_this<Listener> {
 public:
  Listener(asio::io_context& loop, Site& site, DeviceLedger& ledger, HttpServerOptions options)
      : site_(site), ledger_(ledger), options_(std::move(options)), acceptor_(loop), retry_(loop) {}

  void Open();
  void Accept();
  void Stop();

  [[nodiscard]] std::uint16_t port() const { return acceptor_.local_endpoint().port(); }
  [[nodiscard]] const HttpServerFigures& figures() const { return figures_; }

 private:
  class Connection;

  void Take(tcp::socket socket);
  void Leave(Connection* connection);

  Site& site_;
  DeviceLedger& ledger_;
  const HttpServerOptions options_;
  tcp::acceptor acceptor_;
  asio::steady_timer retry_;
  std::set<Connection*> connections_;
  HttpServerFigures figures_;
  bool stopped_ = false;
};

/// Carries bytes and deadlines between one socket and its session. Lives as long as an operation
/// on it is under way.
class HttpServer::Listener::Connection : public std::enable_shared_from_this<Connection> {
 public:
  Connection(std::shared_ptr<Listener> owner, tcp::socket socket, std::string address)
      : owner_(std::move(owner)),
        number_(owner_->figures_.accepted),
        socket_(std::move(socket)),
        timer_(socket_.get_executor()),
        session_(owner_->site_, owner_->ledger_, owner_->options_.session, std::move(address),
                 Now()) {}

  /// Does whatever the session wishes next. Called after every event.
  void Pump() {
    if (ended_) return;
    if (session_.closed()) {
      End();
      return;
    }
    Write();
    Read();
    if (session_.ends_output() && !output_ended_) {
      output_ended_ = true;
      ErrorCode ignored;
      socket_.shutdown(tcp::socket::shutdown_send, ignored);
    }
    SetTimer();
  }

  void End() {
    if (std::exchange(ended_, true)) return;
    session_.OnPeerClosed(Now());
    ErrorCode ignored;
    socket_.close(ignored);
    timer_.cancel();
    owner_->Leave(this);
  }

 private:
  void Write() {
    if (writing_ || session_.output().empty()) return;
    writing_ = true;
    const std::string_view output = session_.output();
    socket_.async_write_some(asio::buffer(output.data(), output.size()),
                             [self = shared_from_this()](const ErrorCode& error, std::size_t sent) {
                               self->writing_ = false;
                               if (self->ended_) return;
                               if (error) self->session_.OnPeerClosed(Now());
                               if (!error) self->session_.OnSent(sent, Now());
                               self->Pump();
                             });
  }

  void Read() {
    if (reading_ || !session_.wants_input()) return;
    reading_ = true;
    socket_.async_read_some(asio::buffer(input_),
                            [self = shared_from_this()](const ErrorCode& error, std::size_t got) {
                              self->reading_ = false;
                              if (self->ended_) return;
                              self->OnRead(error, got);
                              self->Pump();
                            });
  }

  void OnRead(const ErrorCode& error, std::size_t got) {
    if (error) {
      session_.OnPeerClosed(Now());
    } else {
      const std::string_view bytes(input_.data(), got);
      if (owner_->options_.tap) owner_->options_.tap(number_, bytes);
      session_.OnBytes(bytes, Now());
    }
  }

  /// A body moves the deadline with every block. The timer is only set again when the deadline has
  /// come nearer; when it has gone further away, the timer finds out at its end.
  void SetTimer() {
    const Time deadline = session_.deadline();
    if (timer_set_ && timer_at_ <= deadline) return;
    timer_set_ = true;
    timer_at_ = deadline;
    timer_.expires_at(std::chrono::steady_clock::time_point(deadline));
    timer_.async_wait([self = shared_from_this()](const ErrorCode& error) {
      if (error || self->ended_) return;  // set anew, or over
      self->timer_set_ = false;
      self->session_.OnTime(Now());
      self->Pump();
    });
  }

  const std::shared_ptr<Listener> owner_;
  const std::uint64_t number_;
  tcp::socket socket_;
  asio::steady_timer timer_;
  HttpSession session_;
  std::array<char, kReadSize> input_{};
  bool reading_ = false;
  bool writing_ = false;
  bool output_ended_ = false;
  bool ended_ = false;
  bool timer_set_ = false;
  Time timer_at_{};
};

void HttpServer::Listener::Open() {
  const tcp::endpoint endpoint(asio::ip::make_address(options_.address), options_.port);
  acceptor_.open(endpoint.protocol());
  acceptor_.set_option(tcp::acceptor::reuse_address(true));
  acceptor_.bind(endpoint);
  acceptor_.listen(tcp::acceptor::max_listen_connections);
}

void HttpServer::Listener::Accept() {
  acceptor_.async_accept([self = shared_from_this()](const ErrorCode& error, tcp::socket socket) {
    if (self->stopped_) return;
    if (!error) {
      self->Take(std::move(socket));
      self->Accept();
      return;
    }
    // No descriptors left, or a client gone before it was accepted: others may still come.
    self->retry_.expires_after(kAcceptPause);
    self->retry_.async_wait([self](const ErrorCode& stopped) {
      if (!stopped && !self->stopped_) self->Accept();
    });
  });
}

void HttpServer::Listener::Take(tcp::socket socket) {
  ++figures_.accepted;
  ErrorCode error;
  const tcp::endpoint peer = socket.remote_endpoint(error);
  if (error) return;
  if (connections_.size() >= options_.max_connections) {
    ++figures_.turned_away;
    return;
  }
  // The head has to travel at once and alone; the body follows after a pause.
  socket.set_option(tcp::no_delay(true), error);
  auto connection = std::make_shared<Connection>(shared_from_this(), std::move(socket),
                                                 peer.address().to_string());
  connections_.insert(connection.get());
  figures_.connections = connections_.size();
  figures_.most_connections = std::max(figures_.most_connections, connections_.size());
  connection->Pump();
}

void HttpServer::Listener::Leave(Connection* connection) {
  connections_.erase(connection);
  figures_.connections = connections_.size();
}

void HttpServer::Listener::Stop() {
  stopped_ = true;
  ErrorCode ignored;
  acceptor_.close(ignored);
  retry_.cancel();
  const std::set<Connection*> open = connections_;
  for (Connection* connection : open) connection->shared_from_this()->End();
}

HttpServer::HttpServer(asio::io_context& loop, Site& site, DeviceLedger& ledger,
                       HttpServerOptions options)
    : listener_(std::make_shared<Listener>(loop, site, ledger, std::move(options))) {
  listener_->Open();
  listener_->Accept();
}

HttpServer::~HttpServer() {
  try {
    Stop();
  } catch (...) {
    // Out of memory: what is left open ends with the loop.
  }
}

std::uint16_t HttpServer::port() const {
  return listener_->port();
}

const HttpServerFigures& HttpServer::figures() const {
  return listener_->figures();
}

void HttpServer::Stop() {
  listener_->Stop();
}

Time Now() {
  return std::chrono::duration_cast<Time>(std::chrono::steady_clock::now().time_since_epoch());
}

void RaiseDescriptorLimit() {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = limit.rlim_max;
  static_cast<void>(::setrlimit(RLIMIT_NOFILE, &limit));
}

}  // namespace server

// The upgrade server on real sockets.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "server/http_session.h"
#include "server/ledger.h"
#include "server/site.h"

namespace asio {
class io_context;
}

namespace server {

struct HttpServerOptions {
  std::string address = "127.0.0.1";  ///< IPv4 or IPv6 address to listen on
  std::uint16_t port = 0;             ///< 0: any free one
  /// Connections above this number are closed as they come; devices try again by themselves.
  std::size_t max_connections = 4096;
  SessionOptions session;
  /// Sees every byte that clients send, as it comes; may be empty. Connections are counted from 1.
  std::function<void(std::uint64_t connection, std::string_view bytes)> tap;
};

struct HttpServerFigures {
  std::size_t connections = 0;  ///< open now
  std::size_t most_connections = 0;
  std::uint64_t accepted = 0;
  std::uint64_t turned_away = 0;  ///< closed because max_connections were open
};

/// Serves a site to devices: one listening socket, one thread, one HttpSession a connection.
///
/// Everything happens in the thread that runs `loop`. Site, ledger and loop must outlive the
/// server. Nothing a client does ends the loop; running out of descriptors only delays the next
/// connection.
class HttpServer {
 public:
  /// Opens the listening socket. Throws std::system_error when the address cannot be had.
  HttpServer(asio::io_context& loop, Site& site, DeviceLedger& ledger, HttpServerOptions options);
  /// Closes all connections.
  ~HttpServer();
  HttpServer(const HttpServer&) = delete;
  HttpServer& operator=(const HttpServer&) = delete;

  [[nodiscard]] std::uint16_t port() const;
  [[nodiscard]] const HttpServerFigures& figures() const;

  /// Ends listening and all connections, so that the loop runs out of work.
  void Stop();

 private:
  class Listener;
  std::shared_ptr<Listener> listener_;
};

/// The time of a monotonic clock, as sessions and ledger want it.
[[nodiscard]] Time Now();

/// Lets this process open as many sockets and files as the system allows it at most.
void RaiseDescriptorLimit();

}  // namespace server

// What the multicast client says of its progress, and how the window comes to show it.
#pragma once

#include <coredll.h>

#include <cstdint>

#include "base/text.h"
#include "device/handle.h"
#include "mcftp/udp_socket/udp_socket.h"
#include "mcftp/wire/status_datagram.h"

namespace upgrade {

/// Shows reports one after another: each new file's name as a status line, its percentage in the
/// lower bar, and each finished file in the upper one. One thread uses an object.
class StatusDisplay {
 public:
  void Show(const mcftp::StatusDatagram& status) noexcept;

 private:
  base::FixedText<mcftp::kMaxStatusName + 1> shown_name_;
};

/// A UDP port of the device, and a thread that shows every report that comes to it. The upgrade
/// thread owns it for one multicast transfer.
class StatusListener {
 public:
  StatusListener() noexcept = default;
  ~StatusListener() { Stop(); }
  StatusListener(const StatusListener&) = delete;
  StatusListener& operator=(const StatusListener&) = delete;

  /// Takes the first free port from 5655 on and begins to listen.
  /// @return false when there is none, or no socket or thread: then nothing is shown.
  [[nodiscard]] bool Start() noexcept;
  /// Host order; meaningful once Start has succeeded.
  [[nodiscard]] std::uint16_t port() const noexcept { return socket_.port(); }
  /// Closes the socket, which ends the thread, and waits a moment for it. May be called again.
  void Stop() noexcept;

 private:
  [[nodiscard]] bool Bind() noexcept;
  [[nodiscard]] bool Listen() noexcept;

  mcftp::SocketLibrary library_;
  mcftp::UdpEndpoint socket_;
  device::ThreadHandle thread_;
};

}  // namespace upgrade

// What a multicast client and whoever starts it have to say to each other.
#pragma once

#include <coredll.h>

namespace mcftp {

/// The owner of a client. Everything in it is optional; it has to outlive the client's thread.
struct ClientOwner {
  void* context = nullptr;  ///< handed to `stopped` and `log`

  /// Called once, by the client's thread, when the client has shut down. A few instructions of that
  /// thread are still to come: McftpClient::AwaitEnd waits for them.
  void (*stopped)(void* context) = nullptr;

  /// Receives every log line while no syslog server is set: at most 2,048 characters, no line end.
  /// Called by the starting thread and the client's own, never by both at once, with the client's
  /// critical section held: it must not wait for another thread of the client.
  void (*log)(void* context, const WCHAR* line) = nullptr;

  /// Where progress is posted as `message` (wParam: address of the file's name, lParam: percent)
  /// while no user interface is to be told by datagram. Null or 0: nowhere. The name is the
  /// client's own: it changes with the next file, unannounced, and is gone with the client.
  HWND window = nullptr;
  UINT message = 0;
};

}  // namespace mcftp

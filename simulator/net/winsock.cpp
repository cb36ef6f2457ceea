// The Winsock functions on sockets.
#include "ce/winsock.h"

#include <cstring>
#include <memory>

#include "net/winsock_call.h"

namespace {

using sim::Endpoint;
using sim::Received;
using sim::Socket;
using sim::SocketKind;
using sim::WinsockCall;

constexpr int kAddressSize = static_cast<int>(sizeof(ce_sockaddr_in));

/// Reads the caller's address. @return 0 or a Winsock error.
int ReadAddress(const ce_sockaddr* address, int size, Endpoint& endpoint) {
  if (address == nullptr || size < kAddressSize) return WSAEFAULT;
  ce_sockaddr_in in{};
  std::memcpy(&in, address, sizeof in);
  if (in.sin_family != CE_AF_INET) return WSAEAFNOSUPPORT;
  endpoint = sim::ToEndpoint(in);
  return 0;
}

[[nodiscard]] bool HasRoom(const ce_sockaddr* address, const int* size) {
  return address != nullptr && size != nullptr && *size >= kAddressSize;
}

void WriteAddress(const Endpoint& endpoint, ce_sockaddr* address, int* size) {
  const ce_sockaddr_in in = sim::ToSockaddr(endpoint);
  std::memcpy(address, &in, sizeof in);
  *size = kAddressSize;
}

/// A null address means that the caller does not want it; one without room is an error.
[[nodiscard]] bool BadOptional(const ce_sockaddr* address, const int* size) {
  return address != nullptr && !HasRoom(address, size);
}

[[nodiscard]] bool BadBuffer(const char* bytes, int size) {
  return size < 0 || (bytes == nullptr && size > 0);
}

/// Sends what is left of `size` bytes; a blocking call ends when all of them have found room.
int SendRest(Socket& at, const char* bytes, int size, std::size_t& done) {
  std::size_t sent = 0;
  const int error = at.Send(bytes + done, static_cast<std::size_t>(size) - done, sent);
  if (error != 0) return error;
  done += sent;
  return done == static_cast<std::size_t>(size) || at.nonblocking() ? 0 : WSAEWOULDBLOCK;
}

int Receive(WinsockCall& call, SOCKET socket, char* bytes, int size, int flags, Received& result) {
  return call.Run(socket, sim::kReadable, [&](Socket& at) -> int {
    if (BadBuffer(bytes, size)) return WSAEFAULT;
    if ((flags & ~CE_MSG_PEEK) != 0) return WSAEOPNOTSUPP;
    const bool peek = (flags & CE_MSG_PEEK) != 0;
    const int error = at.Receive(bytes, static_cast<std::size_t>(size), peek, result);
    return error == 0 && result.cut ? WSAEMSGSIZE : error;
  });
}

}  // namespace

extern "C" {

SOCKET ce_socket(int family, int type, int protocol) {
  WinsockCall call("socket");
  call.Note("family", family).Note("type", type).Note("protocol", protocol);
  SOCKET number = CE_INVALID_SOCKET;
  int error = call.Enter();
  const bool stream = type == CE_SOCK_STREAM;
  if (error == 0 && family != CE_AF_INET) error = WSAEAFNOSUPPORT;
  if (error == 0 && !stream && type != CE_SOCK_DGRAM) error = WSAESOCKTNOSUPPORT;
  if (error == 0 && protocol != 0 && protocol != (stream ? CE_IPPROTO_TCP : CE_IPPROTO_UDP)) {
    error = WSAEPROTONOSUPPORT;
  }
  if (error == 0) {
    error = call.network().Open(stream ? SocketKind::kStream : SocketKind::kDatagram, number);
  }
  return call.Finish(error, number, CE_INVALID_SOCKET);
}

int ce_closesocket(SOCKET socket) {
  WinsockCall call("closesocket");
  call.Note("socket", socket);
  int error = call.Enter();
  if (error == 0 && !call.network().Close(socket)) error = WSAENOTSOCK;
  return call.Finish(error);
}

int ce_bind(SOCKET socket, const ce_sockaddr* address, int size) {
  WinsockCall call("bind");
  call.Note("socket", socket);
  return call.Finish(call.On(socket, [&](Socket& at) {
    Endpoint local;
    const int error = ReadAddress(address, size, local);
    return error == 0 ? at.Bind(local) : error;
  }));
}

int ce_connect(SOCKET socket, const ce_sockaddr* address, int size) {
  WinsockCall call("connect");
  call.Note("socket", socket);
  bool begun = false;
  return call.Finish(call.Run(socket, sim::kWritable, [&](Socket& at) {
    if (begun) return at.FinishConnect();
    Endpoint peer;
    const int error = ReadAddress(address, size, peer);
    if (error != 0) return error;
    call.Note("address", sim::ToText(peer).c_str());
    begun = true;
    return at.Connect(peer);
  }));
}

int ce_listen(SOCKET socket, int backlog) {
  WinsockCall call("listen");
  call.Note("socket", socket).Note("backlog", backlog);
  return call.Finish(call.On(socket, [&](Socket& at) { return at.Listen(backlog); }));
}

SOCKET ce_accept(SOCKET socket, ce_sockaddr* address, int* size) {
  WinsockCall call("accept");
  call.Note("socket", socket);
  std::unique_ptr<Socket> accepted;
  Endpoint peer;
  const int error = call.Run(socket, sim::kReadable, [&](Socket& at) -> int {
    return BadOptional(address, size) ? WSAEFAULT : at.Accept(accepted, peer);
  });
  if (error != 0) return call.Finish(error, CE_INVALID_SOCKET, CE_INVALID_SOCKET);
  if (address != nullptr) WriteAddress(peer, address, size);
  return call.Finish(0, call.network().Add(std::move(accepted)), CE_INVALID_SOCKET);
}

int ce_send(SOCKET socket, const char* bytes, int size, int flags) {
  WinsockCall call("send");
  call.Note("socket", socket).Note("size", size);
  std::size_t done = 0;
  const int error = call.Run(socket, sim::kWritable, [&](Socket& at) -> int {
    if (BadBuffer(bytes, size)) return WSAEFAULT;
    return flags == 0 ? SendRest(at, bytes, size, done) : WSAEOPNOTSUPP;
  });
  return call.Finish(error, static_cast<int>(done), CE_SOCKET_ERROR);
}

int ce_recv(SOCKET socket, char* bytes, int size, int flags) {
  WinsockCall call("recv");
  call.Note("socket", socket).Note("size", size);
  Received result;
  const int error = Receive(call, socket, bytes, size, flags, result);
  return call.Finish(error, static_cast<int>(result.size), CE_SOCKET_ERROR);
}

int ce_sendto(SOCKET socket, const char* bytes, int size, int flags, const ce_sockaddr* address,
              int address_size) {
  WinsockCall call("sendto");
  call.Note("socket", socket).Note("size", size);
  std::size_t sent = 0;
  const int error = call.Run(socket, sim::kWritable, [&](Socket& at) -> int {
    if (BadBuffer(bytes, size)) return WSAEFAULT;
    if (flags != 0) return WSAEOPNOTSUPP;
    if (at.kind() == SocketKind::kStream || address == nullptr) {
      return SendRest(at, bytes, size, sent);
    }
    Endpoint to;
    const int wrong = ReadAddress(address, address_size, to);
    return wrong != 0 ? wrong : at.SendTo(to, bytes, static_cast<std::size_t>(size), sent);
  });
  return call.Finish(error, static_cast<int>(sent), CE_SOCKET_ERROR);
}

int ce_recvfrom(SOCKET socket, char* bytes, int size, int flags, ce_sockaddr* address,
                int* address_size) {
  WinsockCall call("recvfrom");
  call.Note("socket", socket).Note("size", size);
  if (BadOptional(address, address_size)) {
    const int error = call.Enter();
    return call.Finish(error != 0 ? error : WSAEFAULT);
  }
  Received result;
  const int error = Receive(call, socket, bytes, size, flags, result);
  if ((error == 0 || error == WSAEMSGSIZE) && address != nullptr) {
    const Socket* at = call.network().Find(socket);
    const bool datagram = at != nullptr && at->kind() == SocketKind::kDatagram;
    if (datagram) WriteAddress(result.from, address, address_size);
  }
  return call.Finish(error, static_cast<int>(result.size), CE_SOCKET_ERROR);
}

int ce_shutdown(SOCKET socket, int how) {
  WinsockCall call("shutdown");
  call.Note("socket", socket).Note("how", how);
  return call.Finish(call.On(socket, [&](Socket& at) { return at.Shutdown(how); }));
}

int ce_ioctlsocket(SOCKET socket, std::int32_t command, std::uint32_t* argument) {
  WinsockCall call("ioctlsocket");
  call.Note("socket", socket).Note("command", command);
  return call.Finish(call.On(socket, [&](Socket& at) -> int {
    if (command != CE_FIONBIO && command != CE_FIONREAD) return WSAEINVAL;
    if (argument == nullptr) return WSAEFAULT;
    if (command == CE_FIONBIO) {
      at.set_nonblocking(*argument != 0);
      return 0;
    }
    const int error = at.Pending(*argument);
    if (error == 0 && *argument == 0) call.network().LetTimePass(call.lock());
    return error;
  }));
}

int ce_setsockopt(SOCKET socket, int level, int option, const char* value, int size) {
  WinsockCall call("setsockopt");
  call.Note("socket", socket).Note("level", level).Note("option", option);
  return call.Finish(
      call.On(socket, [&](Socket& at) { return at.SetOption(level, option, value, size); }));
}

int ce_getsockopt(SOCKET socket, int level, int option, char* value, int* size) {
  WinsockCall call("getsockopt");
  call.Note("socket", socket).Note("level", level).Note("option", option);
  return call.Finish(
      call.On(socket, [&](Socket& at) { return at.GetOption(level, option, value, size); }));
}

int ce_getsockname(SOCKET socket, ce_sockaddr* address, int* size) {
  WinsockCall call("getsockname");
  call.Note("socket", socket);
  return call.Finish(call.On(socket, [&](Socket& at) -> int {
    if (!HasRoom(address, size)) return WSAEFAULT;
    Endpoint local;
    const int error = at.LocalName(local);
    if (error == 0) WriteAddress(local, address, size);
    return error;
  }));
}

int ce_getpeername(SOCKET socket, ce_sockaddr* address, int* size) {
  WinsockCall call("getpeername");
  call.Note("socket", socket);
  return call.Finish(call.On(socket, [&](Socket& at) -> int {
    if (!HasRoom(address, size)) return WSAEFAULT;
    Endpoint peer;
    const int error = at.PeerName(peer);
    if (error == 0) WriteAddress(peer, address, size);
    return error;
  }));
}

}  // extern "C"

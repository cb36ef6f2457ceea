// select: which sockets are ready, and the wait for one that is.
#include <algorithm>
#include <array>
#include <optional>
#include <vector>

#include "ce/winsock.h"
#include "net/winsock_call.h"

namespace {

using sim::Micros;
using sim::Network;
using sim::WinsockCall;

struct Selection {
  ce_fd_set* set;
  unsigned interest;
};
using Selections = std::array<Selection, 3>;

/// A socket with all that is asked about it, and what of that it is ready for.
struct Asked {
  Network::Watched watched;
  unsigned ready = 0;
};
using AskedSockets = std::vector<Asked>;

Asked* Find(AskedSockets& sockets, SOCKET number) {
  const auto is_it = [&](const Asked& asked) { return asked.watched.number == number; };
  const auto found = std::find_if(sockets.begin(), sockets.end(), is_it);
  return found == sockets.end() ? nullptr : &*found;
}

/// One entry a socket. @return 0 or a Winsock error.
int Collect(const Selections& selections, AskedSockets& sockets) {
  for (const Selection& selection : selections) {
    if (selection.set == nullptr) continue;
    if (selection.set->fd_count > static_cast<std::uint32_t>(CE_FD_SETSIZE)) return WSAEINVAL;
    for (std::uint32_t i = 0; i < selection.set->fd_count; ++i) {
      const SOCKET number = selection.set->fd_array[i];
      Asked* const known = Find(sockets, number);
      if (known != nullptr) {
        known->watched.interest |= selection.interest;
      } else {
        sockets.push_back({{number, selection.interest}});
      }
    }
  }
  return sockets.empty() ? WSAEINVAL : 0;
}

enum class Look : std::uint8_t { kNoneReady, kSomeReady, kNotOpen };

Look LookAt(const Network& network, AskedSockets& sockets) {
  Look result = Look::kNoneReady;
  for (Asked& asked : sockets) {
    sim::Socket* const socket = network.Find(asked.watched.number);
    if (socket == nullptr) return Look::kNotOpen;
    asked.ready = socket->Ready(asked.watched.interest);
    if (asked.ready != 0) result = Look::kSomeReady;
  }
  return result;
}

/// Waits for the first socket that is ready. @return 0, also when the time is over, or an error.
int WaitForReady(WinsockCall& call, AskedSockets& sockets, std::optional<Micros> timeout) {
  sim::World& world = call.world();
  // In a virtual world a look at the sockets must cost time too, see LetTimePass.
  if (timeout && world.is_virtual()) timeout = std::max(*timeout, Micros(1));
  const std::optional<Micros> deadline = timeout ? std::optional(world.now() + *timeout) : timeout;
  std::vector<Network::Watched> watched;
  for (;;) {
    const Look look = LookAt(call.network(), sockets);
    if (look == Look::kNotOpen) return watched.empty() ? WSAENOTSOCK : WSAEINTR;
    if (look == Look::kSomeReady || (deadline && world.now() >= *deadline)) return 0;
    if (watched.empty()) {
      for (const Asked& asked : sockets) watched.push_back(asked.watched);
    }
    call.network().Wait(call.lock(), watched, deadline);
  }
}

/// Leaves in each set what is ready. @return how many entries are left in all.
int Reduce(const Selections& selections, AskedSockets& sockets) {
  std::uint32_t count = 0;
  for (const Selection& selection : selections) {
    if (selection.set == nullptr) continue;
    const auto is_idle = [&](SOCKET number) {
      return (Find(sockets, number)->ready & selection.interest) == 0;
    };
    SOCKET* const begin = selection.set->fd_array;
    SOCKET* const end = std::remove_if(begin, begin + selection.set->fd_count, is_idle);
    selection.set->fd_count = static_cast<std::uint32_t>(end - begin);
    count += selection.set->fd_count;
  }
  return static_cast<int>(count);
}

int Select(WinsockCall& call, const Selections& selections, const ce_timeval* timeout,
           AskedSockets& sockets) {
  if (const int error = call.Enter(); error != 0) return error;
  if (const int error = Collect(selections, sockets); error != 0) return error;
  if (timeout == nullptr) return WaitForReady(call, sockets, std::nullopt);
  if (timeout->tv_sec < 0 || timeout->tv_usec < 0) return WSAEINVAL;
  const Micros wait = std::chrono::seconds(timeout->tv_sec) + Micros(timeout->tv_usec);
  return WaitForReady(call, sockets, wait);
}

}  // namespace

extern "C" int ce_select(int /*ignored*/, ce_fd_set* read, ce_fd_set* write, ce_fd_set* except,
                         const ce_timeval* timeout) {
  WinsockCall call("select");
  if (timeout != nullptr) {
    call.Note("seconds", timeout->tv_sec).Note("microseconds", timeout->tv_usec);
  }
  const Selections selections = {
      {{read, sim::kReadable}, {write, sim::kWritable}, {except, sim::kExceptional}}};
  AskedSockets sockets;
  const int error = Select(call, selections, timeout, sockets);
  return call.Finish(error, error == 0 ? Reduce(selections, sockets) : 0, CE_SOCKET_ERROR);
}

// select: which sockets are ready, and the wait for one that is.
#include <algorithm>
#include <map>
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

/// One entry a socket, with all that is asked about it. @return 0 or a Winsock error.
int Collect(const std::vector<Selection>& selections, std::vector<Network::Watched>& sockets) {
  std::map<SOCKET, unsigned> interests;
  for (const Selection& selection : selections) {
    if (selection.set == nullptr) continue;
    if (selection.set->fd_count > static_cast<std::uint32_t>(CE_FD_SETSIZE)) return WSAEINVAL;
    for (std::uint32_t i = 0; i < selection.set->fd_count; ++i) {
      interests[selection.set->fd_array[i]] |= selection.interest;
    }
  }
  for (const auto& [number, interest] : interests) sockets.push_back({number, interest});
  return sockets.empty() ? WSAEINVAL : 0;
}

using ReadySockets = std::map<SOCKET, unsigned>;

/// @return false when one of the sockets is not open.
bool FindReady(const Network& network, const std::vector<Network::Watched>& sockets,
               ReadySockets& ready) {
  for (const Network::Watched& watched : sockets) {
    sim::Socket* socket = network.Find(watched.number);
    if (socket == nullptr) return false;
    const unsigned now = socket->Ready(watched.interest);
    if (now != 0) ready[watched.number] = now;
  }
  return true;
}

/// Waits for the first socket that is ready. @return 0, also when the time is over, or an error.
int WaitForReady(WinsockCall& call, const std::vector<Network::Watched>& sockets,
                 std::optional<Micros> timeout, ReadySockets& ready) {
  sim::World& world = call.world();
  // In a virtual world a look at the sockets must cost time too, see LetTimePass.
  if (timeout && world.is_virtual()) timeout = std::max(*timeout, Micros(1));
  const std::optional<Micros> deadline = timeout ? std::optional(world.now() + *timeout) : timeout;
  int missing = WSAENOTSOCK;
  for (;;) {
    if (!FindReady(call.network(), sockets, ready)) return missing;
    if (!ready.empty() || (deadline && world.now() >= *deadline)) return 0;
    call.network().Wait(call.lock(), sockets, deadline);
    missing = WSAEINTR;
  }
}

/// Leaves in each set what is ready. @return how many entries are left in all.
int Reduce(const std::vector<Selection>& selections, const ReadySockets& ready) {
  std::uint32_t count = 0;
  for (const Selection& selection : selections) {
    if (selection.set == nullptr) continue;
    const auto is_idle = [&](SOCKET number) {
      const auto found = ready.find(number);
      return found == ready.end() || (found->second & selection.interest) == 0;
    };
    SOCKET* const begin = selection.set->fd_array;
    SOCKET* const end = std::remove_if(begin, begin + selection.set->fd_count, is_idle);
    selection.set->fd_count = static_cast<std::uint32_t>(end - begin);
    count += selection.set->fd_count;
  }
  return static_cast<int>(count);
}

int Select(WinsockCall& call, const std::vector<Selection>& selections, const ce_timeval* timeout,
           ReadySockets& ready) {
  if (const int error = call.Enter(); error != 0) return error;
  std::vector<Network::Watched> sockets;
  if (const int error = Collect(selections, sockets); error != 0) return error;
  if (timeout == nullptr) return WaitForReady(call, sockets, std::nullopt, ready);
  if (timeout->tv_sec < 0 || timeout->tv_usec < 0) return WSAEINVAL;
  const Micros wait = std::chrono::seconds(timeout->tv_sec) + Micros(timeout->tv_usec);
  return WaitForReady(call, sockets, wait, ready);
}

}  // namespace

extern "C" int ce_select(int /*ignored*/, ce_fd_set* read, ce_fd_set* write, ce_fd_set* except,
                         const ce_timeval* timeout) {
  WinsockCall call("select");
  if (timeout != nullptr) {
    call.Note("seconds", timeout->tv_sec).Note("microseconds", timeout->tv_usec);
  }
  const std::vector<Selection> selections = {
      {read, sim::kReadable}, {write, sim::kWritable}, {except, sim::kExceptional}};
  ReadySockets ready;
  const int error = Select(call, selections, timeout, ready);
  return call.Finish(error, error == 0 ? Reduce(selections, ready) : 0, CE_SOCKET_ERROR);
}

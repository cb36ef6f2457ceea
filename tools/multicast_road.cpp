#include "tools/multicast_road.h"

#include <arpa/inet.h>
#include <ifaddrs.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "tools/failure.h"

namespace tools {
namespace {

/// Closes its descriptor.
class File {
 public:
  explicit File(int file) : file_(file) {}
  ~File() {
    if (file_ >= 0) ::close(file_);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  [[nodiscard]] int get() const { return file_; }

 private:
  const int file_;
};

std::string Dotted(const sockaddr* address) {
  sockaddr_in in{};
  std::memcpy(&in, address, sizeof in);
  char text[INET_ADDRSTRLEN] = {};
  return ::inet_ntop(AF_INET, &in.sin_addr, text, sizeof text) != nullptr ? text : "";
}

sockaddr_in At(const std::string& address, std::uint16_t port) {
  sockaddr_in in{};
  in.sin_family = AF_INET;
  in.sin_port = htons(port);
  static_cast<void>(::inet_pton(AF_INET, address.c_str(), &in.sin_addr));
  return in;
}

/// Every address of 127.0.0.0/8 is this machine's, though only one is listed.
bool IsLoop(const std::string& address) {
  in_addr parsed{};
  return ::inet_pton(AF_INET, address.c_str(), &parsed) == 1 &&
         ntohl(parsed.s_addr) >> 24U == IN_LOOPBACKNET;
}

[[noreturn]] void Refuse(const NetworkInterface& from, const std::string& group, int error) {
  throw Failure(ExitCode::kCannotListen, group + " from " + from.address, std::strerror(error),
                RoadRemedy(error, from, group));
}

}  // namespace

NetworkInterface FindInterface(const std::string& wished) {
  if (IsLoop(wished)) return {"lo", wished};
  ifaddrs* list = nullptr;
  if (::getifaddrs(&list) != 0) list = nullptr;
  const std::unique_ptr<ifaddrs, decltype(&::freeifaddrs)> owner(list, ::freeifaddrs);
  std::string known;
  for (const ifaddrs* at = list; at != nullptr; at = at->ifa_next) {
    if (at->ifa_addr == nullptr || at->ifa_addr->sa_family != AF_INET) continue;
    const NetworkInterface found{at->ifa_name, Dotted(at->ifa_addr)};
    if (found.name == wished || found.address == wished) return found;
    known += (known.empty() ? "" : ", ") + found.address + " (" + found.name + ")";
  }
  throw Failure(ExitCode::kCannotListen, "--interface",
                "this machine has no interface \"" + wished + "\"",
                "choose one of " + (known.empty() ? "127.0.0.1 (lo)" : known));
}

std::string RoadRemedy(int error, const NetworkInterface& from, const std::string& group) {
  switch (error) {
    case ENETUNREACH:
    case EHOSTUNREACH:
      return "bring " + from.name + " up, add a route (ip route add 224.0.0.0/4 dev " + from.name +
             "), or choose another --interface";
    case ENODEV:
    case EADDRNOTAVAIL: return "choose another --interface: " + from.name + " takes no groups";
    case ENOBUFS: return "this machine is in too many groups; raise net.ipv4.igmp_max_memberships";
    case EINVAL: return group + " is no group that can be joined; choose another one";
    case EACCES:
    case EPERM: return "a firewall or the system's rules forbid it; allow UDP to " + group;
    default: return "choose another --interface, or --no-multicast to serve by HTTP alone";
  }
}

void CheckMulticastRoad(const NetworkInterface& from, const std::string& group,
                        std::uint16_t port) {
  const File socket(::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (socket.get() < 0) Refuse(from, group, errno);
  const sockaddr_in own = At(from.address, 0);
  const sockaddr_in there = At(group, port);
  const ip_mreq request{there.sin_addr, own.sin_addr};
  const auto* const bound = reinterpret_cast<const sockaddr*>(&own);
  const auto* const peer = reinterpret_cast<const sockaddr*>(&there);
  if (::bind(socket.get(), bound, sizeof own) != 0 ||
      ::setsockopt(socket.get(), IPPROTO_IP, IP_MULTICAST_IF, &own.sin_addr, sizeof own.sin_addr) !=
          0 ||
      ::setsockopt(socket.get(), IPPROTO_IP, IP_ADD_MEMBERSHIP, &request, sizeof request) != 0 ||
      ::connect(socket.get(), peer, sizeof there) != 0) {
    Refuse(from, group, errno);
  }
}

}  // namespace tools

#include "targets/judge/own_network.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <net/if.h>
#include <net/route.h>
#include <netinet/in.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>

namespace targets {
namespace {

constexpr std::string_view kHostName = "handheld";

std::string Complaint(const char* what) {
  return std::string(what) + ": " + std::strerror(errno);
}

bool WriteText(const char* path, const std::string& text) {
  const int file = ::open(path, O_WRONLY | O_CLOEXEC);
  if (file < 0) return false;
  const bool written = ::write(file, text.data(), text.size()) == static_cast<ssize_t>(text.size());
  ::close(file);
  return written;
}

/// For whoever is not root: the same user, who may do this within a name space of its own.
bool BecomeOwnRoot() {
  const std::string user = std::to_string(::geteuid());
  const std::string group = std::to_string(::getegid());
  return ::unshare(CLONE_NEWUSER | CLONE_NEWNET | CLONE_NEWUTS) == 0 &&
         WriteText("/proc/self/setgroups", "deny") &&
         WriteText("/proc/self/uid_map", user + " " + user + " 1") &&
         WriteText("/proc/self/gid_map", group + " " + group + " 1");
}

bool RaiseLoopback(int socket) {
  ifreq request{};
  std::strcpy(request.ifr_name, "lo");
  if (::ioctl(socket, SIOCGIFFLAGS, &request) != 0) return false;
  request.ifr_flags = static_cast<short>(request.ifr_flags | IFF_UP | IFF_RUNNING);
  return ::ioctl(socket, SIOCSIFFLAGS, &request) == 0;
}

sockaddr Address(std::uint32_t address) {
  sockaddr_in in{};
  in.sin_family = AF_INET;
  in.sin_addr.s_addr = htonl(address);
  sockaddr plain{};
  static_assert(sizeof in == sizeof plain);
  std::memcpy(&plain, &in, sizeof in);
  return plain;
}

/// A program that leaves the choice to the system joins a group where its packets would leave.
bool RouteGroupsToLoopback(int socket) {
  char name[] = "lo";
  rtentry route{};
  route.rt_dst = Address(0xE0000000);
  route.rt_genmask = Address(0xF0000000);
  route.rt_flags = RTF_UP;
  route.rt_dev = name;
  return ::ioctl(socket, SIOCADDRT, &route) == 0;
}

}  // namespace

std::string EnterOwnNetwork() {
  if (::unshare(CLONE_NEWNET | CLONE_NEWUTS) != 0 && !BecomeOwnRoot()) {
    return Complaint("no network of its own can be made for a test");
  }
  if (::sethostname(kHostName.data(), kHostName.size()) != 0) return Complaint("its name");
  const int socket = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (socket < 0) return Complaint("its sockets");
  const bool ready = RaiseLoopback(socket) && RouteGroupsToLoopback(socket);
  const std::string complaint = ready ? "" : Complaint("its loopback interface");
  ::close(socket);
  return complaint;
}

}  // namespace targets

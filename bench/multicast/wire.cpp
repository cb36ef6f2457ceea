// A switch in user space: links with a rate, a delay and a loss, between interfaces of one network
// namespace. With two interfaces it is a line between them.
//
//   bench_wire RATE_MBIT DELAY_US LOSS_PERCENT SEED SERVER_IF RECEIVER_IF...
//
// Each host has a line of RATE_MBIT to the switch and one back; a frame takes DELAY_US beside its
// own length on a line. Frames to receivers are lost by SEED. Ends with its standard input, and
// prints what it carried as one JSON line.

#include <arpa/inet.h>
#include <linux/if_packet.h>
#include <net/ethernet.h>
#include <net/if.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <queue>
#include <random>
#include <string>
#include <system_error>
#include <vector>

namespace {

using Clock = std::chrono::steady_clock;
using Nanos = std::chrono::nanoseconds;

constexpr Nanos kLongestQueue = std::chrono::milliseconds(100);
constexpr std::size_t kBurst = 64;  ///< frames taken from one interface before the next

struct Link {
  double nanos_per_byte = 0;
  Nanos delay{};
  double loss = 0;
};

/// One interface, and when its two lines are free again.
struct Port {
  int socket = -1;
  Clock::time_point up_free;
  Clock::time_point down_free;
  bool receiver = false;
};

struct Frame {
  Clock::time_point when;
  std::uint64_t number = 0;  ///< keeps the order of those of one moment
  std::size_t to = 0;
  std::vector<std::uint8_t> bytes;

  bool operator>(const Frame& other) const {
    return when != other.when ? when > other.when : number > other.number;
  }
};

struct Carried {
  std::uint64_t frames = 0;
  std::uint64_t lost = 0;
  std::uint64_t overflowed = 0;
};

int OpenPort(const char* name) {
  const int made = ::socket(AF_PACKET, SOCK_RAW | SOCK_NONBLOCK, htons(ETH_P_ALL));
  sockaddr_ll address{};
  address.sll_family = AF_PACKET;
  address.sll_protocol = htons(ETH_P_ALL);
  address.sll_ifindex = static_cast<int>(::if_nametoindex(name));
  const int on = 1;
  ::setsockopt(made, SOL_PACKET, PACKET_IGNORE_OUTGOING, &on, sizeof on);
  const int room = 64 << 20;
  ::setsockopt(made, SOL_SOCKET, SO_RCVBUFFORCE, &room, sizeof room);
  ::setsockopt(made, SOL_SOCKET, SO_SNDBUFFORCE, &room, sizeof room);
  if (::bind(made, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    throw std::system_error(errno, std::generic_category(), name);
  }
  return made;
}

/// A sender on the same machine leaves the checksum to hardware that is not there; in UDP over
/// IPv4 0 means that there is none.
void DropUdpChecksum(std::uint8_t* frame, std::size_t size) {
  constexpr std::size_t kEthernet = 14;
  if (size < kEthernet + 28 || frame[12] != 0x08 || frame[13] != 0x00 || frame[23] != 17) return;
  const bool later_fragment = (frame[20] & 0x1FU) != 0 || frame[21] != 0;
  const std::size_t udp = kEthernet + (frame[kEthernet] & 0x0FU) * 4U;
  if (later_fragment || udp + 8 > size) return;
  frame[udp + 6] = 0;
  frame[udp + 7] = 0;
}

class Switch {
 public:
  Switch(Link link, std::uint64_t seed) : link_(link), random_(seed) {}

  void Add(const char* name) {
    Port port;
    port.socket = OpenPort(name);
    port.receiver = !ports_.empty();
    ports_.push_back(port);
  }

  /// Until the standard input ends.
  void Run() {
    std::vector<pollfd> files{{STDIN_FILENO, POLLIN, 0}};
    for (const Port& port : ports_) files.push_back({port.socket, POLLIN, 0});
    for (;;) {
      const timespec wait = UntilNext();
      ::ppoll(files.data(), files.size(), waiting_.empty() ? nullptr : &wait, nullptr);
      if (files[0].revents != 0) return;
      for (std::size_t i = 0; i < ports_.size(); ++i) {
        if (files[i + 1].revents != 0) Take(i);
      }
      Deliver();
    }
  }

  [[nodiscard]] const Carried& carried() const { return carried_; }

 private:
  using Address = std::array<std::uint8_t, 6>;

  [[nodiscard]] timespec UntilNext() const {
    if (waiting_.empty()) return {};
    const Nanos left = std::max<Nanos>(waiting_.top().when - Clock::now(), Nanos(0));
    return {left.count() / 1'000'000'000, left.count() % 1'000'000'000};
  }

  void Take(std::size_t from) {
    for (std::size_t i = 0; i < kBurst; ++i) {
      sockaddr_ll sender{};
      socklen_t length = sizeof sender;
      const ssize_t got = ::recvfrom(ports_[from].socket, buffer_.data(), buffer_.size(), 0,
                                     reinterpret_cast<sockaddr*>(&sender), &length);
      if (got < static_cast<ssize_t>(sizeof(ether_header))) return;
      if (sender.sll_pkttype != PACKET_OUTGOING) Carry(from, static_cast<std::size_t>(got));
    }
  }

  /// @return when the frame has left the line; nothing when too much waits for it already.
  bool PassLine(Clock::time_point& free, Clock::time_point& when, std::size_t size) const {
    if (free > when + kLongestQueue) return false;
    // Preamble, checksum and gap travel too.
    const auto length =
        Nanos(static_cast<std::int64_t>(link_.nanos_per_byte * static_cast<double>(size + 24)));
    free = std::max(free, when) + length;
    when = free;
    return true;
  }

  void Carry(std::size_t from, std::size_t size) {
    DropUdpChecksum(buffer_.data(), size);
    Address source{};
    Address destination{};
    std::memcpy(destination.data(), buffer_.data(), 6);
    std::memcpy(source.data(), buffer_.data() + 6, 6);
    known_[source] = from;
    ++carried_.frames;
    Clock::time_point when = Clock::now();
    if (!PassLine(ports_[from].up_free, when, size)) {
      ++carried_.overflowed;
      return;
    }
    const auto found = known_.find(destination);
    const bool group = (destination[0] & 1U) != 0;
    for (std::size_t to = 0; to < ports_.size(); ++to) {
      if (to == from || (!group && found != known_.end() && found->second != to)) continue;
      Send(to, when, size);
    }
  }

  void Send(std::size_t to, Clock::time_point when, std::size_t size) {
    if (ports_[to].receiver && link_.loss > 0 && chance_(random_) < link_.loss) {
      ++carried_.lost;
      return;
    }
    // The switch begins to send while it still receives: only a line in use holds a frame up.
    Clock::time_point start = when;
    if (ports_[to].down_free > when && !PassLine(ports_[to].down_free, start, size)) {
      ++carried_.overflowed;
      return;
    }
    ports_[to].down_free = start;
    waiting_.push({start + link_.delay, ++number_, to, {buffer_.data(), buffer_.data() + size}});
  }

  void Deliver() {
    while (!waiting_.empty() && waiting_.top().when <= Clock::now()) {
      const Frame& frame = waiting_.top();
      if (::send(ports_[frame.to].socket, frame.bytes.data(), frame.bytes.size(), 0) < 0) {
        ++carried_.overflowed;
      }
      waiting_.pop();
    }
  }

  const Link link_;
  std::mt19937_64 random_;
  std::uniform_real_distribution<double> chance_;
  std::vector<Port> ports_;
  std::map<Address, std::size_t> known_;
  std::priority_queue<Frame, std::vector<Frame>, std::greater<>> waiting_;
  std::uint64_t number_ = 0;
  Carried carried_;
  std::array<std::uint8_t, 65536> buffer_{};
};

}  // namespace

int main(int count, char** arguments) {
  ::prctl(PR_SET_TIMERSLACK, 1000UL);  // nanoseconds: frames of a fast line come close together
  if (count < 7) {
    std::fprintf(stderr, "usage: bench_wire RATE_MBIT DELAY_US LOSS_PERCENT SEED IF IF...\n");
    return 2;
  }
  Link link;
  link.nanos_per_byte = 8000.0 / std::atof(arguments[1]);
  link.delay = std::chrono::microseconds(std::atoi(arguments[2]));
  link.loss = std::atof(arguments[3]) / 100;
  Switch wire(link, std::strtoull(arguments[4], nullptr, 10));
  for (int i = 5; i < count; ++i) wire.Add(arguments[i]);
  std::puts("ready");
  std::fflush(stdout);
  wire.Run();
  const Carried& carried = wire.carried();
  std::printf("{\"frames\": %llu, \"lost\": %llu, \"overflowed\": %llu}\n",
              static_cast<unsigned long long>(carried.frames),
              static_cast<unsigned long long>(carried.lost),
              static_cast<unsigned long long>(carried.overflowed));
  return 0;
}

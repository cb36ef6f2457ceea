// How many frames a second the multicast client takes on one core, in the clear and enciphered, and
// what memory it needs for small and large files. The device, its network and its files are
// simulated; a plain program that takes the same datagrams by the same calls and writes them into a
// file shows what of the time is the simulator's.
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "device/device.h"
#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/wire/frames.h"
#include "memory/memory.h"
#include "net/virtual/virtual_server.h"
#include "support/device_test.h"
// The platform's own names come last.
#include "mcftp/start.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr sim::Endpoint kServer{0x0A000002, 7001};
constexpr sim::Endpoint kClient{0x0A000001, 7000};
constexpr sim::Endpoint kPublicGroup{0xEF010101, 7000};
constexpr sim::Endpoint kPrivateGroup{0xEF010102, 7000};
constexpr std::uint16_t kBlockSize = 1400;
constexpr std::uint32_t kBurst = 16;  ///< frames that wait in the device's socket at one time
constexpr std::uint32_t kSmall = 1U << 20U;
constexpr std::uint32_t kLarge = 64U << 20U;

/// Frames as a server sends them, enciphered or not.
class Frames {
 public:
  explicit Frames(bool encipher) : encipher_(encipher) {}

  std::string Announcement(std::uint32_t size, bool last_file) {
    mcftp::Announcement announcement;
    announcement.last_file = last_file;
    announcement.block_size = kBlockSize;
    announcement.file_size = size;
    announcement.oack_wait_ms = 1000;
    announcement.attributes = 0x20;
    announcement.transfer_id = size;
    announcement.file_name = last_file ? "\\end.bin" : "\\file.bin";
    return Sealed(mcftp::EncodeAnnouncement(announcement, Buffer(), kRoom));
  }
  std::string Oack(mcftp::Role role) {
    const mcftp::OptionAck oack{role, kPrivateGroup.port, kPrivateGroup.address};
    return Sealed(mcftp::EncodeOptionAck(oack, Buffer(), kRoom));
  }
  std::string Data(std::uint32_t block, std::uint16_t length) {
    const mcftp::DataFrame data{length, static_cast<std::uint16_t>(block),
                                Buffer() + mcftp::kDataOffset};
    return Sealed(mcftp::EncodeData(data, Buffer(), kRoom));
  }

 private:
  static constexpr std::size_t kRoom = 2048;

  std::uint8_t* Buffer() { return reinterpret_cast<std::uint8_t*>(buffer_); }
  std::string Sealed(std::size_t length) {
    return {buffer_, encipher_ ? mcftp::SealFrame(cipher_, Buffer(), length, kRoom) : length};
  }

  bool encipher_;
  mcftp::FixedKey key_;
  mcftp::Blowfish cipher_{key_.bytes, mcftp::FixedKey::kLength};
  char buffer_[kRoom] = {};
};

DWORD WINAPI RunClient(void* /*unused*/) {
  return static_cast<DWORD>(mcftp::StartMulticastClient("-A=239.1.1.1 -P=7000"));
}

/// Takes datagrams until an empty one and writes what lies behind their first six bytes, as blocks.
DWORD WINAPI RunPlainReceiver(void* /*unused*/) {
  WSADATA winsock;
  WSAStartup(MAKEWORD(1, 1), &winsock);
  const SOCKET receiver = socket(AF_INET, SOCK_DGRAM, 0);
  sockaddr_in here = {};
  here.sin_family = AF_INET;
  here.sin_port = htons(kPrivateGroup.port);
  bind(receiver, reinterpret_cast<const sockaddr*>(&here), sizeof here);
  ip_mreq group = {};
  group.imr_multiaddr.s_addr = htonl(kPrivateGroup.address);
  setsockopt(receiver, IPPROTO_IP, IP_ADD_MEMBERSHIP, reinterpret_cast<const char*>(&group),
             sizeof group);
  const HANDLE file = CreateFileW(TEXT("\\plain.bin"), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                  FILE_ATTRIBUTE_NORMAL, nullptr);
  static char bytes[2048];
  for (LONG at = 0;; at += kBlockSize) {
    fd_set readable;
    FD_ZERO(&readable);
    FD_SET(receiver, &readable);
    select(0, &readable, nullptr, nullptr, nullptr);
    const int length = recvfrom(receiver, bytes, sizeof bytes, 0, nullptr, nullptr);
    if (length <= 6) break;
    DWORD written = 0;
    SetFilePointer(file, at, nullptr, FILE_BEGIN);
    WriteFile(file, bytes + 6, static_cast<DWORD>(length - 6), &written, nullptr);
  }
  CloseHandle(file);
  closesocket(receiver);
  WSACleanup();
  return 0;
}

struct Result {
  double seconds = 0;
  std::uint32_t frames = 0;
  std::uint64_t peak_bytes = 0;  ///< of the program's heap
  bool good = false;

  [[nodiscard]] double per_second() const { return frames / seconds; }
};

std::vector<std::string> BlocksOf(Frames& frames, std::uint32_t size) {
  std::vector<std::string> blocks;
  for (std::uint32_t at = 0; at < size; at += kBlockSize) {
    const std::uint32_t left = size - at;
    blocks.push_back(
        frames.Data(static_cast<std::uint32_t>(blocks.size() + 1),
                    static_cast<std::uint16_t>(left < kBlockSize ? left : kBlockSize)));
  }
  return blocks;
}

/// Sends the blocks in bursts. @return the time until all are taken.
double Send(sim::VirtualPort& server, const std::vector<std::string>& blocks) {
  const auto start = Clock::now();
  for (std::size_t i = 0; i < blocks.size(); ++i) {
    server.Send(kPrivateGroup, blocks[i]);
    if (i % kBurst == 0) Sleep(1);
  }
  Sleep(1);
  return std::chrono::duration<double>(Clock::now() - start).count();
}

/// One device, one file. Its folder lies in memory where the machine has such a place.
class Run {
 public:
  Run() : world_(sim::World::MakeVirtual(1)), device_(*world_, Profile(), folder_.path()) {}

  Result Client(std::uint32_t size, bool encipher) {
    const sim::AttachedThread host(device_, "host");
    int naks = 0;
    sim::VirtualPort server(*world_, kServer,
                            [&](sim::VirtualPort&, const sim::Endpoint&, std::string_view bytes) {
                              naks += bytes[1] == 0x50 ? 1 : 0;
                            });
    Frames frames(encipher);
    const HANDLE client = CreateThread(nullptr, 0, &RunClient, nullptr, 0, nullptr);
    const auto say = [&](const sim::Endpoint& to, const std::string& frame) {
      server.Send(to, frame);
      Sleep(1);
    };
    Sleep(1);
    say(kPublicGroup, frames.Announcement(size, false));
    say(kClient, frames.Oack(mcftp::Role::kPassive));
    const std::vector<std::string> blocks = BlocksOf(frames, size);
    Result result;
    result.frames = static_cast<std::uint32_t>(blocks.size());
    result.seconds = Send(server, blocks);
    say(kClient, frames.Oack(mcftp::Role::kNakMaster));  // its NAK of the last block: complete
    Sleep(10000);
    say(kPublicGroup, frames.Announcement(0, true));
    WaitForSingleObject(client, INFINITE);
    CloseHandle(client);
    result.peak_bytes = device_.memory().peak_bytes();
    result.good = naks == 1 && SizeOf(TEXT("\\file.bin")) == size;
    return result;
  }

  Result Plain(std::uint32_t size) {
    const sim::AttachedThread host(device_, "host");
    sim::VirtualPort server(*world_, kServer,
                            [](sim::VirtualPort&, const sim::Endpoint&, std::string_view) {});
    Frames frames(false);
    const HANDLE receiver = CreateThread(nullptr, 0, &RunPlainReceiver, nullptr, 0, nullptr);
    Sleep(1);
    const std::vector<std::string> blocks = BlocksOf(frames, size);
    Result result;
    result.frames = static_cast<std::uint32_t>(blocks.size());
    result.seconds = Send(server, blocks);
    server.Send(kPrivateGroup, "");
    WaitForSingleObject(receiver, INFINITE);
    CloseHandle(receiver);
    result.good = SizeOf(TEXT("\\plain.bin")) == size;
    return result;
  }

 private:
  static sim::Profile Profile() {
    sim::Profile profile;
    profile.address = "10.0.0.1";
    profile.store_pages = 40000;  // 160,000 KiB
    return profile;
  }

  static std::uint32_t SizeOf(const WCHAR* path) {
    const HANDLE file = CreateFileW(path, GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr);
    const std::uint32_t size = GetFileSize(file, nullptr);
    CloseHandle(file);
    return size;
  }

  test::TemporaryFolder folder_;
  std::unique_ptr<sim::World> world_;
  sim::Device device_;
};

}  // namespace

int main() {
  const Result plain = Run().Plain(kLarge);
  const Result clear = Run().Client(kLarge, false);
  const Result enciphered = Run().Client(kLarge, true);
  const Result small = Run().Client(kSmall, false);
  std::printf(
      "  one passive client, 64 MiB in blocks of %u  frames/s   times the plain program's\n",
      kBlockSize);
  const auto row = [&](const char* name, const Result& result) {
    std::printf("    %-40s%10.0f%12.2f%s\n", name, result.per_second(),
                result.per_second() / plain.per_second(), result.good ? "" : "; IT FAILED");
  };
  row("plain program: receive and write", plain);
  row("client, in the clear", clear);
  row("client, enciphered", enciphered);
  std::printf("  the client's heap at its fullest: %llu KiB for 1 MiB, %llu KiB for 64 MiB%s\n",
              static_cast<unsigned long long>(small.peak_bytes / 1024),
              static_cast<unsigned long long>(clear.peak_bytes / 1024),
              small.peak_bytes == clear.peak_bytes ? "" : "; IT GROWS");
  const bool good = plain.good && clear.good && enciphered.good && small.good &&
                    small.peak_bytes == clear.peak_bytes;
  return good ? 0 : 1;
}

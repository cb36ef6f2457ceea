// Input: datagrams that a multicast client receives from its server and from strangers while a file
// comes, see below. Checks that the client ends as it does without them, that nothing of it is left
// behind, and that it has written nothing outside the blocks of the file that it was told of.
//
// A datagram is one byte, its length in two bytes, low one first, and so many bytes. Of the first
// byte: bits 0 and 1 say where it goes (the client, the public group, the private group), bit 2
// that a stranger sends it, the others how long the sender waits before it, in steps of 100 ms.
#include <stdlib.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "device/device.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "net/network.h"
#include "net/virtual/virtual_server.h"
#include "profile/profile.h"
#include "world/sim_thread.h"
#include "world/world.h"
// The platform's own names come last.
#include "device/file.h"
#include "mcftp/cipher/blowfish.h"
#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/start.h"
#include "mcftp/wire/frames.h"

namespace {

using namespace std::chrono_literals;

constexpr std::string_view kName = "\\Temp\\a.bin";
constexpr std::uint32_t kBlockSize = 512;
constexpr std::uint32_t kSize = 1300;
constexpr std::uint32_t kRoom = 3 * kBlockSize;
constexpr sim::Address kDevice = 0x0A000001;
constexpr sim::Endpoint kTargets[] = {
    {kDevice, 7000}, {0xEF010101, 7000}, {0xEF010102, 7000}, {0xEF010102, 7000}};

void Require(bool holds) {
  if (!holds) std::abort();
}

struct Datagram {
  sim::Micros before;
  sim::Endpoint to;
  bool from_stranger;
  std::string bytes;
};

std::vector<Datagram> Read(const std::uint8_t* data, std::size_t size) {
  std::vector<Datagram> datagrams;
  while (size >= 3 && datagrams.size() < 200) {
    const std::uint8_t how = data[0];
    const std::size_t length = std::min<std::size_t>(data[1] + 256U * data[2], size - 3);
    datagrams.push_back({(how >> 3) * 100ms, kTargets[how & 3], (how & 4) != 0,
                         std::string(reinterpret_cast<const char*>(data) + 3, length)});
    data += 3 + length;
    size -= 3 + length;
  }
  return datagrams;
}

/// Whether the client would take it for another announcement of the file that is looked at.
bool AnnouncesTheFile(std::string bytes) {
  static const mcftp::FixedKey key;
  static const mcftp::Blowfish cipher(key.bytes, mcftp::FixedKey::kLength);
  auto* const frame = reinterpret_cast<std::uint8_t*>(bytes.data());
  mcftp::Header header;
  mcftp::Announcement announcement;
  return mcftp::DecodeHeader(frame, bytes.size(), header) &&
         mcftp::OpenFrame(cipher, frame, bytes.size()) && header.Is(mcftp::Opcode::kAnnouncement) &&
         mcftp::DecodeAnnouncement(frame, bytes.size(), announcement) &&
         announcement.file_name == kName;
}

std::string Encode(const mcftp::Announcement& offer) {
  std::uint8_t frame[128];
  const std::size_t length = mcftp::EncodeAnnouncement(offer, frame, sizeof frame);
  return {reinterpret_cast<const char*>(frame), length};
}

std::string Offer() {
  mcftp::Announcement offer;
  offer.block_size = kBlockSize;
  offer.file_size = kSize;
  offer.oack_wait_ms = 1000;
  offer.file_name = kName;
  return Encode(offer);
}

/// The last file of the run, and not for this device.
std::string Farewell() {
  mcftp::Announcement offer;
  offer.last_file = true;
  offer.block_size = kBlockSize;
  offer.file_name = "\\Temp\\end.bin";
  offer.masks = "MR*";
  return Encode(offer);
}

void Ignore(sim::VirtualPort& /*port*/, const sim::Endpoint& /*from*/, std::string_view /*bytes*/) {
}

/// The device of all inputs, with the server beside it.
class Surroundings {
 public:
  Surroundings()
      : world_(sim::World::MakeVirtual(1)),
        server_(*world_, {0x0A000002, 7001}, Ignore),
        stranger_(*world_, {0x0A000003, 7001}, Ignore) {
    std::string name = (std::filesystem::temp_directory_path() / "orvenix-fuzz-XXXXXX").string();
    Require(::mkdtemp(name.data()) != nullptr);
    folder_ = name;
    sim::Profile profile;
    profile.address = "10.0.0.1";
    device_ = std::make_unique<sim::Device>(*world_, profile, folder_ / "device");
    thread_ = std::make_unique<sim::AttachedThread>(*device_, "fuzz");
    RunClient({});  // what a first client makes for those behind it
  }
  ~Surroundings() {
    thread_.reset();
    device_.reset();
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
  }
  Surroundings(const Surroundings&) = delete;
  Surroundings& operator=(const Surroundings&) = delete;

  [[nodiscard]] sim::Device& device() { return *device_; }

  void RunClient(const std::vector<Datagram>& datagrams) {
    device::File files;
    files.RemoveDirectoryTree("\\*.*");
    files.CreateDirectory("\\Temp");
    sim::VirtualNetwork network(*world_);
    sim::Micros when = world_->now() + 10ms;
    network.At(when, [this] { server_.Send(kTargets[1], Offer()); });
    for (const Datagram& datagram : datagrams) {
      if (AnnouncesTheFile(datagram.bytes)) continue;
      when += datagram.before;
      network.At(when, [this, datagram] {
        (datagram.from_stranger ? stranger_ : server_).Send(datagram.to, datagram.bytes);
      });
    }
    // An error ends whatever there is, and the next announcement is read.
    network.At(when + 20ms,
               [this] { server_.Send(kTargets[0], std::string("\0\x60\0\0\0\0", 6)); });
    network.At(when + 30ms, [this] { server_.Send(kTargets[1], Farewell()); });
    Require(mcftp::StartMulticastClient("-A=239.1.1.1 -P=7000 -HV=TQ52 -DA=10.0.0.3 -DP=514") == 0);
    while (world_->now() < when) Sleep(1000);  // what is still on its way hits nobody
  }

 private:
  std::filesystem::path folder_;
  std::unique_ptr<sim::World> world_;
  sim::VirtualPort server_;
  sim::VirtualPort stranger_;
  std::unique_ptr<sim::Device> device_;
  std::unique_ptr<sim::AttachedThread> thread_;
};

void CheckFile() {
  device::File file;
  std::uint32_t size = 0;
  if (file.OpenForReading("\\Temp\\a.bin", true)) Require(file.GetSize(&size));
  Require(size <= kRoom);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static Surroundings surroundings;
  sim::Device& device = surroundings.device();
  const std::size_t blocks = device.memory().live_blocks();
  const std::size_t handles = device.kernel().OpenHandles();

  surroundings.RunClient(Read(data, size));

  CheckFile();
  Require(device.memory().live_blocks() == blocks);
  Require(device.memory().bad_frees() == 0);
  Require(device.kernel().OpenHandles() == handles);
  Require(device.kernel().CriticalSections() == 0);
  Require(device.network().open_sockets() == 0 && device.network().started() == 0);
  return 0;
}

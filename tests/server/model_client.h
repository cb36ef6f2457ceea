// A client of MCFTP in a few lines, after its protocol and not after its code, and a network of
// such clients around one multicast run: so that the server is tried by hundreds of devices in no
// time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <queue>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "mcftp/wire/frames.h"
#include "server/moment.h"
#include "server/multicast_run.h"
#include "server/peer.h"

namespace test {

/// What a device does with the frames of one run. Time-outs are those of a device's factory
/// settings.
class ModelClient {
 public:
  enum class State : std::uint8_t { kWaiting, kAwaitOack, kReceive, kDally, kStopped };
  using Send = std::function<void(std::string)>;

  explicit ModelClient(Send send) : send_(std::move(send)) {}

  void OnDatagram(const server::Peer& from, const server::Peer& to, std::string_view bytes,
                  server::Micros now);
  void OnTime(server::Micros now);
  [[nodiscard]] std::optional<server::Micros> deadline() const;

  /// Leaves the file as after a frame that does not belong there: it waits for an announcement.
  void Abort() { Reset(); }

  [[nodiscard]] State state() const { return state_; }
  /// The files that are complete by the client's own lights, as they stand on its disk.
  [[nodiscard]] const std::map<std::string, std::string>& files() const { return files_; }
  [[nodiscard]] const std::string& file_in_work() const { return content_; }
  [[nodiscard]] bool Listens(std::uint32_t group) const {
    return state_ != State::kStopped && (group == public_group || group == private_group_);
  }

  std::uint32_t public_group = 0xEF010101;
  std::uint32_t blocks_before_overrun = 100;
  float overrun_threshold = 85;
  bool fails_to_write = false;
  std::uint64_t data_frames = 0;
  std::uint64_t duplicates = 0;

 private:
  void Reset();
  void Announced(const mcftp::Announcement& announcement, server::Micros now);
  void Request(server::Micros now);
  void OnOptionAck(const mcftp::OptionAck& oack, server::Micros now);
  void OnData(const mcftp::DataFrame& data, server::Micros now);
  void CheckOverrun(const mcftp::DataFrame& data);
  void SendAck(std::uint32_t block, bool duplicate);
  void SendNak();
  void Complete(server::Micros now);

  Send send_;
  State state_ = State::kWaiting;
  server::Micros deadline_{std::chrono::seconds(300)};
  std::string name_;
  std::uint32_t transfer_id_ = 0;
  std::uint32_t server_ = 0;
  std::uint32_t private_group_ = 0;
  bool last_file_ = false;
  std::uint32_t size_ = 0;
  std::uint16_t block_size_ = 1;
  std::uint32_t count_ = 0;
  std::uint32_t oack_wait_ms_ = 0;
  std::uint32_t requests_ = 0;
  mcftp::Role role_ = mcftp::Role::kPassive;
  std::vector<bool> have_;
  std::uint32_t first_missing_ = 1;
  std::string content_;
  std::uint32_t received_ = 0;
  std::uint32_t last_acked_ = 0;
  std::uint32_t last_naked_ = 0;
  std::uint32_t overrun_block_ = 0;
  std::uint32_t overrun_start_ = 0;
  std::map<std::string, std::string> files_;
};

/// One run and its devices, joined by links that lose, delay and repeat.
class ModelNetwork {
 public:
  struct Link {
    server::Micros delay{500};
    server::Micros jitter{0};  ///< keeps the order unless `reorders`
    double loss_down = 0;
    double loss_up = 0;
    double repeat = 0;
    bool reorders = false;
    std::uint64_t bits_per_second = 0;  ///< down, shared by all, headers counted; 0: no limit
    std::size_t queue = 1000;           ///< frames that wait for it; more are dropped
  };

  ModelNetwork(server::MulticastOptions options, std::vector<server::MulticastFile> files,
               std::size_t devices, Link link, std::uint64_t seed);

  /// Runs until the run has finished, or until `limit`.
  void Run(server::Micros limit = std::chrono::hours(2));
  void At(server::Micros when, std::function<void()> action);
  ModelClient& AddDevice();
  /// Wakes the server after it was told something.
  void Pump();

  /// From now on nobody sends and nobody hears, but the devices.
  void KillServer() { server_dead_ = true; }
  /// The server dies, and another one starts in its place.
  void RestartServer(server::MulticastOptions options, std::vector<server::MulticastFile> files);

  [[nodiscard]] server::MulticastRun& run() { return *run_; }
  [[nodiscard]] ModelClient& device(std::size_t index) { return *clients_[index]; }
  [[nodiscard]] std::size_t devices() const { return clients_.size(); }
  [[nodiscard]] server::Micros now() const { return now_; }
  /// Nothing reaches the device, or comes from it, while it is deaf.
  void SetDeaf(std::size_t index, bool deaf) { deaf_[index] = deaf; }
  [[nodiscard]] static server::Peer PeerOf(std::size_t index);

  static constexpr server::Peer kServer{0x0A000002, 7001};

  /// May change, or by emptying it drop, what goes down to a device.
  std::function<bool(std::size_t device, std::string_view bytes)> passes_down;
  std::function<bool(std::size_t device, std::string_view bytes)> passes_up;

 private:
  struct Event {
    server::Micros when;
    std::uint64_t order;
    std::function<void()> action;
    bool operator<(const Event& other) const {
      return when != other.when ? when > other.when : order > other.order;
    }
  };

  void SendDown(const server::Outgoing& outgoing);
  void SendUp(std::size_t index, const std::string& bytes);
  void Travel(std::size_t index, bool down, std::function<void()> arrive);
  void SetClientTimer(std::size_t index);
  [[nodiscard]] bool Falls(double probability);

  std::unique_ptr<server::MulticastRun> run_;
  const Link link_;
  std::mt19937_64 random_;
  server::Micros now_{0};
  std::uint64_t order_ = 0;
  std::priority_queue<Event> events_;
  std::vector<std::unique_ptr<ModelClient>> clients_;
  std::vector<bool> deaf_;
  std::vector<server::Micros> latest_down_;
  std::vector<server::Micros> latest_up_;
  std::vector<server::Micros> timer_at_;
  bool server_dead_ = false;
  server::Micros server_timer_{-1};
  server::Micros line_free_at_{0};
};

}  // namespace test

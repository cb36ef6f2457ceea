#include "server/model_client.h"

#include <algorithm>
#include <utility>

namespace test {

using mcftp::Opcode;
using mcftp::Role;
using server::Micros;
using server::Peer;

namespace {

constexpr Micros kAnnouncementWait = std::chrono::seconds(300);
constexpr Micros kReceiveWait = std::chrono::seconds(32);
constexpr Micros kDallyWait = std::chrono::seconds(5);
constexpr std::uint32_t kMaxRequests = 8;

}  // namespace

// ---- the client ----

void ModelClient::Reset() {
  name_.clear();
  state_ = State::kWaiting;
  received_ = 0;
  last_acked_ = 0;
  last_naked_ = 0;
  overrun_block_ = 0;
  overrun_start_ = blocks_before_overrun;
}

void ModelClient::OnDatagram(const Peer& from, const Peer& /*to*/, std::string_view bytes,
                             Micros now) {
  if (state_ == State::kStopped) return;
  const auto* frame = reinterpret_cast<const std::uint8_t*>(bytes.data());
  mcftp::Header header;
  if (!mcftp::DecodeHeader(frame, bytes.size(), header)) return;
  if (header.Is(Opcode::kAnnouncement)) {
    mcftp::Announcement announcement;
    if (!mcftp::DecodeAnnouncement(frame, bytes.size(), announcement)) return;
    if (announcement.file_name == name_) return;
    server_ = from.address;
    Announced(announcement, now);
  } else if (header.Is(Opcode::kData)) {
    mcftp::DataFrame data;
    if (from.address != server_ || !mcftp::DecodeData(frame, bytes.size(), data)) return;
    OnData(data, now);
  } else if (header.Is(Opcode::kOptionAck)) {
    mcftp::OptionAck oack;
    if (!mcftp::DecodeOptionAck(frame, bytes.size(), oack)) return;
    server_ = from.address;
    if (oack.role) role_ = *oack.role;
    OnOptionAck(oack, now);
  } else {
    server_ = from.address;
    if (state_ == State::kWaiting) {
      deadline_ = now + kAnnouncementWait;
    } else {
      const bool ends = state_ == State::kDally && last_file_;
      Reset();
      if (ends) state_ = State::kStopped;
      deadline_ = now + kAnnouncementWait;
    }
  }
}

void ModelClient::Announced(const mcftp::Announcement& announcement, Micros now) {
  switch (state_) {
    case State::kWaiting:
      name_ = announcement.file_name;
      transfer_id_ = announcement.transfer_id;
      last_file_ = announcement.last_file;
      size_ = announcement.file_size;
      block_size_ = announcement.block_size;
      count_ = announcement.BlockCount();
      oack_wait_ms_ = announcement.oack_wait_ms;
      have_.assign(count_ + 2, false);
      first_missing_ = 1;
      content_.assign(size_, '\0');
      files_.erase(name_);
      requests_ = 0;  // what it has received and said last is only forgotten by a reset
      Request(now);
      break;
    case State::kAwaitOack: Request(now); break;
    case State::kReceive:
      Reset();
      deadline_ = now + kAnnouncementWait;
      break;
    case State::kDally:
      Reset();
      if (last_file_) state_ = State::kStopped;
      deadline_ = now + kAnnouncementWait;
      break;
    case State::kStopped: break;
  }
}

void ModelClient::Request(Micros now) {
  if (requests_ >= kMaxRequests) {
    state_ = State::kWaiting;
    deadline_ = now + kAnnouncementWait;
    return;
  }
  ++requests_;
  mcftp::ReadRequest request;
  request.last_file = last_file_;
  request.transfer_id = transfer_id_;
  request.file_name = name_;
  std::uint8_t frame[mcftp::kMaxReadRequest];
  const std::size_t length = mcftp::EncodeReadRequest(request, frame, sizeof frame);
  send_({reinterpret_cast<const char*>(frame), length});
  if (size_ == 0) {
    files_[name_] = "";
    const bool ends = last_file_;
    Reset();
    if (ends) state_ = State::kStopped;
    deadline_ = now + kAnnouncementWait;
    return;
  }
  state_ = State::kAwaitOack;
  deadline_ = now + std::chrono::milliseconds(oack_wait_ms_);
}

void ModelClient::OnOptionAck(const mcftp::OptionAck& oack, Micros now) {
  switch (state_) {
    case State::kWaiting:
      if (role_ == Role::kNakMaster) SendNak();
      if (role_ == Role::kAckMaster) SendAck(count_, false);
      deadline_ = now + kAnnouncementWait;
      break;
    case State::kAwaitOack:
      private_group_ = oack.address;
      state_ = State::kReceive;
      deadline_ = now + kReceiveWait;
      break;
    case State::kReceive:
      deadline_ = now + kReceiveWait;
      if (role_ == Role::kAckMaster) SendAck(0, false);
      if (role_ == Role::kNakMaster) {
        SendNak();
        if (last_naked_ == count_) Complete(now);
      }
      break;
    case State::kDally:
      if (role_ != Role::kPassive) {
        SendAck(count_, false);
        deadline_ = now + kDallyWait;
      } else {
        const bool ends = last_file_;
        Reset();
        if (ends) state_ = State::kStopped;
        deadline_ = now + kAnnouncementWait;
      }
      break;
    case State::kStopped: break;
  }
}

void ModelClient::CheckOverrun(const mcftp::DataFrame& data) {
  if (data.block <= overrun_start_ || data.length == 0) return;
  const float percent = static_cast<float>(data.length + received_) /
                        static_cast<float>(std::uint32_t{data.length} * data.block) * 100;
  if (percent == 100) return;
  const auto report = [&] {
    overrun_block_ = data.block;
    mcftp::ErrorFrame error;
    error.code = mcftp::kOverrunCode;
    const std::string text =
        "Overrun:" + std::to_string(static_cast<std::uint16_t>(percent * 100)) + ":" +
        std::to_string(data.block);
    error.message = text;
    std::uint8_t frame[100];
    const std::size_t length = mcftp::EncodeError(error, frame, sizeof frame);
    send_({reinterpret_cast<const char*>(frame), length});
  };
  if (percent < overrun_threshold && overrun_block_ == 0) {
    report();
  } else if (overrun_block_ == 0) {
    return;
  } else if (percent > overrun_threshold) {
    overrun_start_ = blocks_before_overrun + overrun_block_;
    overrun_block_ = 0;
  } else if (data.block > overrun_block_ + blocks_before_overrun) {
    report();
  }
}

void ModelClient::OnData(const mcftp::DataFrame& data, Micros now) {
  if (state_ == State::kAwaitOack || state_ == State::kDally) {
    const bool ends = state_ == State::kDally && last_file_;
    Reset();
    if (ends) state_ = State::kStopped;
    deadline_ = now + kAnnouncementWait;
    return;
  }
  if (state_ != State::kReceive || !mcftp::FitsSession(data, block_size_, count_)) return;
  deadline_ = now + kReceiveWait;
  ++data_frames;
  if (role_ == Role::kPassive) CheckOverrun(data);
  const bool duplicate = have_[data.block];
  if (duplicate) ++duplicates;
  if (!duplicate) {
    have_[data.block] = true;
    if (fails_to_write) {
      mcftp::ErrorFrame error;
      error.code = 3;
      error.message = "Disk full or allocation exceeded";
      std::uint8_t frame[100];
      const std::size_t length = mcftp::EncodeError(error, frame, sizeof frame);
      send_({reinterpret_cast<const char*>(frame), length});
      Reset();
      deadline_ = now + kAnnouncementWait;
      return;
    }
    content_.replace((data.block - 1U) * block_size_, data.length,
                     reinterpret_cast<const char*>(data.data), data.length);
    received_ += data.length;
  }
  if (role_ == Role::kAckMaster) SendAck(data.block, duplicate);
  if (role_ == Role::kNakMaster) {
    SendNak();
    if (overrun_block_ != 0 && last_naked_ >= overrun_block_) {
      overrun_block_ = 0;
      role_ = Role::kAckMaster;
    }
  }
  if ((role_ == Role::kAckMaster && last_acked_ == count_) ||
      (role_ == Role::kNakMaster && last_naked_ == count_)) {
    Complete(now);
  }
}

void ModelClient::SendAck(std::uint32_t block, bool duplicate) {
  last_acked_ = block;
  std::uint8_t frame[mcftp::kAckLength];
  const mcftp::AckFrame ack{static_cast<std::uint16_t>(block), duplicate};
  const std::size_t length = mcftp::EncodeAck(ack, frame, sizeof frame);
  send_({reinterpret_cast<const char*>(frame), length});
}

void ModelClient::SendNak() {
  if (count_ == 0 || last_naked_ == count_) return;
  while (first_missing_ <= count_ && have_[first_missing_]) ++first_missing_;
  last_naked_ = std::min(first_missing_, count_);
  std::uint8_t frame[mcftp::kNakLength];
  const mcftp::NakFrame nak{static_cast<std::uint16_t>(last_naked_)};
  const std::size_t length = mcftp::EncodeNak(nak, frame, sizeof frame);
  send_({reinterpret_cast<const char*>(frame), length});
}

void ModelClient::Complete(Micros now) {
  files_[name_] = content_;
  name_.clear();
  state_ = State::kDally;
  deadline_ = now + kDallyWait;
}

std::optional<Micros> ModelClient::deadline() const {
  if (state_ == State::kStopped) return std::nullopt;
  return deadline_;
}

void ModelClient::OnTime(Micros now) {
  if (state_ == State::kStopped || now < deadline_) return;
  switch (state_) {
    case State::kWaiting: state_ = State::kStopped; break;
    case State::kAwaitOack: Request(now); break;
    case State::kReceive:
      Reset();
      deadline_ = now + kAnnouncementWait;
      break;
    case State::kDally: {
      const bool ends = last_file_;
      Reset();
      if (ends) state_ = State::kStopped;
      deadline_ = now + kAnnouncementWait;
      break;
    }
    case State::kStopped: break;
  }
}

// ---- the network ----

ModelNetwork::ModelNetwork(server::MulticastOptions options,
                           std::vector<server::MulticastFile> files, std::size_t devices, Link link,
                           std::uint64_t seed)
    : run_(std::make_unique<server::MulticastRun>(std::move(options), std::move(files))),
      link_(link),
      random_(seed) {
  for (std::size_t i = 0; i < devices; ++i) AddDevice();
}

Peer ModelNetwork::PeerOf(std::size_t index) {
  return {0x0A010000 + static_cast<std::uint32_t>(index), 7000};
}

ModelClient& ModelNetwork::AddDevice() {
  const std::size_t index = clients_.size();
  clients_.push_back(
      std::make_unique<ModelClient>([this, index](const std::string& b) { SendUp(index, b); }));
  deaf_.push_back(false);
  latest_down_.emplace_back(0);
  latest_up_.emplace_back(0);
  timer_at_.emplace_back(-1);
  return *clients_.back();
}

bool ModelNetwork::Falls(double probability) {
  if (probability <= 0) return false;
  return static_cast<double>(random_() >> 11U) * 0x1.0p-53 < probability;
}

void ModelNetwork::RestartServer(server::MulticastOptions options,
                                 std::vector<server::MulticastFile> files) {
  run_ = std::make_unique<server::MulticastRun>(std::move(options), std::move(files));
  server_timer_ = Micros(-1);
  server_dead_ = false;
  run_->Start({kServer.address, run_->former_port() != 0 ? run_->former_port() : kServer.port},
              now_);
  Pump();
}

void ModelNetwork::At(Micros when, std::function<void()> action) {
  events_.push({std::max(when, now_), order_++, std::move(action)});
}

void ModelNetwork::Travel(std::size_t index, bool down, std::function<void()> arrive) {
  Micros& latest = down ? latest_down_[index] : latest_up_[index];
  const Micros start = down ? std::max(now_, line_free_at_) : now_;
  Micros when = start + link_.delay;
  if (link_.jitter.count() > 0) {
    when += Micros(
        static_cast<std::int64_t>(random_() % static_cast<std::uint64_t>(link_.jitter.count())));
  }
  if (!link_.reorders) when = std::max(when, latest);
  latest = std::max(latest, when);
  At(when, std::move(arrive));
}

void ModelNetwork::SendDown(const server::Outgoing& outgoing) {
  if (link_.bits_per_second > 0) {
    const auto bits = static_cast<std::int64_t>(server::WireBytes(outgoing.bytes.size()) * 8);
    const Micros takes(bits * 1'000'000 / static_cast<std::int64_t>(link_.bits_per_second));
    if (line_free_at_ > now_ + takes * static_cast<std::int64_t>(link_.queue)) return;
    line_free_at_ = std::max(line_free_at_, now_) + takes;
  }
  for (std::size_t i = 0; i < clients_.size(); ++i) {
    const bool to_it = server::IsGroup(outgoing.to.address)
                           ? clients_[i]->Listens(outgoing.to.address)
                           : outgoing.to == PeerOf(i);
    if (!to_it || Falls(link_.loss_down)) continue;
    if (passes_down && !passes_down(i, outgoing.bytes)) continue;
    const int copies = Falls(link_.repeat) ? 2 : 1;
    for (int copy = 0; copy < copies; ++copy) {
      Travel(i, true, [this, i, to = outgoing.to, bytes = std::string(outgoing.bytes)] {
        if (deaf_[i]) return;
        clients_[i]->OnDatagram(kServer, to, bytes, now_);
        SetClientTimer(i);
      });
    }
  }
}

void ModelNetwork::SendUp(std::size_t index, const std::string& bytes) {
  if (deaf_[index] || Falls(link_.loss_up)) return;
  if (passes_up && !passes_up(index, bytes)) return;
  const int copies = Falls(link_.repeat) ? 2 : 1;
  for (int copy = 0; copy < copies; ++copy) {
    Travel(index, false, [this, index, bytes] {
      if (server_dead_) return;
      run_->OnDatagram(PeerOf(index), bytes, now_);
      Pump();
    });
  }
}

void ModelNetwork::SetClientTimer(std::size_t index) {
  const auto deadline = clients_[index]->deadline();
  if (!deadline || (timer_at_[index] >= now_ && timer_at_[index] <= *deadline)) return;
  timer_at_[index] = *deadline;
  At(*deadline, [this, index, at = *deadline] {
    if (timer_at_[index] != at) return;
    timer_at_[index] = Micros(-1);
    clients_[index]->OnTime(now_);
    SetClientTimer(index);
  });
}

void ModelNetwork::Pump() {
  if (server_dead_) return;
  run_->OnTime(now_);
  while (const server::Outgoing* next = run_->Next(now_)) SendDown(*next);
  const auto deadline = run_->deadline(now_);
  if (!deadline || run_->finished()) return;
  if (server_timer_ > now_ && server_timer_ <= *deadline) return;
  server_timer_ = std::max(*deadline, now_);
  At(server_timer_, [this, at = server_timer_] {
    if (server_timer_ != at) return;
    server_timer_ = Micros(-1);
    Pump();
  });
}

void ModelNetwork::Run(Micros limit) {
  if (run_->figures().files.empty()) {
    for (std::size_t i = 0; i < clients_.size(); ++i) SetClientTimer(i);
    run_->Start(kServer, now_);
    Pump();
  }
  while (!events_.empty() && !run_->finished() && now_ < limit) {
    Event event = events_.top();
    events_.pop();
    now_ = event.when;
    event.action();
  }
}

}  // namespace test

#include "server/multicast_run.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <random>
#include <set>
#include <stdexcept>
#include <string>
#include <system_error>
#include <utility>

#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/wire/frames.h"
#include "server/multicast/option_rules.h"
#include "server/multicast/outbox.h"
#include "server/multicast/pace.h"
#include "server/multicast/session.h"
#include "server/multicast/session_store.h"
#include "server/request.h"

namespace server {
namespace {

/// Frames that are no blocks, while a block waits.
constexpr int kMostControl = 16;
/// Of a name that another server announces.
constexpr std::size_t kMostShown = 60;
/// No frame for a server is longer.
constexpr std::size_t kLongestReceived = 2048;
/// What happens in between is lost with a server that dies: devices that are proven are asked
/// again. Who joins is kept before it is answered.
constexpr Micros kStoreInterval = std::chrono::milliseconds(250);

bool IsDevice(const Peer& peer) {
  return peer.port != 0 && peer.address != 0 && peer.address != 0xFFFFFFFF &&
         !IsGroup(peer.address);
}

std::uint64_t LargestFrame(const MulticastOptions& options,
                           const std::vector<MulticastFile>& files) {
  std::uint64_t largest = 0;
  for (const MulticastFile& file : files) {
    const Blocking blocks = ChooseBlocks(file.content->size(), options.block_size);
    const std::size_t length = mcftp::kDataOffset + blocks.block_size;
    largest =
        std::max(largest, WireBytes(options.encrypt ? mcftp::EncipheredLength(length) : length));
  }
  return largest;
}

}  // namespace

class MulticastRun::Body {
 public:
  Body(MulticastOptions options, std::vector<MulticastFile> files)
      : options_(std::move(options)),
        files_(std::move(files)),
        outbox_(options_.encrypt),
        pace_(options_.rate, LargestFrame(options_, files_)),
        random_(options_.seed != 0 ? options_.seed : std::random_device{}()),
        journal_(options_.session_file) {
    figures_.rate = options_.rate;
    if (!journal_.keeps()) return;
    fingerprint_ = Fingerprint(options_, files_);
    recalled_ = Recall(options_.session_file);
    if (recalled_ && !Fits(*recalled_)) recalled_.reset();
  }

  void Start(const Peer& own, Micros now);
  void OnDatagram(const Peer& from, std::string_view bytes, Micros now);
  void OnOverheard(const Peer& from, std::string_view bytes, Micros now);
  void OnTime(Micros now);
  const Outgoing* Next(Micros now);
  std::optional<Micros> deadline(Micros now);
  void StartNow(Micros now);
  void SetRate(std::uint64_t bits_per_second, Micros now);
  void Stop(Micros now);
  void OnRefused(int error, Micros now);

  [[nodiscard]] bool ended() const { return ended_; }
  [[nodiscard]] bool finished() const { return ended_ && outbox_.empty(); }
  [[nodiscard]] const MulticastFigures& figures() const { return figures_; }
  [[nodiscard]] const MulticastOptions& options() const { return options_; }
  [[nodiscard]] std::uint16_t former_port() const { return recalled_ ? recalled_->port : 0; }
  void SetListener(MulticastListener listener) { listener_ = std::move(listener); }

 private:
  void NextFile(Micros now);
  void BeginSession(Micros now);
  void MakeSession(std::uint32_t transfer_id);
  [[nodiscard]] bool Fits(const RunMemory& recalled) const;
  bool Resume(Micros now);
  void Remember(Micros now);
  void Store(Micros now);
  [[nodiscard]] RunMemory RunNumbers() const;
  [[nodiscard]] RunMemory Everything() const;
  void EndSession();
  void EndRun(Micros now);
  void Tell(MulticastEventKind kind, std::string detail, Micros now, int error = 0);
  void Advance(Micros now);
  bool Take(std::string_view bytes, mcftp::Header& header);
  void Account(const Outgoing& outgoing, Micros now);
  [[nodiscard]] StartPolicy PolicyForFile() const;
  [[nodiscard]] std::uint32_t NewTransferId();

  const MulticastOptions options_;
  const std::vector<MulticastFile> files_;
  MulticastFigures figures_;
  MulticastListener listener_;
  Outbox outbox_;
  Pace pace_;
  std::mt19937_64 random_;

  Peer own_;
  std::size_t index_ = 0;  ///< in files_, of the session under way
  std::unique_ptr<MulticastSession> session_;
  std::set<Peer> known_;  ///< devices of this round that are not dead
  std::set<std::uint32_t> transfer_ids_;
  bool ended_ = false;
  int control_in_a_row_ = 0;

  SessionJournal journal_;
  std::uint64_t fingerprint_ = 0;
  std::optional<RunMemory> recalled_;
  std::uint64_t stored_changes_ = 0;
  std::size_t stored_devices_ = 0;
  FilePhase stored_phase_ = FilePhase::kWaiting;
  Micros stored_at_{-kStoreInterval};
  std::array<std::uint8_t, kLongestReceived + mcftp::Blowfish::kBlock> received_{};
};

void MulticastRun::Body::Start(const Peer& own, Micros now) {
  own_ = own;
  if (files_.empty()) {
    EndRun(now);
  } else if (!Resume(now)) {
    BeginSession(now);
  }
}

/// Whether the session file speaks of these files.
bool MulticastRun::Body::Fits(const RunMemory& recalled) const {
  return recalled.fingerprint == fingerprint_ && !recalled.files.empty() &&
         std::all_of(recalled.files.begin(), recalled.files.end(),
                     [this](const FileMemory& file) { return file.index < files_.size(); });
}

/// Goes on with what the session file says.
bool MulticastRun::Body::Resume(Micros now) {
  if (!recalled_) return false;
  const RunMemory recalled = std::move(*recalled_);
  recalled_.reset();
  figures_.round = std::max(recalled.round, 1U);
  for (const FileMemory& file : recalled.files) {
    if (session_ != nullptr) EndSession();
    index_ = file.index;
    transfer_ids_.insert(file.transfer_id);
    MakeSession(file.transfer_id);
    FileMemory settled = file;
    if (&file != &recalled.files.back()) settled.phase = FilePhase::kFinished;
    session_->Resume(settled, now);
    if (settled.phase == FilePhase::kFinished) session_->Stop(now);
  }
  Advance(now);
  return true;
}

void MulticastRun::Body::Remember(Micros now) {
  if (!journal_.keeps() || session_ == nullptr || session_->changes() == stored_changes_) return;
  const FileFigures& current = figures_.files.back();
  const bool urgent = current.devices.size() != stored_devices_ || current.phase != stored_phase_;
  if (urgent || now >= stored_at_ + kStoreInterval) Store(now);
}

void MulticastRun::Body::Store(Micros now) {
  if (!journal_.keeps() || session_ == nullptr) return;
  const FileFigures& current = figures_.files.back();
  stored_changes_ = session_->changes();
  stored_devices_ = current.devices.size();
  stored_phase_ = current.phase;
  stored_at_ = now;
  RunMemory changes = RunNumbers();
  changes.files.push_back(session_->TakeChanges());
  if (journal_.Add(changes) || journal_.Begin(Everything())) return;
  if (figures_.not_stored++ == 0) {
    Tell(MulticastEventKind::kNotStored, options_.session_file.string(), now);
  }
}

RunMemory MulticastRun::Body::RunNumbers() const {
  RunMemory memory;
  memory.fingerprint = fingerprint_;
  memory.round = figures_.round;
  memory.port = own_.port;
  return memory;
}

RunMemory MulticastRun::Body::Everything() const {
  RunMemory memory = RunNumbers();
  for (std::size_t i = 0; i + 1 < figures_.files.size(); ++i) {
    memory.files.push_back(RememberFile(figures_.files[i]));
  }
  memory.files.push_back(session_->Remember());
  return memory;
}

std::uint32_t MulticastRun::Body::NewTransferId() {
  if (options_.first_transfer_id != 0) {
    return options_.first_transfer_id + static_cast<std::uint32_t>(figures_.files.size());
  }
  for (;;) {
    const auto id = static_cast<std::uint32_t>(random_());
    if (id != 0 && transfer_ids_.insert(id).second) return id;
  }
}

StartPolicy MulticastRun::Body::PolicyForFile() const {
  if (index_ == 0) return options_.start;
  StartPolicy policy;  // the devices are there already
  policy.expected = static_cast<std::uint32_t>(known_.size());
  return policy;
}

void MulticastRun::Body::BeginSession(Micros now) {
  MakeSession(NewTransferId());
  session_->Begin(now);
}

void MulticastRun::Body::MakeSession(std::uint32_t transfer_id) {
  const MulticastFile& file = files_[index_];
  SessionPlan plan;
  plan.file = &file;
  plan.blocks = ChooseBlocks(file.content->size(), options_.block_size);
  plan.transfer_id = transfer_id;
  plan.last_file = index_ + 1 == files_.size();
  plan.own = own_;
  plan.start = PolicyForFile();
  plan.begins_when_quiet = index_ > 0;

  FileFigures& figures = figures_.files.emplace_back();
  figures_.current = figures_.files.size() - 1;
  figures.index = index_;
  figures.device_path = file.device_path;
  figures.masks = file.masks;
  figures.size = file.content->size();
  figures.block_size = plan.blocks.block_size;
  figures.block_count = plan.blocks.block_count;
  figures.transfer_id = plan.transfer_id;
  figures.last_file = plan.last_file;
  figures.expected = plan.start.expected;
  session_ =
      std::make_unique<MulticastSession>(options_, plan, figures_, figures, outbox_, listener_);
  stored_changes_ = ~std::uint64_t{0};
  stored_devices_ = ~std::size_t{0};
}

void MulticastRun::Body::EndSession() {
  for (const DeviceFigures& device : figures_.files.back().devices) {
    if (device.state == DeviceState::kDead) {
      known_.erase(device.peer);
    } else {
      known_.insert(device.peer);
    }
  }
  session_.reset();
}

void MulticastRun::Body::NextFile(Micros now) {
  const bool for_all = files_[index_].masks.empty();
  const bool nobody = figures_.files.back().devices.empty();
  Store(now);
  EndSession();
  // A round that nobody comes to is over. Those who have come wait for the last file, to end on it.
  const bool in_vain = figures_.round > 1 && for_all && nobody && known_.empty();
  const bool round_over = ++index_ == files_.size() || in_vain;
  if (!round_over) {
    BeginSession(now);
    return;
  }
  if (figures_.round >= options_.rounds || (figures_.round > 1 && known_.empty())) {
    if (journal_.keeps()) journal_.Remove();
    EndRun(now);
    return;
  }
  ++figures_.round;
  index_ = 0;
  known_.clear();
  BeginSession(now);
}

void MulticastRun::Body::EndRun(Micros now) {
  ended_ = true;
  Tell(MulticastEventKind::kRunEnded, "", now);
}

void MulticastRun::Body::Tell(MulticastEventKind kind, std::string detail, Micros now, int error) {
  if (!listener_) return;
  MulticastEvent event;
  event.kind = kind;
  event.when = now;
  event.error = error;
  event.detail = std::move(detail);
  listener_(event);
}

void MulticastRun::Body::OnRefused(int error, Micros now) {
  if (figures_.refused++ > 0) return;
  Tell(MulticastEventKind::kRefused, std::generic_category().message(error), now, error);
}

void MulticastRun::Body::Advance(Micros now) {
  while (session_ != nullptr && session_->finished()) NextFile(now);
  Remember(now);
}

void MulticastRun::Body::OnTime(Micros now) {
  if (session_ == nullptr) return;
  session_->OnTime(now);
  Advance(now);
}

/// Takes a frame's bytes over, in the clear.
bool MulticastRun::Body::Take(std::string_view bytes, mcftp::Header& header) {
  if (bytes.size() > kLongestReceived) return false;
  std::copy(bytes.begin(), bytes.end(), received_.begin());
  return mcftp::DecodeHeader(received_.data(), bytes.size(), header) &&
         outbox_.Open(received_.data(), bytes.size());
}

void MulticastRun::Body::OnOverheard(const Peer& from, std::string_view bytes, Micros now) {
  std::vector<Peer>& rivals = figures_.rivals;
  const bool known = std::find(rivals.begin(), rivals.end(), from) != rivals.end();
  mcftp::Header header;
  mcftp::Announcement announcement;
  if (from == own_ || known || rivals.size() == MulticastFigures::kMostRivals ||
      !Take(bytes, header) || !header.Is(mcftp::Opcode::kAnnouncement) ||
      !mcftp::DecodeAnnouncement(received_.data(), bytes.size(), announcement)) {
    return;
  }
  rivals.push_back(from);
  Tell(MulticastEventKind::kRival,
       ToText(from) + " announces " + Printable(announcement.file_name, kMostShown) +
           " on the same group",
       now);
}

void MulticastRun::Body::OnDatagram(const Peer& from, std::string_view bytes, Micros now) {
  ++figures_.frames_received;
  mcftp::Header header;
  bool good = from.address != own_.address && IsDevice(from) && Take(bytes, header);
  if (good && session_ != nullptr) {
    good = session_->OnFrame(from, header, received_.data(), bytes.size(), now);
  }
  if (!good) ++figures_.garbage;
  Advance(now);
}

void MulticastRun::Body::Account(const Outgoing& outgoing, Micros now) {
  const std::uint64_t wire = WireBytes(outgoing.bytes.size());
  pace_.Take(wire, now);
  ++figures_.frames_sent;
  figures_.wire_bytes += wire;
  if (figures_.files.empty()) return;
  FileFigures& file = figures_.files.back();
  ++file.frames;
  file.wire_bytes += wire;
  if (outbox_.kind() == Outbox::Kind::kControl) ++file.control_frames;
}

const Outgoing* MulticastRun::Body::Next(Micros now) {
  Remember(now);
  // Answers go first, but whoever asks for many of them does not keep the blocks back.
  const Outgoing* next = control_in_a_row_ < kMostControl ? outbox_.Next() : nullptr;
  ++control_in_a_row_;
  if (next == nullptr) {
    control_in_a_row_ = 0;
    if (session_ != nullptr && pace_.Ready(now) && session_->HasBlock(now)) {
      next = session_->NextBlock(now);
    }
    if (next == nullptr) next = outbox_.Next();
  }
  if (next != nullptr) Account(*next, now);
  return next;
}

std::optional<Micros> MulticastRun::Body::deadline(Micros now) {
  if (session_ == nullptr) return std::nullopt;
  std::optional<Micros> earliest = session_->deadline(now);
  if (journal_.keeps() && session_->changes() != stored_changes_) {
    earliest = Earlier(earliest, stored_at_ + kStoreInterval);
  }
  if (session_->HasBlock(now)) earliest = Earlier(earliest, pace_.ReadyAt(now));
  return earliest;
}

void MulticastRun::Body::StartNow(Micros now) {
  if (session_ != nullptr) session_->StartNow(now);
}

void MulticastRun::Body::SetRate(std::uint64_t bits_per_second, Micros now) {
  pace_.SetRate(bits_per_second, now);
  if (session_ != nullptr) session_->OnRate(now);
  figures_.rate = bits_per_second;
}

void MulticastRun::Body::Stop(Micros now) {
  if (ended_) return;
  if (session_ != nullptr) {
    Store(now);  // whoever starts again goes on from here
    session_->Stop(now);
    EndSession();
  }
  EndRun(now);
}

// ---- the face ----

MulticastRun::MulticastRun(MulticastOptions options, std::vector<MulticastFile> files) {
  CheckOptions(options);
  for (const MulticastFile& file : files) {
    const std::string objection = Objection(file);
    if (objection.empty()) continue;
    throw std::invalid_argument("\"" + file.device_path + "\" " + objection);
  }
  body_ = std::make_unique<Body>(std::move(options), std::move(files));
}

MulticastRun::~MulticastRun() = default;

void MulticastRun::SetListener(MulticastListener listener) {
  body_->SetListener(std::move(listener));
}

void MulticastRun::Start(const Peer& own, Micros now) {
  body_->Start(own, now);
}

void MulticastRun::OnDatagram(const Peer& from, std::string_view bytes, Micros now) {
  body_->OnDatagram(from, bytes, now);
}

void MulticastRun::OnOverheard(const Peer& from, std::string_view bytes, Micros now) {
  body_->OnOverheard(from, bytes, now);
}

void MulticastRun::OnTime(Micros now) {
  body_->OnTime(now);
}

const Outgoing* MulticastRun::Next(Micros now) {
  return body_->Next(now);
}

std::optional<Micros> MulticastRun::deadline(Micros now) const {
  return body_->deadline(now);
}

bool MulticastRun::finished() const {
  return body_->finished();
}

bool MulticastRun::ended() const {
  return body_->ended();
}

void MulticastRun::OnRefused(int error, Micros now) {
  body_->OnRefused(error, now);
}

void MulticastRun::StartNow(Micros now) {
  body_->StartNow(now);
}

void MulticastRun::SetRate(std::uint64_t bits_per_second, Micros now) {
  body_->SetRate(bits_per_second, now);
}

void MulticastRun::Stop(Micros now) {
  body_->Stop(now);
}

std::uint16_t MulticastRun::former_port() const {
  return body_->former_port();
}

const MulticastFigures& MulticastRun::figures() const {
  return body_->figures();
}

const MulticastOptions& MulticastRun::options() const {
  return body_->options();
}

}  // namespace server

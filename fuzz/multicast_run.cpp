// Input: what devices, and strangers, say to a multicast server, and when. Checks every frame that
// the server says, and that it comes to an end: once nobody answers any more, or though two devices
// go on saying the same for ever.
//
// The first byte chooses options. Then come steps, a byte each and what it needs:
//   0 t          t times 20 ms pass
//   1 d n bytes  a datagram of n bytes from device d
//   2 d          device d asks for the file that was announced last
//   3 d hh ll    device d acknowledges a block, 4 d hh ll: ... with the duplicate flag
//   5 d hh ll    device d misses a block
//   6 d hh ll    device d reports an overrun at a block
//   7 x          the server is told: 0 start now, 1 stop, else a rate; 2 to 6: when the input is
//                used up, two devices go on with ACK 0, the ACK of each block, of the last block,
//                NAK 1, NAK of the last block
#include "server/multicast_run.h"

#include <algorithm>
#include <cstdlib>
#include <deque>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "base/byte_reader.h"
#include "mcftp/cipher/fixed_key.h"
#include "mcftp/cipher/frame_cipher.h"
#include "mcftp/wire/frames.h"

namespace {

using server::Micros;
using server::Peer;

constexpr Peer kOwn{0x0A000002, 7001};
constexpr std::size_t kMostFrames = 20000;      ///< while somebody answers
constexpr std::size_t kMostLastFrames = 20000;  ///< once nobody does, or two say always the same
constexpr std::size_t kParrots = 2;
constexpr int kMostDeadlines = 200000;

void Require(bool holds) {
  if (!holds) std::abort();
}

Peer PeerOf(std::uint8_t device) {
  return {0x0A000064U + device % 40U, 7000};
}

std::string Pattern(std::size_t size) {
  std::string bytes(size, '\0');
  for (std::size_t i = 0; i < size; ++i) bytes[i] = static_cast<char>(i * 7 + i / 256);
  return bytes;
}

class Conversation {
 public:
  explicit Conversation(std::uint8_t choice)
      : contents_{Pattern(600), "", Pattern((choice & 0x20) != 0 ? 20000 : 65)},
        options_(Options(choice)),
        run_(options_, Files()) {
    run_.Start(kOwn, now_);
    Collect();
  }

  /// @return false when the input is used up.
  bool Step(base::ByteReader& in);

  /// Nobody says anything new any more: the run ends, and soon enough.
  void Finish() {
    limit_ = frames_ + kMostLastFrames;
    finishing_ = true;
    for (int i = 0; !run_.finished(); ++i) {
      Require(i < kMostDeadlines && frames_ < limit_);
      if (!unanswered_.empty()) {
        AnswerAlways();
        continue;
      }
      const auto deadline = run_.deadline(now_);
      Require(deadline.has_value());
      now_ = std::max(now_, *deadline);
      run_.OnTime(now_);
      Collect();
    }
  }

 private:
  static server::MulticastOptions Options(std::uint8_t choice) {
    server::MulticastOptions options;
    options.seed = 1;
    options.encrypt = (choice & 0x01) != 0;
    options.window = (choice & 0x02) != 0 ? 1 : 64;
    options.block_size = (choice & 0x04) != 0 ? 100 : 1400;
    options.start.expected = (choice & 0x08) != 0 ? 2 : 0;
    options.rounds = (choice & 0x10) != 0 ? 2 : 1;
    options.rate = (choice & 0x40) != 0 ? 1000000 : 0;
    options.max_devices = (choice & 0x80) != 0 ? 3 : 16384;
    return options;
  }

  std::vector<server::MulticastFile> Files() const {
    std::vector<server::MulticastFile> files;
    for (const std::string& content : contents_) {
      server::MulticastFile file;
      file.device_path = "\\Temp\\" + std::to_string(files.size());
      file.content = server::MemoryContent(content);
      files.push_back(std::move(file));
    }
    return files;
  }

  void Pass(Micros time) {
    const Micros end = now_ + time;
    for (auto next = run_.deadline(now_); next && *next <= end && frames_ < limit_;
         next = run_.deadline(now_)) {
      now_ = std::max(now_, *next);
      run_.OnTime(now_);
      Collect();
    }
    now_ = end;
    run_.OnTime(now_);
    Collect();
  }

  void Say(std::uint8_t device, const std::uint8_t* bytes, std::size_t size) {
    const Peer peer = PeerOf(device);
    spoken_.insert(peer);
    run_.OnDatagram(peer, {reinterpret_cast<const char*>(bytes), size}, now_);
    Collect();
  }

  void Ask(std::uint8_t device) {
    std::uint8_t frame[mcftp::kMaxReadRequest];
    mcftp::ReadRequest request;
    request.transfer_id = transfer_id_;
    request.last_file = last_file_;
    request.file_name = name_;
    Say(device, frame, mcftp::EncodeReadRequest(request, frame, sizeof frame));
  }

  void Answer(std::uint8_t step, std::uint8_t device, std::uint16_t block) {
    std::uint8_t frame[64];
    const std::string text =
        "Overrun:" + std::to_string(block % 10000) + ":" + std::to_string(block);
    const std::size_t length =
        step == 5   ? mcftp::EncodeNak({block}, frame, sizeof frame)
        : step == 6 ? mcftp::EncodeError({mcftp::kOverrunCode, text}, frame, sizeof frame)
                    : mcftp::EncodeAck({block, step == 4}, frame, sizeof frame);
    Say(device, frame, length);
  }

  /// To one frame.
  void AnswerAlways() {
    const auto [to, block] = unanswered_.front();
    unanswered_.pop_front();
    std::size_t parrots = 0;
    for (const Peer& device : std::set<Peer>(spoken_)) {
      if (parrots++ == kParrots) return;
      if (to != device && to.address != options_.private_group) continue;
      const std::uint16_t words[] = {0, block, LastBlock(), 1, LastBlock()};
      Answer(refrain_ < 5 ? 3 : 5, static_cast<std::uint8_t>(device.address - PeerOf(0).address),
             words[refrain_ - 2U]);
    }
  }

  [[nodiscard]] std::uint16_t LastBlock() const {
    return block_size_ == 0 ? std::uint16_t{0}
                            : static_cast<std::uint16_t>((size_ + block_size_ - 1) / block_size_);
  }

  void Tell(std::uint8_t what) {
    if (what >= 2 && what <= 6) {
      refrain_ = what;
    } else if (what == 0) {
      run_.StartNow(now_);
    } else if (what == 1) {
      run_.Stop(now_);
    } else {
      run_.SetRate(what == 255 ? 0 : what * 10000U, now_);
    }
    Collect();
  }

  void Collect() {
    while (frames_ < limit_) {
      const server::Outgoing* next = run_.Next(now_);
      if (next == nullptr) return;
      ++frames_;
      Check(next->to, next->bytes);
      if (finishing_ && refrain_ != 0 && next->to != options_.public_group) {
        unanswered_.emplace_back(next->to, block_);
      }
    }
  }

  void Check(const Peer& to, std::string_view bytes);
  void CheckAnnouncement(const std::vector<std::uint8_t>& frame);
  void CheckData(const std::vector<std::uint8_t>& frame);

  const std::vector<std::string> contents_;
  const server::MulticastOptions options_;
  server::MulticastRun run_;
  Micros now_{0};
  std::set<Peer> spoken_;
  std::size_t frames_ = 0;
  std::size_t limit_ = kMostFrames;
  // What was announced last
  std::string name_ = "x";
  std::uint32_t transfer_id_ = 0;
  std::uint16_t block_size_ = 0;
  std::uint32_t size_ = 0;
  bool last_file_ = false;
  std::uint16_t block_ = 0;  ///< that went out last

  std::uint8_t refrain_ = 0;  ///< what two devices go on with; 0: nothing
  bool finishing_ = false;
  std::deque<std::pair<Peer, std::uint16_t>> unanswered_;
};

bool Conversation::Step(base::ByteReader& in) {
  if (frames_ >= limit_) return false;
  const std::uint8_t step = in.U8() % 8;
  const std::uint8_t argument = in.U8();
  if (!in.ok()) return false;
  if (step == 0) {
    Pass(std::chrono::milliseconds(20) * argument);
  } else if (step == 1) {
    const std::size_t size = in.U8();
    const std::uint8_t* bytes = in.Bytes(size);
    if (bytes != nullptr) Say(argument, bytes, size);
  } else if (step == 2) {
    Ask(argument);
  } else if (step == 7) {
    Tell(argument);
  } else {
    Answer(step, argument, in.U16());
  }
  return true;
}

void Conversation::Check(const Peer& to, std::string_view bytes) {
  static const mcftp::FixedKey key;
  static const mcftp::Blowfish cipher(key.bytes, mcftp::FixedKey::kLength);
  std::vector<std::uint8_t> frame(bytes.begin(), bytes.end());
  mcftp::Header header;
  Require(mcftp::DecodeHeader(frame.data(), frame.size(), header));
  Require(header.encrypted == options_.encrypt && !header.resend);
  Require(mcftp::OpenFrame(cipher, frame.data(), frame.size()));
  switch (static_cast<mcftp::Opcode>(header.opcode)) {
    case mcftp::Opcode::kAnnouncement:
      Require(to == options_.public_group);
      return CheckAnnouncement(frame);
    case mcftp::Opcode::kData:
      Require(to.address == options_.private_group && to.port == options_.public_group.port);
      return CheckData(frame);
    case mcftp::Opcode::kOptionAck: {
      mcftp::OptionAck oack;
      Require(mcftp::DecodeOptionAck(frame.data(), frame.size(), oack));
      Require(oack.role.has_value() && oack.address == options_.private_group);
      Require(oack.port == options_.public_group.port);
      return Require(spoken_.count(to) == 1);
    }
    case mcftp::Opcode::kError: {
      mcftp::ErrorFrame error;
      Require(mcftp::DecodeError(frame.data(), frame.size(), error));
      return Require(spoken_.count(to) == 1);
    }
    default: std::abort();  // frames of clients
  }
}

void Conversation::CheckAnnouncement(const std::vector<std::uint8_t>& frame) {
  mcftp::Announcement announcement;
  Require(mcftp::DecodeAnnouncement(frame.data(), frame.size(), announcement));
  Require(announcement.oack_wait_ms > 0);
  Require(announcement.server_port == kOwn.port && announcement.server_address == kOwn.address);
  name_ = announcement.file_name;
  transfer_id_ = announcement.transfer_id;
  block_size_ = announcement.block_size;
  last_file_ = announcement.last_file;
  size_ = announcement.file_size;
  const auto number = static_cast<std::size_t>(name_.back() - '0');
  Require(number < contents_.size() && announcement.file_size == contents_[number].size());
  Require(announcement.last_file == (number + 1 == contents_.size()));
}

/// A block is what the announced file has there.
void Conversation::CheckData(const std::vector<std::uint8_t>& frame) {
  mcftp::DataFrame data;
  Require(mcftp::DecodeData(frame.data(), frame.size(), data));
  const std::string& content = contents_.at(static_cast<std::size_t>(name_.back() - '0'));
  Require(data.block >= 1 && data.length >= 1);
  block_ = data.block;
  const std::size_t at = std::size_t{block_size_} * (data.block - 1U);
  Require(at < content.size());
  const std::string expected = content.substr(at, block_size_);
  Require(data.length == expected.size());
  Require(std::equal(expected.begin(), expected.end(), data.data,
                     [](char a, std::uint8_t b) { return static_cast<std::uint8_t>(a) == b; }));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  Conversation conversation(data[0]);
  base::ByteReader steps(data + 1, std::min<std::size_t>(size - 1, 2000));
  while (conversation.Step(steps)) {
  }
  conversation.Finish();
  return 0;
}

// A conversation with a multicast run, frame by frame, in bytes written by hand.
#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "server/multicast_run.h"

namespace server {

inline constexpr Peer kOwn{0x0A000002, 7001};
inline constexpr Peer kPublic{0xEF010101, 7000};
inline constexpr Peer kPrivate{0xEF010102, 7000};
inline constexpr Peer kA{0x0A00000B, 7000};
inline constexpr Peer kB{0x0A00000C, 7000};
inline constexpr Peer kC{0x0A00000D, 7000};

// What the server says to one device
inline constexpr char kPassive[] = "00 70 00 00 1b 58 ef 01 01 02";
inline constexpr char kAckMaster[] = "00 74 00 00 1b 58 ef 01 01 02";
inline constexpr char kNakMaster[] = "00 78 00 00 1b 58 ef 01 01 02";
inline constexpr char kUnknownId[] =
    "00 60 00 00 00 05 55 6e 6b 6e 6f 77 6e 20 74 72 61 6e 73 66 65 72 20 49 44 00";

/// "00 40 00" of bytes.
inline std::string Hex(std::string_view bytes) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    if (!text.empty()) text += ' ';
    text += kDigits[byte >> 4U];
    text += kDigits[byte & 0xFU];
  }
  return text;
}

/// The bytes of "00 40 00"; blanks may be left out.
inline std::string Bytes(std::string_view hex) {
  std::string bytes;
  unsigned value = 0;
  int digits = 0;
  for (const char c : hex) {
    if (c == ' ') continue;
    value = value << 4U | static_cast<unsigned>(c <= '9' ? c - '0' : c - 'a' + 10);
    if (++digits % 2 == 0) {
      bytes += static_cast<char>(value);
      value = 0;
    }
  }
  return bytes;
}

inline std::string Word(unsigned value) {
  return {static_cast<char>(value >> 8U), static_cast<char>(value & 0xFFU)};
}
inline std::string Ack(unsigned block) {
  return Bytes("00 40 00 00") + Word(block);
}
inline std::string Nak(unsigned block) {
  return Bytes("00 50 00 00") + Word(block);
}
inline std::string Overrun(const std::string& numbers) {
  return Bytes("00 60 00 00 00 40") + "Overrun:" + numbers + std::string(1, '\0');
}
/// A read request: header, 16 zeros, identifier, 29 zeros, name and zero.
inline std::string Request(unsigned id, const std::string& name, bool last_file) {
  return Bytes(last_file ? "00 11" : "00 10") + std::string(18, '\0') + Word(id) +
         std::string(29, '\0') + name + std::string(1, '\0');
}
/// Text without a pattern that a wrong block could share.
inline std::string SomeBytes(std::size_t size) {
  std::string bytes(size, '\0');
  std::uint32_t state = 1;
  for (char& c : bytes) {
    state = state * 1664525U + 1013904223U;
    c = static_cast<char>(state >> 24U);
  }
  return bytes;
}

inline MulticastFile FileOf(const std::string& name, const std::string& bytes) {
  MulticastFile file;
  file.device_path = name;
  file.time_stamp = "2006-03-01 14:05:09";
  file.content = MemoryContent(bytes);
  return file;
}

class MulticastScript : public ::testing::Test {
 protected:
  using Ms = std::chrono::milliseconds;

  MulticastScript() {
    options_.public_group = kPublic;
    options_.private_group = kPrivate.address;
    options_.block_size = 512;
    options_.window = 1;
    options_.first_transfer_id = 0x11;
  }

  void Add(const std::string& name, const std::string& bytes, const std::string& masks = "") {
    contents_.push_back(bytes);
    files_.push_back(FileOf(name, bytes));
    files_.back().masks = masks;
  }
  void Begin() {
    run_ = std::make_unique<MulticastRun>(options_, files_);
    run_->Start(kOwn, now_);
    Collect();
  }

  void Say(const Peer& from, const std::string& bytes) {
    run_->OnDatagram(from, bytes, now_);
    Collect();
  }
  /// Lets time pass, stopping at every deadline on the way.
  void Pass(Micros time) {
    const Micros end = now_ + time;
    for (int steps = 0;; ++steps) {
      ASSERT_LT(steps, 100'000) << "deadlines that do not move";
      const auto deadline = run_->deadline(now_);
      if (!deadline || *deadline > end) break;
      now_ = std::max(now_, *deadline);
      run_->OnTime(now_);
      Collect();
    }
    now_ = end;
    run_->OnTime(now_);
    Collect();
  }

  /// Lets time pass until the server says something, a minute at most.
  void Await() {
    for (Micros waited{0}; seen_ == sent_.size() && waited < std::chrono::minutes(1);) {
      const Micros before = now_;
      const auto deadline = run_->deadline(now_);
      ASSERT_TRUE(deadline) << "the server waits for a datagram";
      Pass(std::max(*deadline - now_, Micros(1)));
      waited += now_ - before;
    }
    ASSERT_LT(seen_, sent_.size()) << "the server is silent";
  }
  /// A new conversation with the same options.
  void StartAnew() {
    files_.clear();
    contents_.clear();
    sent_.clear();
    seen_ = 0;
    now_ = Micros(0);
  }

  /// The next frame that went out.
  void Expect(const Peer& to, const std::string& bytes, const std::string& what = "") {
    ASSERT_LT(seen_, sent_.size())
        << "nothing was sent; expected " << Hex(bytes.substr(0, 80)) << " " << what;
    EXPECT_EQ(ToText(sent_[seen_].first), ToText(to)) << what;
    EXPECT_EQ(Hex(sent_[seen_].second.substr(0, 80)), Hex(bytes.substr(0, 80))) << what;
    EXPECT_TRUE(sent_[seen_].second == bytes) << what << ": behind the first 80 bytes";
    ++seen_;
  }
  void ExpectHex(const Peer& to, const char* hex) { Expect(to, Bytes(hex)); }
  void ExpectData(unsigned block, std::size_t file = 0) { Expect(kPrivate, Data(block, file)); }
  void ExpectAnnouncement() {
    ASSERT_LT(seen_, sent_.size()) << "no announcement";
    EXPECT_EQ(sent_[seen_].first, kPublic);
    EXPECT_EQ(static_cast<unsigned char>(sent_[seen_].second[1]) >> 4U, 2U);
    ++seen_;
  }
  void ExpectNothing() {
    EXPECT_EQ(seen_, sent_.size())
        << "to " << ToText(sent_[seen_].first) << ": " << Hex(sent_[seen_].second.substr(0, 80));
    seen_ = sent_.size();
  }
  void SkipAll() { seen_ = sent_.size(); }

  [[nodiscard]] std::string Data(unsigned block, std::size_t file = 0) const {
    const std::string part =
        contents_[file].substr((block - 1) * options_.block_size, options_.block_size);
    return Bytes("00 30") + Word(static_cast<unsigned>(part.size())) + Word(block) + part;
  }
  [[nodiscard]] const FileFigures& Figures(std::size_t file = 0) const {
    return run_->figures().files.at(file);
  }
  [[nodiscard]] std::string StateOf(std::size_t device, std::size_t file = 0) const {
    return std::string(StateName(Figures(file).devices.at(device).state));
  }

  MulticastOptions options_;
  std::vector<MulticastFile> files_;
  std::vector<std::string> contents_;
  std::unique_ptr<MulticastRun> run_;
  Micros now_{0};
  std::vector<std::pair<Peer, std::string>> sent_;
  std::size_t seen_ = 0;

 private:
  void Collect() {
    while (const Outgoing* next = run_->Next(now_)) {
      sent_.emplace_back(next->to, std::string(next->bytes));
    }
  }
};

/// Lock-step with devices that ask for a file of 2,500 bytes, 5 blocks.
class LockStepScript : public MulticastScript {
 protected:
  static constexpr char kName[] = "\\Temp\\r.bin";

  void BeginWith(const std::vector<Peer>& devices, std::size_t size = 2500) {
    Add(kName, SomeBytes(size));
    options_.start.expected = static_cast<std::uint32_t>(devices.size());
    Begin();
    for (const Peer& device : devices) Say(device, Request(0x11, kName, true));
    if (devices.size() > 1) Pass(Ms(1125));
  }
  void Acknowledge(const Peer& device, unsigned first, unsigned last) {
    for (unsigned block = first; block <= last; ++block) Say(device, Ack(block));
  }
};

/// Many blocks in flight. Blocks of 512 bytes. Of a file of n blocks, n - 1 is the guard.
class PipelineScript : public MulticastScript {
 protected:
  static constexpr char kName[] = "\\Temp\\p.bin";

  PipelineScript() { options_.window = 64; }

  void BeginWith(const std::vector<Peer>& devices, unsigned blocks) {
    Add(kName, SomeBytes(blocks * 512U));
    options_.start.expected = static_cast<std::uint32_t>(devices.size());
    Begin();
    for (const Peer& device : devices) Say(device, Request(0x11, kName, true));
    if (devices.size() > 1) Pass(Ms(1125));
  }
  /// A acknowledges the whole first pass. The others have heard what they will say.
  void EndFirstPass(unsigned blocks) {
    Say(kA, Ack(0));
    while (PhaseName(Figures().phase) == "streaming") AnswerBlocks(kA);
    EXPECT_EQ(Figures().first_pass_frames, blocks - 2);
    SkipAll();
    Pass(Ms(1));
  }
  /// The device acknowledges what has come in the last 20 ms, as they end.
  void AnswerBlocks(const Peer& device) {
    Pass(Ms(20));
    const std::size_t end = sent_.size();
    for (; seen_ < end; ++seen_) {
      if (sent_[seen_].first != kPrivate) continue;
      Say(device, Bytes("00 40 00 00") + sent_[seen_].second.substr(4, 2));
    }
  }
  /// Every device lacks the last two blocks only, and has taken its role for the end.
  void BeginClosing(const std::vector<Peer>& devices) {
    Await();
    for (const Peer& device : devices) ExpectHex(device, kAckMaster);
    for (const Peer& device : devices) Say(device, Ack(0));
  }
  [[nodiscard]] std::size_t Count(const Peer& to, const std::string& bytes) const {
    std::size_t count = 0;
    for (std::size_t i = seen_; i < sent_.size(); ++i) {
      count += sent_[i].first == to && sent_[i].second == bytes;
    }
    return count;
  }
};

}  // namespace server

// Input: one byte of options, then steps: what strangers and devices send to a multicast run, and
// the time between. Checks that whatever goes out is a frame as it should be, that the device table
// keeps its limit, that deadlines move, and that nobody is called proven who has not said so.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "mcftp/wire/frames.h"
#include "server/multicast_run.h"

namespace {

constexpr char kName[] = "\\Temp\\f.bin";
constexpr std::uint16_t kBlockSize = 16;
constexpr std::uint32_t kSize = 200;  // 13 blocks, the last one short
constexpr std::size_t kMostDevices = 3;

void Require(bool holds) {
  if (!holds) std::abort();
}

std::string Content() {
  std::string content(kSize, '\0');
  for (std::size_t i = 0; i < content.size(); ++i) content[i] = static_cast<char>(i * 7 + 1);
  return content;
}

class Bytes {
 public:
  Bytes(const std::uint8_t* data, std::size_t size) : data_(data), left_(size) {}
  [[nodiscard]] bool empty() const { return left_ == 0; }
  std::uint8_t Byte() {
    if (left_ == 0) return 0;
    --left_;
    return *data_++;
  }
  std::string_view Some(std::size_t size) {
    const std::size_t taken = std::min(size, left_);
    const std::string_view some(reinterpret_cast<const char*>(data_), taken);
    data_ += taken;
    left_ -= taken;
    return some;
  }

 private:
  const std::uint8_t* data_;
  std::size_t left_;
};

class Trial {
 public:
  explicit Trial(std::uint8_t choices) : content_(Content()) {
    server::MulticastOptions options;
    options.block_size = kBlockSize;
    options.window = (choices & 1U) != 0 ? 1 : 8;
    options.max_devices = kMostDevices;
    options.poll_group = 2;
    options.first_transfer_id = 1;
    options.start.expected = (choices >> 1U & 3U);
    options.rounds = 1 + (choices >> 3U & 1U);
    server::MulticastFile file;
    file.device_path = kName;
    file.content = server::MemoryContent(content_);
    server::MulticastFile second = file;
    second.device_path = "\\Temp\\g.bin";
    run_ = std::make_unique<server::MulticastRun>(options,
                                                  std::vector<server::MulticastFile>{file, second});
    run_->Start({0x0A000002, 7001}, now_);
    Collect();
  }

  void Say(std::uint8_t device, std::string_view bytes) {
    run_->OnDatagram({0x0A000010U + device % 5U, 7000}, bytes, now_);
    Collect();
  }

  void SayKnown(std::uint8_t device, std::uint8_t kind, std::uint8_t number) {
    std::uint8_t frame[mcftp::kMaxReadRequest];
    std::size_t length = 0;
    if (kind == 0) {
      mcftp::ReadRequest request;
      request.transfer_id = number;
      request.file_name = number % 2 == 1 ? kName : "\\Temp\\g.bin";
      length = mcftp::EncodeReadRequest(request, frame, sizeof frame);
    } else if (kind == 1) {
      length = mcftp::EncodeAck({number, false}, frame, sizeof frame);
    } else if (kind == 2) {
      length = mcftp::EncodeNak({number}, frame, sizeof frame);
    } else {
      const std::string text = "Overrun:5000:" + std::to_string(number);
      length = mcftp::EncodeError({mcftp::kOverrunCode, text}, frame, sizeof frame);
    }
    Say(device, {reinterpret_cast<const char*>(frame), length});
  }

  void Pass(server::Micros time) {
    const server::Micros end = now_ + time;
    for (int steps = 0;; ++steps) {
      Require(steps < 100'000);
      const auto deadline = run_->deadline(now_);
      if (!deadline || *deadline > end) break;
      now_ = std::max(now_, *deadline);
      run_->OnTime(now_);
      Collect();
    }
    now_ = end;
  }

  void Check() const {
    for (const server::FileFigures& file : run_->figures().files) {
      Require(file.devices.size() <= kMostDevices);
      for (const server::DeviceFigures& device : file.devices) {
        if (device.state != server::DeviceState::kProven) continue;
        Require(device.acks + device.naks > 0);
      }
    }
  }

 private:
  void Collect() {
    for (int count = 0;; ++count) {
      Require(count < 10'000);
      const server::Outgoing* next = run_->Next(now_);
      if (next == nullptr) return;
      CheckFrame(*next);
    }
  }

  void CheckFrame(const server::Outgoing& outgoing) const {
    const auto* frame = reinterpret_cast<const std::uint8_t*>(outgoing.bytes.data());
    const std::size_t length = outgoing.bytes.size();
    mcftp::Header header;
    Require(mcftp::DecodeHeader(frame, length, header));
    mcftp::Announcement announcement;
    mcftp::DataFrame data;
    mcftp::OptionAck oack;
    mcftp::ErrorFrame error;
    if (header.Is(mcftp::Opcode::kAnnouncement)) {
      Require(server::IsGroup(outgoing.to.address));
      Require(mcftp::DecodeAnnouncement(frame, length, announcement));
    } else if (header.Is(mcftp::Opcode::kData)) {
      Require(server::IsGroup(outgoing.to.address));
      Require(mcftp::DecodeData(frame, length, data));
      const std::size_t offset = (data.block - 1U) * kBlockSize;
      Require(data.block > 0 && offset < kSize);
      Require(content_.substr(offset, kBlockSize) ==
              std::string_view(reinterpret_cast<const char*>(data.data), data.length));
    } else {
      Require(!server::IsGroup(outgoing.to.address));
      Require(
          (header.Is(mcftp::Opcode::kOptionAck) && mcftp::DecodeOptionAck(frame, length, oack)) ||
          (header.Is(mcftp::Opcode::kError) && mcftp::DecodeError(frame, length, error)));
    }
  }

  const std::string content_;
  std::unique_ptr<server::MulticastRun> run_;
  server::Micros now_{0};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0 || size > 4096) return 0;
  Bytes input(data, size);
  Trial trial(input.Byte());
  while (!input.empty()) {
    const std::uint8_t step = input.Byte();
    if (step < 0x40) {
      trial.Say(step, input.Some(input.Byte()));
    } else if (step < 0xC0) {
      trial.SayKnown(step, step >> 4U & 3U, input.Byte());
    } else {
      trial.Pass(std::chrono::milliseconds(1U << (step & 0xFU)));
    }
    trial.Check();
  }
  return 0;
}

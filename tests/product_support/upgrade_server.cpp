#include "product_support/upgrade_server.h"

#include <fstream>
#include <stdexcept>

#include "base/crc32.h"

namespace test {
namespace {

server::Time ToTime(sim::Micros moment) {
  // Rounded up, so that a deadline has come when its timer fires.
  return std::chrono::ceil<server::Time>(moment);
}

/// One answer for everything.
class Answerer final : public sim::StreamProgram {
 public:
  Answerer(std::string answer, Afterwards afterwards)
      : answer_(std::move(answer)), afterwards_(afterwards) {}

  void OnBytes(sim::StreamEnd& end, std::string_view /*bytes*/) override {
    if (answered_) return;
    answered_ = true;
    end.Send(answer_);
    if (afterwards_ == Afterwards::kEnd) end.ShutdownSend();
    if (afterwards_ == Afterwards::kReset) end.Reset();
  }
  void OnEnd(sim::StreamEnd& end) override { end.Close(); }

 private:
  const std::string answer_;
  const Afterwards afterwards_;
  bool answered_ = false;
};

}  // namespace

/// Drives one HttpSession by what the network tells.
class UpgradeServer::Session final : public sim::StreamProgram {
 public:
  Session(UpgradeServer& owner, std::size_t index, std::string peer)
      : owner_(owner), index_(index), peer_(std::move(peer)) {}

  void OnOpen(sim::StreamEnd& end) override {
    session_ = std::make_unique<server::HttpSession>(
        owner_.site_, owner_.ledger_, server::SessionOptions{}, peer_, ToTime(end.now()));
    Go(end);
  }
  void OnBytes(sim::StreamEnd& end, std::string_view bytes) override {
    owner_.received_[index_].append(bytes);
    session_->OnBytes(bytes, ToTime(end.now()));
    Go(end);
  }
  void OnRoom(sim::StreamEnd& end) override { Go(end); }
  void OnEnd(sim::StreamEnd& end) override {
    session_->OnPeerClosed(ToTime(end.now()));
    Go(end);
  }
  void OnBroken(sim::StreamEnd& end, int /*winsock_error*/) override {
    if (session_ != nullptr) session_->OnPeerClosed(ToTime(end.now()));
  }
  void OnTime(sim::StreamEnd& end) override {
    session_->OnTime(ToTime(end.now()));
    Go(end);
  }

 private:
  void Go(sim::StreamEnd& end) {
    while (!session_->closed() && !session_->output().empty()) {
      const std::size_t sent = end.Send(session_->output());
      if (sent == 0) break;
      session_->OnSent(sent, ToTime(end.now()));
    }
    if (session_->closed()) {
      end.Close();
      return;
    }
    if (session_->ends_output()) end.ShutdownSend();
    end.SetPaused(!session_->wants_input());
    end.SetTimer(session_->deadline());
  }

  UpgradeServer& owner_;
  const std::size_t index_;
  const std::string peer_;
  std::unique_ptr<server::HttpSession> session_;
};

UpgradeServer::UpgradeServer(sim::World& world, std::uint16_t port)
    : site_(folder_.path()),
      server_(std::make_unique<sim::VirtualServer>(
          world, sim::Endpoint{kServerAddress, port},
          [this](const sim::Endpoint& peer) { return Accept(peer); })) {}

UpgradeServer::~UpgradeServer() {
  server_.reset();
}

std::unique_ptr<sim::StreamProgram> UpgradeServer::Accept(const sim::Endpoint& peer) {
  received_.emplace_back();
  if (to_treat_ > 0) {
    --to_treat_;
    return treat_();
  }
  return std::make_unique<Session>(*this, received_.size() - 1, sim::ToText(peer.address));
}

void UpgradeServer::TreatNext(int times, Treatment treat) {
  to_treat_ = times;
  treat_ = std::move(treat);
}

std::string UpgradeServer::Put(const std::string& path, std::string_view content) {
  const std::filesystem::path file = folder_.path() / path;
  std::filesystem::create_directories(file.parent_path());
  std::ofstream(file, std::ios::binary) << content;
  return CrcText(content);
}

void UpgradeServer::Remove(const std::string& path) {
  std::filesystem::remove(folder_.path() / path);
}

std::vector<std::string> UpgradeServer::RequestedPaths() const {
  std::vector<std::string> paths;
  for (const std::string& bytes : received_) {
    const std::size_t end = bytes.find(" HTTP/1.1");
    if (bytes.rfind("GET ", 0) == 0 && end != std::string::npos && end > 4) {
      paths.push_back(bytes.substr(4, end - 4));
    }
  }
  return paths;
}

const server::DeviceRecord& UpgradeServer::Device() const {
  for (const auto& entry : ledger_.devices()) {
    if (entry.second.report) return entry.second;
  }
  throw std::runtime_error("no device has reported");
}

UpgradeServer::Treatment AnswerWith(std::string answer, Afterwards afterwards) {
  return [answer = std::move(answer), afterwards]() -> std::unique_ptr<sim::StreamProgram> {
    return std::make_unique<Answerer>(answer, afterwards);
  };
}

std::string CrcText(std::string_view content) {
  base::Crc32 crc;
  crc.Update(content.data(), content.size());
  return std::to_string(crc.value());
}

}  // namespace test

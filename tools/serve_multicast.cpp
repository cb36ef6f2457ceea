#include "tools/serve_multicast.h"

#include <sys/stat.h>

#include <algorithm>
#include <chrono>
#include <ctime>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <utility>
#include <vector>

#include "server/capture.h"
#include "server/multicast_driver.h"
#include "server/site.h"
#include "tools/failure.h"
#include "tools/multicast_road.h"
#include "tools/multicast_table.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::uint64_t kLeastRate = 100'000;

/// "2006-03-01 14:05:09", as the HTTP server tells it.
std::string TimeStamp(const fs::path& path) {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) return {};
  std::tm when{};
  ::gmtime_r(&status.st_mtime, &when);
  char text[32];
  const std::size_t size = std::strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &when);
  return {text, size};
}

std::vector<server::MulticastFile> OpenFiles(const Bundle& bundle, const fs::path& tree) {
  std::vector<server::MulticastFile> files;
  for (const BundleFile& from : AnnouncedFiles(bundle)) {
    const fs::path path = tree / from.source;
    server::MulticastFile file;
    file.device_path = from.destination;
    file.masks = from.masks == "*" ? "" : from.masks;
    file.attributes = from.attributes == 0 ? server::kAttributeArchive : from.attributes;
    file.time_stamp = TimeStamp(path);
    try {
      file.content = server::OpenContent(path);
    } catch (const std::system_error& error) {
      throw Failure(ExitCode::kBadInput, path.string(), error.code().message(),
                    "make the bundle anew");
    }
    const std::string objection = server::Objection(file);
    if (!objection.empty()) {
      throw Failure(ExitCode::kBadInput, path.string(), objection,
                    "make the bundle anew, with --http-only for this file");
    }
    files.push_back(std::move(file));
  }
  return files;
}

server::StartPolicy StartPolicyOf(const ServeMulticast& options) {
  server::StartPolicy policy;
  policy.expected = options.expected;
  policy.minimum = options.minimum;
  policy.longest_wait = std::chrono::seconds(options.wait_s);
  if (options.start_now) policy.expected = std::max<std::uint32_t>(options.minimum, 1);
  return policy;
}

server::MulticastOptions RunOptionsOf(const MulticastSetup& setup, const ServeMulticast& options) {
  server::MulticastOptions run;
  run.public_group = {server::ParseAddress(setup.group).value_or(0), setup.port};
  run.private_group = server::ParseAddress(setup.private_group).value_or(0);
  run.start = StartPolicyOf(options);
  run.rounds = options.rounds;
  run.block_size = static_cast<std::uint16_t>(options.block_size.value_or(setup.block_size));
  run.encrypt = options.encrypt || setup.encrypt;
  run.window = options.window;
  run.rate = ParseRate(options.rate);
  run.session_file = options.session;
  return run;
}

/// A manifest can be written by hand.
const MulticastSetup& Checked(const MulticastSetup& setup) {
  try {
    CheckMulticastSetup(setup);
  } catch (const Failure& failure) {
    throw Failure(ExitCode::kBadInput, kBundleManifest, failure.what());
  }
  return setup;
}

}  // namespace

class MulticastService::Body {
 public:
  Body(asio::io_context& loop, const Bundle& bundle, const fs::path& tree,
       const std::string& address, const ServeMulticast& options)
      : setup_(Checked(*bundle.multicast)),
        network_(FindInterface(options.network.empty() ? address : options.network)) {
    CheckMulticastRoad(network_, setup_.group, setup_.port);
    std::vector<server::MulticastFile> files = OpenFiles(bundle, tree);
    files_ = files.size();
    socket_.address = network_.address;
    socket_.ttl = options.ttl;
    socket_.loop_back = options.loop || network_.name == "lo";
    if (!options.pcap.empty()) OpenCapture(options.pcap);
    try {
      run_ =
          std::make_unique<server::MulticastRun>(RunOptionsOf(setup_, options), std::move(files));
      driver_ = std::make_unique<server::MulticastDriver>(loop, *run_, socket_);
    } catch (const std::system_error& error) {
      throw Failure(ExitCode::kCannotListen, setup_.group + " from " + network_.address,
                    error.what(), RoadRemedy(error.code().value(), network_, setup_.group));
    } catch (const std::invalid_argument& error) {
      throw Failure(ExitCode::kBadInput, "multicast", error.what(), "make the bundle anew");
    }
  }

  [[nodiscard]] server::MulticastRun& run() { return *run_; }
  [[nodiscard]] server::MulticastDriver& driver() { return *driver_; }
  [[nodiscard]] const server::MulticastFigures& figures() const { return run_->figures(); }
  [[nodiscard]] RateMeter& meter() { return meter_; }
  /// Files of all rounds.
  [[nodiscard]] std::size_t sessions() const { return files_ * run_->options().rounds; }

  [[nodiscard]] std::string Remedy(int error) const {
    return RoadRemedy(error, network_, setup_.group);
  }
  [[nodiscard]] bool captured() const {
    if (capture_ == nullptr) return true;
    capture_->Flush();
    return capture_->good();
  }

  [[nodiscard]] std::string Headline() const {
    return "announcing " + std::to_string(files_) + " files on " + setup_.group + ":" +
           std::to_string(setup_.port) + " from " + server::ToText(driver_->local()) + " (" +
           network_.name + "), ttl " + std::to_string(socket_.ttl) +
           (socket_.loop_back ? ", loop on" : "") + (run_->options().encrypt ? ", enciphered" : "");
  }

  [[nodiscard]] nlohmann::ordered_json HeadlineJson() const {
    return {{"event", "multicast"},
            {"what", "ready"},
            {"files", files_},
            {"group", setup_.group},
            {"port", setup_.port},
            {"private_group", setup_.private_group},
            {"address", server::ToText(driver_->local())},
            {"interface", network_.name},
            {"ttl", socket_.ttl},
            {"loop", socket_.loop_back},
            {"encrypt", run_->options().encrypt}};
  }

 private:
  void OpenCapture(const fs::path& file) {
    try {
      capture_ = std::make_unique<server::CaptureFile>(file);
    } catch (const std::runtime_error& error) {
      throw Failure(ExitCode::kCannotWrite, file.string(), error.what(),
                    "is the folder there and writable?");
    }
    socket_.tap = [this](const server::Peer& from, const server::Peer& to, std::string_view bytes) {
      const auto now = std::chrono::system_clock::now().time_since_epoch();
      capture_->Add(std::chrono::duration_cast<server::Micros>(now), from, to, bytes);
    };
  }

  const MulticastSetup setup_;
  const NetworkInterface network_;
  std::size_t files_ = 0;
  server::MulticastSocketOptions socket_;
  RateMeter meter_;
  std::unique_ptr<server::CaptureFile> capture_;
  std::unique_ptr<server::MulticastRun> run_;
  std::unique_ptr<server::MulticastDriver> driver_;
};

MulticastService::MulticastService(asio::io_context& loop, const Bundle& bundle,
                                   const fs::path& tree, const std::string& address,
                                   const ServeMulticast& options)
    : body_(std::make_unique<Body>(loop, bundle, tree, address, options)) {}

MulticastService::~MulticastService() = default;

void MulticastService::Start(server::MulticastListener listener) {
  body_->run().SetListener([this, listener](const server::MulticastEvent& event) {
    if (event.kind != server::MulticastEventKind::kRefused) return listener(event);
    server::MulticastEvent with_remedy = event;
    with_remedy.detail += "; " + body_->Remedy(event.error);
    listener(with_remedy);
  });
  body_->driver().Start([] {});
}

void MulticastService::Stop() {
  body_->run().Stop(server::NowMicros());
  body_->driver().Close();
}

void MulticastService::StartNow() {
  body_->run().StartNow(server::NowMicros());
  body_->driver().Wake();
}

void MulticastService::SetRate(std::uint64_t bits_per_second) {
  body_->run().SetRate(bits_per_second, server::NowMicros());
  body_->driver().Wake();
}

void MulticastService::ChangeRate(bool faster) {
  const std::uint64_t limit = figures().rate;
  const std::uint64_t now = limit != 0 ? limit : body_->meter().bits_per_second();
  if (limit == 0 && faster) return;  // nothing holds it back
  SetRate(std::max(kLeastRate, faster ? now / 4 * 5 : now / 5 * 4));
}

bool MulticastService::captured() const {
  return body_->captured();
}

const server::MulticastFigures& MulticastService::figures() const {
  return body_->figures();
}

std::string MulticastService::Headline() const {
  return body_->Headline();
}

nlohmann::ordered_json MulticastService::HeadlineJson() const {
  return body_->HeadlineJson();
}

nlohmann::ordered_json MulticastService::Progress() {
  body_->meter().See(figures().wire_bytes, server::NowMicros());
  return MulticastProgressJson(figures(), body_->meter().bits_per_second());
}

std::string MulticastService::ProgressLine() const {
  return MulticastProgressLine(figures(), body_->meter().bits_per_second());
}

std::string MulticastService::Table(std::size_t rows) {
  body_->meter().See(figures().wire_bytes, server::NowMicros());
  return FormatMulticast(figures(), body_->sessions(), body_->meter().bits_per_second(), rows);
}

}  // namespace tools

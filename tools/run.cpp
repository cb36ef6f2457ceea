#include "tools/run.h"

#include <unistd.h>

#include <chrono>
#include <memory>
#include <optional>
#include <stdexcept>
#include <thread>

#include "device/device.h"
#include "kernel/kernel.h"
#include "library/management_queue.h"
#include "net/network.h"
#include "process/processes.h"
#include "server/capture.h"
#include "storage/storage.h"
#include "text/names.h"
#include "tools/configlet_library.h"
#include "tools/device_folder.h"
#include "tools/device_table.h"
#include "tools/failure.h"
#include "tools/file_check.h"
#include "tools/file_text.h"
#include "tools/job_file.h"
#include "tools/job_walk.h"
#include "tools/lint/lint.h"
#include "tools/multicast_watch.h"
#include "tools/run_view.h"
#include "window/screen.h"
#include "world/world.h"

namespace tools {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPoll{50};
constexpr const char* kInProgressEvent = "TW_UPGRADE_IN_PROGRESS";
constexpr const char16_t* kTransferLog = u"\\FileXfer.log";

RunView::Style StyleOf(const RunOptions& options) {
  if (options.json) return RunView::Style::kJson;
  return ::isatty(STDOUT_FILENO) == 1 ? RunView::Style::kTerminal : RunView::Style::kPlain;
}

/// How an upgrade ended, seen from outside.
struct Outcome {
  ExitCode code = ExitCode::kOk;
  bool ended = false;
  double seconds = 0;
  FileCheck check;
};

class UpgradeRun {
 public:
  explicit UpgradeRun(const RunOptions& options)
      : options_(options),
        job_(ReadJob(options.job)),
        profile_(ReadDeviceFolder(options.device)),
        configlet_(LoadConfiglet(options.library)),
        view_(StyleOf(options), options.events),
        world_(sim::World::MakeReal()),
        device_(MakeDevice()) {
    callbacks_.set_data = &TakeDocument;
  }

  ExitCode Run() {
    if (!options_.force) RefuseBadJob();
    const sim::AttachedThread host(*device_, "host");
    Watch();
    view_.ShowEvent({{"event", "started"},
                     {"job", options_.job.string()},
                     {"device", options_.device.string()}});
    configlet_.initialize();
    if (options_.callbacks) {
      configlet_.set_callbacks(reinterpret_cast<std::uintptr_t>(&view_), &callbacks_);
    }
    ShowProcesses();
    Walk();
    Outcome outcome;
    outcome.ended = WaitForEnd();
    configlet_.uninitialize();
    device_->network().ListenToDatagrams({});
    ShowMulticast();
    ShowProcesses();
    outcome.seconds = Seconds();
    outcome.check = CheckFiles(device_->storage(), job_, profile_.configuration);
    Judge(outcome);
    device_->screen().OnPaint({});
    view_.EndUpgrade();
    KeepScreen();
    Tell(outcome);
    return outcome.code;
  }

 private:
  void RefuseBadJob() {
    const std::string name = options_.job.string();
    const Findings findings = LintJob(job_, name);
    if (findings.Count(Level::kError) == 0) return;
    view_.ShowEvent(FindingsJson(name, findings));
    RefuseErrors(name, findings, "see 'orvenix job lint', or run it all the same with --force");
  }

  std::unique_ptr<sim::Device> MakeDevice() {
    try {
      return std::make_unique<sim::Device>(*world_, profile_, options_.device);
    } catch (const std::runtime_error& error) {
      throw Failure(ExitCode::kBadInput, options_.device.string(), error.what());
    }
  }

  static int TakeDocument(std::uintptr_t context, const char* text, std::int32_t length,
                          const IcfgCallbacks*) {
    if (text == nullptr || length <= 0) return 0;
    reinterpret_cast<RunView*>(context)->ShowMessage(
        {"host", std::string(text, static_cast<std::size_t>(length - 1))});
    return 0;
  }

  void Watch() {
    if (!options_.pcap.empty()) OpenCapture();
    device_->network().ListenToDatagrams([this](const sim::SeenDatagram& datagram) {
      multicast_.See(datagram);
      if (capture_) Capture(datagram);
    });
    device_->messages().Listen([this](const sim::QueuedMessage& message) {
      const std::string at = message.master.empty() ? "" : "@" + message.master;
      view_.ShowMessage({message.destination + at, message.text});
    });
    sim::Screen& screen = device_->screen();
    if (!options_.screens.empty()) screen.SavePaints(options_.screens);
    screen.OnPaint([this, &screen](const sim::FinishedPaint&) {
      const auto view = sim::ReadProgress(screen);
      if (!view) return;
      view_.ShowProgress(*view);
      std::string ignored;  // a screen that cannot be kept spoils no upgrade
      static_cast<void>(screen.SavePng(options_.device / kDeviceScreen, ignored));
    });
  }

  void OpenCapture() {
    try {
      capture_.emplace(options_.pcap);
    } catch (const std::runtime_error& error) {
      throw Failure(ExitCode::kCannotWrite, options_.pcap.string(), error.what(),
                    "is the folder there and writable?");
    }
  }

  void Capture(const sim::SeenDatagram& datagram) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const auto peer = [](const sim::Endpoint& at) { return server::Peer{at.address, at.port}; };
    capture_->Add(std::chrono::duration_cast<server::Micros>(now), peer(datagram.from),
                  peer(datagram.to), datagram.bytes);
  }

  void Walk() {
    try {
      WalkJob(configlet_, job_, options_.job.string(),
              [this](const WalkedCall& call) { ShowCall(call); });
    } catch (const Failure&) {
      ShowProcesses();  // a refused job may have stopped some
      throw;
    }
  }

  /// Which programs of the device run: a job may stop some and start one.
  void ShowProcesses() {
    nlohmann::ordered_json names = nlohmann::ordered_json::array();
    for (const auto& process : device_->processes().List()) names.push_back(process.name);
    view_.ShowEvent({{"event", "processes"}, {"names", names}});
  }

  void ShowCall(const WalkedCall& call) {
    nlohmann::ordered_json event{
        {"event", "call"}, {"function", call.function}, {"name", call.name}};
    if (!call.value.empty()) event["value"] = call.value;
    event["result"] = call.result;
    view_.ShowEvent(event);
  }

  [[nodiscard]] double Seconds() const {
    return std::chrono::duration<double>(Clock::now() - start_).count();
  }

  /// The upgrade's event is gone and its threads have ended: only the host is left.
  [[nodiscard]] bool Ended() const {
    if (device_->kernel().LiveThreads() > 1) return false;
    for (const std::string& name : device_->kernel().NamedObjects()) {
      if (name == kInProgressEvent) return false;
    }
    return true;
  }

  void ShowMulticast() {
    for (const ReceptionEvent& event : multicast_.TakeEvents()) view_.ShowMulticast(event);
    view_.ShowBlocks(multicast_.reception());
  }

  [[nodiscard]] bool WaitForEnd() {
    const Clock::time_point limit = Clock::now() + std::chrono::seconds(options_.timeout_s);
    while (!Ended()) {
      if (Clock::now() >= limit) return false;
      std::this_thread::sleep_for(kPoll);
      ShowMulticast();
    }
    return true;
  }

  /// Whether any connection to the server came about: the device's log says so.
  [[nodiscard]] bool ServerWasReached() const {
    const auto log = device_->storage().HostPath(kTransferLog);
    if (!log) return false;
    const std::string text = ReadWholeFile(*log, std::size_t{1} << 30U);
    return text.find("connect established") != std::string::npos;
  }

  void Judge(Outcome& outcome) const {
    if (!outcome.ended) {
      outcome.code = ServerWasReached() ? ExitCode::kTimeout : ExitCode::kUnreachable;
    } else if (!outcome.check.list_found || !outcome.check.all_right()) {
      outcome.code = ExitCode::kFilesWrong;
    }
  }

  /// Keeps what the screen said last, for `orvenix device screen`.
  void KeepScreen() const {
    const auto last = view_.last();
    if (!last) return;
    nlohmann::ordered_json json{{"lines", last->status_lines}};
    if (last->overall) json["overall"] = Percent(*last->overall);
    if (last->file) json["file"] = Percent(*last->file);
    if (last->caption) json["caption"] = *last->caption;
    WriteWholeFile(options_.device / kDeviceScreenText,
                   json.dump(2, ' ', false, nlohmann::json::error_handler_t::replace) + "\n");
  }

  void Tell(const Outcome& outcome) {
    const ExitCodeRow& row = RowOf(outcome.code);
    nlohmann::ordered_json event{{"event", "ended"},
                                 {"outcome", row.name},
                                 {"code", static_cast<int>(row.code)},
                                 {"seconds", outcome.seconds},
                                 {"list_found", outcome.check.list_found},
                                 {"paints", device_->screen().finished_paints()}};
    const ReceptionTotals received = multicast_.totals();
    event["multicast"] = {
        {"files", received.files}, {"blocks", received.blocks}, {"twice", received.twice}};
    event["datagrams_lost"] = device_->network().datagrams_lost();
    event["files"] = nlohmann::ordered_json::array();
    std::size_t right = 0;
    for (const CheckedFile& file : outcome.check.files) {
      event["files"].push_back({{"path", file.path}, {"state", NameOf(file.state)}});
      if (file.state == FileState::kRight) ++right;
      if (file.state == FileState::kWrong || file.state == FileState::kMissing) {
        view_.ShowRemark(std::string(NameOf(file.state)) + ": " + file.path);
      }
    }
    view_.ShowEvent(event);
    char seconds[32];
    std::snprintf(seconds, sizeof seconds, "%.1f", outcome.seconds);
    view_.ShowRemark(std::string(row.name) + ": " + std::to_string(right) + " of " +
                     std::to_string(outcome.check.files.size()) + " files right after " + seconds +
                     " s");
    if (outcome.code != ExitCode::kOk) {
      throw Failure(outcome.code, options_.device.string(), row.meaning, Advice(outcome));
    }
  }

  [[nodiscard]] std::string Advice(const Outcome& outcome) const {
    if (outcome.ended) {
      const auto log = device_->storage().HostPath(kTransferLog);
      return "see its log: orvenix explain " + (log ? *log : options_.device).string();
    }
    return "is the server running at " + FindField(job_, "HTTPServer", "BaseURL") + ":" +
           FindField(job_, "HTTPServer", "HTTPPort") + "?";
  }

  const RunOptions options_;
  const Job job_;
  const sim::Profile profile_;
  const ConfigletLibrary configlet_;
  IcfgCallbacks callbacks_{};
  RunView view_;  // the device's threads use these three to their end
  MulticastWatch multicast_;
  std::optional<server::CaptureFile> capture_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  const Clock::time_point start_ = Clock::now();
};

}  // namespace

ExitCode Run(const RunOptions& options) {
  return UpgradeRun(options).Run();
}

}  // namespace tools

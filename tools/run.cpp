#include "tools/run.h"

#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <iostream>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <thread>
#include <tuple>

#include "base/number.h"
#include "device/device.h"
#include "driver/drivers.h"
#include "kernel/kernel.h"
#include "library/management_queue.h"
#include "net/network.h"
#include "process/processes.h"
#include "server/capture.h"
#include "storage/storage.h"
#include "tools/device_folder.h"
#include "tools/failure.h"
#include "tools/file_check.h"
#include "tools/file_text.h"
#include "tools/lint/device_configuration.h"
#include "tools/lint/lint.h"
#include "tools/multicast_watch.h"
#include "tools/run_view.h"
#include "tools/upgrade.h"
#include "window/image.h"
#include "window/screen.h"
#include "world/world.h"

namespace tools {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPoll{50};
constexpr const char* kInProgressEvent = "TW_UPGRADE_IN_PROGRESS";
constexpr const char16_t* kTransferLog = u"\\FileXfer.log";
constexpr const char* kPassFile = "kvoupgclnt.txt";  ///< the device notes the last pass there

RunView::Style StyleOf(const RunOptions& options) {
  if (options.json) return RunView::Style::kJson;
  return ::isatty(STDOUT_FILENO) == 1 ? RunView::Style::kTerminal : RunView::Style::kPlain;
}

/// How an upgrade ended, seen from outside.
struct Outcome {
  ExitCode code = ExitCode::kOk;
  bool ended = false;
  bool failed = false;     ///< the device has told so
  bool restarted = false;  ///< the device's flash asked for it
  double seconds = 0;
  FileCheck check;
};

std::unique_ptr<Upgrade> MakeUpgrade(const RunOptions& options, RunView& view) {
  return options.mode == RunMode::kClient ? MakeClientUpgrade(options, view)
                                          : MakeConfigletUpgrade(options, view);
}

/// The file, or one of this start's own.
fs::path OfThisStart(const RunOptions& options, const fs::path& path) {
  if (path.empty() || !options.again) return path;
  return path.string() + ".pass" + std::to_string(options.pass);
}

/// One start of the device.
class UpgradeRun {
 public:
  explicit UpgradeRun(const RunOptions& options)
      : options_(options),
        view_(StyleOf(options), options.events, options.again),
        upgrade_(MakeUpgrade(options, view_)),
        profile_(ReadDeviceFolder(options.device)),
        world_(sim::World::MakeReal()),
        device_(MakeDevice()) {
    device_->kernel().ShortenSleeps(options.hurry);
  }

  ExitCode Run() {
    if (!options_.force) RefuseBadJob();
    const sim::AttachedThread host(*device_, "host");
    Watch();
    TellStart();
    ShowProcesses();
    Start();
    Outcome outcome;
    outcome.ended = WaitForEnd();
    outcome.restarted = device_->drivers().restart_requested();
    upgrade_->Finish();
    device_->network().ListenToDatagrams({});
    ShowMulticast();
    ShowProcesses();
    outcome.seconds = Seconds();
    outcome.failed = failed_;
    outcome.check = upgrade_->Check(*device_);
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
    const Findings findings = upgrade_->Lint();
    if (findings.Count(Level::kError) == 0) return;
    view_.ShowEvent(FindingsJson(name, findings));
    RefuseErrors(name, findings, "see 'orvenix job lint', or run it all the same with --force");
  }

  void TellStart() {
    nlohmann::ordered_json event{
        {"event", "started"}, {"job", options_.job.string()}, {"device", options_.device.string()}};
    if (options_.passes > 1) {
      event["pass"] = options_.pass;
      event["passes"] = options_.passes;
      view_.ShowRemark("pass " + std::to_string(options_.pass) + " of " +
                       std::to_string(options_.passes));
    }
    view_.ShowEvent(event);
  }

  std::unique_ptr<sim::Device> MakeDevice() {
    try {
      return std::make_unique<sim::Device>(*world_, profile_, options_.device);
    } catch (const std::runtime_error& error) {
      throw Failure(ExitCode::kBadInput, options_.device.string(), error.what());
    }
  }

  void Watch() {
    if (!options_.pcap.empty()) OpenCapture();
    device_->network().ListenToDatagrams([this](const sim::SeenDatagram& datagram) {
      multicast_.See(datagram);
      if (capture_) Capture(datagram);
    });
    device_->messages().Listen([this](const sim::QueuedMessage& message) {
      const std::string at = message.master.empty() ? "" : "@" + message.master;
      const Message shown{message.destination + at, message.text};
      failed_ = failed_ || IsFailure(shown);
      view_.ShowMessage(shown);
    });
    sim::Screen& screen = device_->screen();
    if (!options_.screens.empty()) screen.SavePaints(OfThisStart(options_, options_.screens));
    screen.OnPaint([this, &screen](const sim::FinishedPaint&) {
      const auto view = sim::ReadProgress(screen);
      if (!view) return;
      view_.ShowProgress(*view);
      // Written at the end: a picture a paint would keep the device busy.
      sim::Image picture = screen.Snapshot();
      const std::lock_guard<std::mutex> hold(picture_mutex_);
      picture_ = std::move(picture);
    });
  }

  void OpenCapture() {
    try {
      capture_.emplace(OfThisStart(options_, options_.pcap));
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

  void Start() {
    try {
      upgrade_->Start(*device_);
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

  [[nodiscard]] double Seconds() const {
    return std::chrono::duration<double>(Clock::now() - start_).count();
  }

  /// The upgrade's event is gone and its threads have ended, so that only the host is left; or the
  /// device goes no further without a restart.
  [[nodiscard]] bool Ended() const {
    if (device_->drivers().restart_requested()) return true;
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
    } else if (outcome.failed) {
      outcome.code = ExitCode::kTestFailed;
    } else if (!outcome.check.list_found || !outcome.check.all_right()) {
      outcome.code = ExitCode::kFilesWrong;
    }
  }

  /// Keeps what the screen said last, for `orvenix device screen`.
  void KeepScreen() {
    const auto last = view_.last();
    if (!last) return;
    std::string ignored;  // a screen that cannot be kept spoils no upgrade
    {
      const std::lock_guard<std::mutex> hold(picture_mutex_);
      if (picture_) {
        static_cast<void>(WritePng(*picture_, options_.device / kDeviceScreen, ignored));
      }
    }
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
                                 {"restarted", outcome.restarted},
                                 {"list_found", outcome.check.list_found},
                                 {"paints", device_->screen().finished_paints()}};
    const ReceptionTotals received = multicast_.totals();
    event["multicast"] = {
        {"files", received.files}, {"blocks", received.blocks}, {"twice", received.twice}};
    event["datagrams_lost"] = device_->network().datagrams_lost();
    event["launched"] = nlohmann::ordered_json::array();
    for (const auto& launch : device_->processes().Launches()) {
      event["launched"].push_back(
          {{"program", launch.program}, {"command_line", launch.command_line}});
    }
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
    if (outcome.code == ExitCode::kOk && options_.pass < options_.passes) {
      view_.ShowEvent({{"event", "restart"},
                       {"cause", outcome.restarted ? "flash" : "next pass"},
                       {"pass", options_.pass + 1}});
    }
    char seconds[32];
    std::snprintf(seconds, sizeof seconds, "%.1f", outcome.seconds);
    if (outcome.restarted) view_.ShowRemark("the device's flash has restarted it");
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
    return "is the server running at " + upgrade_->Server() + "?";
  }

  const RunOptions options_;
  RunView view_;  // the device's threads use these to their end
  std::unique_ptr<Upgrade> upgrade_;
  const sim::Profile profile_;
  MulticastWatch multicast_;
  std::optional<server::CaptureFile> capture_;
  std::mutex picture_mutex_;
  std::optional<sim::Image> picture_;  ///< of the screen as it was painted last
  std::atomic<bool> failed_{false};
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  const Clock::time_point start_ = Clock::now();
};

/// The pass that the device has noted, 0 when it has none.
int NotedPass(const fs::path& device) {
  for (const char* folder : {"storage/Flash File Store", "storage"}) {
    const fs::path file = device / folder / kPassFile;
    std::error_code error;
    if (!fs::is_regular_file(file, error)) continue;
    return static_cast<int>(base::LeadingNumber(ReadWholeFile(file)));
  }
  return 0;
}

/// The first pass that this device is still to run, and the last one of the job.
std::pair<int, int> PassesOf(const RunOptions& options) {
  Findings unused;
  const std::string text = ReadWholeFile(options.job);
  const DeviceJob job = ReadConfiguration(text, options.job.string(), unused);
  const auto packages = PackagesFor(job, ReadDeviceFolder(options.device).configuration);
  return {IsMultiPass(packages) ? NotedPass(options.device) + 1 : 1, LastPass(packages)};
}

/// Runs one start in a process of its own. @return the program's exit code in this process; in the
/// new one the code of the start.
ExitCode RunApart(const RunOptions& options) {
  std::cout << std::flush;
  const pid_t parent = ::getpid();
  const pid_t child = ::fork();
  if (child < 0) throw std::system_error(errno, std::generic_category(), "no further process");
  if (child == 0) {
    // Whoever ends this program ends the device too.
    if (::prctl(PR_SET_PDEATHSIG, SIGKILL) != 0 || ::getppid() != parent) ::_exit(1);
    return UpgradeRun(options).Run();
  }
  int status = 0;
  while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  if (!WIFEXITED(status)) {
    throw Failure(ExitCode::kInternal, options.device.string(),
                  "the device's process was ended by signal " + std::to_string(WTERMSIG(status)));
  }
  return static_cast<ExitCode>(WEXITSTATUS(status));
}

}  // namespace

ExitCode Run(const RunOptions& options) {
  if (options.mode == RunMode::kConfiglet) return UpgradeRun(options).Run();
  const Clock::time_point begin = Clock::now();
  RunOptions start = options;
  std::tie(start.pass, start.passes) = PassesOf(options);
  if (start.pass >= start.passes) return UpgradeRun(start).Run();
  const pid_t self = ::getpid();
  for (;; ++start.pass, start.again = true) {
    const auto passed = std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - begin);
    const auto left = static_cast<std::int64_t>(options.timeout_s) - passed.count();
    start.timeout_s = static_cast<std::uint32_t>(std::max<std::int64_t>(left, 0));
    const ExitCode code = RunApart(start);
    if (::getpid() != self || code != ExitCode::kOk || start.pass >= start.passes) return code;
  }
}

}  // namespace tools

#include <dlfcn.h>

#include "ce/files.h"
#include "ce/kernel.h"
#include "device/device.h"
#include "text/names.h"
#include "tools/client/upgrade_client.h"
#include "tools/configlet_library.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/lint/device_configuration.h"
#include "tools/lint/lint.h"
#include "tools/served_files.h"
#include "tools/upgrade.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr const char* kClientName = "liborvenix_client.so";

StartUpgradeClientFunction* LoadClient(const RunOptions& options) {
  // First the library, so that the client finds this one and no other.
  static_cast<void>(LoadConfiglet(options.library));
  const std::string path = (LibraryFolder() / kClientName).string();
  void* const library = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  void* const found = library == nullptr ? nullptr : ::dlsym(library, kStartUpgradeClient);
  if (found == nullptr) {
    const char* const reason = ::dlerror();
    throw Failure(ExitCode::kBadInput, path, reason == nullptr ? "cannot be loaded" : reason,
                  "build the program anew");
  }
  return reinterpret_cast<StartUpgradeClientFunction*>(found);
}

class ClientUpgrade final : public Upgrade {
 public:
  ClientUpgrade(const RunOptions& options, RunView& view)
      : file_(options.job),
        text_(ReadWholeFile(options.job)),
        served_(FindServed(options.job, options.served)),
        pass_(options.pass),
        view_(view) {
    job_ = ReadConfiguration(text_, file_.string(), unused_);
    start_ = LoadClient(options);
  }

  [[nodiscard]] Findings Lint() const override {
    return LintConfiguration(text_, file_.string(), served_.get());
  }

  void Start(sim::Device& /*device*/) override {
    std::u16string name;
    if (!sim::FromHostText(file_.filename().string(), name) || !Send(name)) {
      throw Failure(ExitCode::kBadInput, file_.string(), "cannot be put on the device",
                    "has its folder \\Windows room, and the file a plain name?");
    }
    UpgradeClientJob told;
    const bool started = start_(name.c_str(), &told);
    view_.ShowEvent({{"event", "loaded"},
                     {"answer", told.loaded},
                     {"packages_seen", told.packages_seen},
                     {"packages", told.packages},
                     {"downloads", told.downloads},
                     {"multi_pass", told.multi_pass != 0},
                     {"started", started}});
    if (!started) {
      throw Failure(ExitCode::kBadInput, file_.string(), "no upgrade was started",
                    "has the device memory for the job?");
    }
  }

  [[nodiscard]] FileCheck Check(sim::Device& device) const override {
    return CheckConfiguredFiles(device, job_, pass_, served_.get());
  }

  [[nodiscard]] std::string Server() const override {
    const std::string port = job_.http_port.given() ? job_.http_port.text : "80";
    return job_.base_url.text + ":" + port;
  }

 private:
  /// Puts the file where the device looks first; loading deletes it there.
  [[nodiscard]] bool Send(const std::u16string& name) const {
    CreateDirectoryW(u"\\Windows", nullptr);
    const std::u16string path = u"\\Windows\\" + name;
    const HANDLE file = CreateFileW(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                    FILE_ATTRIBUTE_NORMAL, nullptr);
    if (file == INVALID_HANDLE_VALUE) return false;
    DWORD written = 0;
    const auto size = static_cast<DWORD>(text_.size());
    const BOOL good = WriteFile(file, text_.data(), size, &written, nullptr);
    CloseHandle(file);
    return good != FALSE && written == size;
  }

  const fs::path file_;
  const std::string text_;
  const std::unique_ptr<server::Site> served_;
  const int pass_;
  RunView& view_;
  Findings unused_;
  DeviceJob job_;
  StartUpgradeClientFunction* start_ = nullptr;
};

}  // namespace

std::unique_ptr<Upgrade> MakeClientUpgrade(const RunOptions& options, RunView& view) {
  return std::make_unique<ClientUpgrade>(options, view);
}

}  // namespace tools

#include "device/device.h"
#include "storage/storage.h"
#include "tools/configlet_library.h"
#include "tools/job_file.h"
#include "tools/job_walk.h"
#include "tools/lint/lint.h"
#include "tools/upgrade.h"

namespace tools {
namespace {

class ConfigletUpgrade final : public Upgrade {
 public:
  ConfigletUpgrade(const RunOptions& options, RunView& view)
      : name_(options.job.string()),
        takes_statuses_(options.callbacks),
        job_(ReadJob(options.job)),
        configlet_(LoadConfiglet(options.library)),
        view_(view) {
    callbacks_.set_data = &TakeDocument;
  }

  [[nodiscard]] Findings Lint() const override { return LintJob(job_, name_); }

  void Start(sim::Device& /*device*/) override {
    configlet_.initialize();
    if (takes_statuses_) {
      configlet_.set_callbacks(reinterpret_cast<std::uintptr_t>(&view_), &callbacks_);
    }
    WalkJob(configlet_, job_, name_, [this](const WalkedCall& call) { Show(call); });
  }

  void Finish() override { configlet_.uninitialize(); }

  [[nodiscard]] FileCheck Check(sim::Device& device) const override {
    return CheckFiles(device, job_);
  }

  [[nodiscard]] std::string Server() const override {
    return FindField(job_, "HTTPServer", "BaseURL") + ":" +
           FindField(job_, "HTTPServer", "HTTPPort");
  }

 private:
  static int TakeDocument(std::uintptr_t context, const char* text, std::int32_t length,
                          const IcfgCallbacks*) {
    if (text == nullptr || length <= 0) return 0;
    reinterpret_cast<RunView*>(context)->ShowMessage(
        {"host", std::string(text, static_cast<std::size_t>(length - 1))});
    return 0;
  }

  void Show(const WalkedCall& call) {
    nlohmann::ordered_json event{
        {"event", "call"}, {"function", call.function}, {"name", call.name}};
    if (!call.value.empty()) event["value"] = call.value;
    event["result"] = call.result;
    view_.ShowEvent(event);
  }

  const std::string name_;
  const bool takes_statuses_;
  const Job job_;
  const ConfigletLibrary configlet_;
  IcfgCallbacks callbacks_{};
  RunView& view_;
};

}  // namespace

std::unique_ptr<Upgrade> MakeConfigletUpgrade(const RunOptions& options, RunView& view) {
  return std::make_unique<ConfigletUpgrade>(options, view);
}

}  // namespace tools

// What the product's tests know of its inside, read in the loaded binary.
#include <atomic>

#include "ce_loader/binary/binary.h"
#include "configlet/walk.h"
#include "device/lock.h"
#include "loader/host_callbacks.h"
#include "report/messages/host_callbacks.h"
#include "upgrade/run_state/run_state.h"

namespace configlet {

Walk& TheWalk() noexcept {
  static auto* const walk =
      static_cast<Walk*>(binary::Variable("_ZN9configlet12_GLOBAL__N_18the_walkE"));
  return *walk;
}

void ForgetJob(const UpgradeConfig* job) noexcept {
  binary::FunctionAt<void(const UpgradeConfig*)>("_ZN9configlet9ForgetJobEPK13UpgradeConfig")(job);
}

}  // namespace configlet

namespace upgrade {
namespace {

std::atomic<int>& InProgress() {
  static auto* const word =
      static_cast<std::atomic<int>*>(binary::Variable("_ZN7upgrade12_GLOBAL__N_111in_progressE"));
  return *word;
}

}  // namespace

bool UpgradeInProgress() noexcept {
  return InProgress() != 0;
}

void EndUpgrade() noexcept {
  InProgress() = 0;
}

}  // namespace upgrade

namespace report {

HostCallbacks GetHostCallbacks() noexcept {
  struct State {  // as src/report/messages/host_callbacks.cpp has it
    device::Lock lock;
    HostCallbacks callbacks;
  };
  auto* const state = static_cast<const State*>(binary::Variable("_ZN6report12_GLOBAL__N_14hostE"));
  return {state->callbacks.context, loader::HostTable(state->callbacks.table)};
}

}  // namespace report

#include "kernel/kernel.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>

#include "device/device.h"
#include "kernel/handle_table.h"
#include "locale/code_pages.h"

namespace sim {
namespace {

constexpr std::size_t kSleepsKept = 65536;

}  // namespace

std::vector<SleepRecord> Kernel::Sleeps() const {
  const auto lock = device_.world().Acquire();
  return {sleeps_.begin(), sleeps_.end()};
}

void Kernel::ForgetSleeps() {
  const auto lock = device_.world().Acquire();
  sleeps_.clear();
}

void Kernel::SkipSleeps() {
  const auto lock = device_.world().Acquire();
  skips_sleeps_ = true;
}

void Kernel::ShortenSleeps(std::uint32_t divisor) {
  const auto lock = device_.world().Acquire();
  sleep_divisor_ = std::max<std::uint32_t>(divisor, 1);
}

std::size_t Kernel::LiveThreads() const {
  const auto lock = device_.world().Acquire();
  return device_.world().LiveThreads(device_);
}

std::vector<std::string> Kernel::NamedObjects() const {
  const auto lock = device_.world().Acquire();
  std::vector<std::string> names;
  for (const auto& [key, object] : named_) {
    if (!object.expired()) names.push_back(ToUtf8(key.second));
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::size_t Kernel::OpenHandles() const {
  const auto lock = device_.world().Acquire();
  return device_.handles().open_handles();
}

std::size_t Kernel::CriticalSections() const {
  const auto lock = device_.world().Acquire();
  return sections_.size();
}

void Kernel::SetTickBase(std::uint32_t ticks) {
  const auto lock = device_.world().Acquire();
  tick_base_ = ticks;
}

std::uint32_t Kernel::TickCount() const {
  return tick_base_ + static_cast<std::uint32_t>(device_.world().now().count() / 1000);
}

std::shared_ptr<KernelObject> Kernel::FindNamed(Kind kind, const WCHAR* name) const {
  if (name == nullptr || *name == 0) return nullptr;
  const auto found = named_.find({kind, name});
  if (found == named_.end()) return nullptr;
  std::shared_ptr<KernelObject> object = found->second.lock();
  if (object == nullptr) named_.erase(found);
  return object;
}

void Kernel::Name(Kind kind, const WCHAR* name, const std::shared_ptr<KernelObject>& object) {
  if (name != nullptr && *name != 0) named_[{kind, name}] = object;
}

void Kernel::AddSection(const CRITICAL_SECTION* section) {
  sections_[section] = std::make_unique<Section>();
}

Kernel::Section& Kernel::FindSection(const CRITICAL_SECTION* section, const char* call) const {
  const auto found = sections_.find(section);
  if (found == sections_.end()) {
    std::fprintf(stderr, "cesim: %s of a section that is not initialised\n", call);
    std::abort();
  }
  return *found->second;
}

void Kernel::RemoveSection(const CRITICAL_SECTION* section) {
  sections_.erase(section);
}

void Kernel::NoteSleep(std::uint32_t thread, std::uint32_t length_ms) {
  if (sleeps_.size() == kSleepsKept) sleeps_.pop_front();
  sleeps_.push_back({device_.world().now(), thread, length_ms});
}

}  // namespace sim

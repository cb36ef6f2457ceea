#include "report/messages/host_callbacks.h"

#include <atomic>

namespace report {
namespace {

std::atomic<std::uintptr_t> host_context{0};
std::atomic<const IcfgCallbacks*> host_table{nullptr};

}  // namespace

void SetHostCallbacks(HostCallbacks callbacks) noexcept {
  host_context.store(callbacks.context, std::memory_order_relaxed);
  host_table.store(callbacks.table, std::memory_order_relaxed);
}

HostCallbacks GetHostCallbacks() noexcept {
  return {host_context.load(std::memory_order_relaxed), host_table.load(std::memory_order_relaxed)};
}

}  // namespace report

// Where the host wants its status documents.
#pragma once

#include <cstdint>

struct IcfgCallbacks;

namespace report {

struct HostCallbacks {
  std::uintptr_t context = 0;            ///< the host's own value
  const IcfgCallbacks* table = nullptr;  ///< the host's, null until it has set one
};

/// Remembers both for the life of the process. Any thread.
void SetHostCallbacks(HostCallbacks callbacks) noexcept;

/// Both as they were set together. Any thread.
[[nodiscard]] HostCallbacks GetHostCallbacks() noexcept;

}  // namespace report

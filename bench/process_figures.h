// What this process has taken so far. Included before <coredll.h>, whose names come after the
// host's.
#pragma once

#include <sys/resource.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>

namespace bench {

/// Seconds of processor time.
inline double ProcessorSeconds() {
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  const auto seconds = [](const auto& time) {
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
  };
  return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

/// The most memory this program has held, in KiB. The figure of getrusage begins with the parent's.
inline long PeakKib() {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.rfind("VmHWM:", 0) == 0) return std::atol(line.c_str() + 6);
  }
  return 0;
}

/// Shows what was printed so far. The names that this takes mean the device's console later on.
inline void FlushConsole() {
  std::fflush(stdout);
}

}  // namespace bench

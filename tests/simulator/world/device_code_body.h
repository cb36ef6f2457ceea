// The one body of both variants; included once by each.
#pragma once

#include "simulator/world/device_code.h"

namespace {

class CleanUp {
 public:
  explicit CleanUp(test::DeviceCodeSteps& steps) : steps_(steps) {}
  ~CleanUp() { ++steps_.cleaned_up; }
  CleanUp(const CleanUp&) = delete;
  CleanUp& operator=(const CleanUp&) = delete;

 private:
  test::DeviceCodeSteps& steps_;
};

DWORD WaitForEver(void* argument) noexcept {
  auto& steps = *static_cast<test::DeviceCodeSteps*>(argument);
  const CleanUp clean_up(steps);
  ++steps.begun;
  Sleep(INFINITE);
  ++steps.went_on;
  return 0;
}

}  // namespace

// Code as the device's library is built: without exceptions, and in one variant without any tables
// that tell how to unwind it.
#pragma once

#include "ce/kernel.h"

namespace test {

/// What the routines report; zero at the beginning.
struct DeviceCodeSteps {
  int begun;
  int went_on;     ///< after the Sleep without end
  int cleaned_up;  ///< the frame's objects
};

DWORD WaitWithoutExceptions(void* steps) noexcept;
DWORD WaitWithoutTables(void* steps) noexcept;

}  // namespace test

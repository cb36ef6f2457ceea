// One-step exchanges between threads.

#include "ce/kernel.h"

// No gate: on the device this is a few instructions of the caller, not a call of the system, and
// it cannot fail.
LONG InterlockedExchange(LONG volatile* target, LONG value) {
  return __atomic_exchange_n(target, value, __ATOMIC_SEQ_CST);
}

// Functions that are given functions of a program. A DLL with a misaligned stack has its own called
// with such a stack, too: in place of theirs the simulator gets gates.
#include "ce/kernel.h"
#include "ce/window.h"
#include "loader/gates.h"

// What the DLL passes by address has one layout on both sides.
#include "ce/layouts.h"

namespace {

template <typename Callback>
Callback Misaligned(Callback callback) {
  if (callback == nullptr) return nullptr;
  return reinterpret_cast<Callback>(loader::LastingGate(
      loader::Gate::Kind::kMisaligned, reinterpret_cast<loader::Function>(callback)));
}

}  // namespace

extern "C" {

HANDLE misaligned_CreateThread(SECURITY_ATTRIBUTES* security, DWORD stack_size,
                               LPTHREAD_START_ROUTINE start, void* argument, DWORD flags,
                               DWORD* thread_id) {
  return CreateThread(security, stack_size, Misaligned(start), argument, flags, thread_id);
}

ATOM misaligned_RegisterClassW(const WNDCLASSW* window_class) {
  if (window_class == nullptr) return RegisterClassW(nullptr);
  WNDCLASSW copy = *window_class;
  copy.lpfnWndProc = Misaligned(copy.lpfnWndProc);
  return RegisterClassW(&copy);
}

}  // extern "C"

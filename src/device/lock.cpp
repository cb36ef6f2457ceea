#include "device/lock.h"

#include <coredll.h>

#include "base/format.h"
#include "base/text.h"

namespace device {
namespace {

using MutexName = base::WideFixedText<64>;

MutexName NameOf(const char* name) noexcept {
  char narrow[MutexName::capacity()];
  const std::size_t length = base::Format(narrow, sizeof narrow, "Orvenix.%.32s.%x", name,
                                          static_cast<std::uint32_t>(GetCurrentProcessId()));
  MutexName wide;
  for (std::size_t i = 0; i < length; ++i) wide.data()[i] = static_cast<WCHAR>(narrow[i]);
  return wide;
}

HANDLE Acquire(const char* name) noexcept {
  HANDLE mutex = CreateMutexW(nullptr, FALSE, NameOf(name).c_str());
  if (mutex == nullptr) return nullptr;
  const DWORD result = WaitForSingleObject(mutex, INFINITE);
  if (result == WAIT_OBJECT_0 || result == WAIT_ABANDONED_0) return mutex;
  CloseHandle(mutex);
  return nullptr;
}

}  // namespace

LockGuard::LockGuard(const char* name) noexcept : mutex_(Acquire(name)) {}

LockGuard::~LockGuard() {
  if (mutex_ == nullptr) return;
  ReleaseMutex(mutex_);
  CloseHandle(mutex_);
}

}  // namespace device

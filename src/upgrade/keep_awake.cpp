#include "upgrade/keep_awake.h"

#include <coredll.h>

#include <utility>

namespace upgrade {
namespace {

std::uint32_t ReadPowerOffSeconds() noexcept {
  device::RegistryKey key;
  // The backslash in front is what the devices are asked with; where the registry does not take it,
  // the value counts as missing.
  if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("\\SYSTEM\\CurrentControlSet\\Control\\Power"), 0,
                    KEY_READ, key.Receive()) != ERROR_SUCCESS) {
    return 0;
  }
  DWORD value = 0;
  DWORD type = 0;
  DWORD size = sizeof value;
  const LONG result = RegQueryValueExW(key.get(), TEXT("ExtPowerOff"), nullptr, &type,
                                       reinterpret_cast<BYTE*>(&value), &size);
  const bool read = result == ERROR_SUCCESS && type == REG_DWORD && size == sizeof value;
  return read ? static_cast<std::uint32_t>(value) : 0;
}

DWORD WINAPI KeepAwakeThread(void* /*unused*/) {
  const DWORD pause_ms = KeepAwakeSeconds(ReadPowerOffSeconds()) * 1000U;
  for (;;) {
    SYSTEMTIME now;
    WCHAR text[32];
    GetLocalTime(&now);
    // KEPT ODDITY: the time is formatted and used for nothing.
    GetTimeFormatW(LOCALE_USER_DEFAULT, 0, &now, TEXT("hh:mm:ss tt"), text, 32);
    SystemIdleTimerReset();
    Sleep(pause_ms);
  }
}

}  // namespace

KeepAwake::KeepAwake() noexcept
    : thread_(CreateThread(nullptr, 0, KeepAwakeThread, nullptr, 0, nullptr)) {}

void KeepAwake::Stop() noexcept {
  if (thread_) TerminateThread(thread_.get(), 0);
  thread_.Reset();
}

LightRequirement::LightRequirement() noexcept {
  WCHAR device[] = TEXT("BKL1:");
  requirement_ = SetPowerRequirement(device, D0, POWER_NAME, nullptr, 0);
  if (requirement_ == nullptr) {
    NKDbgPrintfW(TEXT("SetPowerRequirement failed: %X\n"), static_cast<UINT>(GetLastError()));
  }
}

void LightRequirement::Release() noexcept {
  if (requirement_ == nullptr) return;
  if (ReleasePowerRequirement(std::exchange(requirement_, nullptr)) != ERROR_SUCCESS) {
    NKDbgPrintfW(TEXT("ReleasePowerRequirement failed: %X\n"), static_cast<UINT>(GetLastError()));
  }
}

}  // namespace upgrade

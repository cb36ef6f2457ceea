// LoadLibraryW, FreeLibrary and GetProcAddressW.
#include <cstdint>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "library/libraries.h"
#include "text/names.h"

extern "C" HMODULE LoadLibraryW(const WCHAR* name) {
  sim::ApiCall call("LoadLibraryW", ERROR_MOD_NOT_FOUND);
  call.Argument("name", name);
  const HMODULE none = nullptr;
  if (call.failed()) return call.Return(none);
  if (name == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, none);
  DWORD error = ERROR_SUCCESS;
  HMODULE const module = call.device().libraries().Load(sim::BoundedView(name, MAX_PATH), error);
  return module != nullptr ? call.Return(module) : call.Fail(error, none);
}

extern "C" BOOL FreeLibrary(HMODULE module) {
  sim::ApiCall call("FreeLibrary", ERROR_INVALID_HANDLE);
  call.Argument("module", module);
  if (call.failed()) return call.Return(FALSE);
  return call.device().libraries().Free(module) ? call.Return(TRUE)
                                                : call.Fail(ERROR_INVALID_HANDLE, FALSE);
}

extern "C" FARPROC GetProcAddressW(HMODULE module, const WCHAR* name) {
  sim::ApiCall call("GetProcAddressW", ERROR_PROC_NOT_FOUND);
  call.Argument("module", module);
  // A small number in place of a name would be an ordinal, which no library here has.
  constexpr std::uintptr_t kHighestOrdinal = 0xFFFF;
  const bool is_name = reinterpret_cast<std::uintptr_t>(name) > kHighestOrdinal;
  if (is_name) call.Argument("name", name);
  const FARPROC none = nullptr;
  if (call.failed()) return call.Return(none);
  const std::u16string_view wanted = is_name ? std::u16string_view(name) : std::u16string_view();
  DWORD error = ERROR_SUCCESS;
  const FARPROC function = call.device().libraries().Find(module, wanted, error);
  return function != nullptr ? call.Return(function) : call.Fail(error, none);
}

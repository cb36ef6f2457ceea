// LoadLibraryW and GetProcAddressW.
#include <cstdint>
#include <memory>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "library/libraries.h"

extern "C" HMODULE LoadLibraryW(const WCHAR* name) {
  sim::ApiCall call("LoadLibraryW", ERROR_MOD_NOT_FOUND);
  call.Argument("name", name);
  const HMODULE none = nullptr;
  if (call.failed()) return call.Return(none);
  if (name == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, none);
  HMODULE const module = call.device().libraries().Load(name);
  return module != nullptr ? call.Return(module) : call.Fail(ERROR_MOD_NOT_FOUND, none);
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
  const std::shared_ptr<const sim::Library> library = call.device().libraries().Find(module);
  if (library == nullptr) return call.Fail(ERROR_INVALID_HANDLE, none);
  if (!is_name) return call.Fail(ERROR_PROC_NOT_FOUND, none);
  const auto entry = library->entries.find(std::u16string_view(name));
  if (entry == library->entries.end()) return call.Fail(ERROR_PROC_NOT_FOUND, none);
  return call.Return(entry->second);
}

// The registry calls of the Windows CE API. They return their error instead of setting the
// thread's.
#include <algorithm>
#include <cstring>
#include <string>
#include <utility>

#include "ce/errors.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "registry/registry.h"

namespace {

LONG Finish(sim::ApiCall& call, DWORD error) {
  return call.Return(static_cast<LONG>(error));
}

LONG Injected(sim::ApiCall& call) {
  return Finish(call, call.fault_error());
}

/// Gives out a name with its terminator. `size` is in characters: with the zero going in, without
/// it coming out.
DWORD GiveName(const std::u16string& name, WCHAR* out, DWORD* size) {
  if (out == nullptr || size == nullptr) return ERROR_INVALID_PARAMETER;
  if (name.size() >= *size) return ERROR_MORE_DATA;
  name.copy(out, name.size());
  out[name.size()] = 0;
  *size = static_cast<DWORD>(name.size());
  return ERROR_SUCCESS;
}

/// Gives out a value's type and data; null data ask for the size. What does not fit is told, but
/// not given in part.
DWORD GiveData(const sim::RegistryValue& value, DWORD* type, BYTE* data, DWORD* size) {
  if (data != nullptr && size == nullptr) return ERROR_INVALID_PARAMETER;
  if (type != nullptr) *type = value.type;
  if (size == nullptr) return ERROR_SUCCESS;
  const DWORD room = *size;
  *size = static_cast<DWORD>(value.data.size());
  if (data == nullptr) return ERROR_SUCCESS;
  if (value.data.size() > room) return ERROR_MORE_DATA;
  std::copy(value.data.begin(), value.data.end(), data);
  return ERROR_SUCCESS;
}

}  // namespace

LONG RegOpenKeyExW(HKEY key, const WCHAR* name, DWORD /*options*/, REGSAM /*access*/,
                   HKEY* opened) {
  sim::ApiCall call("RegOpenKeyExW", ERROR_FILE_NOT_FOUND);
  call.Argument("key", key);
  call.Argument("name", name);
  if (call.failed()) return Injected(call);
  if (opened == nullptr) return Finish(call, ERROR_INVALID_PARAMETER);
  return Finish(call, call.device().registry().Open(key, name, *opened));
}

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
LONG RegCreateKeyExW(HKEY key, const WCHAR* name, DWORD /*reserved*/, WCHAR* /*class_name*/,
                     DWORD /*options*/, REGSAM /*access*/, SECURITY_ATTRIBUTES* /*security*/,
                     HKEY* opened, DWORD* disposition) {
  sim::ApiCall call("RegCreateKeyExW", ERROR_OUTOFMEMORY);
  call.Argument("key", key);
  call.Argument("name", name);
  if (call.failed()) return Injected(call);
  if (opened == nullptr) return Finish(call, ERROR_INVALID_PARAMETER);
  DWORD outcome = 0;
  const DWORD error = call.device().registry().Create(key, name, *opened, outcome);
  if (error == ERROR_SUCCESS && disposition != nullptr) *disposition = outcome;
  return Finish(call, error);
}

LONG RegCloseKey(HKEY key) {
  // A failure that is injected closes the key all the same: the caller cannot try again.
  sim::ApiCall call("RegCloseKey", ERROR_INVALID_HANDLE);
  call.Argument("key", key);
  const DWORD error = call.device().registry().Close(key);
  return call.failed() ? Injected(call) : Finish(call, error);
}

LONG RegQueryValueExW(HKEY key, const WCHAR* name, DWORD* /*reserved*/, DWORD* type, BYTE* data,
                      DWORD* size) {
  sim::ApiCall call("RegQueryValueExW", ERROR_FILE_NOT_FOUND);
  call.Argument("key", key);
  call.Argument("name", name);
  if (call.failed()) return Injected(call);
  sim::RegistryValue value;
  const DWORD error = call.device().registry().Query(key, name, value);
  if (error != ERROR_SUCCESS) return Finish(call, error);
  return Finish(call, GiveData(value, type, data, size));
}

LONG RegSetValueExW(HKEY key, const WCHAR* name, DWORD /*reserved*/, DWORD type, const BYTE* data,
                    DWORD size) {
  sim::ApiCall call("RegSetValueExW", ERROR_OUTOFMEMORY);
  call.Argument("key", key);
  call.Argument("name", name);
  call.Argument("type", type);
  call.Argument("size", size);
  if (call.failed()) return Injected(call);
  if ((data == nullptr && size != 0) || size > sim::kMaxRegistryData) {
    return Finish(call, ERROR_INVALID_PARAMETER);
  }
  sim::RegistryValue value;
  if (name != nullptr) {
    // One character more than is allowed, for the check that follows.
    for (std::size_t i = 0; name[i] != 0 && i <= sim::kMaxRegistryName; ++i) value.name += name[i];
  }
  value.type = type;
  if (size != 0) value.data.assign(data, data + size);
  return Finish(call, call.device().registry().Set(key, std::move(value)));
}

LONG RegDeleteValueW(HKEY key, const WCHAR* name) {
  sim::ApiCall call("RegDeleteValueW", ERROR_FILE_NOT_FOUND);
  call.Argument("key", key);
  call.Argument("name", name);
  if (call.failed()) return Injected(call);
  return Finish(call, call.device().registry().DeleteValue(key, name));
}

LONG RegDeleteKeyW(HKEY key, const WCHAR* name) {
  sim::ApiCall call("RegDeleteKeyW", ERROR_FILE_NOT_FOUND);
  call.Argument("key", key);
  call.Argument("name", name);
  if (call.failed()) return Injected(call);
  return Finish(call, call.device().registry().DeleteKey(key, name));
}

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
LONG RegEnumKeyExW(HKEY key, DWORD index, WCHAR* name, DWORD* name_size, DWORD* /*reserved*/,
                   WCHAR* class_name, DWORD* class_size, FILETIME* last_write) {
  sim::ApiCall call("RegEnumKeyExW", ERROR_NO_MORE_ITEMS);
  call.Argument("key", key);
  call.Argument("index", index);
  if (call.failed()) return Injected(call);
  std::u16string found;
  DWORD error = call.device().registry().EnumKey(key, index, found);
  if (error == ERROR_SUCCESS) error = GiveName(found, name, name_size);
  if (error != ERROR_SUCCESS) return Finish(call, error);
  // Keys have neither class nor time here.
  if (class_size != nullptr) {
    if (class_name != nullptr && *class_size != 0) *class_name = 0;
    *class_size = 0;
  }
  if (last_write != nullptr) *last_write = {};
  return Finish(call, ERROR_SUCCESS);
}

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
LONG RegEnumValueW(HKEY key, DWORD index, WCHAR* name, DWORD* name_size, DWORD* /*reserved*/,
                   DWORD* type, BYTE* data, DWORD* size) {
  sim::ApiCall call("RegEnumValueW", ERROR_NO_MORE_ITEMS);
  call.Argument("key", key);
  call.Argument("index", index);
  if (call.failed()) return Injected(call);
  sim::RegistryValue found;
  DWORD error = call.device().registry().EnumValue(key, index, found);
  if (error == ERROR_SUCCESS) error = GiveName(found.name, name, name_size);
  if (error == ERROR_SUCCESS) error = GiveData(found, type, data, size);
  return Finish(call, error);
}

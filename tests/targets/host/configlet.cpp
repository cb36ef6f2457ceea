#include "targets/host/configlet.h"

namespace host {
namespace {

template <typename Function>
bool Find(HMODULE library, const WCHAR* name, Function& function) {
  // By way of the one type that every function's address may be cast to.
  const auto address = reinterpret_cast<void (*)()>(GetProcAddressW(library, name));
  function = reinterpret_cast<Function>(address);
  return address != nullptr;
}

}  // namespace

const char* Load(const WCHAR* name, Configlet& configlet) {
  HMODULE const library = LoadLibraryW(name);
  if (library == nullptr) return "the library";
  const auto complaint = [library](const WCHAR* wide, const char* narrow, auto& function) {
    return Find(library, wide, function) ? nullptr : narrow;
  };
  const char* missing = nullptr;
#define FIND(function, member) \
  if (missing == nullptr) missing = complaint(TEXT(function), function, configlet.member)
  FIND("IcfgGetInterfaceVersion", get_interface_version);
  FIND("IcfgGetSchemaVersion", get_schema_version);
  FIND("IcfgInitialize", initialize);
  FIND("IcfgSetCallbacks", set_callbacks);
  FIND("IcfgBeginGroup", begin_group);
  FIND("IcfgSetField", set_field);
  FIND("IcfgGetField", get_field);
  FIND("IcfgEndGroup", end_group);
  FIND("IcfgGetFirstInstance", get_first_instance);
  FIND("IcfgGetNextInstance", get_next_instance);
  FIND("IcfgUninitialize", uninitialize);
#undef FIND
  return missing;
}

}  // namespace host

// The library as a management client on the device holds it: loaded at run time, its eleven
// functions found by name.
#pragma once

#include <coredll.h>

#include "orvenix/configlet.h"

namespace host {

struct Configlet {
  decltype(&IcfgGetInterfaceVersion) get_interface_version = nullptr;
  decltype(&IcfgGetSchemaVersion) get_schema_version = nullptr;
  decltype(&IcfgInitialize) initialize = nullptr;
  decltype(&IcfgSetCallbacks) set_callbacks = nullptr;
  decltype(&IcfgBeginGroup) begin_group = nullptr;
  decltype(&IcfgSetField) set_field = nullptr;
  decltype(&IcfgGetField) get_field = nullptr;
  decltype(&IcfgEndGroup) end_group = nullptr;
  decltype(&IcfgGetFirstInstance) get_first_instance = nullptr;
  decltype(&IcfgGetNextInstance) get_next_instance = nullptr;
  decltype(&IcfgUninitialize) uninitialize = nullptr;
};

/// Loads `library`, as LoadLibraryW finds it. It is never unloaded: its threads may outlive any
/// holder.
/// @return what could not be found, null when everything is there
const char* Load(const WCHAR* library, Configlet& configlet);

}  // namespace host

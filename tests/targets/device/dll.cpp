// On 32-bit ARM the library is the device's own binary.
#include "loader/dll.h"

#include "targets/device/library.h"

namespace host {

sim::LibraryReader LibraryReader() {
  return loader::DllReader();
}

}  // namespace host

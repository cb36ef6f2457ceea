// On Linux the library is a shared object.
#include "library/shared_objects.h"
#include "targets/device/library.h"

namespace host {

sim::LibraryReader LibraryReader() {
  return &sim::ReadSharedObject;
}

}  // namespace host

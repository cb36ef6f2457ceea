// Functions that the device has in its headers only, over others of its library.
#include <coredll.h>

extern "C" {

BOOL SetEvent(HANDLE event) {
  return EventModify(event, EVENT_SET);
}

ce_FILE* ce_stdout() {
  return _getstdfilex(1);
}

}  // extern "C"

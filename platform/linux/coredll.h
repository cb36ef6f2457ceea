// The Windows CE API for programs built on Linux: the simulator answers the calls.
//
// The build machine's own headers come first, so that the names mapped below cannot reach into
// them. A file that needs the machine's own sockets or streams includes "ce/..." instead.
#pragma once

#include <sys/types.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "ce/types.h"
#include "ce/window.h"
#include "ce/winsock.h"

#undef FD_ZERO
#undef FD_SET
#undef FD_CLR
#undef FD_ISSET
#undef FD_SETSIZE
#define FD_SETSIZE CE_FD_SETSIZE
#define FD_ZERO(set) (static_cast<void>((set)->fd_count = 0))
#define FD_SET(socket, set)                                       \
  do {                                                            \
    if ((set)->fd_count < static_cast<unsigned>(CE_FD_SETSIZE)) { \
      (set)->fd_array[(set)->fd_count++] = (socket);              \
    }                                                             \
  } while (false)
inline bool ce_FD_ISSET(SOCKET socket, const ce_fd_set* set) {
  for (std::uint32_t i = 0; i < set->fd_count; ++i) {
    if (set->fd_array[i] == socket) return true;
  }
  return false;
}
#define FD_ISSET(socket, set) ce_FD_ISSET(socket, set)

#define FILE ce_FILE
#define fopen ce_fopen
#define fwrite ce_fwrite
#define fclose ce_fclose
#define fflush ce_fflush
#undef stdout
#define stdout ce_stdout()

#include "winsock_names.h"

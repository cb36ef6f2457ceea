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

// Checks, and renames what is declared above: last.
// clang-format off
#include "ce/layouts.h"
#include "ce/plain_names.h"
// clang-format on

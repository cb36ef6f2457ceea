// The Windows CE API for the library that runs on the device.
//
// Headers of the compiler's own C library come first, so that the names mapped below cannot reach
// into them. Of that library nothing is linked: it only declares.
#pragma once

#include <sys/types.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"

// Checks, and renames what is declared above: last.
// clang-format off
#include "ce/layouts.h"
#include "ce/plain_names.h"
// clang-format on

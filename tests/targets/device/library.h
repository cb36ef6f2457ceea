// The kind of library that a device of this program loads: the one place where the targets that
// have a simulator below them differ.
#pragma once

#include "library/library_code.h"

namespace host {

[[nodiscard]] sim::LibraryReader LibraryReader();

}  // namespace host

// Paths and wild cards as the device reads them.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "ce/types.h"

namespace sim {

/// A path of the device, taken apart. There is no current folder: a path without a leading "\"
/// begins at the root too, and several backslashes count as one.
struct DevicePath {
  std::vector<std::u16string> names;  ///< from the root down; empty: the root itself
  bool closed = false;                ///< ended with a backslash, so it can only name a folder
};

/// Reads a path that may be hostile: nothing behind its terminator is looked at.
/// @param wild  the last name may hold the wild cards * and ?
/// @return 0, or the error number: ERROR_INVALID_PARAMETER for null, ERROR_PATH_NOT_FOUND for "",
///   ERROR_FILENAME_EXCED_RANGE for MAX_PATH characters or more, and ERROR_INVALID_NAME for "." and
///   "..", control characters and the characters " * / : < > ? |
[[nodiscard]] DWORD ParsePath(const WCHAR* text, bool wild, DevicePath& path);

/// True for a name that can stand in a path.
[[nodiscard]] bool ValidName(std::u16string_view name);

/// `*` stands for any characters, `?` for one, letters match without regard to case. "*.*" matches
/// every name, with or without a dot. Time grows with the product of both lengths at most.
[[nodiscard]] bool MatchesWildCards(std::u16string_view name, std::u16string_view pattern);

}  // namespace sim

// One registry key, open for the whole process, through which the flash driver is registered. All
// of it reports to the kernel's debug output. Not for two threads at once.
#pragma once

#include <coredll.h>

#include <cstdint>

namespace device {

/// Makes or opens a key below HKEY_LOCAL_MACHINE and makes it the open one. After a failure none
/// is open.
bool RegEnter(const WCHAR* path) noexcept;

/// Closes the open key. @return false when there is none.
// KEPT ODDITY: the key is not forgotten. A second RegExit closes the same key again, without a
// word; only one behind a failed RegEnter is reported as one too many.
bool RegExit() noexcept;

/// The open key, null for none.
[[nodiscard]] HKEY OpenKey() noexcept;

/// Reads a 32-bit value of any key.
/// @param value  receives it; 0xFFFFFFFF when there is none of that name and type
bool GetRegistryValue(HKEY key, const WCHAR* name, std::uint32_t* value) noexcept;

/// Writes a text to the open key. @return 0 or an error number.
std::int32_t RegSetString(const WCHAR* name, const WCHAR* text) noexcept;

/// Writes a 32-bit value to the open key. @return 0 or an error number.
std::int32_t RegSetDword(const WCHAR* name, std::uint32_t value) noexcept;

}  // namespace device

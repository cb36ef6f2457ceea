// Files, folders and registry values of the device, by names in its 8-bit code page.
#pragma once

#include <coredll.h>

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace host {

[[nodiscard]] std::basic_string<WCHAR> Widen(std::string_view text);

/// @return the content, none when there is no such file or it cannot be read
[[nodiscard]] std::optional<std::string> ReadWhole(std::string_view path);
/// Adds to the end of a file, or makes it.
bool Append(std::string_view path, std::string_view text);
/// Makes a file, in place of what it was.
bool Write(std::string_view path, std::string_view text);
/// The time of the last writing in the unit of file times; 0 when there is no such file.
[[nodiscard]] std::uint64_t WriteTimeOf(std::string_view path);
/// Makes a folder; its parent must be there.
bool MakeFolder(std::string_view path);

/// Sets a value below HKEY_LOCAL_MACHINE, as a text.
bool SetRegistryText(std::string_view key, std::string_view name, std::string_view value);
/// ... or as a number.
bool SetRegistryNumber(std::string_view key, std::string_view name, DWORD value);
/// "(none)", a number, a text in quotation marks, or the bytes of anything else.
[[nodiscard]] std::string DescribeRegistryValue(std::string_view key, std::string_view name);

}  // namespace host

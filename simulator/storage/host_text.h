// Whole text files of the host: those that keep a device's state.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

namespace sim {

/// Reads a regular file; a missing one is an empty text. @return false with errno set.
[[nodiscard]] bool ReadHostText(const std::filesystem::path& file, std::string& text);

/// Replaces a file's content in one step: a program that dies meanwhile leaves the old file or the
/// new one. A symbolic link is replaced, never followed. @return false with errno set.
[[nodiscard]] bool ReplaceHostText(const std::filesystem::path& file, std::string_view text);

/// Writes all of `text` to a descriptor. @return false with errno set.
[[nodiscard]] bool WriteAll(int fd, std::string_view text);

}  // namespace sim

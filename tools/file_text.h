// Whole files in and out.
#pragma once

#include <cstddef>
#include <filesystem>
#include <string>
#include <string_view>

namespace tools {

/// Reads a whole file. Throws Failure kBadInput when it is missing, no regular file, unreadable or
/// larger than `limit` bytes.
[[nodiscard]] std::string ReadWholeFile(const std::filesystem::path& file,
                                        std::size_t limit = std::size_t{16} << 20U);

/// Writes a whole file beside its place and then moves it there, so that nobody ever sees half of
/// it. Throws Failure kCannotWrite.
void WriteWholeFile(const std::filesystem::path& file, std::string_view content);

}  // namespace tools

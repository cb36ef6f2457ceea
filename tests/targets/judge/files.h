// Whole files of the host. All throw std::runtime_error.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

namespace targets {

[[nodiscard]] std::string ReadFile(const std::filesystem::path& file);
/// Makes the file and the folders above it.
void WriteFile(const std::filesystem::path& file, std::string_view content);
void AppendFile(const std::filesystem::path& file, std::string_view content);

}  // namespace targets

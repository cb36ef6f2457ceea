// Files of a simulated device, as the test's own program sees them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace test {

/// Makes the file, new and whole, and the folders above it.
void PutFile(std::string_view path, std::string_view content);

/// @return the content, nothing when there is no such file.
std::optional<std::string> GetFile(std::string_view path);

[[nodiscard]] bool Exists(std::string_view path);

/// @return the attribute mask, 0xFFFFFFFF when there is no such file.
std::uint32_t AttributesOf(std::string_view path);
void SetAttributesOf(std::string_view path, std::uint32_t attributes);

}  // namespace test

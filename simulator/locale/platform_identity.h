// The platform's answers to its maker's identity query.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace sim {

struct Profile;

/// The query is a selector byte and a zero byte.
inline constexpr std::uint32_t kIdentityControlCode = 0x010122C4;
inline constexpr std::uint8_t kSelectorNetworkIdentity = 2;
inline constexpr std::uint8_t kSelectorConfiguration = 10;
inline constexpr std::uint8_t kSelectorConfigurationZq = 39;

/// @return the answer's bytes: a text with its terminating zero, or the six bytes of the network
///   address; nothing when this platform does not know the selector or the profile names no value.
[[nodiscard]] std::optional<std::string> IdentityAnswer(const Profile& profile,
                                                        std::uint8_t selector);

/// "5E4D3C2B1A00" as six bytes. @return nothing for any other text.
[[nodiscard]] std::optional<std::string> ParseNetworkId(const std::string& text);

}  // namespace sim

#include "locale/platform_identity.h"

#include "profile/profile.h"

namespace sim {
namespace {

std::optional<unsigned> HexDigit(char c) {
  if (c >= '0' && c <= '9') return static_cast<unsigned>(c - '0');
  if (c >= 'A' && c <= 'F') return static_cast<unsigned>(c - 'A' + 10);
  if (c >= 'a' && c <= 'f') return static_cast<unsigned>(c - 'a' + 10);
  return std::nullopt;
}

std::optional<std::string> TextAnswer(const std::string& text) {
  if (text.empty()) return std::nullopt;
  return text + '\0';
}

}  // namespace

std::optional<std::string> IdentityAnswer(const Profile& profile, std::uint8_t selector) {
  const bool is_zq = profile.platform == "Corvanta Zq";
  const bool tells_serial = is_zq || profile.platform == "Corvanta MR7";
  switch (selector) {
    case kSelectorConfigurationZq: return is_zq ? TextAnswer(profile.configuration) : std::nullopt;
    case kSelectorConfiguration: return is_zq ? std::nullopt : TextAnswer(profile.configuration);
    case kSelectorNetworkIdentity:
      return tells_serial ? TextAnswer(profile.serial) : ParseNetworkId(profile.network_id);
    default: return std::nullopt;
  }
}

std::optional<std::string> ParseNetworkId(const std::string& text) {
  constexpr std::size_t kBytes = 6;
  if (text.size() != 2 * kBytes) return std::nullopt;
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); i += 2) {
    const std::optional<unsigned> high = HexDigit(text[i]);
    const std::optional<unsigned> low = HexDigit(text[i + 1]);
    if (!high || !low) return std::nullopt;
    bytes += static_cast<char>(*high * 16 + *low);
  }
  return bytes;
}

}  // namespace sim

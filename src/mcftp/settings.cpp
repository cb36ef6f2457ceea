#include "mcftp/settings.h"

#include <string_view>

#include "mcftp/registry.h"

namespace mcftp {
namespace {

constexpr std::string_view kKey =
    "HKEY_LOCAL_MACHINE\\Software\\Corvanta\\Device Management\\MCFTP Client";
constexpr std::string_view kRestore = "RestoreFactoryDefaults";

struct Value {
  std::string_view name;
  std::uint32_t Settings::*member;
};

/// What is read, in this order, and written, with the defaults.
constexpr Value kValues[] = {
    {"LoadClient", &Settings::load_client},
    {"AuthenticationEnabled", &Settings::authentication_enabled},
    {"AuthenticationAlgorithm", &Settings::authentication_algorithm},
    {"CompressionEnabled", &Settings::compression_enabled},
    {"CompressionAlgorithm", &Settings::compression_algorithm},
    {"EncryptionEnabled", &Settings::encryption_enabled},
    {"EncryptionAlgorithm", &Settings::encryption_algorithm},
    {"MaxSessionRetries", &Settings::max_session_retries},
    {"ReceiveTimeout", &Settings::receive_timeout_ms},
    {"DallyTimeout", &Settings::dally_timeout_ms},
    {"OverrunErrorMessages", &Settings::overrun_error_messages},
    {"RxBlocksBeforeOverrun", &Settings::rx_blocks_before_overrun},
    {"OverrunPercentThreshold", &Settings::overrun_percent_threshold},
    {"MaxRandomBackoff", &Settings::max_random_backoff},
};

/// What nothing can be written to is left, and the rest written.
bool WriteDefaults(const Registry& registry) noexcept {
  const Settings defaults;
  bool written = true;
  for (const Value& value : kValues) {
    written = registry.WriteDword(value.name, defaults.*value.member) && written;
  }
  written = registry.WriteDword(kRestore, 0) && written;
  written = registry.WriteString("Description", "Multicast File Transfer Client") && written;
  return registry.WriteDword("Version", 0) && written;
}

// KEPT ODDITY: the first value that cannot be read ends the reading, whatever stands behind it.
bool ReadValues(const Registry& registry, Settings& settings) noexcept {
  for (const Value& value : kValues) {
    if (registry.ReadDword(value.name, settings.*value.member) != Registry::Outcome::kDone) {
      return false;
    }
  }
  return true;
}

bool CreateWithDefaults(Registry& registry) noexcept {
  return registry.Create(kKey) && WriteDefaults(registry);
}

}  // namespace

bool LoadSettings(Settings& settings) noexcept {
  settings = Settings();
  Registry registry;
  const Registry::Outcome opened = registry.Open(kKey);
  if (opened == Registry::Outcome::kMissing) return CreateWithDefaults(registry);
  if (opened == Registry::Outcome::kFailed) return false;
  std::uint32_t restore = 0;
  const Registry::Outcome read = registry.ReadDword(kRestore, restore);
  if (restore != 0) {
    registry.Close();
    Registry::DeleteKey(kKey);  // if that fails, the defaults replace what is in the way
    return CreateWithDefaults(registry);
  }
  const bool noted = read == Registry::Outcome::kDone ||
                     (read == Registry::Outcome::kMissing && registry.WriteDword(kRestore, 0));
  return ReadValues(registry, settings) && noted;
}

}  // namespace mcftp

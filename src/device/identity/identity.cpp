#include "device/identity/identity.h"

#include <coredll.h>

#include <cstddef>
#include <cstring>
#include <string_view>

#include "base/format.h"
#include "base/text.h"

namespace device {
namespace {

/// This maker's platforms answer the platform type to 258, the number that other platforms answer
/// with the maker's name.
constexpr UINT kPlatformTypeAction = 258;

constexpr DWORD kIdentityQuery = 0x010122C4;
constexpr std::uint8_t kSelectorNetworkIdentity = 2;  // six address bytes, or the serial as text
constexpr std::uint8_t kSelectorConfiguration = 10;
constexpr std::uint8_t kSelectorConfigurationZq = 39;

constexpr std::size_t kAddressBytes = 6;

constexpr base::WideView kPlatformZq = TEXT("Corvanta Zq");
constexpr base::WideView kPlatformMr7 = TEXT("Corvanta MR7");

// What the platform has answered so far; an empty text means that it is to be asked.
base::WideFixedText<256> platform_type;
base::FixedText<32> configuration_cache;
base::FixedText<64> serial_cache;
base::FixedText<64> unique_id_cache;

/// @return an empty text when the platform does not say what it is.
base::WideView PlatformType() noexcept {
  if (platform_type.empty()) {
    constexpr auto kCapacity = static_cast<UINT>(decltype(platform_type)::capacity());
    if (SystemParametersInfoW(kPlatformTypeAction, kCapacity, platform_type.data(), 0) == FALSE) {
      platform_type.Clear();
    }
    platform_type.data()[kCapacity - 1] = 0;
  }
  return platform_type.view();
}

/// One answer of the platform: raw bytes, which a text answer need not terminate.
class PlatformAnswer {
 public:
  /// @return false when the platform did not answer, or with nothing or too much.
  bool Query(std::uint8_t selector) noexcept {
    std::uint8_t input[2] = {selector, 0};
    DWORD returned = 0;
    const BOOL answered =
        KernelIoControl(kIdentityQuery, input, sizeof input, bytes_, sizeof bytes_, &returned);
    length_ = answered != FALSE && returned >= 1 && returned < sizeof bytes_ ? returned : 0;
    return length_ > 0;
  }

  [[nodiscard]] std::size_t length() const noexcept { return length_; }
  [[nodiscard]] std::uint8_t byte(std::size_t index) const noexcept { return bytes_[index]; }
  [[nodiscard]] std::string_view text() const noexcept {
    const std::string_view all(reinterpret_cast<const char*>(bytes_), length_);
    return all.substr(0, all.find('\0'));
  }

 private:
  std::uint8_t bytes_[256] = {};
  std::size_t length_ = 0;
};

IdentityResult CopyOut(std::string_view value, char* text, int* size) noexcept {
  const int capacity = *size;
  *size = static_cast<int>(value.size());
  if (capacity <= *size) return IdentityResult::kTooSmall;
  base::CopyText<char>(text, static_cast<std::size_t>(capacity), value);
  return IdentityResult::kOk;
}

/// KEPT ODDITY: a system counts as newer when its major version is above 5 or its minor version is
/// 2 or more, so that 4.20 is newer than 5.1. Serial numbers of devices in the field depend on it.
bool IsNewerSystem() noexcept {
  OSVERSIONINFOW version = {};
  version.dwOSVersionInfoSize = sizeof version;
  if (GetVersionExW(&version) == FALSE) return false;
  return version.dwMajorVersion > 5 || version.dwMinorVersion >= 2;
}

/// The address from its last byte to its first, in hexadecimal. Newer systems drop one leading
/// zero of it and older ones all, as the management server knows their devices.
base::FixedText<64> SerialFromAddress(const PlatformAnswer& address) noexcept {
  char digits[2 * kAddressBytes + 1];
  base::Format(digits, sizeof digits, "%02X%02X%02X%02X%02X%02X", address.byte(5), address.byte(4),
               address.byte(3), address.byte(2), address.byte(1), address.byte(0));
  std::string_view serial = digits;
  const std::size_t most = IsNewerSystem() ? 1 : serial.size();
  for (std::size_t dropped = 0; dropped < most && base::StartsWith(serial, "0"); ++dropped) {
    serial.remove_prefix(1);
  }
  return base::FixedText<64>(serial);
}

}  // namespace

IdentityResult GetConfigurationText(char* text, int* size) noexcept {
  const base::WideView platform = PlatformType();
  if (platform.empty()) return IdentityResult::kUnavailable;
  if (configuration_cache.empty()) {
    PlatformAnswer answer;
    const bool is_zq = platform == kPlatformZq;
    if (!answer.Query(is_zq ? kSelectorConfigurationZq : kSelectorConfiguration)) {
      return IdentityResult::kUnavailable;
    }
    configuration_cache.Assign(answer.text());
  }
  return CopyOut(configuration_cache.view(), text, size);
}

IdentityResult GetSerialNumber(char* text, int* size) noexcept {
  const base::WideView platform = PlatformType();
  if (platform.empty()) return IdentityResult::kUnavailable;
  if (serial_cache.empty()) {
    PlatformAnswer answer;
    if (answer.Query(kSelectorNetworkIdentity)) {
      if (platform == kPlatformZq || platform == kPlatformMr7) {
        serial_cache.Assign(answer.text());
      } else if (answer.length() >= kAddressBytes) {
        serial_cache = SerialFromAddress(answer);
      }
    }
  }
  return CopyOut(serial_cache.view(), text, size);
}

IdentityResult GetUniqueId(char* text, int* size) noexcept {
  if (unique_id_cache.empty()) {
    char configuration[32];
    char serial[32];
    int capacity = sizeof configuration;
    IdentityResult result = GetConfigurationText(configuration, &capacity);
    if (result != IdentityResult::kOk) return result;
    capacity = sizeof serial;
    result = GetSerialNumber(serial, &capacity);
    if (result != IdentityResult::kOk) return result;
    unique_id_cache.Assign(base::View(configuration).substr(0, 4));
    unique_id_cache.Append(serial);
  }
  return CopyOut(unique_id_cache.view(), text, size);
}

}  // namespace device

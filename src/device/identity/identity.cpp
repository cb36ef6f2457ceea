#include "device/identity/identity.h"

#include <coredll.h>

#include <atomic>
#include <cstddef>
#include <cstring>
#include <string_view>

#include "base/format.h"
#include "base/text.h"
#include "device/lock.h"

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

/// What the platform has told once, for the life of the process. An empty text is one that is still
/// to be asked for. Any thread; the platform is asked without the lock, so two threads may both
/// ask, and the answer that comes first stays.
template <std::size_t Capacity>
class Remembered {
 public:
  using Text = base::FixedText<Capacity>;

  [[nodiscard]] Text Get() noexcept {
    const LockGuard hold(lock_);
    return text_;
  }
  /// @return what is remembered from now on.
  Text Keep(std::string_view text) noexcept {
    const LockGuard hold(lock_);
    if (text_.empty()) text_.Assign(text);
    return text_;
  }

 private:
  Lock lock_;
  Text text_;
};
Remembered<32> configuration_text;
Remembered<64> serial_number;
Remembered<64> unique_id;

enum class Platform : std::uint8_t { kUnknown, kZq, kMr7, kOther };

/// Asked once; a platform that does not say what it is is asked again.
std::atomic<Platform> known_platform{Platform::kUnknown};

Platform AskPlatform() noexcept {
  WCHAR type[256] = {};
  constexpr auto kCapacity = static_cast<UINT>(sizeof type / sizeof type[0]);
  if (SystemParametersInfoW(kPlatformTypeAction, kCapacity, type, 0) == FALSE) {
    return Platform::kUnknown;
  }
  type[kCapacity - 1] = 0;
  const base::WideView name(type);
  if (name.empty()) return Platform::kUnknown;
  if (name == kPlatformZq) return Platform::kZq;
  return name == kPlatformMr7 ? Platform::kMr7 : Platform::kOther;
}

Platform ThePlatform() noexcept {
  Platform platform = known_platform.load(std::memory_order_relaxed);
  if (platform == Platform::kUnknown) {
    platform = AskPlatform();
    known_platform.store(platform, std::memory_order_relaxed);
  }
  return platform;
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
    return base::Part(all, 0, all.find('\0'));
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
  const Platform platform = ThePlatform();
  if (platform == Platform::kUnknown) return IdentityResult::kUnavailable;
  auto known = configuration_text.Get();
  if (known.empty()) {
    PlatformAnswer answer;
    if (!answer.Query(platform == Platform::kZq ? kSelectorConfigurationZq
                                                : kSelectorConfiguration)) {
      return IdentityResult::kUnavailable;
    }
    known = configuration_text.Keep(answer.text());
  }
  return CopyOut(known.view(), text, size);
}

IdentityResult GetSerialNumber(char* text, int* size) noexcept {
  const Platform platform = ThePlatform();
  if (platform == Platform::kUnknown) return IdentityResult::kUnavailable;
  auto known = serial_number.Get();
  PlatformAnswer answer;
  if (known.empty() && answer.Query(kSelectorNetworkIdentity)) {
    if (platform != Platform::kOther) {
      known = serial_number.Keep(answer.text());
    } else if (answer.length() >= kAddressBytes) {
      known = serial_number.Keep(SerialFromAddress(answer).view());
    }
  }
  return CopyOut(known.view(), text, size);
}

/// KEPT ODDITY: a serial number that could not be read counts as an empty one, and the unique id
/// that it leaves, the configuration text's four characters alone, is remembered like a whole one,
/// also when the serial number can be read later.
IdentityResult GetUniqueId(char* text, int* size) noexcept {
  auto known = unique_id.Get();
  if (known.empty()) {
    char configuration[32];
    char serial[32];
    int capacity = sizeof configuration;
    IdentityResult result = GetConfigurationText(configuration, &capacity);
    if (result != IdentityResult::kOk) return result;
    capacity = sizeof serial;
    result = GetSerialNumber(serial, &capacity);
    if (result != IdentityResult::kOk) return result;
    known.Assign(base::Part(base::View(configuration), 0, 4));
    known.Append(serial);
    known = unique_id.Keep(known.view());
  }
  return CopyOut(known.view(), text, size);
}

}  // namespace device

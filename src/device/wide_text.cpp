#include "device/wide_text.h"

namespace device {

bool ToWide(std::string_view text, WCHAR* out, std::size_t capacity) noexcept {
  if (capacity == 0) return false;
  out[0] = 0;
  const int room = static_cast<int>(capacity - 1);
  // A text that does not fit is converted in part: the call itself refuses it whole. One 8-bit
  // character never makes more than one 16-bit unit in the code pages of the devices.
  std::size_t taken = text.size() < capacity - 1 ? text.size() : capacity - 1;
  int units = 0;
  if (taken > 0) {
    units = MultiByteToWideChar(CP_ACP, 0, text.data(), static_cast<int>(taken), out, room);
    if (units <= 0 || units > room) {
      units = 0;
      taken = 0;
    }
  }
  out[units] = 0;
  return taken == text.size();
}

bool ToNarrow(std::basic_string_view<WCHAR> text, char* out, std::size_t capacity) noexcept {
  if (capacity == 0) return false;
  out[0] = '\0';
  const int room = static_cast<int>(capacity - 1);
  // A unit may need several bytes: give up units from the end until the rest fits.
  for (std::size_t taken = text.size() < capacity - 1 ? text.size() : capacity - 1; taken > 0;
       --taken) {
    const int bytes = WideCharToMultiByte(CP_ACP, 0, text.data(), static_cast<int>(taken), out,
                                          room, nullptr, nullptr);
    if (bytes > 0 && bytes <= room) {
      out[bytes] = '\0';
      return taken == text.size();
    }
  }
  out[0] = '\0';
  return text.empty();
}

}  // namespace device

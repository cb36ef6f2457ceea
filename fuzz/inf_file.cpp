// Input: an INF file of any bytes. Checks what fetching its entries relies on.
#include "upgrade/list_file/inf_file.h"

#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "upgrade/list_file/patterns.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckText(std::string_view text, std::string_view bytes) {
  Require(text.size() <= upgrade::InfFileReader::kLongestText);
  Require(text.data() > bytes.data());                               // a quote stands before it
  Require(text.data() + text.size() < bytes.data() + bytes.size());  // and one behind
  Require(text.find_first_of(std::string_view("\"\r\n\0", 4)) == std::string_view::npos);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  upgrade::InfFileReader reader(bytes);
  upgrade::InfEntry entry;
  const char* last = bytes.data();
  while (reader.Next(&entry)) {
    CheckText(entry.pattern, bytes);
    CheckText(entry.source, bytes);
    CheckText(entry.destination, bytes);
    Require(entry.pattern.data() >= last);
    Require(entry.source.data() > entry.pattern.data());
    Require(entry.destination.data() > entry.source.data());
    last = entry.destination.data() + entry.destination.size();
    // A pattern that covers the device's string does so with more behind it, too.
    if (upgrade::InfPatternMatches(entry.pattern, entry.source)) {
      Require(upgrade::InfPatternMatches(entry.pattern, entry.source.substr(0, 1)) ||
              entry.source.empty());
    }
  }
  return 0;
}

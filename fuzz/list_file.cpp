// Input: a list file of any bytes. Checks what filling a job with its records relies on.
#include "upgrade/list_file/list_file.h"

#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "upgrade/list_file/patterns.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

void CheckField(std::string_view field, std::size_t longest, std::string_view bytes) {
  Require(!field.empty() && field.size() <= longest);
  Require(field.data() >= bytes.data());
  Require(field.data() + field.size() <= bytes.data() + bytes.size());
  Require(field.find_first_of(std::string_view(",\r\n\0", 4)) == std::string_view::npos);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  upgrade::ListFileReader reader(bytes);
  upgrade::ListRecord record;
  const char* last = bytes.data();
  std::size_t records = 0;
  while (reader.Next(&record)) {
    CheckField(record.source, 259, bytes);
    CheckField(record.destination, 259, bytes);
    CheckField(record.masks, 2007, bytes);
    CheckField(record.crc, 31, bytes);
    CheckField(record.size, 31, bytes);
    Require(record.source.data() >= last);  // each byte is used once: reading ends
    last = record.size.data() + record.size.size();
    ++records;
    // A pattern that a device's whole string matches is never lost by adding a star.
    const bool matches = upgrade::ListPatternMatches(record.source, record.destination);
    if (matches) Require(upgrade::AnyListPatternMatches("*", record.destination));
    static_cast<void>(upgrade::AnyListPatternMatches(record.masks, record.source));
  }
  Require(records * 10 <= size + 1);  // five fields and their separators
  return 0;
}

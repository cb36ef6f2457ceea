// Records of binary files, little-endian and packed, described once for reading and for writing:
// each record has a static template `Fields` that lists its members in the order of the file.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>

namespace elf2pe {

/// Reads the members of a record from the front of `bytes`, which hold the whole record.
class FieldReader {
 public:
  explicit FieldReader(std::string_view bytes) : bytes_(bytes) {}

  template <typename Integer>
  void operator()(Integer& field) {
    static_assert(std::is_unsigned_v<Integer>, "fields are unsigned; a reader gives them a sign");
    std::uint64_t value = 0;
    for (std::size_t i = 0; i < sizeof field; ++i) {
      value |= std::uint64_t{static_cast<unsigned char>(bytes_[i])} << (8 * i);
    }
    field = static_cast<Integer>(value);
    bytes_.remove_prefix(sizeof field);
  }

  template <std::size_t kSize>
  void operator()(std::array<char, kSize>& field) {
    bytes_.copy(field.data(), kSize);
    bytes_.remove_prefix(kSize);
  }

 private:
  std::string_view bytes_;
};

/// Appends the members of a record to a file.
class FieldWriter {
 public:
  explicit FieldWriter(std::string& out) : out_(out) {}

  template <typename Integer>
  void operator()(const Integer& field) {
    for (std::size_t i = 0; i < sizeof field; ++i) {
      out_.push_back(static_cast<char>(std::uint64_t{field} >> (8 * i) & 0xFF));
    }
  }

  template <std::size_t kSize>
  void operator()(const std::array<char, kSize>& field) {
    out_.append(field.data(), kSize);
  }

 private:
  std::string& out_;
};

/// Adds up what a record takes in a file.
struct FieldCounter {
  template <typename Field>
  constexpr void operator()(const Field& /*field*/) {
    size += sizeof(Field);
  }
  std::size_t size = 0;
};

/// Bytes that a record takes in a file.
template <typename Record>
constexpr std::size_t SizeInFile() {
  FieldCounter counter;
  Record record{};
  Record::Fields(record, counter);
  return counter.size;
}

template <typename Record>
void Append(std::string& out, const Record& record) {
  FieldWriter writer(out);
  Record::Fields(record, writer);
}

/// The record at offset `at`, or nothing when it does not lie in `bytes` as a whole.
template <typename Record>
[[nodiscard]] std::optional<Record> Decode(std::string_view bytes, std::size_t at) {
  if (at > bytes.size() || bytes.size() - at < SizeInFile<Record>()) return std::nullopt;
  Record record{};
  FieldReader reader(bytes.substr(at));
  Record::Fields(record, reader);
  return record;
}

/// A 32-bit word at offset `at`, or nothing behind the end.
[[nodiscard]] inline std::optional<std::uint32_t> WordAt(std::string_view bytes, std::size_t at) {
  if (at > bytes.size() || bytes.size() - at < 4) return std::nullopt;
  std::uint32_t word = 0;
  FieldReader reader(bytes.substr(at));
  reader(word);
  return word;
}

/// Replaces the word at offset `at`, which lies in `bytes`.
inline void SetWord(std::string& bytes, std::size_t at, std::uint32_t word) {
  for (std::size_t i = 0; i < 4; ++i) bytes.at(at + i) = static_cast<char>(word >> (8 * i) & 0xFF);
}

/// The next multiple of `step`, a power of two. The caller knows that it has 32 bits.
[[nodiscard]] constexpr std::uint32_t RoundUp(std::uint32_t value, std::uint32_t step) {
  return (value + step - 1) & ~(step - 1);
}

}  // namespace elf2pe

// Packages written byte by byte, as an installer takes them or as nobody should send them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace test {

/// What a package's setup file says. Directories are made from the strings, with the same numbers.
struct SetupPlan {
  struct String {
    std::uint16_t id;
    std::string text;
  };
  struct File {
    std::uint16_t id;
    std::uint16_t directory;
    std::string name;
  };
  struct Key {
    std::uint16_t id;
    std::uint16_t root;    ///< 1 to 4, in the order of their numbers
    std::uint16_t string;  ///< with its path
  };
  struct Value {
    std::uint16_t key;
    std::uint32_t type;  ///< the format's
    std::string data;    ///< the name, a zero, and the value
  };
  std::string provider = "Tarnwell";
  std::string application = "Scan";
  std::vector<String> strings;
  std::vector<File> files;
  std::vector<Key> keys;
  std::vector<Value> values;
  std::optional<std::uint16_t> claimed_strings;  ///< instead of how many there are
  std::optional<std::uint16_t> claimed_files;
  bool counts_zeros = true;  ///< the lengths of texts count the zero behind them
};

/// The setup file's own name within its cabinet.
inline constexpr char kSetupName[] = "SCAN.000";

/// Where a setup file says what.
inline constexpr std::size_t kSetupStringCount = 48;
inline constexpr std::size_t kSetupFileCount = 52;
inline constexpr std::size_t kSetupStrings = 60;
inline constexpr std::size_t kSetupFiles = 68;
inline constexpr std::size_t kSetupApplication = 84;
inline constexpr std::size_t kSetupProvider = 88;
inline constexpr std::size_t kSetupHeaderSize = 100;

[[nodiscard]] std::string SetupBytes(const SetupPlan& plan);

struct CabinetPlan {
  struct File {
    std::string name;
    std::string data;
    std::uint16_t folder = 0;  ///< files of a folder stand together
    /// Said instead of the folder, for files that go on in another cabinet.
    std::optional<std::uint16_t> claimed_folder = {};
  };
  struct Reserves {
    std::uint16_t header = 0;
    std::uint8_t folder = 0;
    std::uint8_t data = 0;
  };
  std::vector<File> files;
  std::optional<Reserves> reserves = {};
  std::uint16_t method = 0;  ///< of compression; the data are stored whatever it says
  std::uint32_t block_size = 32768;
};

/// Where a cabinet says what.
inline constexpr std::size_t kCabinetFiles = 16;
inline constexpr std::size_t kCabinetFileCount = 28;
inline constexpr std::size_t kCabinetFolders = 36;  ///< without reserves

[[nodiscard]] std::string CabinetBytes(const CabinetPlan& plan);

/// A package of one file, \Program Files\Scan\scan.exe, that holds `content`.
[[nodiscard]] std::string SmallPackage(const std::string& content = "the program");

/// Puts numbers into bytes, low byte first.
void Put16(std::string& bytes, std::size_t at, std::uint16_t value);
void Put32(std::string& bytes, std::size_t at, std::uint32_t value);

}  // namespace test

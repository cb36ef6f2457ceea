#include "installer/setup_file.h"

#include <array>
#include <map>
#include <stdexcept>
#include <utility>

#include "ce/system.h"
#include "locale/code_pages.h"

namespace sim {
namespace {

/// "%CE1%" and so on, as the device has them.
constexpr std::array<const char*, 18> kFolders = {"",
                                                  "\\Program Files",
                                                  "\\Windows",
                                                  "",
                                                  "\\Windows\\StartUp",
                                                  "\\My Documents",
                                                  "",
                                                  "",
                                                  "",
                                                  "",
                                                  "",
                                                  "\\Windows\\Start Menu\\Programs",
                                                  "",
                                                  "",
                                                  "\\Windows\\Start Menu\\Programs\\Games",
                                                  "\\Windows\\Fonts",
                                                  "",
                                                  "\\Windows\\Start Menu"};

constexpr std::size_t kHeaderSize = 100;
constexpr std::size_t kMostText = 4096;

/// Numbers have their low byte first. Throws std::out_of_range behind the end.
class Reader {
 public:
  explicit Reader(std::string_view bytes, std::size_t at = 0) : bytes_(bytes), at_(at) {}

  std::uint16_t U16() {
    const std::string_view two = Bytes(2);
    const auto low = static_cast<std::uint8_t>(two[0]);
    const auto high = static_cast<std::uint8_t>(two[1]);
    return static_cast<std::uint16_t>(low | high << 8);
  }
  std::uint32_t U32() {
    const std::uint32_t low = U16();
    return low | static_cast<std::uint32_t>(U16()) << 16;
  }
  std::string_view Bytes(std::size_t count) {
    if (at_ > bytes_.size() || count > bytes_.size() - at_) {
      throw std::out_of_range("it ends early");
    }
    const std::string_view part = bytes_.substr(at_, count);
    at_ += count;
    return part;
  }
  /// A text with its length in front, which may count a zero.
  std::string Text() {
    const std::string_view text = Bytes(U16());
    return std::string(text.substr(0, text.find('\0')));
  }

 private:
  std::string_view bytes_;
  std::size_t at_;
};

std::string ExpandMacros(const std::string& text) {
  std::string path = text;
  for (std::size_t number = kFolders.size() - 1; number > 0; --number) {
    const std::string macro = "%CE" + std::to_string(number) + "%";
    for (std::size_t at = path.find(macro); at != std::string::npos; at = path.find(macro, at)) {
      path.replace(at, macro.size(), kFolders.at(number));
    }
  }
  return path;
}

/// One read of a setup file.
class SetupReader {
 public:
  SetupReader(std::string_view bytes, PackageSetup& setup) : bytes_(bytes), setup_(setup) {}

  void Read() {
    if (bytes_.size() < kHeaderSize || bytes_.substr(0, 4) != "MSCE") {
      throw std::runtime_error("it is no setup file");
    }
    ReadStrings();
    ReadDirectories();
    ReadFiles();
    ReadHives();
    ReadValues();
    setup_.application = Name(84);
    setup_.provider = Name(88);
  }

 private:
  [[nodiscard]] std::uint16_t Count(std::size_t field) const { return Reader(bytes_, field).U16(); }
  [[nodiscard]] Reader Table(std::size_t field) const {
    return Reader(bytes_, Reader(bytes_, field).U32());
  }
  [[nodiscard]] std::string Name(std::size_t field) const {
    Reader header(bytes_, field);
    const std::size_t at = header.U16();
    const std::string_view name = Reader(bytes_, at).Bytes(header.U16());
    return std::string(name.substr(0, name.find('\0')));
  }

  /// A list of strings by their numbers, up to a 0, that make one path.
  std::string Path(Reader& table) {
    const std::size_t length = table.U16();
    Reader list(table.Bytes(length));
    std::string path;
    for (std::size_t i = 0; i < length / 2; ++i) {
      const std::uint16_t id = list.U16();
      if (id == 0) break;
      const auto string = strings_.find(id);
      if (string == strings_.end()) throw std::runtime_error("a string is missing");
      path += (path.empty() ? "" : "\\") + string->second;
      if (path.size() > kMostText) throw std::runtime_error("a path is too long");
    }
    return path;
  }

  void ReadStrings() {
    Reader table = Table(60);
    for (std::uint16_t i = Count(48); i > 0; --i) {
      const std::uint16_t id = table.U16();
      strings_.emplace(id, table.Text());
    }
  }

  void ReadDirectories() {
    Reader table = Table(64);
    for (std::uint16_t i = Count(50); i > 0; --i) {
      const std::uint16_t id = table.U16();
      const std::string folder = ExpandMacros(Path(table));
      if (directories_.empty()) setup_.folder = folder;
      directories_.emplace(id, folder);
    }
  }

  void ReadFiles() {
    Reader table = Table(68);
    for (std::uint16_t i = Count(52); i > 0; --i) {
      PackageFile file;
      file.id = table.U16();
      const auto folder = directories_.find(table.U16());
      static_cast<void>(table.U16());  // the number once more
      static_cast<void>(table.U32());  // flags
      if (folder == directories_.end()) throw std::runtime_error("a directory is missing");
      file.path = folder->second + "\\" + table.Text();
      setup_.files.push_back(std::move(file));
    }
  }

  void ReadHives() {
    Reader table = Table(72);
    for (std::uint16_t i = Count(54); i > 0; --i) {
      const std::uint16_t id = table.U16();
      const std::uint16_t root = table.U16();
      static_cast<void>(table.U16());
      if (root < 1 || root > KeyTree::kRoots.size()) throw std::runtime_error("an unknown root");
      hives_.emplace(id, Hive{KeyTree::kRoots.at(root - 1U).handle, Path(table)});
    }
  }

  void ReadValues() {
    Reader table = Table(76);
    for (std::uint16_t i = Count(56); i > 0; --i) {
      static_cast<void>(table.U16());  // its number
      const auto hive = hives_.find(table.U16());
      static_cast<void>(table.U16());
      const std::uint32_t type = table.U32();
      const std::string_view data = table.Bytes(table.U16());
      if (hive == hives_.end()) throw std::runtime_error("a key is missing");
      setup_.values.push_back({hive->second.root, hive->second.key, Value(type, data)});
    }
  }

  /// A name with its zero, and what the type says behind it.
  static RegistryValue Value(std::uint32_t type, std::string_view data) {
    const std::size_t end = data.find('\0');
    if (end == std::string_view::npos) throw std::runtime_error("a value without a name");
    const std::string_view content = data.substr(end + 1);
    RegistryValue value;
    value.name = FromAnsi(data.substr(0, end));
    switch (type) {
      case 0x00000000:
        value.type = REG_SZ;
        value.data = Wide(content.substr(0, content.find('\0')));
        break;
      case 0x00000001:
        value.type = REG_BINARY;
        value.data.assign(content.begin(), content.end());
        break;
      case 0x00010000:
        value.type = REG_MULTI_SZ;
        value.data = Wide(WithoutLastZero(content));
        break;
      case 0x00010001:
        if (content.size() != sizeof(DWORD)) throw std::runtime_error("a number of another size");
        value.type = REG_DWORD;
        value.data.assign(content.begin(), content.end());
        break;
      default: throw std::runtime_error("a value of an unknown type");
    }
    return value;
  }

  /// Some packages count the zero behind the last of several texts, others do not.
  static std::string_view WithoutLastZero(std::string_view texts) {
    const std::size_t size = texts.size();
    const bool counted = size >= 2 && texts[size - 1] == '\0' && texts[size - 2] == '\0';
    return texts.substr(0, counted ? size - 1 : size);
  }

  /// With a zero at the end.
  static std::vector<BYTE> Wide(std::string_view text) {
    std::vector<BYTE> bytes;
    for (const char16_t unit : FromAnsi(text) + u'\0') {
      bytes.push_back(static_cast<BYTE>(unit & 0xFF));
      bytes.push_back(static_cast<BYTE>(unit >> 8));
    }
    return bytes;
  }

  struct Hive {
    std::uint32_t root;
    std::string key;
  };
  std::string_view bytes_;
  PackageSetup& setup_;
  std::map<std::uint16_t, std::string> strings_;
  std::map<std::uint16_t, std::string> directories_;
  std::map<std::uint16_t, Hive> hives_;
};

}  // namespace

bool ReadPackageSetup(std::string_view bytes, PackageSetup& setup, std::string& error) {
  try {
    SetupReader(bytes, setup).Read();
    return true;
  } catch (const std::exception& failure) {
    error = failure.what();
    return false;
  }
}

}  // namespace sim

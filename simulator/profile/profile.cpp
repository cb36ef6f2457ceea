// Reading and writing profile files.
//
//   # comment
//   [section]
//   key = value
//
// Blanks around a value do not count; a value in double quotes keeps those inside. A key that is
// not given keeps its default. [volume PATH] and [program NAME] may come as often as there are
// volumes and programs, and the key of [processes] as often as there are processes.
#include "profile/profile.h"

#include <cctype>
#include <fstream>
#include <set>
#include <sstream>
#include <string_view>
#include <utility>

#include "profile/settings.h"

namespace sim {
namespace {

constexpr std::string_view kBlanks = " \t\r\n\v\f";

std::string_view Trim(std::string_view text) {
  const std::size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

bool IsQuoted(std::string_view text) {
  return text.size() >= 2 && text.front() == '"' && text.back() == '"';
}

std::string Lower(std::string_view text) {
  std::string lower(text);
  for (char& c : lower) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return lower;
}

std::string Quote(std::string_view text) {
  return '"' + std::string(text) + '"';
}

class Reader {
 public:
  explicit Reader(Profile& profile) : profile_(profile) {}

  /// @return why the line is refused, empty when it was taken.
  Complaint ReadLine(std::string_view line) {
    const std::string_view text = Trim(line);
    if (text.empty() || text.front() == '#' || text.front() == ';') return {};
    if (text.front() == '[') return ReadSection(text);
    const std::size_t equals = text.find('=');
    if (equals == std::string_view::npos) {
      return Quote(text) + " is neither a section nor a setting; write \"key = value\"";
    }
    const std::string_view key = Trim(text.substr(0, equals));
    std::string_view value = Trim(text.substr(equals + 1));
    if (IsQuoted(value)) value = value.substr(1, value.size() - 2);
    return ReadSetting(key, value);
  }

 private:
  Complaint ReadSection(std::string_view text) {
    if (text.back() != ']') return Quote(text) + " lacks its closing bracket; add a ]";
    const std::string_view inside = Trim(text.substr(1, text.size() - 2));
    const std::size_t blank = inside.find_first_of(kBlanks);
    const std::string_view name =
        blank == std::string_view::npos ? std::string_view{} : Trim(inside.substr(blank));
    section_ = inside.substr(0, blank);
    place_ = Lower(inside);
    volume_ = nullptr;
    program_ = nullptr;
    if (section_ == "volume") return BeginVolume(name);
    if (section_ == "program") return BeginProgram(name);
    if (!name.empty() || !IsKnownSection()) {
      section_.clear();
      return Quote(text) + " is no section of a device profile; correct or remove it";
    }
    return {};
  }

  [[nodiscard]] bool IsKnownSection() const {
    if (section_ == "processes") return true;
    for (const auto& setting : ProfileSettings()) {
      if (setting.section == section_) return true;
    }
    return false;
  }

  Complaint BeginVolume(std::string_view path) {
    if (path.size() < 2 || path.front() != '\\' || path.find('\\', 1) != std::string_view::npos) {
      return "a volume needs its folder; write it like [volume \\Flash File Store]";
    }
    for (const VolumeProfile& other : profile_.volumes) {
      if (Lower(other.path) == Lower(path)) {
        return "volume " + Quote(path) + " stands here twice; remove one";
      }
    }
    profile_.volumes.push_back({std::string(path)});
    volume_ = &profile_.volumes.back();
    return {};
  }

  Complaint BeginProgram(std::string_view name) {
    if (name.empty()) return "a program needs its name; write it like [program wceload.exe]";
    const auto [at, added] = profile_.programs.try_emplace(Lower(name));
    if (!added) return "program " + Quote(name) + " stands here twice; remove one";
    program_ = &at->second;
    return {};
  }

  Complaint ReadSetting(std::string_view key, std::string_view value) {
    if (section_.empty()) return Quote(key) + " stands in no section; write one above it";
    if (section_ == "processes" && key == "process") {
      profile_.processes.push_back({std::string(value)});
      return {};
    }
    if (!keys_.insert(place_ + '=' + std::string(key)).second) {
      return Quote(key) + " is set twice; remove one";
    }
    if (volume_ != nullptr) return Apply(VolumeSettings(), *volume_, key, value);
    if (program_ != nullptr) return Apply(ProgramSettings(), *program_, key, value);
    return Apply(ProfileSettings(), profile_, key, value);
  }

  template <typename Record>
  Complaint Apply(const std::vector<Setting<Record>>& settings, Record& record,
                  std::string_view key, std::string_view value) {
    for (const auto& setting : settings) {
      if (setting.section != section_ || setting.key != key) continue;
      const Complaint complaint = setting.read(record, value);
      return complaint.empty() ? complaint
                               : std::string(key) + " = " + Quote(value) + " " + complaint;
    }
    return Quote(key) + " is no setting of [" + section_ + "]; correct or remove it";
  }

  Profile& profile_;
  std::string section_;  ///< its first word; empty before the first section
  VolumeProfile* volume_ = nullptr;
  ProgramProfile* program_ = nullptr;
  std::string place_;  ///< the whole section line in lower case
  std::set<std::string> keys_;
};

/// @return nothing when a line of the file could not hold the value.
bool IsWritable(std::string_view value) {
  for (const char c : value) {
    if (static_cast<unsigned char>(c) < ' ') return false;
  }
  return true;
}

class Writer {
 public:
  std::ostringstream out;
  std::string unwritable;  ///< the first key whose value no line can hold

  template <typename Record>
  void Settings(const std::vector<Setting<Record>>& settings, const Record& record) {
    std::string_view section;
    for (const auto& setting : settings) {
      if constexpr (std::is_same_v<Record, Profile>) {
        if (setting.section != section) out << "\n[" << setting.section << "]\n";
      }
      section = setting.section;
      if (!setting.comment.empty()) out << "# " << setting.comment << '\n';
      Value(setting.key, setting.write(record));
    }
  }

  void Value(std::string_view key, const std::string& value) {
    Note(key, value);
    const bool needs_quotes = Trim(value).size() != value.size() || IsQuoted(value);
    out << key << " = " << (needs_quotes ? Quote(value) : value) << '\n';
  }

  void Section(std::string_view kind, const std::string& name) {
    Note(kind, name);
    out << "\n[" << kind << ' ' << name << "]\n";
  }

 private:
  void Note(std::string_view key, const std::string& value) {
    if (unwritable.empty() && !IsWritable(value)) unwritable = key;
  }
};

void Write(Writer& writer, const Profile& profile) {
  writer.out << "# A simulated device. Lines that begin with # are comments; a line that is missing"
                "\n# leaves its setting at the usual value.\n";
  writer.Settings(ProfileSettings(), profile);
  writer.out << "\n[processes]\n# The programs that run; one line each.\n";
  for (const ProcessProfile& process : profile.processes) writer.Value("process", process.name);
  for (const VolumeProfile& volume : profile.volumes) {
    writer.Section("volume", volume.path);
    writer.Settings(VolumeSettings(), volume);
  }
  for (const auto& [name, program] : profile.programs) {
    writer.Section("program", name);
    writer.Settings(ProgramSettings(), program);
  }
}

}  // namespace

bool LoadProfile(const std::filesystem::path& file, Profile& profile, std::string& error) {
  std::ifstream in(file, std::ios::binary);
  if (!in) {
    error = file.string() + ": cannot be read; give the path of a device profile";
    return false;
  }
  Profile read;
  Reader reader(read);
  std::string line;
  for (int number = 1; std::getline(in, line); ++number) {
    const Complaint complaint = reader.ReadLine(line);
    if (!complaint.empty()) {
      error = file.string() + ':' + std::to_string(number) + ": " + complaint;
      return false;
    }
  }
  if (in.bad()) {
    error = file.string() + ": cannot be read to its end; look at the disk";
    return false;
  }
  profile = std::move(read);
  return true;
}

bool SaveProfile(const std::filesystem::path& file, const Profile& profile, std::string& error) {
  Writer writer;
  Write(writer, profile);
  if (!writer.unwritable.empty()) {
    error = file.string() + ": " + writer.unwritable +
            " holds a control character, which a profile cannot; remove it";
    return false;
  }
  std::ofstream out(file, std::ios::binary | std::ios::trunc);
  out << writer.out.str();
  out.close();
  if (!out) {
    error = file.string() + ": cannot be written; check the folder and the room on its disk";
    return false;
  }
  return true;
}

}  // namespace sim

#include "tools/device_folder.h"

#include <string_view>
#include <system_error>

#include "base/text.h"
#include "profile/settings.h"
#include "tools/failure.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kVolume = "volume ";
/// Belongs to the management client, which a device has before any upgrade.
constexpr const char* kClientFolder = "storage/Tarnwell/TWSubSystems";

/// The volume of this path; a new one when the profile has none.
sim::VolumeProfile& VolumeNamed(sim::Profile& profile, std::string_view path) {
  for (sim::VolumeProfile& volume : profile.volumes) {
    if (base::EqualIgnoringCase(volume.path, path)) return volume;
  }
  profile.volumes.emplace_back();
  profile.volumes.back().path = path;
  return profile.volumes.back();
}

/// Looks the key up in `rows` and gives it the value.
template <typename Record>
bool Apply(const std::vector<sim::Setting<Record>>& rows, std::string_view section,
           std::string_view key, std::string_view value, Record& record) {
  for (const sim::Setting<Record>& row : rows) {
    if (row.key != key || (!section.empty() && row.section != section)) continue;
    const sim::Complaint complaint = row.read(record, value);
    if (complaint.empty()) return true;
    throw Failure(ExitCode::kUsage, "--set " + std::string(key),
                  "\"" + std::string(value) + "\" " + complaint);
  }
  return false;
}

/// Applies "screen.width=480" or "volume \\SD Card.capacity=1000000". The last dot before the "="
/// divides section and key.
void ApplySetting(const std::string& setting, sim::Profile& profile) {
  const std::size_t equals = setting.find('=');
  const std::size_t dot = setting.rfind('.', equals);
  if (equals == std::string::npos || dot == std::string::npos || dot == 0) {
    throw Failure(ExitCode::kUsage, "--set", "\"" + setting + "\" is no setting",
                  "write section.key=value, as in screen.width=480");
  }
  const std::string_view section = std::string_view(setting).substr(0, dot);
  const std::string_view key = std::string_view(setting).substr(dot + 1, equals - dot - 1);
  const std::string_view value = std::string_view(setting).substr(equals + 1);
  bool applied = false;
  if (base::StartsWith(section, kVolume)) {
    applied = Apply(sim::VolumeSettings(), "", key, value,
                    VolumeNamed(profile, section.substr(kVolume.size())));
  } else {
    applied = Apply(sim::ProfileSettings(), section, key, value, profile);
  }
  if (!applied) {
    throw Failure(ExitCode::kUsage, "--set",
                  "there is no setting \"" + setting.substr(0, equals) + "\"",
                  "see the device.profile of any device");
  }
}

sim::Profile Load(const fs::path& file) {
  sim::Profile profile;
  std::string error;
  if (!sim::LoadProfile(file, profile, error)) {
    throw Failure(ExitCode::kBadInput, "profile", error);
  }
  return profile;
}

}  // namespace

sim::Profile MakeDeviceFolder(const fs::path& folder, const fs::path& profile,
                              const std::vector<std::string>& settings) {
  std::error_code error;
  if (fs::exists(folder) && (!fs::is_directory(folder) || !fs::is_empty(folder, error))) {
    throw Failure(ExitCode::kCannotWrite, folder.string(), "is there already",
                  "choose another folder, or remove it");
  }
  std::string error_text;
  sim::Profile made = profile.empty() ? sim::Profile{} : Load(profile);
  for (const std::string& setting : settings) ApplySetting(setting, made);
  fs::create_directories(folder / kClientFolder, error);
  const fs::path file = folder / kDeviceProfile;
  if (!sim::SaveProfile(file, made, error_text)) {
    throw Failure(ExitCode::kCannotWrite, file.string(), error_text);
  }
  return made;
}

sim::Profile ReadDeviceFolder(const fs::path& folder) {
  if (!fs::exists(folder / kDeviceProfile)) {
    throw Failure(ExitCode::kBadInput, folder.string(), "is not a device",
                  "make one with 'orvenix device new " + folder.string() + "'");
  }
  return Load(folder / kDeviceProfile);
}

}  // namespace tools

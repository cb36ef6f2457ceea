#include "tools/device_show.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <fstream>
#include <iostream>
#include <memory>
#include <nlohmann/json.hpp>
#include <sstream>
#include <vector>

#include "ce/errors.h"
#include "device/device.h"
#include "locale/clock.h"
#include "profile/settings.h"
#include "storage/storage.h"
#include "text/names.h"
#include "tools/device_folder.h"
#include "tools/device_table.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "world/world.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr int kMaxDepth = 40;
constexpr std::size_t kLogLines = 12;
constexpr const char16_t* kTransferLog = u"\\FileXfer.log";

struct ShownFile {
  std::u16string path;
  DWORD attributes = 0;
  std::uint64_t size = 0;
  std::string written;
};

/// "r", "h", "s", "a" and so on, a letter or a dot each.
std::string AttributeLetters(DWORD attributes) {
  static constexpr std::array<std::pair<DWORD, char>, 6> kLetters = {
      {{FILE_ATTRIBUTE_READONLY, 'r'},
       {FILE_ATTRIBUTE_HIDDEN, 'h'},
       {FILE_ATTRIBUTE_SYSTEM, 's'},
       {FILE_ATTRIBUTE_ARCHIVE, 'a'},
       {FILE_ATTRIBUTE_INROM, 'R'},
       {FILE_ATTRIBUTE_TEMPORARY, 't'}}};
  std::string letters;
  for (const auto& [bit, letter] : kLetters) letters += (attributes & bit) != 0 ? letter : '.';
  return letters;
}

std::string TimeText(const FILETIME& time) {
  const auto when = sim::ToCalendar(sim::ToTicks(time));
  if (!when) return "-";
  std::array<char, 40> text{};
  std::snprintf(text.data(), text.size(), "%04d-%02d-%02d %02d:%02d:%02d", when->wYear,
                when->wMonth, when->wDay, when->wHour, when->wMinute, when->wSecond);
  return text.data();
}

/// Everything below `folder`, folders before what is in them, in the storage's own order.
void FindFiles(sim::Storage& storage, const std::u16string& folder, int depth,
               std::vector<ShownFile>& found) {
  WIN32_FIND_DATAW data{};
  std::shared_ptr<sim::Search> search;
  DWORD error = storage.FindFirst((folder + u"\\*.*").c_str(), search, data);
  for (; error == ERROR_SUCCESS; error = storage.FindNext(*search, data)) {
    ShownFile file;
    file.path = folder + u"\\" + data.cFileName;
    file.attributes = data.dwFileAttributes;
    file.size = std::uint64_t{data.nFileSizeHigh} << 32U | data.nFileSizeLow;
    file.written = TimeText(data.ftLastWriteTime);
    found.push_back(file);
    const bool is_folder = (file.attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
    if (is_folder && depth < kMaxDepth) FindFiles(storage, file.path, depth + 1, found);
  }
}

std::vector<std::string> EndOfLog(sim::Storage& storage) {
  const auto log = storage.HostPath(kTransferLog);
  if (!log) return {};
  std::ifstream in(*log, std::ios::binary);
  std::vector<std::string> lines;
  for (std::string line; std::getline(in, line);) {
    while (!line.empty() && line.back() == '\r') line.pop_back();
    if (!line.empty()) lines.push_back(server::Printable(line, 200));
    if (lines.size() > kLogLines) lines.erase(lines.begin());
  }
  return lines;
}

nlohmann::ordered_json ProfileJson(const sim::Profile& profile) {
  nlohmann::ordered_json json;
  for (const auto& setting : sim::ProfileSettings()) {
    json[std::string(setting.section)][std::string(setting.key)] = setting.write(profile);
  }
  return json;
}

void PrintProfile(const sim::Profile& profile) {
  std::string_view section;
  for (const auto& setting : sim::ProfileSettings()) {
    if (setting.section != section) std::cout << "\n" << setting.section << ":";
    section = setting.section;
    std::cout << "  " << setting.key << "=" << setting.write(profile);
  }
  std::cout << "\n\n";
}

void PrintFiles(const std::vector<ShownFile>& files) {
  for (const ShownFile& file : files) {
    const bool is_folder = (file.attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
    std::array<char, 64> facts{};
    std::snprintf(facts.data(), facts.size(), "%s %12s  %s  ",
                  AttributeLetters(file.attributes).c_str(),
                  is_folder ? "folder" : std::to_string(file.size).c_str(), file.written.c_str());
    std::cout << facts.data() << sim::ToHostText(file.path) << "\n";
  }
}

nlohmann::ordered_json FilesJson(const std::vector<ShownFile>& files) {
  nlohmann::ordered_json json = nlohmann::ordered_json::array();
  for (const ShownFile& file : files) {
    json.push_back({{"path", sim::ToHostText(file.path)},
                    {"folder", (file.attributes & FILE_ATTRIBUTE_DIRECTORY) != 0},
                    {"attributes", file.attributes},
                    {"size", file.size},
                    {"written", file.written}});
  }
  return json;
}

std::string Dump(const nlohmann::ordered_json& json) {
  return json.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

}  // namespace

ExitCode ShowDevice(const fs::path& folder, bool json) {
  const sim::Profile profile = ReadDeviceFolder(folder);
  const auto world = sim::World::MakeVirtual();
  std::unique_ptr<sim::Device> device;
  try {
    device = std::make_unique<sim::Device>(*world, profile, folder);
  } catch (const std::runtime_error& error) {
    throw Failure(ExitCode::kBadInput, folder.string(), error.what());
  }
  std::vector<ShownFile> files;
  FindFiles(device->storage(), u"", 0, files);
  const std::vector<std::string> log = EndOfLog(device->storage());
  if (json) {
    std::cout << Dump({{"device", folder.string()},
                       {"profile", ProfileJson(profile)},
                       {"files", FilesJson(files)},
                       {"log", log}})
              << std::endl;
    return ExitCode::kOk;
  }
  std::cout << profile.name << " in " << folder.string() << "\n";
  PrintProfile(profile);
  PrintFiles(files);
  if (!log.empty()) std::cout << "\nend of \\FileXfer.log:\n";
  for (const std::string& line : log) std::cout << "  " << line << "\n";
  std::cout << std::flush;
  return ExitCode::kOk;
}

ExitCode ShowScreen(const fs::path& folder, const fs::path& picture, bool json) {
  static_cast<void>(ReadDeviceFolder(folder));
  if (!fs::exists(folder / kDeviceScreenText)) {
    throw Failure(ExitCode::kBadInput, folder.string(), "nothing was ever shown on its screen",
                  "run a job on it first");
  }
  nlohmann::ordered_json screen;
  try {
    screen = nlohmann::ordered_json::parse(ReadWholeFile(folder / kDeviceScreenText));
    screen["picture"] = (folder / kDeviceScreen).string();
    if (!picture.empty()) WriteWholeFile(picture, ReadWholeFile(folder / kDeviceScreen));
    if (json) {
      std::cout << Dump(screen) << std::endl;
      return ExitCode::kOk;
    }
    for (const auto& line : screen.at("lines")) std::cout << line.get<std::string>() << "\n";
    for (const char* bar : {"overall", "file"}) {
      if (!screen.contains(bar)) continue;
      std::cout << bar << " " << screen.at(bar).get<int>() << "%\n";
    }
    if (screen.contains("caption")) std::cout << screen.at("caption").get<std::string>() << "\n";
  } catch (const nlohmann::json::exception& error) {
    throw Failure(ExitCode::kBadInput, (folder / kDeviceScreenText).string(), error.what(),
                  "run a job on the device again");
  }
  std::cout << "picture: " << (picture.empty() ? folder / kDeviceScreen : picture).string()
            << std::endl;
  return ExitCode::kOk;
}

}  // namespace tools

#include "tools/multicast_table.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <map>
#include <tuple>
#include <vector>

#include "tools/device_table.h"
#include "tools/failure.h"

namespace tools {
namespace {

using server::DeviceFigures;
using server::DeviceState;
using server::FileFigures;
using server::Micros;

constexpr std::uint64_t kLeastRate = 10'000;

double Seconds(Micros time) {
  return std::chrono::duration<double>(time).count();
}

double Milliseconds(Micros time) {
  return std::chrono::duration<double, std::milli>(time).count();
}

const char* RoleName(std::uint8_t role) {
  constexpr std::array<const char*, 3> kNames = {"passive", "ack master", "nak master"};
  return role < kNames.size() ? kNames[role] : "";
}

[[gnu::format(printf, 1, 2)]] std::string Format(const char* format, ...) {
  std::array<char, 512> text{};
  va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(text.data(), text.size(), format, arguments);
  va_end(arguments);
  return text.data();
}

/// Blocks sent again, in percent of those sent first.
double RepairPercent(const FileFigures& file) {
  if (file.first_pass_frames == 0) return 0;
  return 100 * static_cast<double>(file.repair_frames) /
         static_cast<double>(file.first_pass_frames);
}

/// On the wire, from the first block until the last device was settled; 0: not known.
std::uint64_t BitsPerSecond(const FileFigures& file) {
  const double seconds = Seconds(file.ended - file.data_began);
  if (file.data_began.count() == 0 || seconds <= 0) return 0;
  return static_cast<std::uint64_t>(static_cast<double>(file.wire_bytes) * 8 / seconds);
}

nlohmann::ordered_json ToJson(const DeviceFigures& device) {
  return {{"address", server::ToText(device.peer)},
          {"state", server::StateName(device.state)},
          {"role", RoleName(device.role)},
          {"late", device.late},
          {"reason", device.reason},
          {"last_heard", device.last_heard},
          {"first_gap", device.first_gap},
          {"requests", device.requests},
          {"acks", device.acks},
          {"naks", device.naks},
          {"overruns", device.overruns},
          {"round_trip_ms", Milliseconds(device.round_trip)},
          {"loss", device.loss}};
}

nlohmann::ordered_json ToJson(const FileFigures& file) {
  nlohmann::ordered_json json{{"path", file.device_path},
                              {"masks", file.masks},
                              {"phase", server::PhaseName(file.phase)},
                              {"size", file.size},
                              {"block_size", file.block_size},
                              {"blocks", file.block_count},
                              {"last_file", file.last_file},
                              {"seconds", Seconds(file.ended - file.began)},
                              {"bits_per_second", BitsPerSecond(file)},
                              {"expected", file.expected},
                              {"announcements", file.announcements},
                              {"first_frames", file.first_pass_frames},
                              {"repair_frames", file.repair_frames},
                              {"farewell_frames", file.farewell_frames},
                              {"control_frames", file.control_frames},
                              {"frames", file.frames},
                              {"wire_bytes", file.wire_bytes},
                              {"wire_per_byte", file.WirePerByte()},
                              {"acks", file.acks},
                              {"naks", file.naks},
                              {"errors", file.errors},
                              {"joined", file.devices.size()},
                              {"proven", file.Count(DeviceState::kProven)}};
  json["devices"] = nlohmann::ordered_json::array();
  for (const DeviceFigures& device : file.devices) json["devices"].push_back(ToJson(device));
  return json;
}

std::string DeviceRow(const DeviceFigures& device) {
  const std::string heard = device.reason.empty() ? device.last_heard : device.reason;
  return Format("%-21s %-9s %-11s %5.1f%% %7.1f ms %6llu %8llu  %s\n",
                server::ToText(device.peer).c_str(),
                std::string(server::StateName(device.state)).c_str(), RoleName(device.role),
                100 * device.loss, Milliseconds(device.round_trip),
                static_cast<unsigned long long>(device.naks),
                static_cast<unsigned long long>(device.overruns), heard.substr(0, 40).c_str());
}

const FileFigures* Current(const server::MulticastFigures& figures) {
  return figures.current < figures.files.size() ? &figures.files[figures.current] : nullptr;
}

bool SendsBlocks(const FileFigures& file) {
  return file.phase == server::FilePhase::kStreaming ||
         file.phase == server::FilePhase::kRepairing || file.phase == server::FilePhase::kClosing;
}

/// What devices said of blocks that did not come, the worst of them.
double WorstLoss(const FileFigures& file) {
  double worst = 0;
  for (const DeviceFigures& device : file.devices) worst = std::max(worst, device.loss);
  return worst;
}

/// Devices that still need something come first.
std::vector<const DeviceFigures*> InOrder(const FileFigures& file) {
  std::vector<const DeviceFigures*> devices;
  for (const DeviceFigures& device : file.devices) devices.push_back(&device);
  const auto rank = [](const DeviceFigures* device) {
    return std::tuple(device->state != DeviceState::kJoined, device->state == DeviceState::kProven,
                      device->role == 0);
  };
  std::stable_sort(devices.begin(), devices.end(),
                   [&rank](const auto* a, const auto* b) { return rank(a) < rank(b); });
  return devices;
}

std::string Plural(std::size_t count, const char* what) {
  return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

/// What went wrong at the server itself, a line each.
std::string ServerTroubles(const server::MulticastFigures& figures) {
  std::string text;
  if (figures.refused > 0) {
    text += "  " + Plural(figures.refused, "datagram") +
            " of these did not go out: the system refused to send\n";
  }
  if (figures.not_stored > 0) {
    text += "  the session file could not be written " + Plural(figures.not_stored, "time") +
            ": a server that is started again knows less\n";
  }
  for (const server::Peer& rival : figures.rivals) {
    text += "  " + server::ToText(rival) +
            " announces on the same group: what devices say may be meant for that server\n";
  }
  return text;
}

}  // namespace

nlohmann::ordered_json ToJson(const server::MulticastFigures& figures) {
  nlohmann::ordered_json json{{"rounds", figures.round},
                              {"frames_sent", figures.frames_sent},
                              {"frames_received", figures.frames_received},
                              {"wire_bytes", figures.wire_bytes},
                              {"garbage", figures.garbage},
                              {"strangers", figures.strangers},
                              {"turned_away", figures.turned_away},
                              {"refused", figures.refused},
                              {"not_stored", figures.not_stored},
                              {"rate_limit", figures.rate}};
  json["rivals"] = nlohmann::ordered_json::array();
  for (const server::Peer& rival : figures.rivals) json["rivals"].push_back(server::ToText(rival));
  json["files"] = nlohmann::ordered_json::array();
  for (const FileFigures& file : figures.files) json["files"].push_back(ToJson(file));
  return json;
}

nlohmann::ordered_json ToJson(const server::MulticastEvent& event, Micros start) {
  nlohmann::ordered_json json{{"event", "multicast"},
                              {"what", server::EventName(event.kind)},
                              {"seconds", Seconds(event.when - start)}};
  if (event.file != nullptr) {
    const FileFigures& file = *event.file;
    json["file"] = file.device_path;
    json["phase"] = server::PhaseName(file.phase);
    json["joined"] = file.devices.size();
    json["proven"] = file.Count(DeviceState::kProven);
    json["frames"] = file.frames;
    json["repair_frames"] = file.repair_frames;
  }
  if (event.device != nullptr) json["device"] = server::ToText(event.device->peer);
  if (!event.detail.empty()) json["detail"] = event.detail;
  return json;
}

std::string ToLine(const server::MulticastEvent& event, Micros start) {
  std::string line = Format("%9.3f  %-11.11s ", Seconds(event.when - start),
                            std::string(server::EventName(event.kind)).c_str());
  line += event.device != nullptr ? server::ToText(event.device->peer) : "multicast";
  if (event.file != nullptr) line += "  " + event.file->device_path;
  if (event.kind == server::MulticastEventKind::kFileEnded && event.file != nullptr) {
    const FileFigures& file = *event.file;
    line +=
        Format("  %zu of %zu proven, %llu frames, %llu repairs", file.Count(DeviceState::kProven),
               file.devices.size(), static_cast<unsigned long long>(file.frames),
               static_cast<unsigned long long>(file.repair_frames));
  }
  if (!event.detail.empty()) line += "  (" + event.detail + ")";
  return line;
}

std::string FormatMulticast(const server::MulticastFigures& figures, std::size_t sessions,
                            std::uint64_t measured, std::size_t rows) {
  const FileFigures* const file = Current(figures);
  if (file == nullptr) return "";
  const std::uint32_t expected = file->expected;
  const double percent = file->block_count == 0
                             ? 0
                             : 100 * static_cast<double>(file->first_pass_frames) /
                                   static_cast<double>(file->block_count);
  std::string text = "multicast file " + std::to_string(figures.current + 1) + " of " +
                     std::to_string(sessions) + ", round " + std::to_string(figures.round) + ": " +
                     file->device_path + ", " + FormatBytes(file->size) + "\n";
  text += Format("%s  %.0f%%  joined %zu of %s  window %u  rate %s of %s  repairs %.1f%%\n",
                 std::string(server::PhaseName(file->phase)).c_str(), std::min(percent, 100.0),
                 file->devices.size(), expected == 0 ? "?" : std::to_string(expected).c_str(),
                 file->window, FormatRate(std::max<std::uint64_t>(measured, 1)).c_str(),
                 FormatRate(figures.rate).c_str(), RepairPercent(*file));
  text += ServerTroubles(figures);
  text += Format("%-21s %-9s %-11s %6s %10s %6s %8s  %s\n", "DEVICE", "STATE", "ROLE", "LOSS",
                 "ROUND TRIP", "NAKS", "OVERRUNS", "LAST HEARD");
  const auto devices = InOrder(*file);
  for (std::size_t i = 0; i < devices.size() && i < rows; ++i) text += DeviceRow(*devices[i]);
  if (devices.size() > rows) text += "... and " + std::to_string(devices.size() - rows) + " more\n";
  return text;
}

nlohmann::ordered_json MulticastProgressJson(const server::MulticastFigures& figures,
                                             std::uint64_t measured) {
  const FileFigures* const file = Current(figures);
  if (file == nullptr || !SendsBlocks(*file)) return nullptr;
  return {{"event", "multicast"},
          {"what", "progress"},
          {"file", file->device_path},
          {"phase", server::PhaseName(file->phase)},
          {"sent", file->first_pass_frames},
          {"blocks", file->block_count},
          {"repair_frames", file->repair_frames},
          {"joined", file->devices.size()},
          {"proven", file->Count(DeviceState::kProven)},
          {"window", file->window},
          {"rate", measured},
          {"loss", WorstLoss(*file)}};
}

std::string MulticastProgressLine(const server::MulticastFigures& figures, std::uint64_t measured) {
  const FileFigures* const file = Current(figures);
  if (file == nullptr || !SendsBlocks(*file)) return "";
  return Format(
      "           %-11.11s multicast  %llu of %u blocks, %llu repairs, %zu of %zu proven, "
      "window %u, %s, loss %.1f%%",
      std::string(server::PhaseName(file->phase)).c_str(),
      static_cast<unsigned long long>(file->first_pass_frames), file->block_count,
      static_cast<unsigned long long>(file->repair_frames), file->Count(DeviceState::kProven),
      file->devices.size(), file->window, FormatRate(std::max<std::uint64_t>(measured, 1)).c_str(),
      100 * WorstLoss(*file));
}

std::string FormatMulticastReport(const server::MulticastFigures& figures) {
  std::string text;
  std::uint64_t repairs = 0;
  std::size_t joined = 0, proven = 0;
  for (const FileFigures& file : figures.files) {
    repairs += file.repair_frames;
    joined += file.devices.size();
    proven += file.Count(DeviceState::kProven);
    text += Format("  %s: ", file.device_path.c_str());
    if (file.devices.empty()) {
      text += "nobody asked for it\n";
      continue;
    }
    text += Format(
        "%zu of %s proven, %llu frames, %llu repairs (%.1f%%), %.3f bytes on the wire "
        "a byte, %.1f s\n",
        file.Count(DeviceState::kProven), Plural(file.devices.size(), "device").c_str(),
        static_cast<unsigned long long>(file.frames),
        static_cast<unsigned long long>(file.repair_frames), RepairPercent(file),
        file.WirePerByte(), Seconds(file.ended - file.began));
    for (const DeviceFigures& device : file.devices) {
      if (device.state == DeviceState::kProven) continue;
      text += Format("    %s %s: %s, last heard %s\n", server::ToText(device.peer).c_str(),
                     std::string(server::StateName(device.state)).c_str(),
                     device.reason.empty() ? "the run was ended" : device.reason.c_str(),
                     device.last_heard.c_str());
    }
  }
  text += ServerTroubles(figures);
  return Format("multicast: %zu of %zu transfers proven, %llu frames sent, %llu of them repairs\n",
                proven, joined, static_cast<unsigned long long>(figures.frames_sent),
                static_cast<unsigned long long>(repairs)) +
         text;
}

std::uint64_t ParseRate(const std::string& text) {
  double value = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, value, std::chars_format::fixed);
  const std::string_view unit(stop, static_cast<std::size_t>(end - stop));
  double factor = 0;
  if (unit.empty()) factor = 1;
  if (unit == "k" || unit == "K") factor = 1e3;
  if (unit == "M" || unit == "m") factor = 1e6;
  if (unit == "G" || unit == "g") factor = 1e9;
  if (error != std::errc() || factor == 0 || !(value >= 0) || value * factor > 1e12) {
    throw Failure(ExitCode::kUsage, "rate", "\"" + text + "\" is no rate",
                  "give bits per second as 800k, 10M or 1.5G; 0 is no limit");
  }
  const auto rate = static_cast<std::uint64_t>(std::llround(value * factor));
  if (value > 0 && rate < kLeastRate) {
    throw Failure(ExitCode::kUsage, "rate", "\"" + text + "\" is too slow",
                  "devices give up when no block comes for half a minute: 10k is the least");
  }
  return rate;
}

std::string FormatRate(std::uint64_t bits_per_second) {
  if (bits_per_second == 0) return "no limit";
  const auto value = static_cast<double>(bits_per_second);
  if (value >= 1e9) return Format("%.1f Gbit/s", value / 1e9);
  if (value >= 1e6) return Format("%.1f Mbit/s", value / 1e6);
  return Format("%.1f kbit/s", value / 1e3);
}

void RateMeter::See(std::uint64_t bytes, Micros now) {
  if (when_ == Micros{0}) {
    bytes_ = bytes;
    when_ = now;
    return;
  }
  const Micros passed = now - when_;
  if (passed < std::chrono::seconds(1)) return;
  rate_ = static_cast<std::uint64_t>(static_cast<double>(bytes - bytes_) * 8 / Seconds(passed));
  bytes_ = bytes;
  when_ = now;
}

}  // namespace tools

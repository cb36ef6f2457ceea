#include "tools/device_table.h"

#include <algorithm>
#include <array>
#include <cinttypes>
#include <cstdio>
#include <vector>

namespace tools {
namespace {

double SecondsSince(server::Time start, server::Time when) {
  return std::chrono::duration<double>(when - start).count();
}

std::string StateOf(const server::DeviceRecord& device) {
  if (device.report) return device.report->error.empty() ? "done" : "failed";
  return device.requests == device.completed + device.not_found + device.aborted ? "waiting"
                                                                                 : "fetching";
}

std::string Cut(const std::string& text, std::size_t width) {
  return text.size() <= width ? text : "..." + text.substr(text.size() - (width - 3));
}

}  // namespace

std::string FormatBytes(std::uint64_t bytes) {
  static constexpr std::array<const char*, 5> kUnits = {"B", "KiB", "MiB", "GiB", "TiB"};
  auto value = static_cast<double>(bytes);
  std::size_t unit = 0;
  while (value >= 1000 && unit + 1 < kUnits.size()) {
    value /= 1024;
    ++unit;
  }
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), unit == 0 ? "%.0f %s" : "%.1f %s", value, kUnits[unit]);
  return text.data();
}

nlohmann::ordered_json ToJson(const server::DeviceRecord& device) {
  nlohmann::ordered_json json{
      {"device", device.key},
      {"address", device.address},
      {"type", device.identity.type},
      {"family", device.identity.family},
      {"model", device.identity.model},
      {"serial", device.identity.serial},
      {"core_name", device.identity.core_name},
      {"state", StateOf(device)},
      {"requests", device.requests},
      {"completed", device.completed},
      {"not_found", device.not_found},
      {"aborted", device.aborted},
      {"bytes", device.bytes},
      {"last_path", device.last_path},
      {"attempt", device.attempt},
      {"total", device.total},
      {"bundle_rx", device.bundle_rx},
      {"http_fallback", device.http_fallback},
      {"reports", device.reports},
      {"report", nullptr},
  };
  if (device.report) {
    json["report"] = {{"bundle_rx", device.report->bundle_rx},
                      {"http_fallback", device.report->http_fallback},
                      {"error", device.report->error}};
  }
  json["files"] = nlohmann::ordered_json::array();
  for (const auto& [path, file] : device.files) {
    json["files"].push_back({{"path", server::Printable(path, path.size())},
                             {"requests", file.requests},
                             {"completed", file.completed},
                             {"bytes", file.bytes}});
  }
  return json;
}

nlohmann::ordered_json ToJson(const server::Event& event, server::Time start) {
  nlohmann::ordered_json json{{"event", server::EventName(event.kind)},
                              {"seconds", SecondsSince(start, event.when)},
                              {"address", event.address}};
  if (event.device == nullptr) {
    json["detail"] = event.detail;
    return json;
  }
  const server::DeviceRecord& device = *event.device;
  json["device"] = device.key;
  if (event.kind == server::EventKind::kReport) {
    json["bundle_rx"] = event.bytes;
    json["http_fallback"] = device.http_fallback;
    json["error"] = event.detail;
    return json;
  }
  json["path"] = event.path;
  json["attempt"] = device.attempt;
  json["total"] = device.total;
  json["bytes"] = event.bytes;
  if (!event.detail.empty()) json["detail"] = event.detail;
  return json;
}

std::string ToLine(const server::Event& event, server::Time start) {
  std::array<char, 64> head{};
  std::snprintf(head.data(), head.size(), "%9.3f  %-11.11s ", SecondsSince(start, event.when),
                std::string(server::EventName(event.kind)).c_str());
  std::string line = head.data();
  line += event.device != nullptr ? event.device->key : event.address;
  if (!event.path.empty()) line += "  " + event.path;
  if (event.kind == server::EventKind::kReport) {
    line += "  fetched " + FormatBytes(event.bytes) + " by HTTP";
  } else if (event.bytes != 0) {
    line += "  " + FormatBytes(event.bytes);
  }
  if (!event.detail.empty()) line += "  (" + event.detail + ")";
  return line;
}

std::string FormatTable(const server::DeviceLedger& ledger, std::size_t rows) {
  std::vector<const server::DeviceRecord*> devices;
  for (const auto& [key, device] : ledger.devices()) devices.push_back(&device);
  std::sort(devices.begin(), devices.end(),
            [](const server::DeviceRecord* a, const server::DeviceRecord* b) {
              return a->last_seen != b->last_seen ? a->last_seen > b->last_seen : a->key < b->key;
            });
  std::array<char, 256> line{};
  std::snprintf(line.data(), line.size(), "%-20s %-15s %-8s %-9s %6s %10s  %s\n", "DEVICE",
                "ADDRESS", "MODEL", "STATE", "FILES", "SENT", "LAST FILE");
  std::string table = line.data();
  for (std::size_t i = 0; i < devices.size() && i < rows; ++i) {
    const server::DeviceRecord& device = *devices[i];
    std::snprintf(line.data(), line.size(), "%-20s %-15s %-8s %-9s %6" PRIu32 " %10s  %s\n",
                  Cut(device.key, 20).c_str(), Cut(device.address, 15).c_str(),
                  Cut(device.identity.model, 8).c_str(), StateOf(device).c_str(), device.completed,
                  FormatBytes(device.bytes).c_str(), Cut(device.last_path, 40).c_str());
    table += line.data();
  }
  if (devices.size() > rows) {
    table += "... and " + std::to_string(devices.size() - rows) + " more\n";
  }
  return table;
}

}  // namespace tools

#include "tools/fleet/fleet_report.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <nlohmann/json.hpp>

namespace fleet {
namespace {

using server::DeviceState;
using server::FileFigures;

double Seconds(sim::Micros time) {
  return static_cast<double>(time.count()) / 1e6;
}

/// What a fleet's report says of one file beyond the server's figures.
struct FileSummary {
  double ideal_frames;   ///< for each block
  double ideal_wire;     ///< bytes for each byte, with headers
  double first_to_last;  ///< seconds from the first block to the last device's settling
};

FileSummary Summarize(const Plan& plan, const FileFigures& file) {
  FileSummary summary{};
  summary.ideal_frames = IdealFrames(plan.devices, plan.link.loss);
  constexpr std::size_t kDataHeader = 6;
  if (file.block_size != 0) {
    summary.ideal_wire = summary.ideal_frames *
                         static_cast<double>(server::WireBytes(kDataHeader + file.block_size)) /
                         file.block_size;
  }
  if (file.ended > file.data_began) summary.first_to_last = Seconds(file.ended - file.data_began);
  return summary;
}

[[gnu::format(printf, 1, 2)]] std::string Line(const char* format, ...) {
  char line[256];
  va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(line, sizeof line, format, arguments);
  va_end(arguments);
  return std::string(line) + '\n';
}

unsigned long long Big(std::uint64_t number) {
  return number;
}

std::string FileText(const Plan& plan, const FileFigures& file) {
  const FileSummary summary = Summarize(plan, file);
  const double wire = file.WirePerByte();
  std::string text = file.device_path + "\n";
  text += Line("  blocks   %u of %u bytes, %u bytes in all", file.block_count,
               unsigned{file.block_size}, file.size);
  text += Line("  time     %.3f s from the first block to the last device", summary.first_to_last);
  text += Line("  frames   %llu first, %llu repairs, %llu control, %llu announcements",
               Big(file.first_pass_frames), Big(file.repair_frames), Big(file.control_frames),
               Big(file.announcements));
  text += Line("  wire     %.3f bytes a byte; at best %.3f, that is %.3f of it", wire,
               summary.ideal_wire, summary.ideal_wire > 0 ? wire / summary.ideal_wire : 0.0);
  text += Line("  answers  %llu NAK, %llu ACK, %llu ERROR", Big(file.naks), Big(file.acks),
               Big(file.errors));
  text += Line("  devices  %zu proven, %zu joined, %zu dead, %zu released",
               file.Count(DeviceState::kProven), file.Count(DeviceState::kJoined),
               file.Count(DeviceState::kDead), file.Count(DeviceState::kReleased));
  return text;
}

nlohmann::ordered_json FileJson(const Plan& plan, const FileFigures& file) {
  const FileSummary summary = Summarize(plan, file);
  return {{"path", file.device_path},
          {"bytes", file.size},
          {"block_size", file.block_size},
          {"blocks", file.block_count},
          {"seconds", summary.first_to_last},
          {"announcements", file.announcements},
          {"first_frames", file.first_pass_frames},
          {"repair_frames", file.repair_frames},
          {"control_frames", file.control_frames},
          {"frames", file.frames},
          {"wire_bytes", file.wire_bytes},
          {"wire_per_byte", file.WirePerByte()},
          {"ideal_wire_per_byte", summary.ideal_wire},
          {"ideal_frames_per_block", summary.ideal_frames},
          {"naks", file.naks},
          {"acks", file.acks},
          {"errors", file.errors},
          {"proven", file.Count(DeviceState::kProven)},
          {"joined", file.Count(DeviceState::kJoined)},
          {"dead", file.Count(DeviceState::kDead)},
          {"released", file.Count(DeviceState::kReleased)}};
}

}  // namespace

std::string TextReport(const Plan& plan, const Outcome& outcome) {
  std::string text = Line("%u devices, %.3g %% loss, seed %llu", plan.devices, plan.link.loss * 100,
                          Big(plan.seed));
  for (const FileFigures& file : outcome.figures.files) text += FileText(plan, file);
  const auto ended = static_cast<std::size_t>(
      std::count_if(outcome.devices.begin(), outcome.devices.end(),
                    [](const DeviceOutcome& device) { return device.ended; }));
  text += Line("clients    %zu of %u came to their end", ended, plan.devices);
  text += Line("files      %zu right, %zu wrong, %zu missing", outcome.Count(FileFate::kRight),
               outcome.Count(FileFate::kWrong), outcome.Count(FileFate::kMissing));
  text += Line("server     %.3f s%s", Seconds(outcome.run_ended - outcome.run_began),
               outcome.run_finished ? "" : ", NOT ENDED");
  return text;
}

nlohmann::ordered_json JsonReport(const Plan& plan, const Outcome& outcome) {
  nlohmann::ordered_json report = {
      {"event", "fleet"},
      {"devices", plan.devices},
      {"loss", plan.link.loss},
      {"seed", plan.seed},
      {"server_seconds", Seconds(outcome.run_ended - outcome.run_began)},
      {"server_finished", outcome.run_finished},
      {"frames_sent", outcome.figures.frames_sent},
      {"frames_received", outcome.figures.frames_received},
      {"wire_bytes", outcome.figures.wire_bytes},
      {"files_right", outcome.Count(FileFate::kRight)},
      {"files_wrong", outcome.Count(FileFate::kWrong)},
      {"files_missing", outcome.Count(FileFate::kMissing)},
      {"all_right", outcome.all_right()}};
  for (const FileFigures& file : outcome.figures.files) {
    report["files"].push_back(FileJson(plan, file));
  }
  return report;
}

}  // namespace fleet

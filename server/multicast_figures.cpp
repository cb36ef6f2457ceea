#include "server/multicast_figures.h"

#include <algorithm>

namespace server {

std::string_view StateName(DeviceState state) {
  switch (state) {
    case DeviceState::kJoined: return "joined";
    case DeviceState::kProven: return "proven";
    case DeviceState::kDead: return "dead";
    case DeviceState::kReleased: return "released";
  }
  return "";
}

std::string_view PhaseName(FilePhase phase) {
  switch (phase) {
    case FilePhase::kWaiting: return "waiting";
    case FilePhase::kAnnounced: return "announced";
    case FilePhase::kStreaming: return "streaming";
    case FilePhase::kRepairing: return "repairing";
    case FilePhase::kClosing: return "closing";
    case FilePhase::kLingering: return "lingering";
    case FilePhase::kFinished: return "finished";
  }
  return "";
}

std::string_view EventName(MulticastEventKind kind) {
  switch (kind) {
    case MulticastEventKind::kAnnounced: return "announced";
    case MulticastEventKind::kJoined: return "joined";
    case MulticastEventKind::kStarted: return "started";
    case MulticastEventKind::kMaster: return "master";
    case MulticastEventKind::kOverrun: return "overrun";
    case MulticastEventKind::kRepairing: return "repairing";
    case MulticastEventKind::kProven: return "proven";
    case MulticastEventKind::kDead: return "dead";
    case MulticastEventKind::kReleased: return "released";
    case MulticastEventKind::kFileEnded: return "file-ended";
    case MulticastEventKind::kRunEnded: return "run-ended";
    case MulticastEventKind::kRefused: return "refused";
    case MulticastEventKind::kNotStored: return "not-stored";
    case MulticastEventKind::kRival: return "rival";
  }
  return "";
}

std::size_t FileFigures::Count(DeviceState state) const {
  return static_cast<std::size_t>(
      std::count_if(devices.begin(), devices.end(),
                    [state](const DeviceFigures& device) { return device.state == state; }));
}

}  // namespace server

#include "server/ledger.h"

namespace server {
namespace {

constexpr std::size_t kMaxShownPath = 300;

std::string KeyOf(const Identity& identity, std::string_view address) {
  if (!identity.core_name.empty()) return identity.core_name;
  if (!identity.serial.empty()) return identity.serial;
  return std::string(address);
}

void Update(std::string& known, const std::string& said) {
  if (!said.empty()) known = said;
}

void Update(Identity& known, const Identity& said) {
  Update(known.type, said.type);
  Update(known.family, said.family);
  Update(known.model, said.model);
  Update(known.serial, said.serial);
  Update(known.core_name, said.core_name);
}

Event About(EventKind kind, const DeviceRecord& device, Time now) {
  Event event;
  event.kind = kind;
  event.when = now;
  event.device = &device;
  event.address = device.address;
  return event;
}

}  // namespace

std::string_view EventName(EventKind kind) {
  switch (kind) {
    case EventKind::kRequest: return "request";
    case EventKind::kSent: return "sent";
    case EventKind::kAborted: return "aborted";
    case EventKind::kNotFound: return "not-found";
    case EventKind::kReport: return "report";
    case EventKind::kBadRequest: return "bad-request";
  }
  return "";
}

DeviceRecord& DeviceLedger::Find(const Request& request, std::string_view address, Time now) {
  std::string key = KeyOf(request.identity, address);
  auto found = devices_.find(key);
  if (found == devices_.end() && devices_.size() >= max_devices_) {
    key = kOthers;
    found = devices_.find(key);
  }
  if (found == devices_.end()) {
    found = devices_.emplace(key, DeviceRecord{}).first;
    found->second.key = key;
    found->second.first_seen = now;
  }
  DeviceRecord& device = found->second;
  device.address = address;
  device.last_seen = now;
  Update(device.identity, request.identity);
  if (request.bundle_rx) device.bundle_rx = *request.bundle_rx;
  if (request.http_fallback) device.http_fallback = *request.http_fallback;
  return device;
}

DeviceRecord& DeviceLedger::OnRequest(const Request& request, std::string_view address,
                                      std::uint64_t size, Time now) {
  DeviceRecord& device = Find(request, address, now);
  ++device.requests;
  ++device.files[request.path].requests;
  device.last_path = Printable(request.path, kMaxShownPath);
  device.attempt = request.attempt;
  device.total = request.total;
  Event event = About(EventKind::kRequest, device, now);
  event.path = device.last_path;
  event.bytes = size;
  Tell(event);
  return device;
}

void DeviceLedger::OnNotFound(const Request& request, std::string_view address, Time now) {
  DeviceRecord& device = Find(request, address, now);
  ++device.requests;
  ++device.not_found;
  device.last_path = Printable(request.path, kMaxShownPath);
  device.attempt = request.attempt;
  device.total = request.total;
  Event event = About(EventKind::kNotFound, device, now);
  event.path = device.last_path;
  Tell(event);
}

void DeviceLedger::OnBytes(DeviceRecord& device, std::string_view path, std::size_t count,
                           Time now) {
  device.bytes += count;
  device.last_seen = now;
  const auto file = device.files.find(path);
  if (file != device.files.end()) file->second.bytes += count;
}

void DeviceLedger::OnSent(DeviceRecord& device, std::string_view path, std::uint64_t size,
                          Time now) {
  ++device.completed;
  const auto file = device.files.find(path);
  if (file != device.files.end()) ++file->second.completed;
  Event event = About(EventKind::kSent, device, now);
  event.path = Printable(path, kMaxShownPath);
  event.bytes = size;
  Tell(event);
}

void DeviceLedger::OnAborted(DeviceRecord& device, std::string_view path, std::uint64_t sent,
                             std::string_view why, Time now) {
  ++device.aborted;
  Event event = About(EventKind::kAborted, device, now);
  event.path = Printable(path, kMaxShownPath);
  event.bytes = sent;
  event.detail = why;
  Tell(event);
}

void DeviceLedger::OnReport(const Request& request, std::string_view address, Time now) {
  DeviceRecord& device = Find(request, address, now);
  ++device.reports;
  device.report = JobReport{request.bundle_rx.value_or(0), request.http_fallback.value_or(false),
                            request.error};
  Event event = About(EventKind::kReport, device, now);
  event.bytes = device.report->bundle_rx;
  event.detail = request.error;
  Tell(event);
}

void DeviceLedger::OnBadRequest(std::string_view address, std::string_view why, Time now) {
  ++bad_requests_;
  Event event;
  event.kind = EventKind::kBadRequest;
  event.when = now;
  event.address = address;
  event.detail = why;
  Tell(event);
}

void DeviceLedger::Tell(const Event& event) const {
  if (listener_) listener_(event);
}

}  // namespace server

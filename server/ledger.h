// What the server knows of each device: who it is, what it fetched, how its job ended.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "server/moment.h"
#include "server/request.h"

namespace server {

/// One file of the bundle, as one device fetched it.
struct FetchRecord {
  std::uint32_t requests = 0;
  std::uint32_t completed = 0;  ///< times the whole body went out
  std::uint64_t bytes = 0;      ///< body bytes sent in all
};

/// The device's own words at the end of its job.
struct JobReport {
  std::uint32_t bundle_rx = 0;  ///< bytes it fetched by HTTP
  bool http_fallback = false;
  std::string error;  ///< empty: the job succeeded
};

struct DeviceRecord {
  std::string key;      ///< what it is known by: core name, else serial number, else address
  std::string address;  ///< peer address of its latest connection
  Identity identity;    ///< of its latest request that said so

  std::uint32_t requests = 0;   ///< for files, answered or not
  std::uint32_t completed = 0;  ///< files sent whole
  std::uint32_t not_found = 0;  ///< requests for what is not in the bundle
  std::uint32_t aborted = 0;    ///< bodies cut short by either side
  std::uint64_t bytes = 0;      ///< body bytes sent

  std::string last_path;
  std::uint32_t attempt = 0;  ///< numbers of its latest request, as the device counts
  std::uint32_t total = 0;
  std::uint32_t bundle_rx = 0;  ///< as of its latest message
  bool http_fallback = false;

  std::map<std::string, FetchRecord, std::less<>> files;  ///< by path; files of the bundle only

  std::uint32_t reports = 0;
  std::optional<JobReport> report;  ///< the latest

  Time first_seen{};
  Time last_seen{};
};

enum class EventKind : std::uint8_t {
  kRequest,     ///< a file is about to be sent
  kSent,        ///< its last byte has gone out
  kAborted,     ///< the connection ended within its body
  kNotFound,    ///< nothing of that name is in the bundle, or may be
  kReport,      ///< the device's job is over
  kBadRequest,  ///< something that is not a device's request; there is no record
};

/// A word for an event, as the live output shows it: "request", "sent", "not-found", ...
[[nodiscard]] std::string_view EventName(EventKind kind);

struct Event {
  EventKind kind{};
  Time when{};
  const DeviceRecord* device = nullptr;  ///< null for kBadRequest
  std::string address;
  std::string path;         ///< printable; empty for kReport and kBadRequest
  std::uint64_t bytes = 0;  ///< size of the file, or body bytes sent so far for kAborted
  std::string detail;       ///< one line more, for people
};

/// The records of all devices, kept for as long as the server runs. A stranger can invent names
/// without end, so at most `max_devices` are kept apart; whoever comes later shares one record
/// under kOthers. Not for several threads at once.
class DeviceLedger {
 public:
  static constexpr std::string_view kOthers = "(others)";
  static constexpr std::size_t kDefaultMaxDevices = 20000;

  explicit DeviceLedger(std::size_t max_devices = kDefaultMaxDevices) : max_devices_(max_devices) {}

  /// Called after each change, with the ledger up to date. Must not change the ledger.
  void SetListener(std::function<void(const Event&)> listener) { listener_ = std::move(listener); }

  /// A device asks for a file that will be sent. The record stays valid as long as the ledger.
  DeviceRecord& OnRequest(const Request& request, std::string_view address, std::uint64_t size,
                          Time now);
  void OnNotFound(const Request& request, std::string_view address, Time now);
  void OnBytes(DeviceRecord& device, std::string_view path, std::size_t count, Time now);
  void OnSent(DeviceRecord& device, std::string_view path, std::uint64_t size, Time now);
  void OnAborted(DeviceRecord& device, std::string_view path, std::uint64_t sent,
                 std::string_view why, Time now);
  void OnReport(const Request& request, std::string_view address, Time now);
  void OnBadRequest(std::string_view address, std::string_view why, Time now);

  [[nodiscard]] const std::map<std::string, DeviceRecord, std::less<>>& devices() const {
    return devices_;
  }
  [[nodiscard]] std::uint64_t bad_requests() const { return bad_requests_; }

 private:
  DeviceRecord& Find(const Request& request, std::string_view address, Time now);
  void Tell(const Event& event) const;

  const std::size_t max_devices_;
  std::map<std::string, DeviceRecord, std::less<>> devices_;
  std::uint64_t bad_requests_ = 0;
  std::function<void(const Event&)> listener_;
};

}  // namespace server

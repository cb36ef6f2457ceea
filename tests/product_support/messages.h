// What a management system hears of an upgrade, as tests expect and record it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

#include "device/device.h"
#include "orvenix/configlet.h"

namespace test {

/// The one line of a ready-to-work status.
std::string StatusText(int state, const std::string& reason);

/// The one line of a device event; `text` as it stands within a document.
/// @param timestamp  empty: the event has none
std::string EventText(const std::string& timestamp, const std::string& unique_id,
                      std::uint32_t code, const std::string& text = "");

/// Stands in a MessageRecord for the device's local time at which the message was sent.
inline constexpr char kNow[] = "(now)";

/// Records what a device sends, in order, as "host: ..." or "NAME: ..." or "NAME@MASTER: ...".
class MessageRecord {
 public:
  /// Listens at the queue from now on.
  explicit MessageRecord(sim::Device& device);
  /// Leaves the statuses to the queue, too. The device must still be there.
  ~MessageRecord();
  MessageRecord(const MessageRecord&) = delete;
  MessageRecord& operator=(const MessageRecord&) = delete;

  /// Makes this the host: statuses come here from now on.
  void TakeStatuses();
  /// The queue gets them again.
  static void LeaveStatuses();

  [[nodiscard]] std::vector<std::string> Lines() const;

 private:
  static int TakeStatus(std::uintptr_t context, const char* text, std::int32_t length,
                        const IcfgCallbacks* table);
  void Add(std::string line);

  sim::Device& device_;
  std::size_t listener_ = 0;
  IcfgCallbacks callbacks_{};
  bool is_host_ = false;  ///< has been at some time
  mutable std::mutex mutex_;
  std::vector<std::string> lines_;
};

}  // namespace test

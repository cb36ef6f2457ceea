// What the tests of the link to the message queue share.
#pragma once

#include <gmock/gmock.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "faults/faults.h"
#include "library/management_queue.h"
#include "product_support/log_lines.h"
#include "product_support/messages.h"
#include "report/messages/message_link.h"
#include "support/device_test.h"
#include "trace/trace.h"

namespace report {

using test::EventText;
using test::kNow;
using test::ReadLog;
using test::StatusText;

inline constexpr const char* kTime = "2006/03/01:14:05:09";  // at which a virtual world begins

inline constexpr const char* kLoad = "Orvenix - InitKXTransfer - LoadLibrary\r\n";
inline constexpr const char* kFind = "Orvenix - InitKXTransfer - GetHandles\r\n";
inline constexpr const char* kOpen = "Orvenix - InitKXTransfer - open\r\n";
inline const std::string kStart = std::string(kLoad) + kFind + kOpen;
inline constexpr const char* kStatusEntered = "Orvenix - SetRWIStatus - entering\r\n";
inline constexpr const char* kStatusSent =
    "Orvenix - SetRWIStatus - send msg\r\nOrvenix - SetRWIStatus - send msg lapi write\r\n";
inline constexpr const char* kEventEntered = "Orvenix - SendDeviceEvent - entering\r\n";

/// What an event's sending logs, by an open connection.
inline std::string EventLog(const std::string& id, std::uint32_t code, const std::string& text) {
  return kEventEntered + std::string(kTime) + "Orvenix - SendDeviceEvent - send msg\r\n" +
         EventText(kTime, id, code, text) + "\r\n";
}

/// Each test runs in a process of its own: the link lives as long as its process.
class MessageLinkTest : public DeviceTest {
 protected:
  MessageLinkTest() { Restart({}); }
  ~MessageLinkTest() override { device().trace().SetSink(nullptr); }

  void Restart(const sim::Profile& profile) {
    record_.reset();
    DeviceTest::Restart(profile);
    record_ = std::make_unique<test::MessageRecord>(device());
    device().trace().SetSink([this](std::string_view line) { trace_.emplace_back(line); });
  }
  void RestartWith(const char* library, const char* lacks, bool opens = true) {
    sim::Profile profile;
    profile.message_library = library;
    profile.message_library_lacks = lacks;
    profile.message_queue_opens = opens;
    Restart(profile);
  }

  [[nodiscard]] test::MessageRecord& record() { return *record_; }
  [[nodiscard]] std::vector<std::string> Sent() const { return record_->Lines(); }
  std::uint64_t Calls(const char* call) { return device().faults().Count(call); }

  /// The trace of all calls of that name, from their arguments to their results; the last error,
  /// which the library leaves alone, is left out.
  [[nodiscard]] std::vector<std::string> Traced(const std::string& call) const {
    std::vector<std::string> found;
    for (const std::string& line : trace_) {
      const std::size_t at = line.find("\"call\":\"" + call + "\",");
      if (at == std::string::npos) continue;
      const std::size_t from = line.find("\"args\"");
      found.push_back(line.substr(from, line.rfind(",\"error\"") - from));
    }
    return found;
  }

 private:
  std::unique_ptr<test::MessageRecord> record_;
  std::vector<std::string> trace_;
};

}  // namespace report

#include "product_support/messages.h"

#include <cstdio>
#include <cstring>

#include "library/management_queue.h"
#include "locale/clock.h"

namespace test {
namespace {

std::string Field(const std::string& name, const std::string& value) {
  const std::string begin = "<Field Name=\"" + name + "\"";
  return value.empty() ? begin + "/>" : begin + ">" + value + "</Field>";
}

std::string Tabs(std::size_t count) {
  return std::string(count, '\t');
}
std::string Blanks(std::size_t count) {
  return std::string(count, ' ');
}

/// The text with the device's time of now replaced by kNow.
std::string WithoutTime(const sim::Device& device, std::string text) {
  const auto now = sim::ToCalendar(sim::ToLocalTicks(device, sim::SystemTicks(device)));
  char time[64];
  std::snprintf(time, sizeof time, "%04d/%02d/%02d:%02d:%02d:%02d", now->wYear, now->wMonth,
                now->wDay, now->wHour, now->wMinute, now->wSecond);
  const std::size_t at = text.find(time);
  if (at != std::string::npos) text.replace(at, std::strlen(time), kNow);
  return text;
}

}  // namespace

std::string StatusText(int state, const std::string& reason) {
  return R"(<?xml version="1.0" encoding="UTF-8"?>)" + Tabs(7) + R"(<DevInfo Action="Set">)" +
         Tabs(7) + Blanks(3) + R"(<Subsystem Name="TW_Client">)" + Blanks(24) + Tabs(2) +
         Blanks(3) + R"(<Group Name="Ready-to-Work">)" + Tabs(3) + Blanks(24) +
         Field("State", std::to_string(state)) + Tabs(3) + Blanks(24) + "<Field Name=\"Reason\">" +
         reason + "</Field>" + Blanks(24) + Tabs(2) + Blanks(3) + "</Group>" + Blanks(27) +
         Tabs(1) + Blanks(3) + "</Subsystem>" + Tabs(7) + Blanks(3) + "</DevInfo>";
}

std::string EventText(const std::string& timestamp, const std::string& unique_id,
                      std::uint32_t code, const std::string& text) {
  return R"(<?xml version="1.0" encoding="UTF-8"?><DevInfo Action="Notify">)"
         R"(<Subsystem Name="TW_EVENT_DB"><Group Name="errorLogMsg">)" +
         (timestamp.empty() ? Field("timestamp", "0") : Field("timestampString", timestamp)) +
         Field("system", "20") + Field("subsystem", "TW_UPGD_SRVR") + Field("uniqueId", unique_id) +
         Field("msgNum", std::to_string(code)) + Field("fcnName", "SendDeviceEvent") +
         Field("severity", "3") + Field("lineNum", "1") + Field("optArgArrayElement", text) +
         Field("systemRc", "0") + "</Group></Subsystem></DevInfo>";
}

MessageRecord::MessageRecord(sim::Device& device) : device_(device) {
  callbacks_.set_data = &TakeStatus;
  listener_ = device.messages().Listen([this](const sim::QueuedMessage& message) {
    const std::string to =
        message.destination + (message.master.empty() ? "" : "@" + message.master) + ": ";
    Add(to + WithoutTime(device_, message.text));
  });
}

MessageRecord::~MessageRecord() {
  if (is_host_) LeaveStatuses();
  device_.messages().StopListening(listener_);
}

void MessageRecord::TakeStatuses() {
  is_host_ = true;
  IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(this), &callbacks_);
}

void MessageRecord::LeaveStatuses() {
  IcfgSetCallbacks(0, nullptr);
}

std::vector<std::string> MessageRecord::Lines() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return lines_;
}

// A length that does not count the zero, or another table, makes a line that no test expects.
int MessageRecord::TakeStatus(std::uintptr_t context, const char* text, std::int32_t length,
                              const IcfgCallbacks* table) {
  auto* const record = reinterpret_cast<MessageRecord*>(context);
  const bool right =
      length == static_cast<std::int32_t>(std::strlen(text)) + 1 && table == &record->callbacks_;
  record->Add((right ? "host: " : "host, wrongly called: ") + std::string(text));
  return 0;
}

void MessageRecord::Add(std::string line) {
  const std::lock_guard<std::mutex> hold(mutex_);
  lines_.push_back(std::move(line));
}

}  // namespace test

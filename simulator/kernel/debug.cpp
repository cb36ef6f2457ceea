#include "kernel/debug.h"

#include <cstdarg>
#include <utility>

#include "ce/kernel.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "kernel/wide_format.h"
#include "locale/code_pages.h"
#include "world/sim_thread.h"

namespace sim {
namespace {

constexpr std::size_t kRecordsKept = 65536;
constexpr std::size_t kConsoleKept = 65536;

void Keep(std::deque<Debug::Record>& records, Debug::Record record) {
  if (records.size() == kRecordsKept) records.pop_front();
  records.push_back(std::move(record));
}

std::string Join(const std::vector<Debug::Record>& records) {
  std::string text;
  for (const Debug::Record& record : records) text += ToUtf8(record.text);
  return text;
}

}  // namespace

std::vector<Debug::Record> Debug::OutputRecords() const {
  const std::lock_guard<std::mutex> guard(mutex_);
  return {output_.begin(), output_.end()};
}

std::vector<Debug::Record> Debug::KernelRecords() const {
  const std::lock_guard<std::mutex> guard(mutex_);
  return {kernel_.begin(), kernel_.end()};
}

std::string Debug::OutputText() const {
  return Join(OutputRecords());
}

std::string Debug::KernelText() const {
  return Join(KernelRecords());
}

std::string Debug::ConsoleText() const {
  const std::lock_guard<std::mutex> guard(mutex_);
  return console_;
}

void Debug::Clear() {
  const std::lock_guard<std::mutex> guard(mutex_);
  console_.clear();
  output_.clear();
  kernel_.clear();
}

void Debug::SetListener(Listener listener) {
  const std::lock_guard<std::mutex> guard(mutex_);
  listener_ = std::move(listener);
}

void Debug::AddOutput(Record record) {
  const std::lock_guard<std::mutex> guard(mutex_);
  if (listener_) listener_(ToUtf8(record.text));
  Keep(output_, std::move(record));
}

void Debug::AddKernel(Record record) {
  const std::lock_guard<std::mutex> guard(mutex_);
  Keep(kernel_, std::move(record));
}

void Debug::AddConsole(std::string_view text) {
  const std::lock_guard<std::mutex> guard(mutex_);
  if (console_.size() > 2 * kConsoleKept) console_.erase(0, console_.size() - kConsoleKept);
  console_ += text;
}

}  // namespace sim

extern "C" {

void OutputDebugStringW(const WCHAR* text) {
  sim::ApiCall call("OutputDebugStringW", sim::kCannotFail);
  call.Argument("text", text);
  if (text == nullptr) return;
  call.device().debug().AddOutput({call.world().now(), call.thread().id, text});
}

void NKDbgPrintfW(const WCHAR* format, ...) {
  sim::ApiCall call("NKDbgPrintfW", sim::kCannotFail);
  call.Argument("format", format);
  if (format == nullptr) return;
  std::va_list arguments;
  va_start(arguments, format);
  std::u16string text = sim::FormatWide(format, arguments);
  va_end(arguments);
  call.device().debug().AddKernel({call.world().now(), call.thread().id, std::move(text)});
}

}  // extern "C"

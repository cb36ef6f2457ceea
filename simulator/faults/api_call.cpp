#include "faults/api_call.h"

#include <cstdio>
#include <cstdlib>

#include "device/device.h"
#include "faults/faults.h"
#include "trace/trace.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace sim {
namespace {

/// Handles are small numbers and equal in equal runs; an address is neither and would make every
/// trace different.
constexpr std::uintptr_t kHighestHandle = 0x00FFFFFF;

/// A thread that calls this often and never waits is caught in a loop: nothing else of its virtual
/// world will ever run again.
constexpr std::uint32_t kCallsWithoutWait = 5'000'000;

[[noreturn]] void DieInLoop(const SimThread& thread, const char* call) {
  std::fprintf(stderr, "cesim: thread %u \"%s\" never waits, its last call is %s\n", thread.id,
               thread.name.c_str(), call);
  std::abort();
}

void AppendPointer(std::string& out, std::uintptr_t value) {
  const bool root_key = value >= 0x80000000U && value <= 0x8000000FU;
  if (value == ~static_cast<std::uintptr_t>(0)) {
    out += "-1";
  } else if (value <= kHighestHandle || root_key) {
    out += std::to_string(value);
  } else {
    out += "\"address\"";
  }
}

}  // namespace

ApiCall::ApiCall(const char* name, std::uint32_t usual_error)
    : name_(name), thread_(World::Current()) {
  if (thread_ == nullptr) {
    std::fprintf(stderr, "cesim: %s called by a thread that belongs to no simulated device\n",
                 name);
    std::abort();
  }
  device_ = thread_->device;
  outer_call_ = thread_->call.load(std::memory_order_relaxed);
  thread_->call.store(name, std::memory_order_relaxed);
  if (++thread_->calls == kCallsWithoutWait && world().is_virtual()) DieInLoop(*thread_, name);
  traced_ = device_->trace().on();
  const bool can_fail = usual_error != kCannotFail;
  failed_ = device_->faults().Enter(name, can_fail, usual_error, fault_error_);
  if (failed_) thread_->last_error = fault_error_;
}

ApiCall::~ApiCall() {
  thread_->call.store(outer_call_, std::memory_order_relaxed);
  if (traced_) WriteTrace();
}

World& ApiCall::world() const {
  return device_->world();
}

void ApiCall::SetError(std::uint32_t error) {
  thread_->last_error = error;
}

void ApiCall::StartArgument(const char* name) {
  if (!arguments_.empty()) arguments_ += ',';
  AppendJsonText(arguments_, std::string_view(name));
  arguments_ += ':';
}

void ApiCall::Argument(const char* name, const WCHAR* text) {
  if (!traced_) return;
  StartArgument(name);
  if (text == nullptr) {
    arguments_ += "null";
  } else {
    AppendJsonText(arguments_, std::u16string_view(text));
  }
}

void ApiCall::Argument(const char* name, const char* text) {
  if (!traced_) return;
  StartArgument(name);
  if (text == nullptr) {
    arguments_ += "null";
  } else {
    AppendJsonText(arguments_, std::string_view(text));
  }
}

void ApiCall::Argument(const char* name, std::int64_t value) {
  if (!traced_) return;
  StartArgument(name);
  arguments_ += std::to_string(value);
}

void ApiCall::Argument(const char* name, const void* handle) {
  if (!traced_) return;
  StartArgument(name);
  AppendPointer(arguments_, reinterpret_cast<std::uintptr_t>(handle));
}

void ApiCall::NoteResult(std::int64_t result) {
  if (traced_) result_ = std::to_string(result);
}

void ApiCall::NoteResult(const void* result) {
  if (!traced_) return;
  result_.clear();
  AppendPointer(result_, reinterpret_cast<std::uintptr_t>(result));
}

void ApiCall::WriteTrace() {
  std::string line = "{\"us\":" + std::to_string(world().now().count());
  line += ",\"thread\":" + std::to_string(thread_->id);
  line += ",\"call\":\"";
  line += name_;
  line += "\",\"args\":{" + arguments_ + '}';
  if (thread_->leaving) {
    line += ",\"ended\":true}";
  } else {
    if (!result_.empty()) line += ",\"result\":" + result_;
    line += ",\"error\":" + std::to_string(thread_->last_error);
    line += failed_ ? ",\"fault\":true}" : "}";
  }
  device_->trace().Write(line);
}

}  // namespace sim

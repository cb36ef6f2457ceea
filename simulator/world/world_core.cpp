#include "world/world_core.h"

#include <unistd.h>
#include <unwind.h>

#include <algorithm>
#include <chrono>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>

#include "device/device.h"
#include "profile/profile.h"

// Present only under the address sanitizer: abandoned frames leave marks on the stack.
// NOLINTNEXTLINE(bugprone-reserved-identifier, readability-identifier-naming): the sanitizer's name
extern "C" __attribute__((weak)) void __asan_handle_no_return();
// NOLINTNEXTLINE(bugprone-reserved-identifier, readability-identifier-naming): the sanitizer's name
extern "C" __attribute__((weak)) void __asan_unpoison_memory_region(const volatile void*,
                                                                    std::size_t);

namespace sim {
namespace {

thread_local SimThread* current_thread = nullptr;
thread_local _Unwind_Exception abandon;

/// How long, on the host's clock, threads may take to reach a blocking call when they are ended.
constexpr std::chrono::seconds kEndPatience{30};

// The marks that frames left by unwinding have put on the stack, down to those that the frames of
// what comes next would meet.
void ForgetMarks(const SimThread& thread) {
  if (__asan_unpoison_memory_region == nullptr) return;
  constexpr std::uintptr_t kBelow = 16 * 1024;
  const auto low = reinterpret_cast<std::uintptr_t>(__builtin_frame_address(0)) - kBelow;
  const auto high = reinterpret_cast<std::uintptr_t>(thread.first_frame);
  __asan_unpoison_memory_region(reinterpret_cast<const void*>(low), high - low);
}

void AbandonCaught(_Unwind_Reason_Code /*reason*/, _Unwind_Exception* /*exception*/) {
  std::fputs("cesim: a catch (...) swallowed the termination of a simulated thread\n", stderr);
  std::abort();
}

// Called for each frame on the way out. Frames that cannot be unwound end the walk early: what lies
// above them is product code, which is not cleaned up anyway.
_Unwind_Reason_Code StopAtFirstFrame(int /*version*/, _Unwind_Action actions,
                                     _Unwind_Exception_Class /*kind*/,
                                     _Unwind_Exception* /*exception*/, _Unwind_Context* context,
                                     void* argument) {
  auto& thread = *static_cast<SimThread*>(argument);
  const bool at_end = (actions & _UA_END_OF_STACK) != 0;
  if (at_end || _Unwind_GetCFA(context) > reinterpret_cast<std::uintptr_t>(thread.first_frame)) {
    ForgetMarks(thread);
    std::longjmp(thread.way_out, 1);
  }
  return _URC_NO_REASON;
}

const char* StateName(SimThread::State state) {
  switch (state) {
    case SimThread::State::kSuspended: return "suspended";
    case SimThread::State::kReady: return "ready";
    case SimThread::State::kRunning: return "running";
    case SimThread::State::kBlocked: return "waiting";
    case SimThread::State::kFinished: return "ended";
  }
  return "";
}

}  // namespace

SimThread* World::Current() {
  return current_thread;
}

void WorldCore::SetCurrent(SimThread* thread) {
  current_thread = thread;
}

SimThread& WorldCore::Caller(const char* what) const {
  SimThread* thread = current_thread;
  if (thread == nullptr || thread->world != this) {
    std::fprintf(stderr, "cesim: %s by a thread that is not of this world\n", what);
    std::abort();
  }
  return *thread;
}

void WorldCore::EnterQueues(SimThread& thread, const Queues& queues) {
  thread.waits_on = queues;
  for (WaitQueue* queue : queues) queue->waiting_.push_back(&thread);
}

void WorldCore::LeaveQueues(SimThread& thread) {
  for (WaitQueue* queue : thread.waits_on) {
    auto& waiting = queue->waiting_;
    waiting.erase(std::remove(waiting.begin(), waiting.end(), &thread), waiting.end());
  }
  thread.waits_on.clear();
}

void WorldCore::Notify(WaitQueue& queue) {
  if (queue.waiting_.empty()) return;
  // Taken out at once, so that many waiters do not search the list for themselves one by one.
  std::vector<SimThread*> woken = std::exchange(woken_, {});
  woken.swap(queue.waiting_);
  for (SimThread* thread : woken) Wakeup(*thread);
  woken.clear();
  woken_ = std::move(woken);
}

// ---- timers ----

// Waits of one length come due in the order of their beginnings: most timers belong at the end.
void WorldCore::StartTimer(SimThread& thread, Micros due) {
  thread.timer_due = due;
  thread.timer_number = next_timer_++;
  if (thread.spare_timer.empty()) {
    thread.timer = timers_.emplace_hint(timers_.end(), std::pair{due, thread.timer_number},
                                        WorldTimer{&thread, nullptr});
  } else {
    thread.spare_timer.key() = {due, thread.timer_number};
    thread.timer = timers_.insert(timers_.end(), std::move(thread.spare_timer));
  }
}

void WorldCore::StopTimer(SimThread& thread) {
  if (thread.timer_number == 0) return;
  thread.spare_timer = timers_.extract(thread.timer);
  thread.timer_number = 0;
}

WorldTimer WorldCore::PopTimer() {
  const auto first = timers_.begin();
  if (SimThread* const thread = first->second.thread) {
    StopTimer(*thread);
    return {thread, nullptr};
  }
  action_due_.erase(first->first.second);
  return std::move(timers_.extract(first).mapped());
}

std::uint64_t WorldCore::At(Micros when, std::function<void()> action) {
  const std::uint64_t number = next_timer_++;
  timers_.emplace(std::pair{when, number}, WorldTimer{nullptr, std::move(action)});
  action_due_.emplace(number, when);
  ActionAdded();
  return number;
}

void WorldCore::Cancel(std::uint64_t action) {
  const auto found = action_due_.find(action);
  if (found == action_due_.end()) return;
  timers_.erase({found->second, action});
  action_due_.erase(found);
}

// ---- threads ----

SimThread& WorldCore::NewThread(Device& device, std::string name) {
  auto thread = std::make_unique<SimThread>();
  thread->id = ++next_thread_id_;
  thread->world = this;
  thread->device = &device;
  thread->name = std::move(name);
  threads_.push_back(std::move(thread));
  return *threads_.back();
}

SimThread& WorldCore::NewAttached(Device& device, std::string name) {
  SimThread& thread = NewThread(device, std::move(name));
  thread.attached = true;
  thread.outer = current_thread;
  if (thread.outer != nullptr && thread.outer->world == this) {
    thread.runs_on = thread.outer->runs_on;
  }
  current_thread = &thread;
  ++attached_;
  return thread;
}

SimThread& WorldCore::Spawn(Device& device, std::string name, std::function<std::uint32_t()> body,
                            bool suspended) {
  JoinEnded();
  SimThread& thread = NewThread(device, std::move(name));
  thread.body = std::move(body);
  thread.state = SimThread::State::kSuspended;
  try {
    Equip(thread);
  } catch (...) {
    threads_.pop_back();
    throw;
  }
  if (!suspended) Resume(thread);
  return thread;
}

void WorldCore::Equip(SimThread& thread) {
  thread.host = std::thread([this, &thread] { ThreadMain(thread); });
}

void WorldCore::Resume(SimThread& thread) {
  if (thread.state == SimThread::State::kSuspended) Wakeup(thread);
}

void WorldCore::Terminate(SimThread& thread, std::uint32_t exit_code) {
  if (thread.attached || thread.terminate || thread.state == SimThread::State::kFinished) return;
  thread.terminate = true;
  thread.code_to_leave_with = exit_code;
  if (thread.state == SimThread::State::kSuspended || thread.state == SimThread::State::kBlocked) {
    Wakeup(thread);
  }
}

void WorldCore::ThreadMain(SimThread& thread) {
  SetCurrent(&thread);
  Lock lock = Acquire();
  AwaitFirstTurn(thread, lock);
  if (!thread.terminate) {
    lock.unlock();
    RunBody(thread);
    lock.lock();
  }
  thread.body = nullptr;
  if (thread.wake_file >= 0) close(thread.wake_file);
  thread.wake_file = -1;
  Finish(thread, thread.terminate ? thread.code_to_leave_with : thread.code_of_body);
  ended_.push_back(&thread);
  thread_ended_.notify_all();
  Ended(thread);
}

__attribute__((noinline)) void WorldCore::RunBody(SimThread& thread) {
  thread.first_frame = __builtin_frame_address(0);
  if (setjmp(thread.way_out) != 0) return;
  thread.code_of_body = thread.body();
}

void WorldCore::Leave(SimThread& thread) {
  thread.leaving = true;
  if (__asan_handle_no_return != nullptr) __asan_handle_no_return();
  abandon = {};
  abandon.exception_cleanup = AbandonCaught;
  _Unwind_ForcedUnwind(&abandon, StopAtFirstFrame, &thread);
  std::longjmp(thread.way_out, 1);
}

void WorldCore::Finish(SimThread& thread, std::uint32_t exit_code) {
  thread.state = SimThread::State::kFinished;
  thread.exit_code = exit_code;
  thread.call = nullptr;
  if (thread.attached) --attached_;
  const std::vector<ThreadEndListener*> listeners = std::exchange(thread.end_listeners, {});
  for (ThreadEndListener* listener : listeners) listener->ThreadEnded(thread);
  Notify(thread.finished);
}

// A thread on this list has given up the lock for the last time, so joining it under the lock ends.
void WorldCore::JoinEnded() {
  for (SimThread* thread : ended_) {
    if (thread->host.joinable()) thread->host.join();
  }
  ended_.clear();
}

// ---- ends ----

void WorldCore::EndThreadsWhere(const std::function<bool(const SimThread&)>& chosen) {
  Lock lock = Acquire();
  std::vector<SimThread*> ending;
  for (const auto& thread : threads_) {
    const bool done = thread->state == SimThread::State::kFinished;
    if (done || thread->attached || thread.get() == current_thread || !chosen(*thread)) continue;
    ending.push_back(thread.get());
    Terminate(*thread, 0);
  }
  const bool of_this_world = current_thread != nullptr && current_thread->world == this;
  for (SimThread* thread : ending) {
    const auto gone = [thread] { return thread->state == SimThread::State::kFinished; };
    // No limit of virtual time would tell: a thread that never blocks does not let it pass.
    const std::optional<Micros> limit =
        is_virtual() ? std::nullopt : std::optional<Micros>(now() + kEndPatience);
    const bool ended = of_this_world ? WaitUntil(lock, {&thread->finished}, limit, gone)
                                     : thread_ended_.wait_for(lock, kEndPatience, gone);
    if (!ended) Die("a thread that was to end never came to a blocking call");
  }
  JoinEnded();
}

void WorldCore::EndThreads(const Device& device) {
  EndThreadsWhere([&device](const SimThread& thread) { return thread.device == &device; });
}

void WorldCore::EndAllThreads() {
  EndThreadsWhere([](const SimThread&) { return true; });
  const Lock lock = Acquire();
  for (const auto& thread : threads_) {
    if (thread->state != SimThread::State::kFinished) Die("a world ended with a thread attached");
  }
}

std::size_t WorldCore::LiveThreads(const Device& device) const {
  return static_cast<std::size_t>(
      std::count_if(threads_.begin(), threads_.end(), [&device](const auto& thread) {
        return thread->device == &device && thread->state != SimThread::State::kFinished;
      }));
}

std::string WorldCore::Report() const {
  std::string report;
  for (const auto& thread : threads_) {
    if (thread->state == SimThread::State::kFinished) continue;
    const char* call = thread->call.load(std::memory_order_relaxed);
    char line[256];
    std::snprintf(line, sizeof line, "  %u \"%s\": %s in %s", thread->id, thread->name.c_str(),
                  StateName(thread->state), call != nullptr ? call : "no call");
    report += line;
    if (thread->timer_number != 0) {
      std::snprintf(line, sizeof line, " until %" PRId64 " us",
                    static_cast<std::int64_t>(thread->timer_due.count()));
      report += line;
    }
    report += '\n';
  }
  return report;
}

void WorldCore::Die(const char* why) const {
  std::fprintf(stderr, "cesim: %s at %" PRId64 " us\n%s", why,
               static_cast<std::int64_t>(now().count()), Report().c_str());
  std::abort();
}

}  // namespace sim

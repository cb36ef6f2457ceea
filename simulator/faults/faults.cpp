#include "faults/faults.h"

#include <execinfo.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <utility>

namespace sim {
namespace {

/// How far outwards two calls must have come the same way to be of one place. Far enough to know a
/// helper's callers apart, and not so far that every line of a log is a place of its own.
constexpr int kFrames = 8;

std::uint64_t PlaceOfCaller() {
  std::array<void*, kFrames> frames{};
  const int count = backtrace(frames.data(), kFrames);
  std::uint64_t place = 0xCBF29CE484222325U;  // FNV-1a, a word at a time
  for (int i = 0; i < count; ++i) {
    place ^= reinterpret_cast<std::uintptr_t>(frames[static_cast<std::size_t>(i)]);
    place *= 0x100000001B3U;
  }
  return place;
}

}  // namespace

void Faults::Add(FaultRule rule) {
  const std::lock_guard<std::mutex> guard(mutex_);
  rules_.push_back({std::move(rule), 0});
  armed_.store(true, std::memory_order_relaxed);
}

void Faults::Clear() {
  const std::lock_guard<std::mutex> guard(mutex_);
  rules_.clear();
  armed_.store(notes_places_, std::memory_order_relaxed);
}

void Faults::NotePlaces() {
  const std::lock_guard<std::mutex> guard(mutex_);
  notes_places_ = true;
  armed_.store(true, std::memory_order_relaxed);
}

std::vector<std::uint64_t> Faults::places() const {
  const std::lock_guard<std::mutex> guard(mutex_);
  return places_;
}

// One name may have several addresses, one for each source file that spells it: Count adds up.
Faults::Counter& Faults::CounterOf(const char* call) {
  const std::size_t start = std::hash<const char*>{}(call) / 8;
  for (std::size_t step = 0; step < kCounters; ++step) {
    Counter& counter = counters_[(start + step) % kCounters];
    const char* known = counter.call.load(std::memory_order_acquire);
    if (known == nullptr) counter.call.compare_exchange_strong(known, call);
    if (known == nullptr || known == call) return counter;
  }
  std::fputs("cesim: more API functions than counters\n", stderr);
  std::abort();
}

bool Faults::Enter(const char* call, bool can_fail, std::uint32_t usual_error,
                   std::uint32_t& error) {
  CounterOf(call).count.fetch_add(1, std::memory_order_relaxed);
  if (can_fail) failable_calls_.fetch_add(1, std::memory_order_relaxed);
  if (!armed_.load(std::memory_order_relaxed)) return false;
  return Judge(call, can_fail, usual_error, error);
}

// Every rule counts every call it names, whichever rule lets the call fail.
bool Faults::Judge(std::string_view call, bool can_fail, std::uint32_t usual_error,
                   std::uint32_t& error) {
  const std::lock_guard<std::mutex> guard(mutex_);
  if (notes_places_ && can_fail) places_.push_back(PlaceOfCaller());
  bool fails = false;
  for (Armed& armed : rules_) {
    const FaultRule& rule = armed.rule;
    if (rule.call == "*" ? !can_fail : rule.call != call) continue;
    ++armed.seen;
    const bool due =
        armed.seen >= rule.nth && (rule.count == 0 || armed.seen - rule.nth < rule.count);
    if (!due || fails) continue;
    fails = true;
    error = rule.error != 0 ? rule.error : usual_error;
  }
  if (!fails) return false;
  ++fired_;
  last_fired_ = call;
  return true;
}

std::uint64_t Faults::Count(std::string_view call) const {
  if (call == "*") return failable_calls_.load(std::memory_order_relaxed);
  std::uint64_t count = 0;
  for (std::size_t i = 0; i < kCounters; ++i) {
    const char* known = counters_[i].call.load(std::memory_order_acquire);
    if (known != nullptr && call == known) count += counters_[i].count.load();
  }
  return count;
}

std::uint64_t Faults::fired() const {
  const std::lock_guard<std::mutex> guard(mutex_);
  return fired_;
}

std::string Faults::last_fired() const {
  const std::lock_guard<std::mutex> guard(mutex_);
  return last_fired_;
}

}  // namespace sim

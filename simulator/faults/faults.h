// Which API calls of a device fail, and what has been called how often.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace sim {

/// One rule of failure.
///
/// "The 3rd WriteFile fails with 112" is {"WriteFile", 3, 1, 112}; "every allocation from the 40th
/// on fails" is {"LocalAlloc", 40, 0, 14}; "the 7th call of any that can fail" is {"*", 7, 1, 0}.
struct FaultRule {
  std::string call;         ///< the function's name, or "*" for every call that can fail
  std::uint64_t nth = 1;    ///< counted from 1, from when the rule was made
  std::uint64_t count = 1;  ///< how many matching calls fail from there on; 0: all
  std::uint32_t error = 0;  ///< last error to set; 0: the function's usual one
};

/// May be used by any thread at any time.
class Faults {
 public:
  void Add(FaultRule rule);
  /// Forgets the rules; the counts stay.
  void Clear();

  /// Counts one call; without rules it costs a few instructions and no lock.
  /// @param call  the function's name, a literal: it is told apart by its address
  /// @param can_fail  false for calls that have no failure to report (Sleep, GetTickCount); no rule
  ///   of "*" counts them
  /// @return true, with `error`, when a rule lets the call fail.
  bool Enter(const char* call, bool can_fail, std::uint32_t usual_error, std::uint32_t& error);

  /// Tells calls apart by the place of the program that makes them, from now on.
  void NotePlaces();
  /// Of each call that can fail since NotePlaces, in their order: a number for the place that makes
  /// it. Equal numbers come from the same line, reached by the same way through the functions
  /// around it; the numbers mean nothing to another process, unless that was forked from this one.
  [[nodiscard]] std::vector<std::uint64_t> places() const;

  /// How often `call` was entered; "*" for the calls that can fail.
  [[nodiscard]] std::uint64_t Count(std::string_view call) const;
  /// How many calls were made to fail.
  [[nodiscard]] std::uint64_t fired() const;
  /// Name of the call that failed last, empty when none did.
  [[nodiscard]] std::string last_fired() const;

 private:
  struct Armed {
    FaultRule rule;
    std::uint64_t seen = 0;
  };
  struct Counter {
    std::atomic<const char*> call{nullptr};
    std::atomic<std::uint64_t> count{0};
  };
  /// Far more than the API has functions.
  static constexpr std::size_t kCounters = 512;

  Counter& CounterOf(const char* call);
  bool Judge(std::string_view call, bool can_fail, std::uint32_t usual_error, std::uint32_t& error);

  std::unique_ptr<Counter[]> counters_ = std::make_unique<Counter[]>(kCounters);
  std::atomic<std::uint64_t> failable_calls_{0};
  std::atomic<bool> armed_{false};
  mutable std::mutex mutex_;
  std::vector<Armed> rules_;
  bool notes_places_ = false;
  std::vector<std::uint64_t> places_;
  std::uint64_t fired_ = 0;
  std::string last_fired_;
};

}  // namespace sim

// A device's threads, named objects and critical sections, and what tests want to know of them.
#pragma once

#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "ce/kernel.h"
#include "world/world.h"

namespace sim {

class Device;
class KernelObject;

struct SleepRecord {
  Micros at;             ///< when the Sleep began
  std::uint32_t thread;  ///< id
  std::uint32_t length_ms;
};

class Kernel {
 public:
  explicit Kernel(Device& device) : device_(device) {}

  // For tests and tools. These take the world's lock themselves.

  /// The most recent Sleeps (65,536 at most), oldest first.
  [[nodiscard]] std::vector<SleepRecord> Sleeps() const;
  void ForgetSleeps();
  /// From now on Sleep notes its length and returns at once: for measuring what a program does
  /// between its pauses.
  void SkipSleeps();
  /// From now on Sleep notes its length and takes `divisor`-th of it: for whoever watches a program
  /// that pauses for a reader's sake. Waits with a time-out keep theirs.
  void ShortenSleeps(std::uint32_t divisor);
  /// Threads of the device that have not ended, attached host threads included.
  [[nodiscard]] std::size_t LiveThreads() const;
  /// Names of the events, mutexes and semaphores that exist, sorted.
  [[nodiscard]] std::vector<std::string> NamedObjects() const;
  [[nodiscard]] std::size_t OpenHandles() const;
  /// Critical sections that are initialised and not deleted.
  [[nodiscard]] std::size_t CriticalSections() const;
  /// What GetTickCount says at the world's beginning: a device that has been up for a while.
  void SetTickBase(std::uint32_t ticks);

  /// The id of the process that all threads of the device belong to.
  [[nodiscard]] static constexpr std::uint32_t process_id() { return 0x42; }

  // For the API functions. Lock held.

  enum class Kind : std::uint8_t { kEvent, kMutex, kSemaphore };
  /// @return the live object of this kind and name, null when there is none or the name is empty.
  [[nodiscard]] std::shared_ptr<KernelObject> FindNamed(Kind kind, const WCHAR* name) const;
  void Name(Kind kind, const WCHAR* name, const std::shared_ptr<KernelObject>& object);

  struct Section {
    SimThread* owner = nullptr;
    std::uint32_t depth = 0;
    std::deque<SimThread*> line;  ///< who waits for it, longest first
    WaitQueue left;               ///< notified when somebody of the line has got it
  };
  void AddSection(const CRITICAL_SECTION* section);
  /// Ends the program, with `call`, for a section that was never initialised.
  [[nodiscard]] Section& FindSection(const CRITICAL_SECTION* section, const char* call) const;
  void RemoveSection(const CRITICAL_SECTION* section);

  void NoteSleep(std::uint32_t thread, std::uint32_t length_ms);
  [[nodiscard]] bool skips_sleeps() const { return skips_sleeps_; }
  [[nodiscard]] Micros SleepTime(std::uint32_t length_ms) const {
    return Micros(std::chrono::milliseconds(length_ms)) / sleep_divisor_;
  }
  [[nodiscard]] std::uint32_t TickCount() const;

 private:
  Device& device_;
  std::deque<SleepRecord> sleeps_;
  bool skips_sleeps_ = false;
  std::uint32_t sleep_divisor_ = 1;
  std::uint32_t tick_base_ = 0;
  // Each kind has names of its own. A name lives as long as its object.
  mutable std::map<std::pair<Kind, std::u16string>, std::weak_ptr<KernelObject>> named_;
  std::unordered_map<const CRITICAL_SECTION*, std::unique_ptr<Section>> sections_;
};

}  // namespace sim

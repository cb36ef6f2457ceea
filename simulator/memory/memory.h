// A device's memory: its division between object store and programs, and the programs' blocks.
//
// One pool of pages holds both. The object store's part is the capacity of the root volume, and
// what lies in the root volume is what of it is in use; the rest is program memory, in use by the
// profile's figure and by the live blocks of LocalAlloc. So a full root volume has room again when
// the division moves, and LocalAlloc fails when program memory is used up.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <mutex>
#include <unordered_map>

#include "memory/space.h"

namespace sim {

class Device;

class Memory {
 public:
  /// The division begins as the device's profile says.
  explicit Memory(Device& device);
  /// Gives every block back that the device's programs have not freed.
  ~Memory();
  Memory(const Memory&) = delete;
  Memory& operator=(const Memory&) = delete;

  // ---- blocks; any thread ----

  struct Block {
    void* address = nullptr;   ///< null: program memory is used up
    std::uint64_t number = 0;  ///< from 1, the same in every run; 0: none
    std::size_t size = 0;      ///< bytes
  };
  /// Every block is one of malloc, so that the sanitizers see a byte too far. A block that is not
  /// to be zeroed is filled with 0xCC: the same rubbish in every run.
  Block Allocate(std::size_t size, bool zeroed);
  /// @return the freed block; number 0 when `address` is no live block of this device: then
  ///   nothing is freed, bad_frees() counts it and a line on stderr names it.
  Block Free(void* address);
  /// @return the block at `address`; number 0 when there is none.
  [[nodiscard]] Block Find(const void* address) const;

  [[nodiscard]] std::size_t live_blocks() const;
  [[nodiscard]] std::uint64_t live_bytes() const;
  /// The most bytes that were live at once.
  [[nodiscard]] std::uint64_t peak_bytes() const;
  /// Double frees and frees of foreign addresses; anything but 0 is a fault of the program.
  [[nodiscard]] std::uint64_t bad_frees() const;

  // ---- whole pages, as drivers want them; any thread ----

  /// Pages below 4 GiB, all zero, which take their room from program memory.
  /// @return number 0 when there are none.
  Block AllocatePages(std::size_t size);
  /// @return false when no pages begin at `address`.
  bool FreePages(void* address);
  /// Whether all of these bytes lie in pages of one AllocatePages.
  [[nodiscard]] bool InPages(std::uint64_t address, std::uint64_t size) const;

  // ---- the division; any thread ----

  struct Division {
    std::uint32_t store_pages;
    std::uint32_t ram_pages;
    std::uint32_t page_size;  ///< bytes, never 0
  };
  [[nodiscard]] Division division() const;
  /// Moves the division. @return false, with nothing moved, when one of the two halves would
  ///   become smaller than what is in use of it.
  bool SetStorePages(std::uint32_t store_pages);
  /// Makes the store at least `bytes` large as far as program memory has unused pages: what a
  /// device folder holds must be there after a restart, whatever the profile's division is.
  void GrowStoreFor(std::uint64_t bytes);

  /// The object store: the room of the root volume, which keeps its used bytes up to date.
  [[nodiscard]] Space& store() { return store_; }
  /// Program memory.
  [[nodiscard]] Space& ram() { return ram_; }

 private:
  struct Live {
    std::uint64_t number;
    std::size_t size;
  };

  const std::uint32_t page_size_;
  const std::uint32_t all_pages_;
  Space store_;
  Space ram_;
  std::mutex division_mutex_;  ///< one move of the division at a time

  mutable std::mutex blocks_mutex_;
  std::unordered_map<const void*, Live> blocks_;
  std::uint64_t next_number_ = 1;
  std::uint64_t live_bytes_ = 0;
  std::uint64_t peak_bytes_ = 0;
  std::uint64_t bad_frees_ = 0;
  std::map<std::uintptr_t, std::size_t> pages_;  ///< sizes by address
};

}  // namespace sim

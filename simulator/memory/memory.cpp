#include "memory/memory.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "device/device.h"
#include "profile/profile.h"

namespace sim {
namespace {

constexpr std::uint32_t kUsualPageSize = 4096;
constexpr int kRubbish = 0xCC;
constexpr std::uint32_t kHostPageSize = 4096;

std::uint32_t PageSize(const Profile& profile) {
  return profile.page_size == 0 ? kUsualPageSize : profile.page_size;
}

std::uint32_t AllPages(const Profile& profile) {
  const std::uint64_t pages = std::uint64_t{profile.store_pages} + profile.ram_pages;
  return static_cast<std::uint32_t>(std::min<std::uint64_t>(pages, UINT32_MAX));
}

std::uint64_t PagesFor(std::uint64_t bytes, std::uint32_t page_size) {
  return bytes / page_size + (bytes % page_size != 0 ? 1 : 0);
}

/// Fresh pages whose addresses have 32 bits. @return null when the host has none.
void* MapLow(std::size_t size) {
  constexpr int kProtection = PROT_READ | PROT_WRITE;
  int flags = MAP_PRIVATE | MAP_ANONYMOUS;
#ifdef MAP_32BIT
  flags |= MAP_32BIT;
#endif
  void* const address = mmap(nullptr, size, kProtection, flags, -1, 0);
  if (address == MAP_FAILED) return nullptr;
  if (reinterpret_cast<std::uintptr_t>(address) + std::uint64_t{size} <= UINT32_MAX) return address;
  munmap(address, size);
  return nullptr;
}

}  // namespace

Memory::Memory(Device& device)
    : page_size_(PageSize(device.profile())),
      all_pages_(AllPages(device.profile())),
      store_(std::uint64_t{device.profile().store_pages} * page_size_),
      ram_(std::uint64_t{device.profile().ram_pages} * page_size_) {
  ram_.SetUsed(std::uint64_t{device.profile().ram_used_pages} * page_size_);
}

Memory::~Memory() {
  for (const auto& [address, live] : blocks_) std::free(const_cast<void*>(address));
  for (const auto& [address, size] : pages_) munmap(reinterpret_cast<void*>(address), size);
}

Memory::Block Memory::Allocate(std::size_t size, bool zeroed) {
  if (!ram_.Reserve(size)) return {};
  // One byte for an empty block: its address must be its own.
  void* address = std::malloc(std::max<std::size_t>(size, 1));
  if (address == nullptr) {
    ram_.Release(size);
    return {};
  }
  std::memset(address, zeroed ? 0 : kRubbish, size);
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  const Block block{address, next_number_++, size};
  blocks_.emplace(address, Live{block.number, size});
  live_bytes_ += size;
  peak_bytes_ = std::max(peak_bytes_, live_bytes_);
  return block;
}

Memory::Block Memory::Free(void* address) {
  Block block;
  {
    const std::lock_guard<std::mutex> hold(blocks_mutex_);
    const auto found = blocks_.find(address);
    if (found == blocks_.end()) {
      ++bad_frees_;
    } else {
      block = {address, found->second.number, found->second.size};
      live_bytes_ -= block.size;
      blocks_.erase(found);
    }
  }
  if (block.number == 0) {
    std::fprintf(stderr, "cesim: LocalFree of %p, which is no live block of this device\n",
                 address);
    return block;
  }
  ram_.Release(block.size);
  std::free(address);
  return block;
}

Memory::Block Memory::Find(const void* address) const {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  const auto found = blocks_.find(address);
  if (found == blocks_.end()) return {};
  return {const_cast<void*>(found->first), found->second.number, found->second.size};
}

std::size_t Memory::live_blocks() const {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  return blocks_.size();
}

std::uint64_t Memory::live_bytes() const {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  return live_bytes_;
}

std::uint64_t Memory::peak_bytes() const {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  return peak_bytes_;
}

std::uint64_t Memory::bad_frees() const {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  return bad_frees_;
}

Memory::Block Memory::AllocatePages(std::size_t size) {
  const std::uint64_t pages = PagesFor(size, kHostPageSize);
  const std::uint64_t bytes = pages * kHostPageSize;
  if (size == 0 || bytes > UINT32_MAX || !ram_.Reserve(bytes)) return {};
  const auto length = static_cast<std::size_t>(bytes);
  void* const address = MapLow(length);
  if (address == nullptr) {
    ram_.Release(bytes);
    return {};
  }
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  pages_.emplace(reinterpret_cast<std::uintptr_t>(address), length);
  return {address, next_number_++, length};
}

bool Memory::FreePages(void* address) {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  const auto found = pages_.find(reinterpret_cast<std::uintptr_t>(address));
  if (found == pages_.end()) return false;
  munmap(address, found->second);
  ram_.Release(found->second);
  pages_.erase(found);
  return true;
}

bool Memory::InPages(std::uint64_t address, std::uint64_t size) const {
  const std::lock_guard<std::mutex> hold(blocks_mutex_);
  auto after = pages_.upper_bound(static_cast<std::uintptr_t>(address));
  if (address > UINTPTR_MAX || after == pages_.begin()) return false;
  --after;
  const std::uint64_t offset = address - after->first;
  return offset <= after->second && size <= after->second - offset;
}

Memory::Division Memory::division() const {
  const auto store_pages = static_cast<std::uint32_t>(store_.figures().capacity / page_size_);
  return {store_pages, all_pages_ - store_pages, page_size_};
}

bool Memory::SetStorePages(std::uint32_t store_pages) {
  const std::lock_guard<std::mutex> hold(division_mutex_);
  if (store_pages > all_pages_) return false;
  const std::uint64_t store = std::uint64_t{store_pages} * page_size_;
  const std::uint64_t ram = std::uint64_t{all_pages_ - store_pages} * page_size_;
  // The half that shrinks goes first, so that no page is ever in both.
  const bool shrinks = store < store_.figures().capacity;
  Space& first = shrinks ? store_ : ram_;
  Space& second = shrinks ? ram_ : store_;
  if (!first.Resize(shrinks ? store : ram)) return false;
  return second.Resize(shrinks ? ram : store);
}

void Memory::GrowStoreFor(std::uint64_t bytes) {
  const Division now = division();
  const std::uint64_t needed = PagesFor(bytes, page_size_);
  if (needed <= now.store_pages) return;
  const std::uint64_t unused = ram_.figures().free() / page_size_;
  const std::uint64_t pages = std::min(needed, now.store_pages + unused);
  static_cast<void>(SetStorePages(static_cast<std::uint32_t>(pages)));
}

}  // namespace sim

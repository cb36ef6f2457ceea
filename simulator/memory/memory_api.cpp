// The memory calls of the Windows CE API.
#include <algorithm>
#include <cstdint>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "memory/memory.h"

namespace {

/// Every program of the device has this much address space, whatever memory there is.
constexpr std::uint32_t kAddressSpace = 32U << 20U;

std::uint32_t Clamp(std::uint64_t bytes) {
  return static_cast<std::uint32_t>(std::min<std::uint64_t>(bytes, UINT32_MAX));
}

}  // namespace

HLOCAL LocalAlloc(UINT flags, std::size_t size) {
  sim::ApiCall call("LocalAlloc", ERROR_OUTOFMEMORY);
  call.Argument("size", static_cast<std::int64_t>(size));
  if (call.failed()) return call.Return(HLOCAL{nullptr});
  const sim::Memory::Block block =
      call.device().memory().Allocate(size, (flags & LMEM_ZEROINIT) != 0);
  if (block.number == 0) return call.Fail(ERROR_OUTOFMEMORY, HLOCAL{nullptr});
  // The trace names a block by its number: addresses differ from run to run.
  static_cast<void>(call.Return(block.number));
  return block.address;
}

HLOCAL LocalFree(HLOCAL block) {
  sim::ApiCall call("LocalFree", sim::kCannotFail);
  if (block == nullptr) return call.Return(HLOCAL{nullptr});
  const sim::Memory::Block freed = call.device().memory().Free(block);
  call.Argument("block", freed.number);
  if (freed.number != 0) return call.Return(HLOCAL{nullptr});
  static_cast<void>(call.Fail(ERROR_INVALID_HANDLE, -1));
  return block;
}

std::size_t LocalSize(HLOCAL block) {
  sim::ApiCall call("LocalSize", sim::kCannotFail);
  const sim::Memory::Block found = call.device().memory().Find(block);
  call.Argument("block", found.number);
  if (found.number == 0) return call.Fail(ERROR_INVALID_HANDLE, std::size_t{0});
  return call.Return(found.size);
}

void* VirtualAlloc(void* address, std::size_t size, DWORD type, DWORD protection) {
  sim::ApiCall call("VirtualAlloc", ERROR_OUTOFMEMORY);
  call.Argument("size", static_cast<std::int64_t>(size));
  void* const none = nullptr;
  if (call.failed()) return call.Return(none);
  if ((type & MEM_COMMIT) == 0 || protection != PAGE_READWRITE) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  // No program of the device may choose.
  if (address != nullptr) return call.Fail(ERROR_INVALID_ADDRESS, none);
  const sim::Memory::Block block = call.device().memory().AllocatePages(size);
  if (block.number == 0) return call.Fail(ERROR_OUTOFMEMORY, none);
  static_cast<void>(call.Return(block.number));
  return block.address;
}

BOOL VirtualFree(void* address, std::size_t size, DWORD type) {
  sim::ApiCall call("VirtualFree", sim::kCannotFail);
  if (size != 0 || type != MEM_RELEASE) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  if (!call.device().memory().FreePages(address)) return call.Fail(ERROR_INVALID_ADDRESS, FALSE);
  return call.Return(TRUE);
}

void GlobalMemoryStatus(MEMORYSTATUS* status) {
  sim::ApiCall call("GlobalMemoryStatus", sim::kCannotFail);
  if (status == nullptr) return;
  sim::Memory& memory = call.device().memory();
  const sim::Space::Figures ram = memory.ram().figures();
  *status = {};
  status->dwLength = sizeof *status;
  status->dwTotalPhys = Clamp(ram.capacity);
  status->dwAvailPhys = Clamp(ram.free());
  status->dwMemoryLoad =
      ram.capacity == 0 ? 100U : Clamp((ram.capacity - ram.free()) * 100 / ram.capacity);
  status->dwTotalVirtual = kAddressSpace;
  status->dwAvailVirtual = kAddressSpace - std::min(kAddressSpace, Clamp(memory.live_bytes()));
}

BOOL GetStoreInformation(STORE_INFORMATION* information) {
  sim::ApiCall call("GetStoreInformation", ERROR_GEN_FAILURE);
  if (call.failed()) return call.Return(FALSE);
  if (information == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  const sim::Space::Figures store = call.device().memory().store().figures();
  information->dwStoreSize = Clamp(store.capacity);
  information->dwFreeSize = Clamp(store.free());
  return call.Return(TRUE);
}

BOOL GetSystemMemoryDivision(DWORD* store_pages, DWORD* ram_pages, DWORD* page_size) {
  sim::ApiCall call("GetSystemMemoryDivision", ERROR_GEN_FAILURE);
  if (call.failed()) return call.Return(FALSE);
  if (store_pages == nullptr || ram_pages == nullptr || page_size == nullptr) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const sim::Memory::Division division = call.device().memory().division();
  *store_pages = division.store_pages;
  *ram_pages = division.ram_pages;
  *page_size = division.page_size;
  return call.Return(TRUE);
}

DWORD SetSystemMemoryDivision(DWORD store_pages) {
  sim::ApiCall call("SetSystemMemoryDivision", ERROR_GEN_FAILURE);
  call.Argument("store_pages", store_pages);
  if (call.failed()) return call.Return(SYSMEM_FAILED);
  const bool moved = call.device().memory().SetStorePages(store_pages);
  return call.Return(moved ? SYSMEM_CHANGED : SYSMEM_FAILED);
}

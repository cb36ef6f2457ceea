// The store and the division of memory. The object store of a desktop is the drive on which the
// program runs: it has its size from elsewhere, and memory cannot be moved to it.
#define ORVENIX_DESKTOP_NAMES
#include <coredll.h>

namespace {

constexpr DWORD kPageSize = 4096;

/// The device's calls count bytes in 32 bits, and some callers read them as signed.
constexpr ULONGLONG kMostBytes = 0x7FFFF000;

DWORD InDeviceRange(ULONGLONG bytes) {
  return static_cast<DWORD>((bytes < kMostBytes ? bytes : kMostBytes) / kPageSize * kPageSize);
}

}  // namespace

extern "C" {

HANDLE CreateFileForMappingW(const WCHAR* name, DWORD access, DWORD share,
                             SECURITY_ATTRIBUTES* security, DWORD disposition, DWORD attributes,
                             HANDLE template_file) {
  return CreateFileW(name, access, share, security, disposition, attributes, template_file);
}

BOOL GetStoreInformation(STORE_INFORMATION* information) {
  ULARGE_INTEGER available = {};
  ULARGE_INTEGER total = {};
  if (GetDiskFreeSpaceExW(nullptr, &available, &total, nullptr) == FALSE) return FALSE;
  information->dwStoreSize = InDeviceRange(total.QuadPart);
  information->dwFreeSize = InDeviceRange(available.QuadPart);
  return TRUE;
}

BOOL GetSystemMemoryDivision(DWORD* store_pages, DWORD* ram_pages, DWORD* page_size) {
  STORE_INFORMATION store = {};
  if (GetStoreInformation(&store) == FALSE) return FALSE;
  MEMORYSTATUSEX memory = {};
  memory.dwLength = sizeof memory;
  if (GlobalMemoryStatusEx(&memory) == FALSE) return FALSE;
  *store_pages = store.dwStoreSize / kPageSize;
  *ram_pages = InDeviceRange(memory.ullTotalPhys) / kPageSize;
  *page_size = kPageSize;
  return TRUE;
}

/// @return SYSMEM_CHANGED for the division as it is.
DWORD SetSystemMemoryDivision(DWORD store_pages) {
  DWORD now = 0;
  DWORD ram_pages = 0;
  DWORD page_size = 0;
  const bool same = GetSystemMemoryDivision(&now, &ram_pages, &page_size) && now == store_pages;
  return same ? SYSMEM_CHANGED : SYSMEM_FAILED;
}

void* PlatformVirtualAlloc(void* address, SIZE_T size, DWORD type, DWORD protection) {
  constexpr ULONG_PTR kFirst = 0x10000000;
  constexpr ULONG_PTR kEnd = 0xFFFF0000;
  constexpr ULONG_PTR kGranularity = 0x10000;
  if (address != nullptr || sizeof(void*) == sizeof(DWORD)) {
    return VirtualAlloc(address, size, type, protection);
  }
  MEMORY_BASIC_INFORMATION region = {};
  for (ULONG_PTR at = kFirst; at < kEnd && size <= kEnd - at;) {
    if (VirtualQuery(reinterpret_cast<void*>(at), &region, sizeof region) == 0) break;
    const ULONG_PTR end = reinterpret_cast<ULONG_PTR>(region.BaseAddress) + region.RegionSize;
    if (region.State == MEM_FREE && end - at >= size) {
      void* const pages = VirtualAlloc(reinterpret_cast<void*>(at), size, type, protection);
      if (pages != nullptr) return pages;
      at += kGranularity;
    } else {
      at = (end + kGranularity - 1) / kGranularity * kGranularity;
    }
  }
  SetLastError(ERROR_NOT_ENOUGH_MEMORY);
  return nullptr;
}

}  // extern "C"

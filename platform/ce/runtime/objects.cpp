// What the compiler calls for objects, and for mistakes that must not go on.
#include <coredll.h>

#include <new>

namespace {

/// The device's number for the calling process, wherever a handle is wanted.
const HANDLE kThisProcess = reinterpret_cast<HANDLE>(std::uintptr_t{66});
constexpr DWORD kAborted = 3;

[[noreturn]] void Stop(const WCHAR* reason) noexcept {
  OutputDebugStringW(reason);
  TerminateProcess(kThisProcess, kAborted);
  for (;;) Sleep(INFINITE);
}

void* Allocate(std::size_t size) noexcept {
  return LocalAlloc(LMEM_FIXED, size);
}

void* AllocateOrStop(std::size_t size) noexcept {
  void* const block = Allocate(size);
  if (block == nullptr) Stop(TEXT("Orvenix: no memory\r\n"));
  return block;
}

}  // namespace

extern "C" {
[[noreturn]] void abort() {
  Stop(TEXT("Orvenix: stopped\r\n"));
}

[[noreturn]] void __cxa_pure_virtual() {
  Stop(TEXT("Orvenix: a function without a body was called\r\n"));
}
}

void* operator new(std::size_t size) {
  return AllocateOrStop(size);
}
void* operator new[](std::size_t size) {
  return AllocateOrStop(size);
}
void* operator new(std::size_t size, const std::nothrow_t& /*unused*/) noexcept {
  return Allocate(size);
}
void* operator new[](std::size_t size, const std::nothrow_t& /*unused*/) noexcept {
  return Allocate(size);
}
void operator delete(void* block) noexcept {
  LocalFree(block);
}
void operator delete[](void* block) noexcept {
  LocalFree(block);
}
void operator delete(void* block, std::size_t /*size*/) noexcept {
  LocalFree(block);
}
void operator delete[](void* block, std::size_t /*size*/) noexcept {
  LocalFree(block);
}

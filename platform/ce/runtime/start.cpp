// Where the device enters the library: objects are constructed when it is attached to a process and
// destroyed when it is detached.
#include <coredll.h>

#include <new>

namespace {

using Constructor = void (*)();

/// A destructor that the compiler registered for an object.
struct Destructor {
  Destructor* older;
  void (*function)(void* object);
  void* object;
};

Destructor* newest_destructor = nullptr;

constexpr DWORD kAttached = 1;
constexpr DWORD kDetached = 0;

/// Younger objects go first, for they may use the older.
void RunDestructors() noexcept {
  while (newest_destructor != nullptr) {
    Destructor* const last = newest_destructor;
    newest_destructor = last->older;
    last->function(last->object);
    LocalFree(last);
  }
}

}  // namespace

extern "C" {

extern const Constructor ce_constructors[];
extern const Constructor ce_constructors_end[];

/// For a library that need not hear of it; one that must has its own.
[[gnu::weak]] BOOL DllMain(HINSTANCE /*instance*/, DWORD /*reason*/, void* /*reserved*/) {
  return TRUE;
}

/// What tells the objects of one library from those of others, where several share a run time.
void* __dso_handle = nullptr;

int __aeabi_atexit(void* object, void (*function)(void*), void* /*library*/) {
  void* const memory = LocalAlloc(LMEM_FIXED, sizeof(Destructor));
  if (memory == nullptr) return -1;
  newest_destructor = new (memory) Destructor{newest_destructor, function, object};
  return 0;
}

BOOL _DllMainCRTStartup(HINSTANCE instance, DWORD reason, void* reserved) {
  if (reason == kAttached) {
    for (const Constructor* next = ce_constructors; next != ce_constructors_end; ++next) (*next)();
  }
  const BOOL answer = DllMain(instance, reason, reserved);
  if (reason == kDetached || (reason == kAttached && answer == FALSE)) RunDestructors();
  return answer;
}

}  // extern "C"

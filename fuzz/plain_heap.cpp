// The platform's heap as plain memory, for programs that need nothing else of a device: fast, and
// the sanitizers see every block.
#include <coredll.h>

#include <cstdlib>

HLOCAL LocalAlloc(UINT flags, std::size_t size) {
  return (flags & LMEM_ZEROINIT) != 0 ? std::calloc(1, size) : std::malloc(size);
}

HLOCAL LocalFree(HLOCAL block) {
  std::free(block);
  return nullptr;
}

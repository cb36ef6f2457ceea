#include "library/shared_objects.h"

#include <dlfcn.h>

#include <cstdio>
#include <string>
#include <string_view>

#include "text/names.h"

namespace sim {
namespace {

class SharedObject final : public LibraryCode {
 public:
  explicit SharedObject(void* handle) : handle_(handle) {}
  ~SharedObject() override { dlclose(handle_); }

  bool Enter(HMODULE /*module*/, DWORD /*reason*/) override { return true; }
  [[nodiscard]] FARPROC Find(std::u16string_view name) const override {
    return reinterpret_cast<FARPROC>(dlsym(handle_, ToHostText(name).c_str()));
  }

 private:
  void* const handle_;
};

}  // namespace

std::unique_ptr<LibraryCode> ReadSharedObject(const std::filesystem::path& file) {
  // The host tells files apart by themselves and not by their names: a copy is loaded anew.
  void* const handle = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (handle != nullptr) return std::make_unique<SharedObject>(handle);
  std::fprintf(stderr, "cesim: %s\n", dlerror());
  return nullptr;
}

}  // namespace sim

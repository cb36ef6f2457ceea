#include "tools/configlet_library.h"

#include <dlfcn.h>

#include <string>
#include <system_error>

#include "tools/failure.h"

namespace tools {
namespace {

constexpr const char* kLibraryName = "liborvenix.so";

template <typename Function>
void Find(void* library, const std::string& file, const char* name, Function& function) {
  void* found = ::dlsym(library, name);
  if (found == nullptr) {
    throw Failure(ExitCode::kBadInput, file, std::string("has no function ") + name,
                  "is it the configlet library?");
  }
  function = reinterpret_cast<Function>(found);
}

}  // namespace

std::filesystem::path LibraryFolder() {
  std::error_code error;
  const auto program = std::filesystem::read_symlink("/proc/self/exe", error);
  return program.parent_path().parent_path() / "lib";
}

ConfigletLibrary LoadConfiglet(const std::filesystem::path& file) {
  const std::string path =
      (file.empty() ? LibraryFolder() / kLibraryName : std::filesystem::absolute(file)).string();
  void* library = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) {
    const char* reason = ::dlerror();
    throw Failure(ExitCode::kBadInput, path, reason == nullptr ? "cannot be loaded" : reason,
                  "name the library with --library");
  }
  ConfigletLibrary configlet;
  Find(library, path, "IcfgInitialize", configlet.initialize);
  Find(library, path, "IcfgSetCallbacks", configlet.set_callbacks);
  Find(library, path, "IcfgBeginGroup", configlet.begin_group);
  Find(library, path, "IcfgSetField", configlet.set_field);
  Find(library, path, "IcfgEndGroup", configlet.end_group);
  Find(library, path, "IcfgGetField", configlet.get_field);
  Find(library, path, "IcfgUninitialize", configlet.uninitialize);
  return configlet;
}

}  // namespace tools

// Input: a firmware package's additional parameters. Checks what choosing packages relies on.
#include "upgrade/list_file/package_options.h"

#include <cstdint>
#include <cstdlib>
#include <string_view>

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view options(reinterpret_cast<const char*>(data), size);
  const std::int32_t pass = upgrade::PackagePass(options);
  Require(pass >= 0 && pass <= 9);
  Require(pass == 1 || options.find("Pass=") != std::string_view::npos);

  const upgrade::DiskNeed need = upgrade::PackageDiskNeed(options);
  Require(need.bytes == 0 || options.find("DiskSize=") != std::string_view::npos);
  Require(need.folder.view().find_first_of(",:") == std::string_view::npos);

  Require(upgrade::PackageRamSize(options) == 0 ||
          options.find("RAMAllocSize=") != std::string_view::npos);
  return 0;
}

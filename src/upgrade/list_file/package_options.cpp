#include "upgrade/list_file/package_options.h"

#include <cstddef>
#include <optional>

#include "base/number.h"
#include "base/text.h"

namespace upgrade {
namespace {

std::optional<std::string_view> Behind(std::string_view options, std::string_view name) noexcept {
  const std::size_t at = options.find(name);
  if (at == std::string_view::npos) return std::nullopt;
  return base::Part(options, at + name.size());
}

}  // namespace

std::int32_t PackagePass(std::string_view options) noexcept {
  const auto value = Behind(options, "Pass=");
  if (!value) return 1;
  const char digit = value->empty() ? '\0' : value->front();
  return digit >= '0' && digit <= '9' ? digit - '0' : 0;
}

DiskNeed PackageDiskNeed(std::string_view options) noexcept {
  DiskNeed need;
  const auto found = Behind(options, "DiskSize=");
  if (!found) return need;
  constexpr std::size_t kLongestValue = 127;
  const std::string_view value =
      base::Part(base::Part(*found, 0, found->find(',')), 0, kLongestValue);
  const std::size_t colon = value.find(':');
  if (colon == std::string_view::npos) return need;
  need.folder.Assign(base::Part(value, 0, colon));
  need.bytes = base::LeadingInt(base::Part(value, colon + 1));
  return need;
}

std::int32_t PackageRamSize(std::string_view options) noexcept {
  const auto value = Behind(options, "RAMAllocSize=");
  return value ? base::LeadingInt(*value) : 0;
}

}  // namespace upgrade

#include <coredll.h>

#include "base/text.h"
#include "device/file.h"
#include "upgrade/file_lists.h"
#include "upgrade/paths.h"

namespace upgrade {

void ApplyRenames(const UpgradeConfig& job) noexcept {
  constexpr std::string_view kSuffix = ".rename";
  device::File files;
  for (const tagDownloadFile* file : job.DownloadFiles()) {
    if (file == nullptr) continue;
    const PathText from(base::FieldView(file->destination));
    if (!base::EndsWith(from.view(), kSuffix)) continue;
    const PathText to(base::Part(from.view(), 0, from.size() - kSuffix.size()));
    files.MoveFile(from.c_str(), to.c_str());
  }
}

}  // namespace upgrade

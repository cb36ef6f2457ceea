#include "upgrade/loader_images.h"

#include <coredll.h>

#include "device/file.h"
#include "device/flash/flash_chip.h"
#include "report/window/progress_window.h"

namespace upgrade {
namespace {

constexpr DWORD kPauseMs = 2000;

void DeleteImage(std::string_view model, std::string_view generation) noexcept {
  base::FixedText<32> path("\\");
  path.Append(model);
  path.Append(".IPL.");
  path.Append(generation);
  path.Append(".nb0");
  device::File files;
  if (!files.DeleteFile(path.c_str(), nullptr)) return;
  report::ShowStatus("Deleting !%s!", path.c_str() + 1);
}

}  // namespace

void KeepMatchingLoaderImage(const UpgradeConfig& job) noexcept {
  std::uint8_t code = 0;
  if (!device::GetFlashChipGeneration(&code)) return;
  const base::FixedText<8> own(ChipGeneration(code));
  report::ShowStatus("DOC is !%s!", own.c_str());
  for (const std::string_view other : kChipGenerations) {
    if (own.empty() || other == own.view()) continue;
    DeleteImage(LoaderModel(job.GetMfgString()), other);
  }
  Sleep(kPauseMs);
}

}  // namespace upgrade

#include <coredll.h>

#include "base/number.h"
#include "device/file.h"
#include "device/file_crc.h"
#include "device/flash/ram_file.h"
#include "report/log/log.h"
#include "report/window/progress_window.h"
#include "upgrade/fetch.h"
#include "upgrade/file_lists.h"
#include "upgrade/list_file/patterns.h"
#include "upgrade/paths.h"
#include "upgrade/progress.h"

namespace upgrade {
namespace {

/// A download file as this phase needs it, copied from the job's record.
struct Candidate {
  explicit Candidate(const tagDownloadFile& file) noexcept
      : source(base::FieldView(file.source)),
        destination(base::FieldView(file.destination)),
        crc(base::LeadingNumber(base::FieldView(file.crc))),
        size(base::LeadingNumber(base::FieldView(file.size))) {}
  PathText source;
  PathText destination;
  std::uint32_t crc;   ///< 0: not checked
  std::uint32_t size;  ///< bytes
};

/// @return 0, or why there is no CRC-32.
std::uint32_t ComputeCrc(const Candidate& file, std::uint32_t* crc) noexcept {
  const char* const path = file.destination.c_str();
  if (!IsRamName(file.destination.view())) return device::FILECRC32(path, crc);
  return device::RAMFILECRC32(path + kRamPrefix.size(), crc, file.size, path);
}

/// @return whether the file is on the device with the expected content.
bool IsRight(Run& run, const Candidate& file) noexcept {
  const char* const path = file.destination.c_str();
  report::ShowStatus("Validating, %s", path);
  report::Log("Orvenix - ValidateFiles - check file !%s!\r\n", path);
  if (IsRamName(file.destination.view())) run.os_image = true;
  std::uint32_t crc = 0;
  if (ComputeCrc(file, &crc) != 0) {
    report::Log("Orvenix - ValidateFiles - crc error, no file, %s\r\n", path);
    return false;
  }
  if (crc == file.crc) return true;
  report::Log("Orvenix - ValidateFiles - crc mismatch, %s, %d, %d\r\n", path,
              static_cast<int>(file.crc), static_cast<int>(crc));
  return false;
}

std::uint32_t LengthOf(device::File& file, const char* name) noexcept {
  std::uint32_t length = 0;
  return file.OpenForReading(name, true) && file.GetSize(&length) ? length : 0;
}

std::uint32_t LengthOf(const PathText& destination) noexcept {
  if (IsRamName(destination.view())) {
    device::RAMFile file;
    return LengthOf(file, destination.c_str() + kRamPrefix.size());
  }
  device::File file;
  return LengthOf(file, destination.c_str());
}

void FetchAgain(Run& run, const Candidate& file) noexcept {
  const char* const path = file.destination.c_str();
  report::ShowStatus("%s", path);
  report::SetFileProgress(10);
  report::Log("Orvenix - ValidateFiles - http fetching !%s! to !%s!\r\n", file.source.c_str(),
              path);
  if (!FetchFile(run, file.source.c_str(), path, OnFailedGet::kTryAgain)) return;
  report::SetFileProgress(100);
  const std::uint32_t length = LengthOf(file.destination);
  if (length > 0) AddReceivedBytes(length);
}

void Validate(Run& run, const tagDownloadFile& record) noexcept {
  if (!AnyListPatternMatches(base::FieldView(record.masks), run.job.GetMfgString())) return;
  const Candidate file(record);
  if (file.crc == 0) return;
  if (IsRight(run, file)) {
    run.validated_bytes += file.size;
  } else {
    FetchAgain(run, file);
  }
}

}  // namespace

void ValidateFiles(Run& run) noexcept {
  report::Log("Orvenix - ValidateFiles - Entering\r\n");
  if (run.job.GetMfgString()[0] == '\0') {
    report::ShowStatus("No MCT on device");
    return;
  }
  report::Log("Orvenix - ValidateFiles - LoadFileList\r\n");
  LoadFileList(run);
  for (const tagDownloadFile* file : run.job.DownloadFiles()) {
    if (file != nullptr) Validate(run, *file);
  }
}

}  // namespace upgrade

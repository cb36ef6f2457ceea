#include <coredll.h>

#include "base/number.h"
#include "device/file.h"
#include "device/file_crc.h"
#include "device/local_memory.h"
#include "report/log/log.h"
#include "upgrade/fetch.h"
#include "upgrade/file_lists.h"
#include "upgrade/list_file/list_file.h"
#include "upgrade/paths.h"

namespace upgrade {
namespace {

constexpr int kAttempts = 3;
/// Far beyond any list; a larger file is not one.
constexpr std::uint32_t kLargestListFile = 16U * 1024 * 1024;
/// As many records as leave the device memory to fetch with: a stranger's list could ask for more.
constexpr std::uint32_t kMostRecords = 8192;

/// Deletes a list file that is not the one that the job names.
void DropWrongList(const tagDownloadFile& list, const char* path) noexcept {
  std::uint32_t crc = 0;
  if (device::FILECRC32(path, &crc) != 0) {
    report::Log("Orvenix - LoadFileList - multicast crc error, no file, %s\r\n", path);
    return;
  }
  const std::uint32_t expected = base::LeadingNumber(base::FieldView(list.crc));
  if (crc == expected) {
    report::Log("Orvenix - LoadFileList - multicast list file crc match\r\n");
    return;
  }
  report::Log("Orvenix - LoadFileList - multicast list file crc mismatch, %s, %d, %d\r\n", path,
              static_cast<int>(expected), static_cast<int>(crc));
  device::File().DeleteFile(path, nullptr);
}

/// Opens the list file, fetching it when it is not there.
bool OpenList(Run& run, const char* source, const char* path, device::File& file) noexcept {
  report::Log("Orvenix - LoadFileList, src file = !%s!\r\n", source);
  report::Log("Orvenix - LoadFileList, dest file = !%s!\r\n", path);
  report::Log("Orvenix - LoadFileList, open for reading1 = !%s!\r\n", path);
  if (file.OpenForReading(path, true)) return true;
  if (!FetchFile(run, source, path, OnFailedGet::kTryAgain)) {
    report::Log("Orvenix - LoadFileList, error getting multicast list file\r\n");
    return false;
  }
  report::Log("Orvenix - LoadFileList, open for reading2 = !%s!\r\n", path);
  return file.OpenForReading(path, true);
}

/// @return false when there is no memory for the record.
bool AddRecord(UpgradeConfig& job, const ListRecord& record) noexcept {
  auto file = device::LocalBlock<tagDownloadFile>::Allocate();
  if (!file) return false;
  base::CopyText(file->source, record.source);
  base::CopyText(file->destination, record.destination);
  base::CopyText(file->masks, record.masks);
  base::CopyText(file->crc, record.crc);
  base::CopyText(file->size, record.size);
  job.AddDownloadFile(file.Release());
  return true;
}

void AddRecords(UpgradeConfig& job, device::File& file) noexcept {
  std::uint32_t size = 0;
  if (!file.GetSize(&size) || size > kLargestListFile) return;
  const auto bytes = device::LocalBlock<char>::Allocate(size + 1);
  std::uint32_t length = 0;
  if (!bytes || !file.Read(bytes.get(), size, &length)) return;
  ListFileReader reader({bytes.get(), length});
  ListRecord record;
  for (std::uint32_t count = 0; reader.Next(&record); ++count) {
    if (count == kMostRecords || !AddRecord(job, record)) {
      report::Log("Orvenix - LoadFileList, list too long, %d records taken\r\n",
                  static_cast<int>(count));
      return;
    }
  }
}

}  // namespace

void LoadFileList(Run& run) noexcept {
  const tagDownloadFile* const list = run.job.GetMCFileList();
  if (list == nullptr) return;
  const PathText source(base::FieldView(list->source));
  const PathText path(base::FieldView(list->destination));
  DropWrongList(*list, path.c_str());
  device::File file;
  bool open = false;
  for (int attempt = 0; attempt < kAttempts && !open; ++attempt) {
    open = OpenList(run, source.c_str(), path.c_str(), file);
  }
  if (!open) {
    report::Log("Orvenix - LoadFileList, error getting list file");
    return;
  }
  AddRecords(run.job, file);
}

}  // namespace upgrade

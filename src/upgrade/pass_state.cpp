#include "upgrade/pass_state.h"

#include <coredll.h>

#include "base/format.h"
#include "base/number.h"
#include "base/text.h"
#include "device/file.h"
#include "report/window/progress_window.h"
#include "upgrade/list_file/package_options.h"

namespace upgrade {
namespace {

constexpr std::uint32_t kBytesRead = 20;
constexpr DWORD kPauseAfterReadingMs = 500;

}  // namespace

const char* PassStateFile(const UpgradeConfig& job) noexcept {
  return job.GetFamily()[0] == '7' ? "\\Flash File Store\\kvoupgclnt.txt" : "\\kvoupgclnt.txt";
}

std::int32_t ReadPass(const UpgradeConfig& job) noexcept {
  if (job.IsMultiPass() == 0) return 1;
  device::File file;
  if (!file.OpenForReading(PassStateFile(job), true)) return 0;
  char text[kBytesRead];
  std::uint32_t length = 0;
  file.Read(text, kBytesRead, &length);
  file.Close();
  Sleep(kPauseAfterReadingMs);
  return base::LeadingInt({text, length});
}

void WritePass(const UpgradeConfig& job, std::int32_t pass) noexcept {
  char text[16];
  const std::size_t length = base::Format(text, sizeof text, "%d", pass);
  device::File file;
  if (!file.OpenForWriting(PassStateFile(job), false, 0)) return;
  file.Write(text, static_cast<std::uint32_t>(length));
}

void DeletePassState(const UpgradeConfig& job) noexcept {
  device::File().DeleteFile(PassStateFile(job), nullptr);
}

std::int32_t BeginPass(const UpgradeConfig& job) noexcept {
  if (job.IsMultiPass() == 0) {
    DeletePassState(job);
    WritePass(job, 0);
    return 1;
  }
  // Unsigned: a damaged file may hold the largest number.
  const auto pass = static_cast<std::int32_t>(static_cast<std::uint32_t>(ReadPass(job)) + 1U);
  WritePass(job, pass);
  report::ShowStatus("Start, CurrentPass = %d", pass);
  return pass;
}

bool IsInPass(const UpgradeConfig& job, const FirmwarePackage& package,
              std::int32_t pass) noexcept {
  return job.IsMultiPass() == 0 ||
         PackagePass(base::FieldView(package.additional_parameters)) == pass;
}

}  // namespace upgrade

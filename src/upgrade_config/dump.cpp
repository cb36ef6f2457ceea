// The job record as a text for people who look for a mistake in it.
#include <atomic>
#include <cstdarg>
#include <cstddef>
#include <string_view>

#include "base/format.h"
#include "base/text.h"
#include "device/local_memory.h"
#include "orvenix/upgrade_config.h"
#include "upgrade_config/diagnostic_output.h"

namespace {

constexpr std::size_t kDumpSize = 4096;

std::atomic<orvenix::DiagnosticOutput> g_output{nullptr};

/// A text that grows by formatted pieces; what does not fit is dropped.
class Dump {
 public:
  /// @param buffer  of kDumpSize characters
  explicit Dump(char* buffer) noexcept : buffer_(buffer) { buffer_[0] = '\0'; }

  [[gnu::format(printf, 2, 3)]] void Add(const char* format, ...) noexcept {
    va_list arguments;
    va_start(arguments, format);
    used_ += base::FormatV(buffer_ + used_, kDumpSize - used_, format, arguments);
    va_end(arguments);
  }

  void AddCount(const char* what, std::size_t count) noexcept {
    Add("%s count = %d\r\n", what, static_cast<int>(count));
  }

  void AddTexts(const char* plural, const char* single,
                const orvenix::PointerList<char>& texts) noexcept {
    AddCount(plural, texts.size());
    for (const char* text : texts) Add("%s = %s\r\n", single, text);
  }

 private:
  char* buffer_;
  std::size_t used_ = 0;
};

/// Callers fill these records themselves and may have left a field without its terminator.
void AddStores(Dump& dump, const orvenix::PointerList<tagStorageReq>& stores) noexcept {
  dump.AddCount("Storage Req List", stores.size());
  for (const tagStorageReq* store : stores) {
    if (store == nullptr) continue;
    const std::string_view name = base::FieldView(store->name);
    const std::string_view space = base::FieldView(store->required_space);
    dump.Add("Storage Entry = %.*s, %.*s\r\n", static_cast<int>(name.size()), name.data(),
             static_cast<int>(space.size()), space.data());
  }
}

void AddPackages(Dump& dump, const orvenix::PointerList<FirmwarePackage>& packages) noexcept {
  dump.AddCount("Firmware List", packages.size());
  for (const FirmwarePackage* package : packages) {
    if (package == nullptr) continue;
    const std::string_view from = base::FieldView(package->source_folder);
    const std::string_view to = base::FieldView(package->destination_folder);
    const std::string_view names = base::FieldView(package->base);
    dump.Add("Src = %.*s\r\nDest = %.*s\r\nBase = %.*s\r\nCount = %d\r\n",
             static_cast<int>(from.size()), from.data(), static_cast<int>(to.size()), to.data(),
             static_cast<int>(names.size()), names.data(), package->count);
  }
}

}  // namespace

void orvenix::SetDiagnosticOutput(DiagnosticOutput output) noexcept {
  g_output.store(output, std::memory_order_relaxed);
}

void UpgradeConfig::DumpData() const noexcept {
  const orvenix::DiagnosticOutput output = g_output.load(std::memory_order_relaxed);
  if (output == nullptr) return;
  const device::LocalBlock<char> buffer = device::LocalBlock<char>::Allocate(kDumpSize);
  if (!buffer) return;
  Dump dump(buffer.get());
  const Fields& f = fields_;
  // KEPT ODDITY: the multicast block size is shown as the port, and the port as the block size.
  dump.Add(
      "MultiCast IP = %s\r\nUDPPort = %d\r\nUDPBlockSize=%d\r\nEncryptionKey = %s\r\n"
      "Parms = %s\r\n",
      f.multicast_address, f.multicast_block_size, f.multicast_port, f.multicast_key,
      f.multicast_parameters);
  dump.Add("BaseURL = %s\r\nHTTPPort = %d\r\nHTTPIPAddr = %s\r\nPacketSize = %d\r\n", f.base_url,
           f.http_port, f.http_address, f.transfer_packet_size);
  dump.Add("Syslog Address = %s\r\nSyslog Port = %d\r\n", f.syslog_address,
           static_cast<int>(f.syslog_port));
  dump.Add("Flash Writer = %s\r\nFlashWriter CmdLine = %s\r\n", f.process_name,
           f.process_parameters);
  dump.AddTexts("Delete file", "Delete File", files_to_delete_);
  dump.AddTexts("Save file", "Save File", files_to_save_);
  dump.AddTexts("Stop Process", "Stop Process", processes_to_stop_);
  AddStores(dump, storage_requirements_);
  dump.AddCount("Download File List", download_files_.size());
  AddPackages(dump, firmware_packages_);
  output(buffer.get());
}

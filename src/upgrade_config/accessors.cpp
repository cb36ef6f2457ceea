// The plain reads and writes of the job record's fields.
#include "base/text.h"
#include "orvenix/upgrade_config.h"

using base::CopyText;
using base::View;

int UpgradeConfig::GetXferPacketSize() const noexcept {
  return fields_.transfer_packet_size;
}

int UpgradeConfig::GetHTTPPort() const noexcept {
  return fields_.http_port;
}
void UpgradeConfig::SetHTTPPort(int port) noexcept {
  fields_.http_port = port;
}

const char* UpgradeConfig::GetHTTPIPAddress() const noexcept {
  return fields_.http_address;
}
void UpgradeConfig::SetHTTPIPAddress(const char* address) noexcept {
  CopyText(fields_.http_address, View(address));
}

const char* UpgradeConfig::GetBaseURL() const noexcept {
  return fields_.base_url;
}
void UpgradeConfig::SetBaseURL(const char* url) noexcept {
  CopyText(fields_.base_url, View(url));
}

const char* UpgradeConfig::GetMCIp() const noexcept {
  return fields_.multicast_address;
}
void UpgradeConfig::SetMCIp(const char* address) noexcept {
  CopyText(fields_.multicast_address, View(address));
}

const char* UpgradeConfig::GetMCEncryptionKey() const noexcept {
  return fields_.multicast_key;
}
void UpgradeConfig::SetMCEncryptionKey(const char* key) noexcept {
  CopyText(fields_.multicast_key, View(key));
}

int UpgradeConfig::GetMulticastPort() const noexcept {
  return fields_.multicast_port;
}
void UpgradeConfig::SetMulticastPort(int port) noexcept {
  fields_.multicast_port = port;
}

int UpgradeConfig::GetMulticastBlockSize() const noexcept {
  return fields_.multicast_block_size;
}
void UpgradeConfig::SetMulticastBlockSize(int bytes) noexcept {
  fields_.multicast_block_size = bytes;
}

const char* UpgradeConfig::GetMCProcessParms() const noexcept {
  return fields_.multicast_parameters;
}
void UpgradeConfig::SetMCProcessParms(const char* parameters) noexcept {
  CopyText(fields_.multicast_parameters, View(parameters));
}

const char* UpgradeConfig::GetProcessName() const noexcept {
  return fields_.process_name;
}
void UpgradeConfig::SetProcessName(const char* program) noexcept {
  CopyText(fields_.process_name, View(program));
}

const char* UpgradeConfig::GetProcessParms() const noexcept {
  return fields_.process_parameters;
}
void UpgradeConfig::SetProcessParms(const char* command_line) noexcept {
  CopyText(fields_.process_parameters, View(command_line));
}
void UpgradeConfig::AppendFlashWriterParms(const char* text) noexcept {
  if (text == nullptr) return;
  base::FixedText<sizeof fields_.process_parameters> parameters(
      base::FieldView(fields_.process_parameters));
  parameters.Append(" ");  // also before the first text
  parameters.Append(text);
  CopyText(fields_.process_parameters, parameters.view());
}

int UpgradeConfig::GetProcessWait() const noexcept {
  return fields_.process_wait;
}
void UpgradeConfig::SetProcessWait(int wait) noexcept {
  fields_.process_wait = wait;
}

int UpgradeConfig::GetShowGUI() const noexcept {
  return fields_.show_gui;
}
void UpgradeConfig::SetShowGUI(int show) noexcept {
  fields_.show_gui = show;
}

const char* UpgradeConfig::GetSysLogIP() const noexcept {
  return fields_.syslog_address;
}
void UpgradeConfig::SetSysLogIP(const char* address) noexcept {
  CopyText(fields_.syslog_address, View(address));
}

int UpgradeConfig::GetSysLogPort() const noexcept {
  return fields_.syslog_port;
}
void UpgradeConfig::SetSysLogPort(int port) noexcept {
  fields_.syslog_port = static_cast<std::uint16_t>(port);
}

const char* UpgradeConfig::GetUpgBeginMsg() const noexcept {
  return fields_.begin_message;
}
void UpgradeConfig::SetUpgBeginMsg(const char* text) noexcept {
  CopyText(fields_.begin_message, View(text));
}

const char* UpgradeConfig::GetUpgEndMsg() const noexcept {
  return fields_.end_message;
}
void UpgradeConfig::SetUpgEndMsg(const char* text) noexcept {
  CopyText(fields_.end_message, View(text));
}

const char* UpgradeConfig::GetVersion() const noexcept {
  return fields_.version;
}

const char* UpgradeConfig::GetFlashFileStore() const noexcept {
  return fields_.flash_file_store;
}
void UpgradeConfig::SetFlashFileStore(const char* folder) noexcept {
  CopyText(fields_.flash_file_store, View(folder));
}

const char* UpgradeConfig::GetFlashFileFolder() const noexcept {
  return fields_.flash_file_folder;
}

const char* UpgradeConfig::GetINFFileSrc() const noexcept {
  return fields_.inf_source;
}

const char* UpgradeConfig::GetINFFile() const noexcept {
  return fields_.inf_file;
}

int UpgradeConfig::GetDownloadLoopCount() const noexcept {
  return fields_.download_loop_count;
}

int UpgradeConfig::GetFirmwarePackageCount() const noexcept {
  return fields_.firmware_package_count;
}

int UpgradeConfig::IsMultiPass() const noexcept {
  return fields_.multi_pass;
}

const char* UpgradeConfig::GetSerialNumber() const noexcept {
  return fields_.serial_number;
}

const char* UpgradeConfig::GetUniqueId() const noexcept {
  return fields_.unique_id;
}

const char* UpgradeConfig::GetMfgString() const noexcept {
  return fields_.manufacturing_string;
}

const char* UpgradeConfig::GetType() const noexcept {
  return fields_.type;
}

const char* UpgradeConfig::GetFamily() const noexcept {
  return fields_.family;
}

const char* UpgradeConfig::GetModel() const noexcept {
  return fields_.model;
}

const char* UpgradeConfig::GetFlash() const noexcept {
  return fields_.flash;
}

tagDownloadFile* UpgradeConfig::GetMCFileList() const noexcept {
  return fields_.multicast_list;
}

const orvenix::PointerList<FirmwarePackage>& UpgradeConfig::FirmwarePackages() const noexcept {
  return firmware_packages_;
}
const orvenix::PointerList<tagDownloadFile>& UpgradeConfig::DownloadFiles() const noexcept {
  return download_files_;
}
const orvenix::PointerList<tagStorageReq>& UpgradeConfig::StorageRequirements() const noexcept {
  return storage_requirements_;
}
const orvenix::PointerList<char>& UpgradeConfig::FilesToDelete() const noexcept {
  return files_to_delete_;
}
const orvenix::PointerList<char>& UpgradeConfig::FilesToSave() const noexcept {
  return files_to_save_;
}
const orvenix::PointerList<char>& UpgradeConfig::ProcessesToStop() const noexcept {
  return processes_to_stop_;
}
const orvenix::PointerList<tagRegistryTest>& UpgradeConfig::RegistryTests() const noexcept {
  return registry_tests_;
}

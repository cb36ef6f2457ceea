// The job record: how it is made, copied and destroyed, its identity and its lists.
#include "orvenix/upgrade_config.h"

#include <coredll.h>

#include <cstddef>
#include <string_view>
#include <utility>

#include "base/format.h"
#include "base/text.h"
#include "device/identity/identity.h"
#include "device/local_memory.h"
#include "upgrade_config/list_keeper.h"

namespace {

using orvenix::ListKeeper;
using orvenix::PointerList;

/// Serial number and configuration text are read with the device's own field width.
constexpr int kDeviceTextCapacity = 24;

using Reader = device::IdentityResult (*)(char*, int*) noexcept;

/// What the device does not tell, or tells at too great a length, leaves the field empty.
template <std::size_t Capacity>
void ReadIdentity(Reader reader, int reader_capacity, char (&field)[Capacity]) noexcept {
  int size = reader_capacity;
  if (reader(field, &size) != device::IdentityResult::kOk) field[0] = '\0';
}

void FreeRecord(void* record) noexcept {
  LocalFree(record);
}

void AddCopy(PointerList<char>& list, const char* text) noexcept {
  const std::string_view view = base::View(text);
  device::LocalBlock<char> copy(static_cast<char*>(LocalAlloc(LMEM_FIXED, view.size() + 1)));
  if (!copy) return ListKeeper::NoteMissing(list);
  base::CopyText<char>(copy.get(), view.size() + 1, view);
  ListKeeper::TakeNew(list, std::move(copy));
}

}  // namespace

UpgradeConfig::UpgradeConfig() noexcept {
  GetDeviceInfo();
}

UpgradeConfig::UpgradeConfig(const UpgradeConfig& other) noexcept = default;

UpgradeConfig& UpgradeConfig::operator=(const UpgradeConfig& other) noexcept {
  if (this == &other) return *this;
  fields_ = other.fields_;
  firmware_packages_ = other.firmware_packages_;
  download_files_ = other.download_files_;
  storage_requirements_ = other.storage_requirements_;
  files_to_delete_ = other.files_to_delete_;
  files_to_save_ = other.files_to_save_;
  processes_to_stop_ = other.processes_to_stop_;
  registry_tests_ = other.registry_tests_;
  return *this;
}

UpgradeConfig::~UpgradeConfig() {
  // A file list that was ended inside the downloads stands in both places.
  tagDownloadFile* const list = fields_.multicast_list;
  if (list != nullptr && !ListKeeper::Holds(download_files_, list)) LocalFree(list);
  ListKeeper::FreeElements(download_files_, FreeRecord);
  ListKeeper::FreeElements(storage_requirements_, FreeRecord);
  ListKeeper::FreeElements(files_to_delete_, FreeRecord);
  ListKeeper::FreeElements(files_to_save_, FreeRecord);
  ListKeeper::FreeElements(processes_to_stop_, FreeRecord);
  ListKeeper::FreeElements(registry_tests_, FreeRecord);
  ListKeeper::FreeElements(firmware_packages_, [](FirmwarePackage* package) { delete package; });
}

void* UpgradeConfig::operator new(std::size_t size) noexcept {
  return LocalAlloc(LMEM_FIXED, size);
}

void UpgradeConfig::operator delete(void* record) noexcept {
  if (record != nullptr) LocalFree(record);
}

void UpgradeConfig::GetDeviceInfo() noexcept {
  Fields& f = fields_;
  ReadIdentity(device::GetSerialNumber, kDeviceTextCapacity, f.serial_number);
  ReadIdentity(device::GetConfigurationText, kDeviceTextCapacity, f.manufacturing_string);
  const base::FixedText<sizeof f.manufacturing_string> made(
      base::FieldView(f.manufacturing_string));
  const auto letters = [&made](std::size_t from, std::size_t count) {
    return base::Part(made.view(), from, count);
  };
  const bool is_computer = letters(0, 1) == "7";
  base::CopyText(f.type, is_computer ? "Computer" : letters(0, 1));
  base::CopyText(f.family, is_computer ? "7xx" : letters(1, 1));
  base::CopyText(f.model, is_computer ? letters(0, 4) : letters(2, 2));
  ReadIdentity(device::GetUniqueId, static_cast<int>(sizeof f.unique_id), f.unique_id);
  base::Format(f.flash, sizeof f.flash, "%d", 0);
}

void UpgradeConfig::AddMCFileList(tagDownloadFile* list) noexcept {
  fields_.multicast_list = list;
}

void UpgradeConfig::AddFileSave(const char* path) noexcept {
  AddCopy(files_to_save_, path);
}
void UpgradeConfig::AddFileDelete(const char* path) noexcept {
  AddCopy(files_to_delete_, path);
}
void UpgradeConfig::AddStopProcess(const char* program) noexcept {
  AddCopy(processes_to_stop_, program);
}

void UpgradeConfig::AddDownloadFile(tagDownloadFile* file) noexcept {
  ListKeeper::Take(download_files_, file, [this](tagDownloadFile* lost) {
    if (lost != fields_.multicast_list) FreeRecord(lost);
  });
}

void UpgradeConfig::AddFirmwarePkg(FirmwarePackage* package) noexcept {
  ListKeeper::Take(firmware_packages_, package, [](FirmwarePackage* lost) { delete lost; });
}

void UpgradeConfig::AddStorageReqEntry(tagStorageReq* requirement) noexcept {
  ListKeeper::Take(storage_requirements_, requirement, FreeRecord);
}

void UpgradeConfig::AddRegistryTest(tagRegistryTest* test) noexcept {
  ListKeeper::Take(registry_tests_, test, FreeRecord);
}

#include "product_support/jobs.h"

#include <new>
#include <stdexcept>

#include "base/text.h"
#include "ce/system.h"

namespace test {
namespace {

template <typename Record>
Record* NewRecord() {
  void* const memory = LocalAlloc(LPTR, sizeof(Record));
  if (memory == nullptr) throw std::bad_alloc();
  return new (memory) Record();
}

template <std::size_t Capacity>
void Put(char (&field)[Capacity], std::string_view text) {
  if (!base::CopyText(field, text)) throw std::length_error(std::string(text));
}

}  // namespace

void SetMultiPass(UpgradeConfig& job) {
  FieldsOf(job).multi_pass = 1;
}

void SetInf(UpgradeConfig& job, std::string_view source, std::string_view destination) {
  Put(FieldsOf(job).inf_source, source);
  Put(FieldsOf(job).inf_file, destination);
}

void SetFamily(UpgradeConfig& job, std::string_view family) {
  Put(FieldsOf(job).family, family);
}

void SetTypeAndFamily(UpgradeConfig& job, std::string_view type, std::string_view family) {
  Put(FieldsOf(job).type, type);
  Put(FieldsOf(job).family, family);
}

void SetMfgString(UpgradeConfig& job, std::string_view text) {
  Put(FieldsOf(job).manufacturing_string, text);
}

tagDownloadFile* MakeFile(const FileOfJob& file) {
  auto* const record = NewRecord<tagDownloadFile>();
  Put(record->source, file.source);
  Put(record->destination, file.destination);
  Put(record->masks, file.masks);
  Put(record->crc, file.crc);
  Put(record->size, file.size);
  return record;
}

void AddStore(UpgradeConfig& job, std::string_view name, std::string_view size) {
  auto* const record = NewRecord<tagStorageReq>();
  Put(record->name, name);
  Put(record->required_space, size);
  job.AddStorageReqEntry(record);
}

void AddPackage(UpgradeConfig& job, const PackageOfJob& package) {
  auto* const record = new FirmwarePackage;
  record->count = package.count;
  Put(record->base, package.base);
  Put(record->destination_folder, package.destination_folder);
  Put(record->source_folder, package.source_folder);
  Put(record->command_line, package.command_line);
  Put(record->additional_parameters, package.options);
  job.AddFirmwarePkg(record);
}

void AddTest(UpgradeConfig& job, const TestOfJob& test) {
  auto* const record = NewRecord<tagRegistryTest>();
  Put(record->root, test.root);
  Put(record->key, test.key);
  Put(record->value_name, test.value_name);
  Put(record->type, test.type);
  Put(record->operation, test.operation);
  Put(record->value, test.value);
  Put(record->error_message, test.message);
  job.AddRegistryTest(record);
}

}  // namespace test

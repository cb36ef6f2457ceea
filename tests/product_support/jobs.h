// Jobs for tests: records filled in one line, and the fields that only a configuration file sets.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "orvenix/upgrade_config.h"

namespace test {

/// The job's private fields. Nobody but a configuration file may set some of them, so a test has to
/// reach in.
auto& FieldsOf(UpgradeConfig& job);

template <auto kMember>
struct ExposeFields {
  friend auto& FieldsOf(UpgradeConfig& job) { return job.*kMember; }
};
template struct ExposeFields<&UpgradeConfig::fields_>;

void SetMultiPass(UpgradeConfig& job);
void SetInf(UpgradeConfig& job, std::string_view source, std::string_view destination);
void SetFamily(UpgradeConfig& job, std::string_view family);
void SetTypeAndFamily(UpgradeConfig& job, std::string_view type, std::string_view family);
void SetMfgString(UpgradeConfig& job, std::string_view text);

struct FileOfJob {
  std::string_view source;
  std::string_view destination;
  std::string_view masks = "*";
  std::string_view crc = "0";
  std::string_view size = "0";
};
/// A record from the device's heap, for the caller to hand over.
tagDownloadFile* MakeFile(const FileOfJob& file);

void AddStore(UpgradeConfig& job, std::string_view name, std::string_view size);

struct PackageOfJob {
  std::int32_t count = 0;
  std::string_view base;
  std::string_view destination_folder;
  std::string_view source_folder;
  std::string_view command_line;
  std::string_view options;
};
void AddPackage(UpgradeConfig& job, const PackageOfJob& package);

struct TestOfJob {
  std::string_view root = "HKEY_LOCAL_MACHINE";
  std::string_view key;
  std::string_view value_name;
  std::string_view type;
  std::string_view operation;
  std::string_view value;
  std::string_view message;
};
void AddTest(UpgradeConfig& job, const TestOfJob& test);

}  // namespace test

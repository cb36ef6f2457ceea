// Input: an upgrade configuration file of any bytes, loaded on a simulated device. Checks what
// every reader of a job relies on: texts end within their fields, counts fit, and nothing is loaded
// by half.
#include <stdlib.h>

#include <array>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>

#include "ce/files.h"
#include "ce/kernel.h"
#include "ce/system.h"
#include "device/device.h"
#include "kernel/kernel.h"
#include "memory/memory.h"
#include "orvenix/upgrade_config.h"
#include "profile/profile.h"
#include "upgrade_config/diagnostic_output.h"
#include "world/sim_thread.h"
#include "world/world.h"
#include "xml/document.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

/// The device of all inputs.
class Handheld {
 public:
  Handheld() : world_(sim::World::MakeVirtual(1)) {
    std::string name = (std::filesystem::temp_directory_path() / "orvenix-fuzz-XXXXXX").string();
    Require(::mkdtemp(name.data()) != nullptr);
    folder_ = name;
    device_ = std::make_unique<sim::Device>(*world_, sim::Profile{}, folder_ / "device");
    thread_ = std::make_unique<sim::AttachedThread>(*device_, "fuzz");
    CreateDirectoryW(u"\\windows", nullptr);
  }
  ~Handheld() {
    thread_.reset();
    device_.reset();
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
  }
  Handheld(const Handheld&) = delete;
  Handheld& operator=(const Handheld&) = delete;

  [[nodiscard]] sim::Device& device() { return *device_; }

  static void Put(const std::uint8_t* data, std::size_t size) {
    HANDLE const file = CreateFileW(u"\\windows\\job.xml", GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                    FILE_ATTRIBUTE_NORMAL, nullptr);
    DWORD written = 0;
    Require(WriteFile(file, data, static_cast<DWORD>(size), &written, nullptr) != 0);
    CloseHandle(file);
  }

 private:
  std::filesystem::path folder_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  std::unique_ptr<sim::AttachedThread> thread_;
};

template <std::size_t Capacity>
std::string_view Text(const char (&field)[Capacity]) {
  Require(std::memchr(field, 0, Capacity) != nullptr);
  return field;
}

void CheckFolder(std::string_view folder, bool may_be_ram) {
  const bool is_ram = folder.size() == 4 && folder.back() == ':';
  Require(folder.back() == '\\' || (may_be_ram && is_ram));
}

void CheckRecords(const UpgradeConfig& job) {
  for (const tagDownloadFile* file : job.DownloadFiles()) {
    Text(file->source);
    Text(file->destination);
    Require(Text(file->crc).empty() && Text(file->masks).empty() && Text(file->size).empty());
  }
  for (const tagRegistryTest* test : job.RegistryTests()) {
    Text(test->root);
    Text(test->key);
    Text(test->value_name);
    Text(test->value);
    Text(test->type);
    Text(test->error_message);
    Text(test->operation);
  }
  bool multi_pass = false;
  for (const FirmwarePackage* package : job.FirmwarePackages()) {
    Text(package->base);
    Text(package->command_line);
    CheckFolder(Text(package->source_folder), false);
    const std::string_view destination = Text(package->destination_folder);
    if (!destination.empty()) CheckFolder(destination, true);
    const std::string_view options = Text(package->additional_parameters);
    multi_pass = multi_pass || options.find("Pass=") != std::string_view::npos;
  }
  Require(job.IsMultiPass() == (multi_pass ? 1 : 0));
  Require(job.FirmwarePackages().size() <= static_cast<std::size_t>(job.GetFirmwarePackageCount()));
}

void CheckFields(const UpgradeConfig& job) {
  const struct {
    const char* text;
    std::size_t size;
  } fields[] = {{job.GetVersion(), 64},      {job.GetBaseURL(), 256},
                {job.GetSysLogIP(), 32},     {job.GetFlashFileFolder(), 128},
                {job.GetINFFileSrc(), 260},  {job.GetINFFile(), 64},
                {job.GetProcessName(), 260}, {job.GetProcessParms(), 260},
                {job.GetUpgBeginMsg(), 64},  {job.GetUpgEndMsg(), 64}};
  for (const auto& field : fields) Require(std::strlen(field.text) < field.size);
  Require(job.GetShowGUI() == 0 || job.GetShowGUI() == 1);
  Require(job.GetProcessWait() == 0 || job.GetProcessWait() == 1);
  // What a file says nothing about.
  Require(job.StorageRequirements().empty() && job.GetMCFileList() == nullptr);
  Require(*job.GetHTTPIPAddress() == '\0' && *job.GetMCIp() == '\0');
  Require(std::string_view(job.GetMfgString()) == "TQ52-A1");
}

using Sizes = std::array<std::size_t, 7>;
Sizes SizesOf(const UpgradeConfig& job) {
  return {job.ProcessesToStop().size(),
          job.DownloadFiles().size(),
          job.FilesToDelete().size(),
          job.FilesToSave().size(),
          job.RegistryTests().size(),
          job.FirmwarePackages().size(),
          static_cast<std::size_t>(job.GetFirmwarePackageCount())};
}

void Load(UpgradeConfig& job, const std::uint8_t* data, std::size_t size) {
  Handheld::Put(data, size);
  Require(job.LoadFromFile(u"job.xml") == 1);
  Require(GetFileAttributesW(u"\\windows\\job.xml") == INVALID_FILE_ATTRIBUTES);
  CheckFields(job);
  CheckRecords(job);
}

bool IsDocument(const std::uint8_t* data, std::size_t size) {
  xml::XmlDocument document;
  return document.LoadFromText(reinterpret_cast<const char*>(data), size);
}

void Check(const std::uint8_t* data, std::size_t size) {
  UpgradeConfig job;
  Load(job, data, size);
  const Sizes once = SizesOf(job);
  if (!IsDocument(data, size)) Require(once == Sizes{} && *job.GetBaseURL() == '\0');
  const std::string url = job.GetBaseURL();
  const int port = job.GetHTTPPort();

  // A second time: lists grow by the same again, single values stay.
  Load(job, data, size);
  const Sizes twice = SizesOf(job);
  for (std::size_t i = 0; i < once.size(); ++i) Require(twice[i] == 2 * once[i]);
  Require(job.GetBaseURL() == url && job.GetHTTPPort() == port);
  job.DumpData();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static Handheld handheld;
  orvenix::SetDiagnosticOutput([](const char* text) noexcept {
    Require(std::strlen(text) < 4096 && std::strncmp(text, "MultiCast IP = ", 15) == 0);
  });
  const std::size_t blocks = handheld.device().memory().live_blocks();
  const std::size_t handles = handheld.device().kernel().OpenHandles();
  Check(data, size);
  Require(handheld.device().memory().live_blocks() == blocks);
  Require(handheld.device().memory().bad_frees() == 0);
  Require(handheld.device().kernel().OpenHandles() == handles);
  DeleteFileW(u"\\FileXfer.log");
  Sleep(1);  // a program that never waits is taken for one in a loop
  return 0;
}

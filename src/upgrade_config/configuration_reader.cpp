#include "upgrade_config/configuration_reader.h"

#include <cstddef>
#include <utility>

#include "base/number.h"
#include "base/text.h"
#include "device/local_memory.h"
#include "report/log/log.h"
#include "upgrade_config/list_keeper.h"
#include "upgrade_config/selection/package_selection.h"

namespace orvenix {
namespace {

using base::CopyText;
using base::EqualIgnoringCase;
using base::LeadingInt;
using base::View;
using xml::XmlStep;

/// The file name and extension at the end of a path.
std::string_view FileNameOf(std::string_view path) noexcept {
  const std::size_t separator = path.find_last_of("\\/:");
  return separator == std::string_view::npos ? path : base::Part(path, separator + 1);
}

/// Copies a folder so that it ends in a backslash even where it is cut: without one, names of files
/// would be joined to its last name.
template <std::size_t Capacity>
void CopyFolder(char (&field)[Capacity], std::string_view folder) noexcept {
  if (base::EndsWith(folder, "\\")) folder.remove_suffix(1);
  base::FixedText<Capacity> text(base::Part(folder, 0, Capacity - 2));
  text.Append("\\");
  CopyText(field, text.view());
}

void TakeTestField(tagRegistryTest& test, std::string_view name, std::string_view text) noexcept {
  struct Field {
    std::string_view name;
    char* out;
    std::size_t capacity;
  };
  const Field fields[] = {
      {"Root", test.root, sizeof test.root},
      {"Key", test.key, sizeof test.key},
      {"ValueName", test.value_name, sizeof test.value_name},
      {"Type", test.type, sizeof test.type},
      {"Operator", test.operation, sizeof test.operation},
      {"Value", test.value, sizeof test.value},
      {"ErrorMsg", test.error_message, sizeof test.error_message},
  };
  for (const Field& field : fields) {
    if (field.name == name) CopyText<char>(field.out, field.capacity, text);
  }
}

}  // namespace

// Constant expressions: the library has nothing to do before its first call.
constexpr ConfigurationReader::TextElement ConfigurationReader::kTextElements[] = {
    {"HTTPPort",
     [](UpgradeConfig& job, const char* text) noexcept { job.SetHTTPPort(LeadingInt(text)); }},
    {"BaseUrl",
     [](UpgradeConfig& job, const char* text) noexcept {
       if (*job.GetBaseURL() == '\0') job.SetBaseURL(text);  // what the host has set wins
     }},
    {"FlashFileDir",
     [](UpgradeConfig& job, const char* text) noexcept {
       CopyText(job.fields_.flash_file_folder, text);
     }},
    {"FilePacketXferSize",
     [](UpgradeConfig& job, const char* text) noexcept {
       job.fields_.transfer_packet_size = LeadingInt(text);
     }},
    {"InfFile",
     [](UpgradeConfig& job, const char* text) noexcept {
       CopyText(job.fields_.inf_source, text);
       CopyText(job.fields_.inf_file, FileNameOf(text));
     }},
    {"BeginText", [](UpgradeConfig& job, const char* text) noexcept { job.SetUpgBeginMsg(text); }},
    {"EndText", [](UpgradeConfig& job, const char* text) noexcept { job.SetUpgEndMsg(text); }},
    {"ShowGUI",
     [](UpgradeConfig& job, const char* text) noexcept {
       job.SetShowGUI(EqualIgnoringCase(text, "false") ? 0 : 1);
     },
     true},
    {"DownloadLoopCnt",
     [](UpgradeConfig& job, const char* text) noexcept {
       job.fields_.download_loop_count = LeadingInt(text);
     }},
};

constexpr ConfigurationReader::OtherElement ConfigurationReader::kOtherElements[] = {
    {"UpgradeConfig", &ConfigurationReader::TakeVersion},
    {"Syslog", &ConfigurationReader::TakeSyslog},
    {"FlashWriter", &ConfigurationReader::TakeFlashWriter},
    {"StopProcesses", &ConfigurationReader::ReadStopProcesses},
    {"Downloads", &ConfigurationReader::ReadDownloads},
    {"DiskCleanup", &ConfigurationReader::ReadDiskCleanup},
    {"Registry", &ConfigurationReader::ReadRegistry},
    {"OSFirmware", &ConfigurationReader::ReadFirmware},
};

// KEPT ODDITY: the root itself is never looked at. A file whose root is "UpgradeConfig" has no
// version; one below the root has.
void ConfigurationReader::Read(xml::XmlDocument& document) noexcept {
  if (!cursor_.Attach(&document) || !cursor_.BeginChildren()) return;
  for (step_ = XmlStep::kStart; step_ != XmlStep::kOver; Next()) {
    if (step_ == XmlStep::kStart) TakeElement();
  }
}

XmlStep ConfigurationReader::Next() noexcept {
  if (step_ != XmlStep::kOver) step_ = cursor_.Next();
  return step_;
}

void ConfigurationReader::TakeElement() noexcept {
  for (const TextElement& element : kTextElements) {
    const bool same = element.in_any_letter_case ? EqualIgnoringCase(Name(), element.name)
                                                 : Name() == element.name;
    if (!same) continue;
    if (const char* const text = cursor_.Text(); text != nullptr) element.take(job_, text);
    return;
  }
  for (const OtherElement& element : kOtherElements) {
    if (Name() == element.name) {
      (this->*element.take)();
      return;
    }
  }
}

template <typename Take>
void ConfigurationReader::ReadList(std::string_view list, Take take) noexcept {
  while (Next() != XmlStep::kOver) {
    if (step_ == XmlStep::kStart) take();
    if (step_ == XmlStep::kEnd && Name() == list) return;
  }
}

void ConfigurationReader::TakeVersion() noexcept {
  const char* const version = cursor_.Attribute("Version");
  if (version != nullptr) CopyText(job_.fields_.version, version);
}

void ConfigurationReader::TakeSyslog() noexcept {
  const char* const address = cursor_.Attribute("Address");
  if (address != nullptr) job_.SetSysLogIP(address);
  const char* const port = cursor_.Attribute("Port");
  if (port != nullptr) job_.SetSysLogPort(LeadingInt(port));
}

void ConfigurationReader::TakeFlashWriter() noexcept {
  const char* const program = cursor_.Attribute("Name");
  if (program != nullptr) job_.SetProcessName(program);
  const char* const command_line = cursor_.Attribute("CmdLine");
  if (command_line != nullptr) job_.SetProcessParms(command_line);
  if (View(cursor_.Attribute("Wait")) == "false") job_.SetProcessWait(0);
}

void ConfigurationReader::ReadStopProcesses() noexcept {
  ReadList("StopProcesses", [this] {
    const char* const program = cursor_.Text();
    if (Name() == "Process" && program != nullptr) job_.AddStopProcess(program);
  });
}

void ConfigurationReader::ReadDownloads() noexcept {
  ReadList("Downloads", [this] {
    if (Name() == "File") TakeDownload();
  });
}

void ConfigurationReader::TakeDownload() noexcept {
  const char* const from = cursor_.Attribute("SourceDir");
  const char* const to = cursor_.Attribute("DestDir");
  if (from == nullptr || to == nullptr) return;
  auto file = device::LocalBlock<tagDownloadFile>::Allocate();
  if (!file) return ListKeeper::NoteMissing(job_.download_files_);
  CopyText(file->source, from);
  CopyText(file->destination, to);
  ListKeeper::TakeNew(job_.download_files_, std::move(file));
}

void ConfigurationReader::ReadDiskCleanup() noexcept {
  ReadList("DiskCleanup", [this] {
    if (Name() == "File") TakeCleanup();
  });
}

void ConfigurationReader::TakeCleanup() noexcept {
  const char* const path = cursor_.Text();
  if (path == nullptr) return;
  const std::string_view action = View(cursor_.Attribute("Action"));
  if (EqualIgnoringCase(action, "delete")) job_.AddFileDelete(path);
  if (EqualIgnoringCase(action, "save")) job_.AddFileSave(path);
}

// A test from a file has no defaults: without a type of its own it can only fail. Without a root it
// is made where the test before it was.
void ConfigurationReader::ReadRegistry() noexcept {
  report::Log("UpgradeConfig - Registry\r\n");
  auto test = device::LocalBlock<tagRegistryTest>::Allocate();
  ReadList("Registry", [this, &test] {
    const char* const text = cursor_.Text();
    if (test && text != nullptr) TakeTestField(*test, Name(), text);
  });
  if (!test) return ListKeeper::NoteMissing(job_.registry_tests_);
  report::Log("UpgradeConfig - Adding Registry Item\r\n");
  ListKeeper::TakeNew(job_.registry_tests_, std::move(test));
}

void ConfigurationReader::ReadFirmware() noexcept {
  ReadList("OSFirmware", [this] {
    if (Name() != "Package") return;
    ++job_.fields_.firmware_package_count;  // of the file, whatever this device takes of them
    if (IsPackageForDevice()) TakePackage();
  });
}

bool ConfigurationReader::IsPackageForDevice() const noexcept {
  const char* const flash = cursor_.Attribute("FLASH");
  if (flash != nullptr && !EqualIgnoringCase(flash, job_.GetFlash())) return false;
  return SelectsDevice(View(cursor_.Attribute("HardwareVersion")), job_.GetMfgString());
}

void ConfigurationReader::TakePackage() noexcept {
  const char* const from = cursor_.Attribute("SourceDir");
  if (from == nullptr) return;
  device::LocalObject<FirmwarePackage> package(new FirmwarePackage);
  if (!package) return ListKeeper::NoteMissing(job_.firmware_packages_);
  CopyFolder(package->source_folder, from);
  CopyText(package->base, View(cursor_.Attribute("Base")));
  const char* const to = cursor_.Attribute("DestDir");
  if (to != nullptr && EqualIgnoringCase(to, "RAM:")) {
    CopyText(package->destination_folder, to);
  } else if (to != nullptr) {
    CopyFolder(package->destination_folder, to);
  }
  package->count = LeadingInt(View(cursor_.Attribute("Count")));
  CopyText(package->command_line, View(cursor_.Attribute("CmdLine")));
  CopyText(package->additional_parameters, View(cursor_.Attribute("AdditionalParms")));
  const std::string_view options = package->additional_parameters;
  const bool names_pass = options.find("Pass=") != std::string_view::npos;
  const bool listed = ListKeeper::TakeNew(job_.firmware_packages_, std::move(package));
  if (listed && names_pass) job_.fields_.multi_pass = 1;
}

}  // namespace orvenix

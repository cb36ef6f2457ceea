#include "configlet/fields.h"

#include <string_view>

#include "base/number.h"
#include "base/text.h"
#include "configlet/walk.h"

namespace configlet {
namespace {

// ---- fields of the job ----

template <void (UpgradeConfig::*set)(const char*) noexcept>
void JobText(Walk& walk, const char* value) noexcept {
  if (walk.open_job() != nullptr) (walk.open_job()->*set)(value);
}

template <void (UpgradeConfig::*set)(int) noexcept>
void JobNumber(Walk& walk, const char* value) noexcept {
  if (walk.open_job() != nullptr) (walk.open_job()->*set)(base::LeadingInt(value));
}

/// KEPT ODDITY: only the exact text "false" is false; "False", "0" and "" are true.
template <void (UpgradeConfig::*set)(int) noexcept>
void JobSwitch(Walk& walk, const char* value) noexcept {
  if (walk.open_job() != nullptr)
    (walk.open_job()->*set)(std::string_view(value) == "false" ? 0 : 1);
}

void Process(Walk& walk, const char* value) noexcept {
  if (walk.in_start_process) {
    JobText<&UpgradeConfig::SetProcessName>(walk, value);
  } else if (base::EqualIgnoringCase(walk.group.view(), "StopProcess")) {
    JobText<&UpgradeConfig::AddStopProcess>(walk, value);
  }
}

void Parameters(Walk& walk, const char* value) noexcept {
  // KEPT ODDITY: the letter case of this group's name counts here and nowhere else but in the
  // names "File" and "Store" below.
  if (walk.group.view() == "MulticastClient") {
    JobText<&UpgradeConfig::SetMCProcessParms>(walk, value);
  } else if (walk.in_start_process) {
    JobText<&UpgradeConfig::SetProcessParms>(walk, value);
  }
}

void Wait(Walk& walk, const char* value) noexcept {
  if (walk.in_start_process) JobSwitch<&UpgradeConfig::SetProcessWait>(walk, value);
}

// ---- fields of the record that is being filled ----

template <auto field>
void DownloadText(Walk& walk, const char* value) noexcept {
  tagDownloadFile* const file = walk.download_file.get();
  if (file != nullptr && (walk.in_download || walk.in_file_list)) {
    base::CopyText(file->*field, value);
  }
}

template <auto field>
void TestText(Walk& walk, const char* value) noexcept {
  tagRegistryTest* const test = walk.registry_test.get();
  if (test != nullptr) base::CopyText(test->*field, value);
}

void RequiredSpace(Walk& walk, const char* value) noexcept {
  tagStorageReq* const requirement = walk.storage.get();
  if (requirement != nullptr) base::CopyText(requirement->required_space, value);
}

void Action(Walk& walk, const char* value) noexcept {
  if (walk.group.view() != "File") return;
  if (base::EqualIgnoringCase(value, "Delete")) walk.cleanup_action = Walk::kDelete;
  if (base::EqualIgnoringCase(value, "Save")) walk.cleanup_action = Walk::kSave;
}

void Name(Walk& walk, const char* value) noexcept {
  if (walk.group.view() == "File") {
    walk.cleanup_name.Assign(value);  // cut as every field is
  } else if (walk.group.view() == "Store" && walk.storage.get() != nullptr) {
    base::CopyText(walk.storage.get()->name, value);
  }
}

using Job = UpgradeConfig;
constexpr NameMatch kLeading = NameMatch::kLeadingPart;

// In the order in which names are compared: the first row that matches wins, so the order is part
// of the interface ("P" is the syslog port, "Pro" a process).
constexpr FieldRow kFields[] = {
    {"Address", kLeading, JobText<&Job::SetSysLogIP>},
    {"Port", kLeading, JobNumber<&Job::SetSysLogPort>},
    {"IPAddress", kLeading, JobText<&Job::SetHTTPIPAddress>},
    {"HTTPPort", kLeading, JobNumber<&Job::SetHTTPPort>},
    {"BaseURL", kLeading, JobText<&Job::SetBaseURL>},
    {"MulticastIP", kLeading, JobText<&Job::SetMCIp>},
    {"EncryptionKey", kLeading, JobText<&Job::SetMCEncryptionKey>},
    {"UDPPort", kLeading, JobNumber<&Job::SetMulticastPort>},
    {"UDPBlockSize", kLeading, JobNumber<&Job::SetMulticastBlockSize>},
    {"Process", kLeading, Process},
    {"Parameters", kLeading, Parameters},
    {"Wait", kLeading, Wait},
    {"ShowGUI", kLeading, JobSwitch<&Job::SetShowGUI>},
    {"Action", kLeading, Action},
    {"Name", kLeading, Name},
    {"BeginText", kLeading, JobText<&Job::SetUpgBeginMsg>},
    {"EndText", kLeading, JobText<&Job::SetUpgEndMsg>},
    {"Source", kLeading, DownloadText<&tagDownloadFile::source>},
    {"Dest", kLeading, DownloadText<&tagDownloadFile::destination>},
    {"CRC", kLeading, DownloadText<&tagDownloadFile::crc>},
    {"MCTMask", kLeading, DownloadText<&tagDownloadFile::masks>},
    {"RequiredSpace", kLeading, RequiredSpace},
    {"Root", kLeading, TestText<&tagRegistryTest::root>},
    {"Key", kLeading, TestText<&tagRegistryTest::key>},
    {"ValueName", NameMatch::kWhole, TestText<&tagRegistryTest::value_name>},
    {"Type", kLeading, TestText<&tagRegistryTest::type>},
    {"Operator", kLeading, TestText<&tagRegistryTest::operation>},
    {"Value", NameMatch::kWhole, TestText<&tagRegistryTest::value>},
    {"ErrorMsg", kLeading, TestText<&tagRegistryTest::error_message>},
};

constexpr const FieldRow* Find(std::string_view name) noexcept {
  for (const FieldRow& row : kFields) {
    const std::string_view known =
        row.match == NameMatch::kWhole ? row.name : base::Part(row.name, 0, name.size());
    if (base::EqualIgnoringCase(known, name)) return &row;
  }
  return nullptr;
}

static_assert(Find("P")->name == "Port" && Find("pro")->name == "Process");
static_assert(Find("")->name == "Address", "an empty name sets the syslog address");
static_assert(Find("Val") == nullptr && Find("value")->name == "Value");
static_assert(Find("Portal") == nullptr, "a longer name never matches");

}  // namespace

const FieldRow* FindField(std::string_view name) noexcept {
  return Find(name);
}

}  // namespace configlet

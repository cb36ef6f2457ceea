#include "tools/lint/device_job.h"

#include <algorithm>
#include <string_view>

#include "base/text.h"
#include "tools/lint/checks.h"

namespace tools {
namespace {

/// What the walk remembers between two calls.
class Reader {
 public:
  Reader(const std::string& name, Findings& findings) : name_(name), findings_(findings) {}

  void Group(const JobGroup& group);
  DeviceJob Finish();

  /// Where a field's text goes; null when the field has no meaning here.
  Setting* Job(Setting DeviceJob::*setting) { return &(job_.*setting); }
  Setting* Program();
  Setting* Parameters();
  Setting* Wait() { return in_start_process_ ? &job_.wait : nullptr; }
  Setting* Action() { return IsGroup("File") ? &cleanup_action_ : nullptr; }
  Setting* Name();
  Setting* Download(Setting DownloadSettings::*setting);
  Setting* Store(Setting StoreSettings::*setting);
  Setting* Test(Setting TestSettings::*setting);

 private:
  void Field(const JobField& field);
  void Begin(const JobGroup& group);
  void End(const JobGroup& group);
  void EndFile();
  void EndUpgrade(int line);

  /// The letter case of three groups' names counts for some fields.
  bool IsGroup(std::string_view exact);
  void Add(Rule rule, int line, const std::string& found) {
    findings_.Add(rule, name_ + ":" + std::to_string(line), found);
  }

  const std::string& name_;
  Findings& findings_;
  DeviceJob job_;
  std::string group_;  ///< begun last; its end does not bring the outer one back
  int line_ = 0;       ///< of the call
  bool has_job_ = false, started_ = false;
  bool in_download_ = false, in_file_list_ = false, in_cleanup_ = false, in_start_process_ = false;
  int upgrades_ = 0;
  int open_stores_ = 0, open_tests_ = 0;
  DownloadSettings download_;
  StoreSettings store_;
  TestSettings test_;
  Setting cleanup_name_, cleanup_action_, stop_;
  bool case_told_ = false;
};

struct FieldRow {
  std::string_view name;
  std::size_t limit;  ///< characters that the device keeps; 0: a number or a word
  Setting* (*place)(Reader& in);
  bool whole = false;  ///< leading parts do not stand for it
};

template <Setting DeviceJob::*setting>
Setting* OfJob(Reader& in) {
  return in.Job(setting);
}
template <Setting DownloadSettings::*setting>
Setting* OfFile(Reader& in) {
  return in.Download(setting);
}
template <Setting TestSettings::*setting>
Setting* OfTest(Reader& in) {
  return in.Test(setting);
}

// In the order in which the device compares names: the first that begins with the given name wins.
constexpr FieldRow kFields[] = {
    {"Address", 31, OfJob<&DeviceJob::syslog_address>},
    {"Port", 0, OfJob<&DeviceJob::syslog_port>},
    {"IPAddress", 23, OfJob<&DeviceJob::http_address>},
    {"HTTPPort", 0, OfJob<&DeviceJob::http_port>},
    {"BaseURL", 255, OfJob<&DeviceJob::base_url>},
    {"MulticastIP", 23, OfJob<&DeviceJob::multicast_address>},
    {"EncryptionKey", 255, OfJob<&DeviceJob::multicast_key>},
    {"UDPPort", 0, OfJob<&DeviceJob::multicast_port>},
    {"UDPBlockSize", 0, OfJob<&DeviceJob::multicast_block>},
    {"Process", 259, [](Reader& in) { return in.Program(); }},
    {"Parameters", 259, [](Reader& in) { return in.Parameters(); }},
    {"Wait", 0, [](Reader& in) { return in.Wait(); }},
    {"ShowGUI", 0, OfJob<&DeviceJob::show_window>},
    {"Action", 0, [](Reader& in) { return in.Action(); }},
    {"Name", 259, [](Reader& in) { return in.Name(); }},
    {"BeginText", 63, OfJob<&DeviceJob::begin_text>},
    {"EndText", 63, OfJob<&DeviceJob::end_text>},
    {"Source", 259, OfFile<&DownloadSettings::source>},
    {"Dest", 259, OfFile<&DownloadSettings::destination>},
    {"CRC", 31, OfFile<&DownloadSettings::crc>},
    {"MCTMask", 2007, OfFile<&DownloadSettings::masks>},
    {"RequiredSpace", 31, [](Reader& in) { return in.Store(&StoreSettings::space); }},
    {"Root", 259, OfTest<&TestSettings::root>},
    {"Key", 259, OfTest<&TestSettings::key>},
    {"ValueName", 259, OfTest<&TestSettings::value_name>, true},
    {"Type", 23, OfTest<&TestSettings::type>},
    {"Operator", 11, OfTest<&TestSettings::operation>},
    {"Value", 259, OfTest<&TestSettings::value>, true},
    {"ErrorMsg", 255, OfTest<&TestSettings::message>},
};

constexpr std::string_view kGroups[] = {"Orvenix",
                                        "Syslog",
                                        "Upgrade",
                                        "MultiCast",
                                        "MulticastClient",
                                        "HTTPServer",
                                        "Download",
                                        "StorageRequirements",
                                        "Store",
                                        "DiskCleanup",
                                        "File",
                                        "FileList",
                                        "AlternateRTWReason",
                                        "StartProcess",
                                        "StopProcess",
                                        "Process",
                                        "Tests",
                                        "Test",
                                        "Registry"};

const FieldRow* FindField(std::string_view name) {
  for (const FieldRow& row : kFields) {
    if (base::EqualIgnoringCase(row.whole ? row.name : row.name.substr(0, name.size()), name)) {
      return &row;
    }
  }
  return nullptr;
}

bool Is(const JobGroup& group, std::string_view name) {
  return base::EqualIgnoringCase(group.name, name);
}

// ---- where fields go ----

bool Reader::IsGroup(std::string_view exact) {
  if (group_ == exact) return true;
  if (base::EqualIgnoringCase(group_, exact)) {
    Add(Rule::kGroupCase, line_, "the group is written " + Quoted(group_));
    case_told_ = true;
  }
  return false;
}

Setting* Reader::Program() {
  if (in_start_process_) return &job_.program;
  return base::EqualIgnoringCase(group_, "StopProcess") ? &stop_ : nullptr;
}

Setting* Reader::Parameters() {
  if (IsGroup("MulticastClient")) return &job_.multicast_parameters;
  return in_start_process_ ? &job_.parameters : nullptr;
}

Setting* Reader::Name() {
  if (IsGroup("File")) return &cleanup_name_;
  return IsGroup("Store") ? &store_.name : nullptr;
}

Setting* Reader::Download(Setting DownloadSettings::*setting) {
  return in_download_ || in_file_list_ ? &(download_.*setting) : nullptr;
}

Setting* Reader::Store(Setting StoreSettings::*setting) {
  if (open_stores_ == 0) Add(Rule::kStrayField, line_, "a field of \"Store\" stands outside of it");
  return &(store_.*setting);
}

Setting* Reader::Test(Setting TestSettings::*setting) {
  if (open_tests_ == 0) {
    Add(Rule::kStrayField, line_, "a field of \"Registry\" stands outside of it");
  }
  return &(test_.*setting);
}

// ---- the walk ----

void Reader::Field(const JobField& field) {
  line_ = field.line;
  const FieldRow* const row = FindField(field.name);
  if (row == nullptr) {
    Add(Rule::kUnknownField, field.line, "there is no field " + Quoted(field.name));
    return;
  }
  if (row->name.size() != field.name.size()) {
    Add(Rule::kShortName, field.line,
        Quoted(field.name) + " sets \"" + std::string(row->name) + "\"");
  }
  if (!has_job_ || started_) {
    Add(Rule::kLostSetting, field.line,
        std::string(row->name) + (started_ ? " stands behind the end of \"Upgrade\""
                                           : " stands before the beginning of \"Orvenix\""));
    return;
  }
  case_told_ = false;
  Setting* const place = row->place(*this);
  if (place == nullptr) {
    if (!case_told_) {
      Add(Rule::kIgnoredField, field.line,
          std::string(row->name) + " has no meaning in the group " + Quoted(group_));
    }
    return;
  }
  CheckTextOf({field.value, field.line}, row->name, row->limit, name_, findings_);
  *place = {row->limit > 0 ? field.value.substr(0, row->limit) : field.value, field.line};
  if (place == &stop_) job_.stops.push_back(stop_);
}

void Reader::Begin(const JobGroup& group) {
  group_ = group.name;
  if (Is(group, "Orvenix")) {
    has_job_ = true;
    started_ = false;
    job_ = {};
  } else if (Is(group, "Upgrade")) {
    if (++upgrades_ > 1) Add(Rule::kTwoUpgrades, group.line, "a further group \"Upgrade\"");
  } else if (Is(group, "Download")) {
    in_download_ = true;
  } else if (Is(group, "DiskCleanup")) {
    in_cleanup_ = true;
  } else if (Is(group, "StartProcess")) {
    in_start_process_ = true;
  } else if (Is(group, "FileList")) {
    in_file_list_ = true;
    download_ = {};
    download_.line = group.line;
  } else if (Is(group, "File")) {
    cleanup_name_ = cleanup_action_ = {};
    if (in_download_) download_ = {};
    if (in_download_) download_.line = group.line;
    if (!in_download_ && !in_cleanup_) Add(Rule::kIdleFile, group.line, "a group \"File\"");
  } else if (Is(group, "Store")) {
    ++open_stores_;
    store_ = {};
    store_.line = group.line;
  } else if (Is(group, "Registry")) {
    ++open_tests_;
    test_ = {};
    test_.root.text = "HKEY_LOCAL_MACHINE";
    test_.type.text = "String";
    test_.line = group.line;
  }
}

void Reader::EndFile() {
  if (in_cleanup_) {
    const bool remove = base::EqualIgnoringCase(cleanup_action_.text, "Delete");
    const bool save = base::EqualIgnoringCase(cleanup_action_.text, "Save");
    if (cleanup_name_.text.empty() || !(remove || save)) {
      Add(Rule::kCleanupIdle, line_,
          cleanup_name_.text.empty() ? "a \"File\" without a Name"
                                     : Quoted(cleanup_name_.text) + " without Delete or Save");
    } else {
      (remove ? job_.deletes : job_.saves).push_back(cleanup_name_);
    }
    cleanup_name_ = cleanup_action_ = {};
  } else if (in_download_) {
    job_.downloads.push_back(download_);
  }
}

void Reader::EndUpgrade(int line) {
  if (!has_job_) {
    Add(Rule::kNoUpgrade, line, "the group \"Upgrade\" does not stand inside \"Orvenix\"");
  } else if (!started_) {
    job_.upgrade_line = line;
    started_ = true;
  }
}

void Reader::End(const JobGroup& group) {
  line_ = group.line;
  if (Is(group, "Download")) in_download_ = false;
  if (Is(group, "DiskCleanup")) in_cleanup_ = false;
  if (Is(group, "StartProcess")) in_start_process_ = false;
  if (Is(group, "Upgrade")) EndUpgrade(group.line);
  if (Is(group, "FileList")) in_file_list_ = false;
  if (Is(group, "Store")) --open_stores_;
  if (Is(group, "Registry")) --open_tests_;
  if (!has_job_ || started_) return;
  if (Is(group, "FileList")) job_.list = download_;
  if (Is(group, "File")) EndFile();
  if (Is(group, "Store")) job_.stores.push_back(store_);
  if (Is(group, "Registry")) job_.tests.push_back(test_);
}

void Reader::Group(const JobGroup& group) {
  const auto same = [&group](std::string_view name) { return Is(group, name); };
  if (std::none_of(std::begin(kGroups), std::end(kGroups), same)) {
    Add(Rule::kUnknownGroup, group.line, "there is no group " + Quoted(group.name));
  }
  Begin(group);
  for (const JobGroup::Child& child : group.children) {
    if (const auto* inner = std::get_if<JobGroup>(&child)) {
      Group(*inner);
    } else {
      Field(std::get<JobField>(child));
    }
  }
  End(group);
}

DeviceJob Reader::Finish() {
  if (upgrades_ == 0) Add(Rule::kNoUpgrade, 1, "there is no group \"Upgrade\"");
  return std::move(job_);
}

}  // namespace

DeviceJob ReadAsDevice(const Job& job, const std::string& name, Findings& findings) {
  Reader reader(name, findings);
  for (const JobGroup& group : job.groups) reader.Group(group);
  return reader.Finish();
}

}  // namespace tools

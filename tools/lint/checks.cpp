// The checks that need nothing but the job.
#include "tools/lint/checks.h"

#include <algorithm>
#include <array>

#include "base/number.h"
#include "base/text.h"

namespace tools {
namespace {

constexpr std::uint64_t kLargestInt = 0x7FFFFFFF;
constexpr std::uint64_t kLargestNumber = 0xFFFFFFFF;
constexpr std::uint64_t kLargestPort = 65535;
constexpr std::string_view kRamName = "RAM:";

bool Contains(std::string_view text, std::string_view part) {
  return text.find(part) != std::string_view::npos;
}

template <std::size_t Count>
bool IsOneOf(std::string_view text, const std::array<std::string_view, Count>& names) {
  return std::find(names.begin(), names.end(), text) != names.end();
}

void CheckSwitch(const JobCheck& check, const Setting& setting, const char* name) {
  if (!setting.given() || setting.text == "false") return;
  static constexpr std::array<std::string_view, 4> kMeantAsFalse = {"false", "no", "off", "0"};
  const bool meant = std::any_of(kMeantAsFalse.begin(), kMeantAsFalse.end(), [&](auto word) {
    return base::EqualIgnoringCase(word, setting.text);
  });
  if (meant)
    check.Add(Rule::kSwitchText, setting.line, std::string(name) + " is " + Quoted(setting.text));
}

}  // namespace

// ---- helpers ----

std::string Quoted(std::string_view text) {
  constexpr std::size_t kShown = 60;
  return "\"" + std::string(text.substr(0, kShown)) + (text.size() > kShown ? "..." : "") + "\"";
}

void CheckTextOf(const Setting& setting, std::string_view what, std::size_t limit,
                 const std::string& name, Findings& findings) {
  const std::string& text = setting.text;
  const auto add = [&](Rule rule, const std::string& found) {
    findings.Add(rule, name + ":" + std::to_string(setting.line), std::string(what) + " " + found);
  };
  const auto is_blank = [](char letter) {
    return letter == ' ' || (letter >= '\t' && letter <= '\r');
  };
  if (limit > 0 && text.size() > limit) {
    add(Rule::kCutText, "has " + std::to_string(text.size()) + " characters, the device keeps " +
                            std::to_string(limit));
  }
  const bool ascii = std::all_of(text.begin(), text.end(), [is_blank](char letter) {
    return is_blank(letter) || (letter >= ' ' && letter <= '~');
  });
  if (!ascii) add(Rule::kNotAscii, Quoted(text));
  if (limit > 0 && !text.empty() && (is_blank(text.front()) || is_blank(text.back()))) {
    add(Rule::kOuterBlanks, Quoted(text));
  }
}

bool IsNumber(std::string_view text, std::uint64_t largest) {
  std::uint64_t value = 0;
  for (const char letter : text) {
    if (letter < '0' || letter > '9') return false;
    value = value * 10 + static_cast<std::uint64_t>(letter - '0');
    if (value > largest) return false;
  }
  return !text.empty();
}

bool IsDotted(std::string_view address) {
  constexpr std::size_t kParts = 4;
  for (std::size_t part = 0; part < kParts; ++part) {
    const std::size_t end = std::min(address.find('.'), address.size());
    if (end > 3 || !IsNumber(address.substr(0, end), 255)) return false;
    if ((part + 1 < kParts) != (end < address.size())) return false;
    address.remove_prefix(std::min(end + 1, address.size()));
  }
  return true;
}

std::string PathKey(std::string_view path) {
  std::string key(path);
  std::transform(key.begin(), key.end(), key.begin(),
                 [](char letter) { return letter == '/' ? '\\' : base::LowerAscii(letter); });
  return key;
}

// ---- storage ----

void CheckStorage(const JobCheck& check) {
  const auto& stores = check.job.stores;
  if (stores.empty()) {
    check.Add(Rule::kNoStorage, std::max(check.job.upgrade_line, 1),
              "the job has no storage requirement");
    return;
  }
  std::size_t ram = 0, folders = 0;
  for (const StoreSettings& store : stores) {
    const bool is_ram = base::StartsWith(store.name.text, kRamName);
    (is_ram ? ram : folders) += 1;
    if (store.name.text.empty()) {
      check.Add(Rule::kStorageUnnamed, store.line, "a \"Store\" without a Name");
    }
    if (!IsNumber(store.space.text, kLargestInt)) {
      check.Add(Rule::kStorageNumber, store.line, "RequiredSpace is " + Quoted(store.space.text));
    }
    if (is_ram && ram > 1) {
      check.Add(Rule::kStorageSecondRam, store.line,
                "a further requirement " + Quoted(store.name.text));
    }
  }
  const StoreSettings& last = stores.back();
  if (folders > 0 && base::StartsWith(last.name.text, kRamName)) {
    check.Add(Rule::kStorageLastRam, last.line,
              "the last of the requirements is " + Quoted(last.name.text));
  } else if (folders > 1) {
    check.Add(Rule::kStorageLast, last.line,
              std::to_string(folders) + " folders are required; " + Quoted(last.name.text) +
                  " comes last");
  }
}

// ---- registry tests ----

namespace {

void CheckTest(const JobCheck& check, const TestSettings& test) {
  static constexpr std::array<std::string_view, 6> kOperators = {"EQ",  "NEQ", "LT",
                                                                 "LTE", "GT",  "GTE"};
  static constexpr std::array<std::string_view, 4> kRoots = {
      "HKEY_LOCAL_MACHINE", "HKEY_CURRENT_USER", "HKEY_CLASSES_ROOT", "HKEY_USERS"};
  const std::string value = "the test of " + Quoted(test.value_name.text);
  const auto add = [&](Rule rule, const Setting& setting, const std::string& found) {
    check.Add(rule, setting.given() ? setting.line : test.line, value + " " + found);
  };
  // A configuration file gives no root; the first test then looks under HKEY_LOCAL_MACHINE.
  const bool no_root = check.job.is_configuration && !test.root.given();
  if (!test.type.given()) {
    add(Rule::kTestNoType, test.type, "has no Type");
  } else if (test.type.text != "REG_SZ" && test.type.text != "REG_DWORD") {
    add(Rule::kTestType, test.type, "has the Type " + Quoted(test.type.text));
  }
  if (!IsOneOf(test.operation.text, kOperators)) {
    add(Rule::kTestOperator, test.operation, "has the Operator " + Quoted(test.operation.text));
  }
  if (!IsOneOf(test.root.text, kRoots) && !(no_root && &test == &check.job.tests.front())) {
    add(Rule::kTestRoot, test.root, "has the Root " + Quoted(test.root.text));
  }
  if (test.key.text.empty()) add(Rule::kTestNoKey, test.key, "has no Key");
  if (test.type.text == "REG_DWORD" && !IsNumber(test.value.text, kLargestNumber)) {
    add(Rule::kTestNumber, test.value, "compares with " + Quoted(test.value.text));
  }
  if (test.message.text.empty()) add(Rule::kTestNoMessage, test.message, "has no ErrorMsg");
}

}  // namespace

void CheckTests(const JobCheck& check) {
  for (const TestSettings& test : check.job.tests) CheckTest(check, test);
}

// ---- log and messages ----

void CheckMessages(const JobCheck& check) {
  const DeviceJob& job = check.job;
  const std::uint32_t port = base::LeadingNumber(job.syslog_port.text) % (kLargestPort + 1);
  if (port != 0 &&
      (!IsDotted(job.syslog_address.text) || job.syslog_address.text == "255.255.255.255")) {
    check.Add(Rule::kSyslogAddress, job.syslog_port.line,
              "logs go to port " + std::to_string(port) + " of " + Quoted(job.syslog_address.text));
  }
  if (job.syslog_port.given() && !IsNumber(job.syslog_port.text, kLargestPort)) {
    check.Add(
        Rule::kSyslogPort, job.syslog_port.line,
        "Port is " + Quoted(job.syslog_port.text) + ", which is kept as " + std::to_string(port));
  }
  if (!job.end_text.text.empty() && job.begin_text.text.empty()) {
    check.Add(Rule::kEndWithoutBegin, job.end_text.line, "EndText is " + Quoted(job.end_text.text));
  }
  const auto check_markup = [&check](const Setting& setting, const char* name) {
    if (setting.text.find_first_of("<>&") == std::string::npos) return;
    check.Add(Rule::kMarkupInText, setting.line, std::string(name) + " is " + Quoted(setting.text));
  };
  check_markup(job.begin_text, "BeginText");
  check_markup(job.end_text, "EndText");
  for (const TestSettings& test : job.tests) check_markup(test.message, "ErrorMsg");
  // Configuration files may write this one in any letter case.
  const bool is_false = base::EqualIgnoringCase(job.show_window.text, "false");
  if (!job.is_configuration || !is_false) CheckSwitch(check, job.show_window, "ShowGUI");
  CheckSwitch(check, job.wait, "Wait");
}

// ---- server ----

namespace {

bool HasScheme(std::string_view url) {
  constexpr std::size_t kScheme = 7;
  const std::string start = PathKey(url.substr(0, kScheme));
  const bool same_slashes = url.size() >= kScheme && url[5] == url[6];
  return start == "http:\\\\" && same_slashes;
}

/// The host of a base URL that has a scheme: what stands before a port or path.
std::string_view HostOf(std::string_view url) {
  const std::string_view rest = base::Part(url, 7);
  return rest.substr(0, std::min(rest.find_first_of(":/\\"), rest.size()));
}

void CheckOwnPort(const JobCheck& check) {
  const Setting& url = check.job.base_url;
  check.Add(Rule::kUrlOwnPort, url.line, "BaseURL is " + Quoted(url.text));
  const auto joins = [&url](const DownloadSettings& file) {
    const auto is_slash = [](char letter) { return letter == '/' || letter == '\\'; };
    const bool divided = is_slash(url.text.back()) ||
                         (!file.source.text.empty() && is_slash(file.source.text.front()));
    const std::size_t port = url.text.find(':', 8);
    return !divided && url.text.find_first_of("/\\", port) == std::string::npos;
  };
  const auto& job = check.job;
  if ((job.list && joins(*job.list)) ||
      std::any_of(job.downloads.begin(), job.downloads.end(), joins)) {
    check.Add(Rule::kUrlOwnPortJoined, url.line,
              "BaseURL is " + Quoted(url.text) + ", without a slash behind the port");
  }
}

}  // namespace

void CheckServer(const JobCheck& check) {
  const DeviceJob& job = check.job;
  const std::string& url = job.base_url.text;
  const int line = std::max(job.base_url.line, 1);
  if (job.http_port.given() && (!IsNumber(job.http_port.text, kLargestPort) ||
                                base::LeadingNumber(job.http_port.text) == 0)) {
    check.Add(Rule::kHttpPort, job.http_port.line, "HTTPPort is " + Quoted(job.http_port.text));
  }
  if (url.empty()) {
    if (job.list || !job.downloads.empty() || !job.packages.empty() || job.inf.given())
      check.Add(Rule::kUrlMissing, line, "there is no BaseURL");
    return;
  }
  if (!HasScheme(url)) {
    check.Add(Rule::kUrlScheme, line, "BaseURL is " + Quoted(url));
    return;
  }
  if (url.find(':', 8) != std::string::npos) {
    CheckOwnPort(check);
  } else if (url.find_first_of("/\\", 7) != std::string::npos) {
    check.Add(Rule::kUrlPathWithoutPort, line, "BaseURL is " + Quoted(url));
  }
  if (!job.http_address.text.empty() && job.http_address.text != HostOf(url)) {
    check.Add(Rule::kAddressDiffers, job.http_address.line,
              "IPAddress is " + Quoted(job.http_address.text) + ", BaseURL " + Quoted(url));
  }
}

// ---- processes ----

namespace {

void CheckStop(const JobCheck& check, const Setting& stop) {
  static constexpr std::array<std::string_view, 5> kSystem = {"nk.exe", "filesys.exe", "gwes.exe",
                                                              "device.exe", "services.exe"};
  const std::string found = "stops " + Quoted(stop.text);
  if (stop.text.find_first_of("\\/") != std::string::npos) {
    check.Add(Rule::kStopPath, stop.line, found);
  } else if (!base::EndsWith(PathKey(stop.text), ".exe")) {
    check.Add(Rule::kStopName, stop.line, found);
  }
  if (IsOneOf(PathKey(stop.text), kSystem)) check.Add(Rule::kStopSystem, stop.line, found);
}

}  // namespace

void CheckProcesses(const JobCheck& check) {
  const DeviceJob& job = check.job;
  for (const Setting& stop : job.stops) CheckStop(check, stop);
  if (job.program.text.empty() && job.parameters.given()) {
    check.Add(Rule::kStartNoProgram, job.parameters.line,
              "Parameters are " + Quoted(job.parameters.text));
  }
  if (Contains(job.program.text, "wceload.exe")) {
    const bool appended = std::any_of(
        job.packages.begin(), job.packages.end(),
        [](const PackageSettings& package) { return !package.command_line.text.empty(); });
    if (!Contains(job.parameters.text, " ") && !appended) {
      check.Add(Rule::kInstallerBlank, std::max(job.parameters.line, job.program.line),
                "the installer's Parameters are " + Quoted(job.parameters.text));
    }
  } else if (Contains(PathKey(job.program.text), "wceload.exe")) {
    check.Add(Rule::kInstallerCase, job.program.line, "Process is " + Quoted(job.program.text));
  }
}

}  // namespace tools

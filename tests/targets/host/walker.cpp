#include "targets/host/walker.h"

#include <charconv>
#include <cstring>
#include <type_traits>

#include "targets/host/device_files.h"

namespace host {
namespace {

constexpr char kLogFile[] = "\\FileXfer.log";
constexpr DWORD kPollMs = 20;
constexpr DWORD kStartLimitMs = 30'000;
constexpr DWORD kEndLimitMs = 600'000;
/// From the end of its event until an upgrade's last thread is gone.
constexpr DWORD kLastThreadMs = 4'000;

std::string NameOfResult(std::uint32_t result) {
  switch (result) {
    case ICFG_OK: return "ok";
    case ICFG_UNKNOWN_NAME: return "unknown";
    case ICFG_UPGRADE_RUNNING: return "running";
    case ICFG_NO_SPACE: return "no-space";
    case ICFG_NO_POWER: return "no-power";
    case ICFG_TEST_FAILED: return "test-failed";
    default: return std::to_string(result);
  }
}

std::string YesOrNo(bool yes) {
  return yes ? "yes" : "no";
}

/// 0 for what is no number.
DWORD NumberOf(const Word& word) {
  DWORD number = 0;
  std::from_chars(word.text.data(), word.text.data() + word.text.size(), number);
  return number;
}

/// Divides a text into its lines, whichever line ends a C stream has made of the library's.
std::vector<std::string> LinesOf(std::string_view text) {
  std::vector<std::string> lines;
  while (!text.empty()) {
    const std::size_t end = text.find('\n');
    std::string_view line = text.substr(0, end);
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
    while (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    lines.emplace_back(line);
  }
  return lines;
}

/// Whether an upgrade's event is there. Asking makes it for a moment; nobody waits for it.
bool EventExists() {
  HANDLE const event = CreateEventW(nullptr, FALSE, FALSE, TEXT("TW_UPGRADE_IN_PROGRESS"));
  const bool existed = GetLastError() == ERROR_ALREADY_EXISTS;
  if (event != nullptr) CloseHandle(event);
  return existed;
}

/// Waits until the event is there, or is not.
bool AwaitEvent(bool wanted, DWORD limit_ms) {
  for (DWORD waited = 0; EventExists() != wanted; waited += kPollMs) {
    if (waited >= limit_ms) return false;
    Sleep(kPollMs);
  }
  return true;
}

/// Whether a program of this name runs.
bool ProcessRuns(const std::basic_string<WCHAR>& name) {
  HANDLE const snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  if (snapshot == INVALID_HANDLE_VALUE) return false;
  PROCESSENTRY32 process = {};
  process.dwSize = sizeof process;
  bool found = false;
  for (BOOL more = Process32First(snapshot, &process); more != FALSE && !found;
       more = Process32Next(snapshot, &process)) {
    found = name == process.szExeFile;
  }
  CloseToolhelp32Snapshot(snapshot);
  return found;
}

/// What a file has gained since it had `taken` bytes.
std::string Gain(const char* path, std::size_t& taken) {
  const std::string all = ReadWhole(path).value_or("");
  const std::string gain = taken < all.size() ? all.substr(taken) : "";
  taken = all.size();
  return gain;
}

std::string Quoted(const std::string& text) {
  return '"' + text + '"';
}

}  // namespace

const Walker::Verb Walker::kVerbs[] = {
    {"initialize", 0, 0, &Walker::Initialize},
    {"uninitialize", 0, 0, &Walker::Uninitialize},
    {"interface", 0, 0, &Walker::InterfaceVersion},
    {"schema", 0, 1, &Walker::SchemaVersion},
    {"first", 0, 1, &Walker::FirstInstance},
    {"next", 0, 0, &Walker::NextInstance},
    {"callbacks", 1, 1, &Walker::SetCallbacks},
    {"begin", 1, 2, &Walker::BeginGroup},
    {"set", 2, 2, &Walker::SetField},
    {"get", 1, 1, &Walker::GetField},
    {"end", 1, 1, &Walker::EndGroup},
    {"await-end", 0, 0, &Walker::AwaitEnd},
    {"is-running", 0, 0, &Walker::IsRunning},
    {"is-process", 1, 1, &Walker::IsProcess},
    {"log", 0, 0, &Walker::TakeLog},
    {"has-logged", 1, 1, &Walker::HasLogged},
    {"documents", 0, 0, &Walker::TakeDocuments},
    {"make-folder", 1, 1, &Walker::MakeFolder},
    {"make-file", 2, 2, &Walker::MakeFile},
    {"attributes", 1, 1, &Walker::ShowAttributes},
    {"write-time", 1, 1, &Walker::ShowWriteTime},
    {"file", 1, 1, &Walker::ShowFile},
    {"set-text", 3, 3, &Walker::SetText},
    {"set-number", 3, 3, &Walker::SetNumber},
    {"value", 2, 2, &Walker::ShowValue},
};

Walker::Walker(const Configlet& configlet) : configlet_(configlet) {
  table_.set_data = &TakeDocument;
}

Outcome Walker::Walk(std::string_view walk) {
  std::size_t number = 0;
  while (!walk.empty()) {
    const std::size_t end = walk.find('\n');
    if (!Step(walk.substr(0, end), ++number)) return Outcome::kNotWalked;
    walk.remove_prefix(end == std::string_view::npos ? walk.size() : end + 1);
  }
  return all_as_expected_ ? Outcome::kAsExpected : Outcome::kNotAsExpected;
}

bool Walker::Step(std::string_view text, std::size_t number) {
  WalkLine line;
  const bool is_read = ReadWalkLine(text, line);
  if (is_read && line.verb.empty()) return true;
  const Verb* known = nullptr;
  for (const Verb& verb : kVerbs) {
    if (line.verb == verb.name) known = &verb;
  }
  const std::size_t count = line.arguments.size();
  if (!is_read || known == nullptr || count < known->least || count > known->most) {
    Append(kTraceFile, "line " + std::to_string(number) + " makes no sense\n");
    return false;
  }
  const Results results = (this->*known->action)(line.arguments);
  std::string told = line.verb;
  for (const Word& word : line.arguments) told += ' ' + (word.is_null ? "null" : Quoted(word.text));
  told += " =";
  for (const std::string& result : results) told += ' ' + Quoted(result);
  Append(kTraceFile, told + '\n');
  if (!line.expected || *line.expected == results) return true;
  told = "FAILED line " + std::to_string(number) + ": not";
  for (const std::string& wanted : *line.expected) told += ' ' + Quoted(wanted);
  Append(kTraceFile, told + '\n');
  all_as_expected_ = false;
  return true;
}

Walker::Results Walker::Initialize(const Arguments& /*arguments*/) {
  return {NameOfResult(configlet_.initialize())};
}

Walker::Results Walker::Uninitialize(const Arguments& /*arguments*/) {
  return {NameOfResult(configlet_.uninitialize())};
}

Walker::Results Walker::InterfaceVersion(const Arguments& /*arguments*/) {
  return {std::to_string(configlet_.get_interface_version())};
}

/// `schema null` passes no pointers.
Walker::Results Walker::SchemaVersion(const Arguments& arguments) {
  if (!arguments.empty()) return {NameOfResult(configlet_.get_schema_version(7, nullptr, nullptr))};
  std::uint32_t major = 99;
  std::uint32_t minor = 99;
  const std::uint32_t result = configlet_.get_schema_version(7, &major, &minor);
  return {NameOfResult(result), std::to_string(major), std::to_string(minor)};
}

Walker::Results Walker::FirstInstance(const Arguments& arguments) {
  if (!arguments.empty()) return {NameOfResult(configlet_.get_first_instance(0, nullptr))};
  char name[4] = "abc";
  const std::uint32_t result = configlet_.get_first_instance(0, name);
  return {NameOfResult(result), name, std::string(name + 1, 2)};
}

Walker::Results Walker::NextInstance(const Arguments& /*arguments*/) {
  return {std::to_string(configlet_.get_next_instance())};
}

/// on: a table; reading: one whose function calls the library; deaf: one without that function;
/// off: none.
Walker::Results Walker::SetCallbacks(const Arguments& arguments) {
  const std::string& kind = arguments[0].text;
  reads_inside_.store(kind == "reading");
  const IcfgCallbacks* const table = kind == "off"    ? nullptr
                                     : kind == "deaf" ? &deaf_table_
                                                      : &table_;
  return {NameOfResult(configlet_.set_callbacks(reinterpret_cast<std::uintptr_t>(this), table))};
}

Walker::Results Walker::BeginGroup(const Arguments& arguments) {
  const DWORD mode = arguments.size() < 2 ? 0 : NumberOf(arguments[1]);
  return {NameOfResult(configlet_.begin_group(arguments[0].c_str(), 0, mode))};
}

Walker::Results Walker::SetField(const Arguments& arguments) {
  return {NameOfResult(configlet_.set_field(arguments[0].c_str(), 0, arguments[1].c_str()))};
}

/// Tells what was written, and nothing that was left alone.
Walker::Results Walker::GetField(const Arguments& arguments) {
  constexpr char kUntouched = '?';
  char text[16];
  std::memset(text, kUntouched, sizeof text);
  std::uint32_t length = 99;
  const std::uint32_t result = configlet_.get_field(arguments[0].c_str(), 0, 0, text, &length);
  const std::string_view all(text, sizeof text);
  const std::size_t end = all.find_last_not_of(kUntouched);
  if (end == std::string_view::npos) return {NameOfResult(result), std::to_string(length)};
  return {NameOfResult(result), std::to_string(length), std::string(text),
          std::to_string(end + 1) + " bytes"};
}

Walker::Results Walker::EndGroup(const Arguments& arguments) {
  return {NameOfResult(configlet_.end_group(arguments[0].c_str(), 0, 0))};
}

Walker::Results Walker::AwaitEnd(const Arguments& /*arguments*/) {
  if (!AwaitEvent(true, kStartLimitMs)) return {"never began"};
  if (!AwaitEvent(false, kEndLimitMs)) return {"never ended"};
  Sleep(kLastThreadMs);
  return {"ended"};
}

Walker::Results Walker::IsRunning(const Arguments& /*arguments*/) {
  return {YesOrNo(EventExists())};
}

Walker::Results Walker::IsProcess(const Arguments& arguments) {
  return {YesOrNo(ProcessRuns(Widen(arguments[0].text)))};
}

Walker::Results Walker::TakeLog(const Arguments& /*arguments*/) {
  return LinesOf(Gain(kLogFile, log_taken_));
}

Walker::Results Walker::HasLogged(const Arguments& arguments) {
  const std::string log = ReadWhole(kLogFile).value_or("");
  return {YesOrNo(log.find(arguments[0].text) != std::string::npos)};
}

Walker::Results Walker::TakeDocuments(const Arguments& /*arguments*/) {
  return LinesOf(Gain(kDocumentsFile, documents_taken_));
}

Walker::Results Walker::MakeFolder(const Arguments& arguments) {
  return {YesOrNo(host::MakeFolder(arguments[0].text))};
}

Walker::Results Walker::MakeFile(const Arguments& arguments) {
  return {YesOrNo(Write(arguments[0].text, arguments[1].text))};
}

Walker::Results Walker::ShowAttributes(const Arguments& arguments) {
  const DWORD attributes = GetFileAttributesW(Widen(arguments[0].text).c_str());
  return {attributes == ~DWORD{0} ? "(none)" : std::to_string(attributes)};
}

Walker::Results Walker::ShowWriteTime(const Arguments& arguments) {
  return {std::to_string(WriteTimeOf(arguments[0].text))};
}

Walker::Results Walker::ShowFile(const Arguments& arguments) {
  return {ReadWhole(arguments[0].text).value_or("(none)")};
}

Walker::Results Walker::SetText(const Arguments& arguments) {
  return {YesOrNo(SetRegistryText(arguments[0].text, arguments[1].text, arguments[2].text))};
}

Walker::Results Walker::SetNumber(const Arguments& arguments) {
  return {YesOrNo(SetRegistryNumber(arguments[0].text, arguments[1].text, NumberOf(arguments[2])))};
}

Walker::Results Walker::ShowValue(const Arguments& arguments) {
  return {DescribeRegistryValue(arguments[0].text, arguments[1].text)};
}

int Walker::TakeDocument(std::uintptr_t context, const char* text, std::int32_t length,
                         const IcfgCallbacks* table) {
  auto& self = *reinterpret_cast<Walker*>(context);
  const bool whole =
      text != nullptr && length > 0 && std::strlen(text) + 1 == static_cast<std::size_t>(length);
  std::string line = whole ? text : "(no whole text)";
  if (table != &self.table_) line += " (another table)";
  if (self.reads_inside_.load()) {
    char version[8] = {};
    std::uint32_t size = 0;
    self.configlet_.get_field("Protocol Version", 0, 0, version, &size);
    line += " (version ";
    line += version;
    line += ')';
  }
  Append(kDocumentsFile, line + "\r\n");
  return 0;
}

Outcome RunHost() {
  const std::optional<std::string> walk = ReadWhole(kWalkFile);
  if (!walk) {
    Append(kTraceFile, "there is no walk\n");
    return Outcome::kNotWalked;
  }
  Configlet configlet;
  const char* const missing = Load(TEXT("\\orvenix.dll"), configlet);
  if (missing != nullptr) {
    Append(kTraceFile, std::string(missing) + " was not found\n");
    return Outcome::kNotWalked;
  }
  // The library may call its host until the process ends.
  static Walker walker(configlet);
  static_assert(std::is_trivially_destructible_v<Walker>);
  return walker.Walk(*walk);
}

}  // namespace host

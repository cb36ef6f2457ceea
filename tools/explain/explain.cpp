#include "tools/explain/explain.h"

#include <array>
#include <fstream>
#include <functional>
#include <iomanip>
#include <iostream>
#include <sstream>

#include "server/request.h"
#include "tools/explain/client_log.h"
#include "tools/failure.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kBlock = std::size_t{1} << 16U;
/// A device's message has 1,024 characters at most; syslog and its servers add a few in front.
constexpr std::size_t kMaxLine = 2048;

std::string Hex(std::uint32_t code) {
  std::ostringstream text;
  text << "0x" << std::uppercase << std::hex << std::setw(8) << std::setfill('0') << code;
  return text.str();
}

void PrintJson(const nlohmann::ordered_json& json) {
  std::cout << json.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace) << std::endl;
}

void ExplainCode(std::uint32_t code, const ExplainOptions& options) {
  const std::vector<const CodeRow*> meanings = MeaningsOf(code);
  if (meanings.empty()) {
    throw Failure(ExitCode::kBadInput, options.what, "the system has no such number",
                  "give a result, an event, an error number, or a log file");
  }
  if (options.json) {
    nlohmann::ordered_json json{{"event", "explained"}, {"code", code}, {"hex", Hex(code)}};
    for (const CodeRow* row : meanings) {
      json["meanings"].push_back({{"kind", NameOf(row->kind)},
                                  {"name", row->name},
                                  {"meaning", row->meaning},
                                  {"remedy", row->remedy}});
    }
    PrintJson(json);
    return;
  }
  std::cout << code << " = " << Hex(code);
  if (code > INT32_MAX) std::cout << " = " << static_cast<std::int32_t>(code);
  std::cout << "\n";
  for (const CodeRow* row : meanings) {
    std::cout << "\n" << NameOf(row->kind) << "  " << row->name << "\n  " << row->meaning << "\n";
    if (*row->remedy != '\0') std::cout << "  remedy: " << row->remedy << "\n";
  }
  std::cout << std::flush;
}

/// A line of the log or of the screen, as somebody copied it.
void ExplainText(const ExplainOptions& options) {
  TextMatch match = TextMatcher().Find(SplitStamp(options.what).message);
  if (match.row == nullptr) match = TextMatcher(true).Find(options.what);
  if (match.row == nullptr) {
    match = TextMatcher(false, ClientTexts()).Find(SplitStamp(options.what).message);
  }
  if (match.row == nullptr) {
    throw Failure(ExitCode::kBadInput, options.what,
                  "is no file, no number and no text of the system",
                  "name a log file, a code, or a whole line of a log");
  }
  const TextRow& row = *match.row;
  const CodeRow* code = match.number ? FindCode(row.number, *match.number) : nullptr;
  if (options.json) {
    nlohmann::ordered_json json{{"event", "explained"},
                                {"text", options.what},
                                {"where", row.on_screen ? "screen" : "log"},
                                {"phase", NameOf(row.phase)},
                                {"meaning", row.meaning},
                                {"remedy", row.remedy}};
    if (code != nullptr) json["number"] = {{"name", code->name}, {"meaning", code->meaning}};
    PrintJson(json);
    return;
  }
  std::cout << "a line of the " << (row.on_screen ? "screen" : "log");
  if (row.phase != Phase::kAny) std::cout << ", phase " << NameOf(row.phase);
  std::cout << "\n  " << row.meaning << "\n";
  if (code != nullptr) std::cout << "  " << code->name << ": " << code->meaning << "\n";
  const char* remedy = code != nullptr && *code->remedy != '\0' ? code->remedy : row.remedy;
  if (*remedy != '\0') std::cout << "  remedy: " << remedy << "\n";
  std::cout << std::flush;
}

/// Calls `take` with every line, without its end. Lines longer than a device writes are cut.
void ReadLines(const fs::path& file, const std::function<void(std::string_view)>& take) {
  std::ifstream in(file, std::ios::binary);
  if (!in) throw Failure(ExitCode::kBadInput, file.string(), "cannot be read");
  std::vector<char> block(kBlock);
  std::string line;
  const auto finish = [&line, &take] {
    while (!line.empty() && line.back() == '\r') line.pop_back();
    take(line);
    line.clear();
  };
  do {
    in.read(block.data(), static_cast<std::streamsize>(block.size()));
    std::string_view bytes(block.data(), static_cast<std::size_t>(in.gcount()));
    while (!bytes.empty()) {
      const std::size_t end = bytes.find('\n');
      const std::string_view part = bytes.substr(0, end);
      line.append(part.substr(0, kMaxLine - std::min(kMaxLine, line.size())));
      if (end == std::string_view::npos) break;
      finish();
      bytes.remove_prefix(end + 1);
    }
  } while (in);
  if (in.bad()) throw Failure(ExitCode::kBadInput, file.string(), "cannot be read to its end");
  if (!line.empty()) finish();
}

/// @return false when the file is no log of a multicast client.
bool ExplainClientLog(const ExplainOptions& options) {
  ClientLog log(options.job);
  ReadLines(options.what, [&log](std::string_view line) { log.Line(line); });
  if (log.runs() == 0) return false;
  const ClientRunStory run = log.Finish();
  if (run.number == 0) {
    throw Failure(ExitCode::kBadInput, options.what,
                  "holds " + std::to_string(log.runs()) + " runs of the multicast client",
                  "choose another --job");
  }
  if (options.json) {
    PrintJson(ClientRunJson(options.what, run, log.runs()));
  } else {
    PrintClientRun(std::cout, options.what, run, log.runs());
  }
  return true;
}

void ExplainLog(const ExplainOptions& options) {
  LogStory story = ReadLog(options.what, options.job);
  const JobStory job = story.Finish();
  if (story.jobs() == 0 && ExplainClientLog(options)) return;
  if (job.number == 0) {
    throw Failure(
        ExitCode::kBadInput, options.what,
        story.jobs() == 0 ? "holds no line of this system"
                          : "holds " + std::to_string(story.jobs()) + " jobs",
        story.jobs() == 0 ? "give a device's FileXfer.log or mcast.log" : "choose another --job");
  }
  if (options.json) {
    PrintJson(StoryJson(options.what, job, story.jobs()));
  } else {
    PrintStory(std::cout, options.what, job, story.jobs());
  }
}

}  // namespace

std::optional<std::uint32_t> ParseCode(const std::string& text) {
  constexpr std::size_t kHexDigits = 8, kDecimalDigits = 10;
  std::size_t start = 0;
  int base = 10;
  if (text.size() > 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X')) {
    start = 2;
    base = 16;
  } else if (text.size() == kHexDigits &&
             text.find_first_not_of("0123456789") != std::string::npos) {
    base = 16;
  } else if (!text.empty() && text[0] == '-') {
    start = 1;
  }
  const char* const digits = base == 16 ? "0123456789abcdefABCDEF" : "0123456789";
  const std::size_t count = text.size() - start;
  if (count == 0 || count > (base == 16 ? kHexDigits : kDecimalDigits) ||
      text.find_first_not_of(digits, start) != std::string::npos) {
    return std::nullopt;
  }
  const std::uint64_t value = std::stoull(text.substr(start), nullptr, base);
  if (value > UINT32_MAX) return std::nullopt;
  const auto code = static_cast<std::uint32_t>(value);
  return text[0] == '-' ? 0U - code : code;
}

std::vector<const CodeRow*> MeaningsOf(std::uint32_t code) {
  std::vector<const CodeRow*> meanings;
  for (const CodeRow& row : Codes()) {
    if (row.value == code) meanings.push_back(&row);
  }
  return meanings;
}

LogStory ReadLog(const fs::path& file, std::size_t wanted) {
  LogStory story(wanted);
  ReadLines(file, [&story](std::string_view line) { story.Line(line); });
  return story;
}

void Explain(const ExplainOptions& options) {
  std::error_code error;
  if (const auto code = ParseCode(options.what)) {
    ExplainCode(*code, options);
  } else if (fs::is_regular_file(options.what, error)) {
    ExplainLog(options);
  } else if (options.what.find('/') != std::string::npos &&
             options.what.find(' ') == std::string::npos) {
    throw Failure(ExitCode::kBadInput, options.what, "there is no such file");
  } else {
    ExplainText(options);
  }
}

}  // namespace tools

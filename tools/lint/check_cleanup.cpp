// The checks of a job's delete and save lists.
#include <algorithm>

#include "base/text.h"
#include "tools/lint/checks.h"

namespace tools {
namespace {

/// A path with a dot anywhere is one file to the device.
bool IsFilePath(std::string_view path) {
  return path.find('.') != std::string_view::npos;
}

bool IsRoot(std::string_view path) {
  return path.find_first_not_of('\\') == std::string_view::npos;
}

std::string_view LastPart(std::string_view path) {
  const std::size_t slash = path.rfind('\\');
  return slash == std::string_view::npos ? path : path.substr(slash + 1);
}

void CheckDelete(const JobCheck& check, const Setting& entry) {
  const std::string& path = entry.text;
  const std::string found = "deletes " + Quoted(path);
  if (IsRoot(path)) {
    check.Add(Rule::kDeleteRoot, entry.line, found);
    return;
  }
  if (path.find_first_of("*?") != std::string::npos) {
    check.Add(Rule::kDeleteWildcard, entry.line, found);
  } else if (IsFilePath(path) && LastPart(path).find('.') == std::string_view::npos) {
    check.Add(Rule::kDeleteDotFolder, entry.line, found);
  }
  if (path.front() != '\\') check.Add(Rule::kDeleteRelative, entry.line, found);
}

/// How a walk below a folder of the delete list would name the files in it.
std::string WalkedPrefix(std::string_view folder) {
  return folder == "\\" ? "\\" : PathKey(folder) + "\\";
}

enum class Reach : std::uint8_t { kNot, kByFolder, kDoubled, kDirectly };

/// Whether the walk of `folder` comes to a file `saved`, whose path is a key.
Reach ReachOf(const std::string& folder, const std::string& saved) {
  if (IsFilePath(folder)) return PathKey(folder) == saved ? Reach::kDirectly : Reach::kNot;
  const std::string prefix = WalkedPrefix(folder);
  if (folder != "\\" && folder.back() == '\\') {
    // "\Temp\" is walked as "\Temp\\name": an entry "\Temp\name" never equals that.
    if (base::StartsWith(saved, prefix)) return Reach::kByFolder;
    return base::StartsWith(saved, prefix.substr(0, prefix.size() - 1)) ? Reach::kDoubled
                                                                        : Reach::kNot;
  }
  if (!base::StartsWith(saved, prefix)) return Reach::kNot;
  // The walk takes a folder with a dot in its name for a file and leaves what is in it alone.
  const std::string below = saved.substr(prefix.size());
  const bool behind_dot = below.substr(0, below.rfind('\\') + 1).find('.') != std::string::npos;
  const bool names_file = !below.empty() && below.back() != '\\';
  return names_file && !behind_dot ? Reach::kByFolder : Reach::kNot;
}

void CheckSave(const JobCheck& check, const Setting& entry) {
  const std::string saved = PathKey(entry.text);
  bool reached = false, doubled = false, directly = false;
  for (const Setting& removed : check.job.deletes) {
    const Reach reach = ReachOf(removed.text, saved);
    reached = reached || reach == Reach::kByFolder;
    doubled = doubled || reach == Reach::kDoubled;
    directly = directly || reach == Reach::kDirectly;
  }
  const std::string found = "saves " + Quoted(entry.text);
  if (directly) check.Add(Rule::kSaveDirect, entry.line, found);
  if (doubled) check.Add(Rule::kSaveDoubleBackslash, entry.line, found);
  if (!reached && !doubled && !directly) check.Add(Rule::kSaveNothing, entry.line, found);
}

}  // namespace

void CheckCleanup(const JobCheck& check) {
  for (const Setting& entry : check.job.deletes) CheckDelete(check, entry);
  for (const Setting& entry : check.job.saves) CheckSave(check, entry);
}

}  // namespace tools

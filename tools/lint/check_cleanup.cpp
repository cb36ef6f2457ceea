// The checks of a job's delete and save lists.
#include <algorithm>
#include <set>
#include <string>
#include <vector>

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

/// As the device compares paths to save: without regard to case, but "/" is no "\\" there.
std::string Folded(std::string_view path) {
  std::string folded(path);
  std::transform(folded.begin(), folded.end(), folded.begin(), base::LowerAscii);
  return folded;
}

/// How a job's deletes come to a file, to find what its save list protects.
class Deletes {
 public:
  explicit Deletes(const std::vector<Setting>& entries) {
    for (const Setting& entry : entries) {
      std::string key = Folded(entry.text);
      if (IsFilePath(key)) {
        files_.insert(std::move(key));
      } else if (IsRoot(key)) {
        folders_.insert("");
      } else if (key.back() == '\\') {
        key.pop_back();
        doubling_.insert(std::move(key));
      } else {
        folders_.insert(std::move(key));
      }
    }
  }

  [[nodiscard]] bool NamesFile(const std::string& saved) const { return files_.count(saved) != 0; }

  /// Whether the walk of a folder names the file as `saved` does.
  [[nodiscard]] bool Reaches(const std::string& saved) const {
    return Any(saved, [this, &saved](std::size_t slash) {
      const std::string folder = saved.substr(0, slash);
      const std::string below = saved.substr(slash + 1);
      if (doubling_.count(folder) != 0 && below.front() == '\\') return true;
      // The walk takes a folder with a dot in its name for a file and leaves what is in it alone.
      const std::string between = below.substr(0, below.rfind('\\') + 1);
      return folders_.count(folder) != 0 && between.find('.') == std::string::npos;
    });
  }

  /// "\Temp\" is walked as "\Temp\\name": an entry "\Temp\name" never equals that.
  [[nodiscard]] bool Misses(const std::string& saved) const {
    return Any(saved, [this, &saved](std::size_t slash) {
      return doubling_.count(saved.substr(0, slash)) != 0 && saved[slash + 1] != '\\';
    });
  }

 private:
  /// Every backslash with something behind it, of a path that does not end in one.
  template <typename Test>
  static bool Any(const std::string& saved, Test test) {
    if (saved.back() == '\\') return false;
    for (std::size_t at = saved.find('\\'); at != std::string::npos;
         at = saved.find('\\', at + 1)) {
      if (test(at)) return true;
    }
    return false;
  }

  std::set<std::string> files_;
  std::set<std::string> folders_;
  std::set<std::string> doubling_;  ///< given with a backslash at their end
};

void CheckSave(const JobCheck& check, const Setting& entry, const Deletes& deletes) {
  const std::string saved = Folded(entry.text);
  const std::string found = "saves " + Quoted(entry.text);
  const bool directly = deletes.NamesFile(saved), missed = deletes.Misses(saved);
  if (directly) check.Add(Rule::kSaveDirect, entry.line, found);
  if (missed) check.Add(Rule::kSaveDoubleBackslash, entry.line, found);
  if (!directly && !missed && !deletes.Reaches(saved)) {
    check.Add(Rule::kSaveNothing, entry.line, found);
  }
}

}  // namespace

void CheckCleanup(const JobCheck& check) {
  for (const Setting& entry : check.job.deletes) CheckDelete(check, entry);
  const Deletes deletes(check.job.deletes);
  for (const Setting& entry : check.job.saves) CheckSave(check, entry, deletes);
}

}  // namespace tools

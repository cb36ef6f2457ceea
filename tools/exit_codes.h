// How the program `orvenix` ends. This table is the one place: --help prints it, docs/tools.md
// repeats it, and a test compares the two.
#pragma once

namespace tools {

enum class ExitCode : int {
  kOk = 0,
  kInternal = 1,
  kUsage = 2,
  kBadInput = 3,
  kCannotWrite = 4,
  kCannotListen = 5,
  kUnknownName = 10,
  kUpgradeRunning = 11,
  kNoSpace = 12,
  kNoPower = 13,
  kTestFailed = 14,
  kUnreachable = 20,
  kTimeout = 21,
  kFilesWrong = 22,
};

struct ExitCodeRow {
  ExitCode code;
  const char* name;  ///< as in JSON output
  const char* meaning;
};

inline constexpr ExitCodeRow kExitCodes[] = {
    {ExitCode::kOk, "ok", "done; after `run`: every file of the job is right"},
    {ExitCode::kInternal, "internal", "an error in orvenix itself"},
    {ExitCode::kUsage, "usage", "the command line is wrong"},
    {ExitCode::kBadInput, "bad-input", "a file or folder is missing, unreadable or malformed"},
    {ExitCode::kCannotWrite, "cannot-write", "a result cannot be written"},
    {ExitCode::kCannotListen, "cannot-listen", "the server's address or port cannot be had"},
    {ExitCode::kUnknownName, "unknown-name", "the job has a group or field that is not known"},
    {ExitCode::kUpgradeRunning, "upgrade-running", "refused: an upgrade is in progress"},
    {ExitCode::kNoSpace, "no-space", "refused: not enough storage on the device"},
    {ExitCode::kNoPower, "no-power", "refused: neither line power nor a charged battery"},
    {ExitCode::kTestFailed, "test-failed", "refused: a registry test of the job failed"},
    {ExitCode::kUnreachable, "unreachable", "time is up; the server could never be reached"},
    {ExitCode::kTimeout, "timeout", "time is up; the upgrade had not ended"},
    {ExitCode::kFilesWrong, "files-wrong", "the upgrade ended, but files are missing or wrong"},
};

[[nodiscard]] constexpr const ExitCodeRow& RowOf(ExitCode code) {
  for (const ExitCodeRow& row : kExitCodes) {
    if (row.code == code) return row;
  }
  return kExitCodes[1];
}

static_assert(RowOf(ExitCode::kFilesWrong).code == ExitCode::kFilesWrong);

}  // namespace tools

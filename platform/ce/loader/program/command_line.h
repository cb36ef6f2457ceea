// What ce_loader is asked to do.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>

#include "loader/mapped_image.h"

namespace loader {

enum class Task : std::uint8_t { kHelp, kList, kCheck };

struct CommandLine {
  Task task = Task::kHelp;
  std::filesystem::path dll;
  std::filesystem::path device;   ///< its folder; empty: a fresh one, removed at the end
  std::filesystem::path profile;  ///< empty: the folder's own, or the usual device
  Options options;
};

extern const char kUsage[];

/// @param command_line  begins with the values that the environment gives
/// @return false for a command line that makes no sense, with one line in `complaint`
[[nodiscard]] bool ReadCommandLine(int argc, const char* const* argv, CommandLine& command_line,
                                   std::string& complaint);

}  // namespace loader

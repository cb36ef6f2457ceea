// ce_loader: carries out a DLL for Windows CE in a simulated device.
#include <cstdio>
#include <exception>
#include <iostream>
#include <string>

#include "loader/dll.h"
#include "loader/program/check.h"
#include "loader/program/command_line.h"
#include "loader/program/listing.h"

namespace {

constexpr int kFailed = 1;
constexpr int kUsageError = 2;

int Run(const loader::CommandLine& command_line) {
  switch (command_line.task) {
    case loader::Task::kHelp: std::cout << loader::kUsage; return 0;
    case loader::Task::kList: {
      const std::string bytes = loader::ReadDllFile(command_line.dll);
      loader::List(elf2pe::ReadPe(bytes), std::cout);
      return 0;
    }
    case loader::Task::kCheck: return loader::Check(command_line, std::cout) ? 0 : kFailed;
  }
  return kUsageError;
}

}  // namespace

int main(int argc, char** argv) {
  loader::CommandLine command_line;
  std::string complaint;
  if (!loader::ReadCommandLine(argc, argv, command_line, complaint)) {
    std::fprintf(stderr, "ce_loader: %s\n%s", complaint.c_str(), loader::kUsage);
    return kUsageError;
  }
  try {
    return Run(command_line);
  } catch (const std::exception& problem) {
    std::fprintf(stderr, "ce_loader: %s: %s\n", command_line.dll.c_str(), problem.what());
    return kFailed;
  }
}

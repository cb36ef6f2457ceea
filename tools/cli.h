// The command line of the program `orvenix`.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>

#include "tools/command_line.h"
#include "tools/exit_codes.h"

namespace tools {

/// What a verb does once its options are read. Throws Failure.
using Action = std::function<ExitCode()>;

/// Each adds one verb with its options, and sets `action` when the command line names it.
void AddBundleVerb(CLI::App& app, Action& action);
/// Adds `bundle cab` below `bundle`.
void AddPackageVerb(CLI::App& bundle, Action& action);
void AddJobVerb(CLI::App& app, Action& action);
void AddServeVerb(CLI::App& app, Action& action);
void AddDeviceVerb(CLI::App& app, Action& action);
void AddRunVerb(CLI::App& app, Action& action);
void AddExplainVerb(CLI::App& app, Action& action);
void AddFleetVerb(CLI::App& app, Action& action);

/// Adds --json, with the verb's own words about what it changes.
void AddJsonOption(CLI::App& verb, bool& json, const std::string& effect);

}  // namespace tools

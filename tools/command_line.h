// The program `orvenix` as one call.
#pragma once

namespace tools {

/// Reads the command line and does what it says. @return the exit code of the program. Every
/// failure is one line on the standard error output, and with --json one object on the standard
/// output as well.
int RunCommandLine(int argc, char** argv);

}  // namespace tools

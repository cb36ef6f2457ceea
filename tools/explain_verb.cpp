#include <memory>

#include "tools/cli.h"
#include "tools/explain/explain.h"

namespace tools {

void AddExplainVerb(CLI::App& app, Action& action) {
  CLI::App* explain =
      app.add_subcommand("explain", "Tell what a code, a line of a log, or a whole log means");
  auto options = std::make_shared<ExplainOptions>();
  explain
      ->add_option(
          "WHAT", options->what,
          "a result, event or error number (decimal or 0x...), a device's FileXfer.log, or "
          "one line of it")
      ->required();
  explain->add_option("--job", options->job, "which job of the log, from 1 (default: the last)");
  AddJsonOption(*explain, options->json, "print it as one JSON object");
  explain->footer(
      "Example:\n  orvenix explain 0xC4111005\n"
      "  orvenix explain ./handheld/storage/FileXfer.log");
  explain->callback([options, &action] {
    action = [options] {
      Explain(*options);
      return ExitCode::kOk;
    };
  });
}

}  // namespace tools

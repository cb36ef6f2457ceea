#include <memory>

#include "tools/cli.h"
#include "tools/lint/lint.h"

namespace tools {

void AddJobVerb(CLI::App& app, Action& action) {
  CLI::App* job = app.add_subcommand("job", "Look at jobs before they are sent");
  job->require_subcommand(1);
  CLI::App* lint = job->add_subcommand(
      "lint", "Check a job from what a device will really do with it; exit code 3 on errors");
  auto options = std::make_shared<LintOptions>();
  lint->add_option("FILE", options->file, "a job file, or a bundle")->required();
  lint->add_option("--bundle", options->served,
                   "the bundle or served folder to check the job's files in (default: the bundle "
                   "that the job lies in)");
  AddJsonOption(*lint, options->json, "print all findings as one JSON object");
  lint->footer(
      "Example:\n  orvenix job lint ./bundle\n"
      "  orvenix job lint job.xml --bundle ./served --json");
  lint->callback([options, &action] {
    action = [options] {
      Lint(*options);
      return ExitCode::kOk;
    };
  });
}

}  // namespace tools

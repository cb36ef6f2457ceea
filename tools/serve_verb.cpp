#include <memory>

#include "tools/cli.h"
#include "tools/serve.h"

namespace tools {

void AddServeVerb(CLI::App& app, Action& action) {
  CLI::App* serve = app.add_subcommand("serve", "Serve a bundle to devices until interrupted");
  auto options = std::make_shared<ServeOptions>();
  serve->add_option("BUNDLE", options->bundle, "a bundle, its job.xml, or any folder of files")
      ->required();
  serve->add_option("--address", options->address,
                    "address to listen on (default: the bundle's, else 127.0.0.1)");
  serve->add_option("--port", options->port,
                    "port to listen on, 0 for any free one (default: the bundle's, else 8080)");
  serve
      ->add_option("--pause", options->pause_ms,
                   "milliseconds between head and body; without it devices do not check small "
                   "files")
      ->capture_default_str()
      ->check(CLI::Range(0, 10000));
  serve->add_option("--checkpoint", options->checkpoint_block_size,
                    "announce this checkpoint block size; devices refuse more than 16384");
  serve->add_option("--max-connections", options->max_connections, "devices at once")
      ->capture_default_str();
  serve->add_option("--report", options->report,
                    "write all devices' records to this file at the end");
  serve->add_option("--until-reports", options->until_reports,
                    "end after this many devices have reported the end of their job");
  serve->add_flag("--force", options->force,
                  "serve the bundle although 'job lint' finds errors in its job");
  AddJsonOption(*serve, options->json, "print one JSON object a line for every event");
  serve->footer(
      "Example:\n  orvenix serve ./bundle --address 127.0.0.2 --report report.json\n"
      "Try it without a device:\n"
      "  curl --request-target bundle.lst http://127.0.0.2:8080/");
  serve->callback([options, &action] { action = [options] { return Serve(*options); }; });
}

}  // namespace tools

#include <memory>

#include "tools/cli.h"
#include "tools/run.h"

namespace tools {

void AddRunVerb(CLI::App& app, Action& action) {
  CLI::App* run = app.add_subcommand("run", "Run a job on a simulated device and watch it");
  auto options = std::make_shared<RunOptions>();
  run->add_option("JOB", options->job, "the job file, as 'bundle make' writes it")->required();
  run->add_option("--device", options->device, "the device's folder, from 'device new'")
      ->required();
  run->add_option("--screens", options->screens, "save a picture of every paint in this folder");
  run->add_option("--events", options->events, "also write what --json prints to this file");
  run->add_option("--pcap", options->pcap,
                  "keep the device's datagrams in this file, for a packet viewer");
  run->add_option("--timeout", options->timeout_s, "seconds to wait for the end of the upgrade")
      ->capture_default_str();
  run->add_flag("--callbacks,!--no-callbacks", options->callbacks,
                "take statuses as the host (default), or leave them to the message queue");
  run->add_option("--library", options->library,
                  "the configlet library (default: lib/liborvenix.so beside this program)");
  run->add_flag("--force", options->force, "run the job although 'job lint' finds errors in it");
  AddJsonOption(*run, options->json, "print one JSON object a line for everything that happens");
  run->footer("Example:\n  orvenix run ./bundle/job.xml --device ./handheld --screens ./screens");
  run->callback([options, &action] { action = [options] { return Run(*options); }; });
}

}  // namespace tools

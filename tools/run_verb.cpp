#include <memory>
#include <string>

#include "tools/cli.h"
#include "tools/run.h"

namespace tools {

void AddRunVerb(CLI::App& app, Action& action) {
  CLI::App* run = app.add_subcommand("run", "Run a job on a simulated device and watch it");
  auto options = std::make_shared<RunOptions>();
  run->add_option("JOB", options->job, "a job file, or with --mode client a configuration file")
      ->required();
  auto mode = std::make_shared<std::string>("configlet");
  run->add_option(
         "--mode", *mode,
         "who starts the upgrade: a management host by walking a job through the configlet "
         "(configlet), or a program that loads a configuration file (client), once for "
         "each of its passes")
      ->capture_default_str()
      ->check(CLI::IsMember({"configlet", "client"}));
  run->add_option("--device", options->device, "the device's folder, from 'device new'")
      ->required();
  run->add_option("--screens", options->screens, "save a picture of every paint in this folder");
  run->add_option("--events", options->events, "also write what --json prints to this file");
  run->add_option("--pcap", options->pcap,
                  "keep the device's datagrams in this file, for a packet viewer");
  run->add_option("--timeout", options->timeout_s, "seconds to wait for the end of the upgrade")
      ->capture_default_str();
  run->add_option("--bundle", options->served,
                  "with --mode client: compare files with this bundle or served folder (default: "
                  "the bundle that the file lies in)");
  run->add_option("--hurry", options->hurry, "divide the device's pauses for its reader by this")
      ->capture_default_str()
      ->check(CLI::Range(1, 1000));
  run->add_flag("--callbacks,!--no-callbacks", options->callbacks,
                "take statuses as the host (default), or leave them to the message queue");
  run->add_option("--library", options->library,
                  "the configlet library (default: lib/liborvenix.so beside this program)");
  run->add_flag("--force", options->force, "run the job although 'job lint' finds errors in it");
  AddJsonOption(*run, options->json, "print one JSON object a line for everything that happens");
  run->footer(
      "Example:\n  orvenix run ./bundle/job.xml --device ./handheld --screens ./screens\n"
      "  orvenix run ./bundle/upgrade.xml --mode client --device ./handheld");
  run->callback([options, mode, &action] {
    options->mode = *mode == "client" ? RunMode::kClient : RunMode::kConfiglet;
    action = [options] { return Run(*options); };
  });
}

}  // namespace tools

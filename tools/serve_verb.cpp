#include <memory>

#include "tools/cli.h"
#include "tools/serve.h"

namespace tools {
namespace {

void AddMulticastOptions(CLI::App& serve, ServeMulticast& multicast) {
  const char* const group = "Multicast, for a bundle made with --multicast";
  const auto option = [&serve, group](const char* name, auto& value, const char* text) {
    return serve.add_option(name, value, text)->group(group);
  };
  const auto flag = [&serve, group](const char* name, bool& value, const char* text) {
    serve.add_flag(name, value, text)->group(group);
  };
  flag("--no-multicast", multicast.off, "serve by HTTP alone");
  option("--expect", multicast.expected, "begin a file when so many devices have asked for it");
  option("--minimum", multicast.minimum, "do not begin with fewer devices, until --wait is over")
      ->capture_default_str();
  option("--wait", multicast.wait_s, "seconds that --minimum or --expect are waited for at most");
  flag("--start-now", multicast.start_now,
       "begin each file as soon as --minimum devices, or one, have asked for it");
  option("--rounds", multicast.rounds, "send everything so often, for devices that come later")
      ->capture_default_str()
      ->check(CLI::Range(1, 1000));
  option("--rate", multicast.rate,
         "bits per second on the wire, as 800k, 10M, 1.5G; 0: no limit. While it serves, the keys "
         "+ and - change it, or a line \"rate 10M\" where the input is no terminal")
      ->capture_default_str();
  option("--interface", multicast.network,
         "address or interface of this machine that sends (default: the HTTP address)");
  option("--ttl", multicast.ttl, "networks that a datagram may cross")
      ->capture_default_str()
      ->check(CLI::Range(0, 255));
  flag("--loop", multicast.loop, "let devices on this machine hear it too; always so on 127.x.x.x");
  option("--window", multicast.window, "blocks under way at most; 1: one after the other")
      ->capture_default_str()
      ->check(CLI::Range(1, 4096));
  option("--block-size", multicast.block_size,
         "bytes of a file in one datagram (default: the bundle's)")
      ->check(CLI::Range(1, 65000));
  flag("--encrypt", multicast.encrypt, "encipher all frames (default: as the bundle says)");
  option("--session", multicast.session,
         "keep the run in this file; a server that is started again goes on from there");
  option("--pcap", multicast.pcap, "keep every datagram in this file, for a packet viewer");
}

}  // namespace

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
  AddMulticastOptions(*serve, options->multicast);
  AddJsonOption(*serve, options->json, "print one JSON object a line for every event");
  serve->footer(
      "Example:\n  orvenix serve ./bundle --address 127.0.0.2 --report report.json\n"
      "  orvenix serve ./bundle --expect 200 --rate 50M --ttl 4 --session run.session\n"
      "Try it without a device:\n"
      "  curl --request-target bundle.lst http://127.0.0.2:8080/");
  serve->callback([options, &action] { action = [options] { return Serve(*options); }; });
}

}  // namespace tools

#include <iostream>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>

#include "base/number.h"
#include "tools/bundle.h"
#include "tools/cli.h"
#include "tools/device_table.h"
#include "tools/failure.h"

namespace tools {
namespace {

struct MakeCommand {
  BundleOptions options;
  bool no_window = false;
  std::string syslog;
  std::vector<std::string> attributes;
  std::vector<std::string> masks_for;
  std::vector<std::string> dest_for;
  std::vector<std::string> firmware;
  bool no_wait = false;
  std::string multicast;
  std::optional<std::string> private_group;
  MulticastSetup setup;
  bool json = false;
};

/// Splits "10.0.0.2:514" and "*.ini=hidden".
std::pair<std::string, std::string> SplitAt(const std::string& text, char divider) {
  const std::size_t at = text.rfind(divider);
  if (at == std::string::npos) return {text, ""};
  return {text.substr(0, at), text.substr(at + 1)};
}

void Complete(MakeCommand& command) {
  command.options.show_window = !command.no_window;
  if (!command.syslog.empty()) {
    const auto [address, port] = SplitAt(command.syslog, ':');
    const std::uint32_t number = port.empty() ? 514 : base::LeadingNumber(port);
    if (number == 0 || number > 65535) {
      throw Failure(ExitCode::kUsage, "--syslog", "\"" + port + "\" is no port",
                    "give it as 10.0.0.2:514");
    }
    command.options.syslog_address = address;
    command.options.syslog_port = static_cast<std::uint16_t>(number);
  }
  for (const std::string& rule : command.attributes) {
    const auto [pattern, names] = SplitAt(rule, '=');
    static_cast<void>(ParseAttributes(names));
    command.options.attributes.emplace_back(pattern, names);
  }
  for (const std::string& rule : command.masks_for) {
    command.options.file_masks.push_back(SplitAt(rule, '='));
  }
  for (const std::string& rule : command.dest_for) {
    command.options.destinations.push_back(SplitAt(rule, '='));
  }
  for (const std::string& package : command.firmware) {
    command.options.firmware.push_back(ParseFirmware(package));
  }
  command.options.wait = !command.no_wait;
  if (!command.multicast.empty()) {
    MulticastSetup setup = ParseMulticastSetup(command.multicast);
    if (command.private_group) setup.private_group = *command.private_group;
    setup.block_size = command.setup.block_size;
    setup.device_text = command.setup.device_text;
    setup.encrypt = command.setup.encrypt;
    command.options.multicast = setup;
  }
}

void AddMulticastOptions(CLI::App& make, MakeCommand& command) {
  CLI::Option* multicast = make.add_option(
      "--multicast", command.multicast,
      "GROUP:PORT where files are announced, for example 239.1.1.1:7000; without it all files go "
      "by HTTP");
  make.add_option("--private-group", command.private_group,
                  "where their blocks go (default: the address after GROUP)")
      ->needs(multicast);
  make.add_option("--device-text", command.setup.device_text,
                  "what devices compare masks with while they receive: the beginning of their "
                  "configuration text, without blanks, '-' and '/'")
      ->needs(multicast);
  make.add_option("--block-size", command.setup.block_size, "bytes of a file in one datagram")
      ->capture_default_str()
      ->needs(multicast);
  make.add_flag("--encrypt", command.setup.encrypt, "encipher what goes to the groups")
      ->needs(multicast);
  make.add_option("--http-only", command.options.http_only,
                  "PATTERN of files that go by HTTP only; may be repeated")
      ->allow_extra_args(false)
      ->needs(multicast);
}

void AddFirmwareOptions(CLI::App& make, MakeCommand& command) {
  const char* const group = "Firmware, and what follows it";
  BundleOptions& options = command.options;
  make.add_option("--dest-for", command.dest_for,
                  "PATTERN=FOLDER: another folder for the files that match, without their "
                  "sub-folders, or RAM: for images that are flashed; may be repeated, the first "
                  "that matches counts")
      ->allow_extra_args(false)
      ->group(group);
  make.add_option("--firmware", command.firmware,
                  "FILE;KEY=VALUE;...: a package of the configuration file: one image, or the "
                  "first of several parts, os001.zip. Keys: to (RAM: or a folder), hardware "
                  "(patterns, divided by commas), flash, pass (1 to 9), cmd, ram, disk; may be "
                  "repeated")
      ->allow_extra_args(false)
      ->group(group);
  make.add_option("--inf", options.inf,
                  "an INF file of the configuration; the files that it names lie beside it")
      ->group(group);
  make.add_flag("--configuration", options.configuration,
                "make a configuration file, for devices without a management host, in any case")
      ->group(group);
  make.add_option("--program", options.program, "program that the device starts at the end")
      ->group(group);
  make.add_option("--parameters", options.parameters, "its command line")->group(group);
  make.add_flag("--no-wait", command.no_wait, "the device does not wait for its end")->group(group);
}

std::string ConfiguredText(const Bundle& bundle) {
  if (!bundle.configured_files) return "";
  return ", " + std::to_string(*bundle.configured_files) + " more by the configuration file";
}

std::string AnnouncedText(const Bundle& bundle) {
  if (!bundle.multicast) return "";
  return ", " + std::to_string(AnnouncedFiles(bundle).size()) + " with the list announced on " +
         bundle.multicast->group + ":" + std::to_string(bundle.multicast->port);
}

ExitCode Make(MakeCommand& command) {
  Complete(command);
  const Bundle bundle = MakeBundle(command.options);
  const std::filesystem::path& out = command.options.out;
  if (command.json) {
    nlohmann::ordered_json json{{"event", "made"},
                                {"bundle", out.string()},
                                {"job", (out / kBundleJob).string()},
                                {"files", bundle.files.size()},
                                {"bytes", bundle.total_size},
                                {"list_crc32", bundle.list.crc32},
                                {"announced", AnnouncedFiles(bundle).size()}};
    if (bundle.files.empty()) json.erase("job");
    if (bundle.configured_files) {
      json["configuration"] = (out / kBundleConfiguration).string();
      json["configured_files"] = *bundle.configured_files;
    }
    std::cout << json.dump() << std::endl;
    return ExitCode::kOk;
  }
  std::cout << bundle.files.size() << " files, " << FormatBytes(bundle.total_size) << ", for "
            << bundle.address << ":" << bundle.port << AnnouncedText(bundle)
            << ConfiguredText(bundle) << "\n  serve it:  orvenix serve " << out.string() << "\n";
  if (!bundle.files.empty()) {
    std::cout << "  run it:    orvenix run " << (out / kBundleJob).string() << " --device DIR\n";
  }
  if (bundle.configured_files) {
    std::cout << "  run it:    orvenix run " << (out / kBundleConfiguration).string()
              << " --mode client --device DIR\n";
  }
  std::cout << std::flush;
  return ExitCode::kOk;
}

}  // namespace

void AddBundleVerb(CLI::App& app, Action& action) {
  CLI::App* bundle = app.add_subcommand("bundle", "Make files ready for the upgrade server");
  bundle->require_subcommand(1);
  CLI::App* make = bundle->add_subcommand(
      "make", "Turn a folder of files into a bundle: list file, served tree and job");
  auto command = std::make_shared<MakeCommand>();
  BundleOptions& options = command->options;
  make->add_option("FOLDER", options.folder, "the files, sub-folders included")->required();
  make->add_option("BUNDLE", options.out, "the bundle to make; an earlier one is replaced")
      ->required();
  make->add_option("--name", options.name, "first part of every published path")
      ->capture_default_str();
  make->add_option("--address", options.address, "the server, as devices reach it")
      ->capture_default_str();
  make->add_option("--port", options.port, "its port")->capture_default_str();
  make->add_option("--dest", options.destination, "folder on the device")->capture_default_str();
  make->add_option("--masks", options.masks, "which devices: patterns of configuration texts")
      ->capture_default_str();
  make->add_option("--attributes", command->attributes,
                   "PATTERN=LIST: attributes of the files that match, from read-only, hidden, "
                   "system, archive; may be repeated, the first that matches counts")
      ->allow_extra_args(false);
  make->add_option("--masks-for", command->masks_for,
                   "PATTERN=MASKS: other devices for the files that match; may be repeated, the "
                   "first that matches counts")
      ->allow_extra_args(false);
  make->add_option("--begin-text", options.begin_text, "what the device reports at the beginning");
  make->add_option("--end-text", options.end_text,
                   "what it reports at the end; needs a --begin-text");
  make->add_option("--syslog", command->syslog, "ADDRESS:PORT that the device logs to");
  make->add_flag("--no-window", command->no_window, "show no progress window on the device");
  AddMulticastOptions(*make, *command);
  AddFirmwareOptions(*make, *command);
  AddJsonOption(*make, command->json, "print what was made as one JSON object");
  make->footer(
      "Example:\n  orvenix bundle make ./files ./bundle --address 127.0.0.2 --port 8080 \\\n"
      "      --dest '\\Application' --attributes '*.ini=read-only,archive' \\\n"
      "      --multicast 239.1.1.1:7000 --device-text TQ52 --http-only '*.ini'\n"
      "  orvenix bundle make ./files ./bundle --address 127.0.0.2 \\\n"
      "      --firmware './os.nb0;to=RAM:;hardware=TQ52*;pass=1' \\\n"
      "      --firmware './apps001.zip;to=\\SDMMC Disk;pass=2'");
  make->callback([command, &action] { action = [command] { return Make(*command); }; });
  AddPackageVerb(*bundle, action);
}

}  // namespace tools

#include <iostream>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>

#include "tools/cli.h"
#include "tools/device_table.h"
#include "tools/package/package.h"

namespace tools {
namespace {

struct CabCommand {
  PackageOptions options;
  std::optional<std::string> destination;
  bool json = false;
};

ExitCode Make(CabCommand& command) {
  PackageOptions& options = command.options;
  options.destination = command.destination.value_or("\\Program Files\\" + options.application);
  const Package package = MakePackage(options);
  if (command.json) {
    const nlohmann::ordered_json json{
        {"event", "packed"},      {"cabinet", options.cabinet.string()},
        {"files", package.files}, {"values", package.values},
        {"bytes", package.size},  {"key", "HKEY_LOCAL_MACHINE\\" + package.key}};
    std::cout << json.dump() << std::endl;
    return ExitCode::kOk;
  }
  std::cout << package.files << " files and " << package.values << " registry values, "
            << FormatBytes(package.size) << ", for " << options.destination
            << "\n  installed as:  HKEY_LOCAL_MACHINE\\" << package.key
            << "\n  in a job:      StartProcess with Process \\Windows\\wceload.exe and Parameters "
               "\"/noui \" and its path on the device"
            << std::endl;
  return ExitCode::kOk;
}

}  // namespace

void AddPackageVerb(CLI::App& bundle, Action& action) {
  CLI::App* cab = bundle.add_subcommand(
      "cab", "Turn a folder of files into a package for the device's installer");
  auto command = std::make_shared<CabCommand>();
  PackageOptions& options = command->options;
  cab->add_option("FOLDER", options.folder, "the files, sub-folders included")->required();
  cab->add_option("CABINET", options.cabinet, "the cabinet to make; an earlier one is replaced")
      ->required();
  cab->add_option("--application", options.application, "what is installed")->required();
  cab->add_option("--provider", options.provider, "whose it is")->required();
  cab->add_option("--dest", command->destination,
                  "folder on the device (default: \\Program Files\\ and the application)");
  cab->add_option("--registry", options.registry, "FILE with registry values, as .reg text");
  AddJsonOption(*cab, command->json, "print what was made as one JSON object");
  cab->footer(
      "Example:\n  orvenix bundle cab ./scan ./files/scan.cab --application Scan \\\n"
      "      --provider Tarnwell --registry scan.reg");
  cab->callback([command, &action] { action = [command] { return Make(*command); }; });
}

}  // namespace tools

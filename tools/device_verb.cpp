#include <iostream>
#include <memory>
#include <nlohmann/json.hpp>

#include "tools/cli.h"
#include "tools/device_folder.h"
#include "tools/device_show.h"

namespace tools {
namespace {

struct DeviceCommand {
  std::filesystem::path device;
  std::filesystem::path profile;
  std::vector<std::string> settings;
  std::filesystem::path picture;
  bool json = false;
};

ExitCode New(const DeviceCommand& command) {
  const sim::Profile profile = MakeDeviceFolder(command.device, command.profile, command.settings);
  const std::string file = (command.device / kDeviceProfile).string();
  if (command.json) {
    const nlohmann::ordered_json json{{"event", "made"},
                                      {"device", command.device.string()},
                                      {"profile", file},
                                      {"name", profile.name}};
    std::cout << json.dump() << std::endl;
  } else {
    std::cout << "a " << profile.name << " in " << command.device.string()
              << "\n  look at it:  orvenix device show " << command.device.string()
              << "\n  change it:   " << file << std::endl;
  }
  return ExitCode::kOk;
}

CLI::App* AddVerb(CLI::App& device, const char* name, const char* purpose, DeviceCommand& command) {
  CLI::App* verb = device.add_subcommand(name, purpose);
  verb->add_option("DIR", command.device, "the device's folder")->required();
  return verb;
}

}  // namespace

void AddDeviceVerb(CLI::App& app, Action& action) {
  CLI::App* device = app.add_subcommand("device", "Make and look at simulated devices");
  device->require_subcommand(1);
  auto command = std::make_shared<DeviceCommand>();

  CLI::App* make = AddVerb(*device, "new", "Make a device", *command);
  make->add_option("--profile", command->profile, "profile file to begin with");
  make->add_option("--set", command->settings, "section.key=value of the profile; may be repeated")
      ->allow_extra_args(false);
  AddJsonOption(*make, command->json, "print what was made as one JSON object");
  make->footer(
      "Example:\n  orvenix device new ./handheld --set screen.width=480 --set power.ac_line=0");
  make->callback([command, &action] { action = [command] { return New(*command); }; });

  CLI::App* show =
      AddVerb(*device, "show", "Show a device: profile, files, end of its log", *command);
  AddJsonOption(*show, command->json, "print it as one JSON object");
  show->footer("Example:\n  orvenix device show ./handheld");
  show->callback([command, &action] {
    action = [command] { return ShowDevice(command->device, command->json); };
  });

  CLI::App* screen = AddVerb(*device, "screen", "Show what stood on its screen last", *command);
  screen->add_option("--picture", command->picture, "copy the picture to this PNG file");
  AddJsonOption(*screen, command->json, "print it as one JSON object");
  screen->footer("Example:\n  orvenix device screen ./handheld --picture screen.png");
  screen->callback([command, &action] {
    action = [command] { return ShowScreen(command->device, command->picture, command->json); };
  });
}

}  // namespace tools

#include "tools/cli.h"

#include <algorithm>
#include <exception>
#include <iostream>
#include <nlohmann/json.hpp>
#include <string_view>

#include "tools/failure.h"

namespace tools {
namespace {

std::string ExitCodeHelp() {
  std::string help = "Exit codes:\n";
  for (const ExitCodeRow& row : kExitCodes) {
    std::string number = std::to_string(static_cast<int>(row.code));
    number.insert(0, 4 - number.size(), ' ');
    std::string name = row.name;
    name.resize(17, ' ');
    help.append(number).append("  ").append(name).append(row.meaning).append("\n");
  }
  return help + "\nEvery verb explains itself: orvenix VERB --help";
}

int Report(const Failure& failure, bool json) {
  if (json) {
    const nlohmann::ordered_json error{{"event", "error"},
                                       {"code", static_cast<int>(failure.code())},
                                       {"name", RowOf(failure.code()).name},
                                       {"where", failure.where()},
                                       {"what", failure.reason()},
                                       {"advice", failure.advice()}};
    std::cout << error.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace) << std::endl;
  }
  std::string line = failure.what();
  std::replace(line.begin(), line.end(), '\n', ' ');
  std::cerr << "orvenix: " << line << std::endl;
  return static_cast<int>(failure.code());
}

void RefuseUnknownVerb(const CLI::App& app, int argc, char** argv) {
  if (argc < 2 || *argv[1] == '-') return;
  std::string verbs;
  for (const CLI::App* verb : app.get_subcommands({})) {
    if (verb->get_name() == argv[1]) return;
    verbs += (verbs.empty() ? "" : ", ") + verb->get_name();
  }
  throw Failure(ExitCode::kUsage, argv[1], "there is no such verb", "use one of " + verbs);
}

/// A mistake in the command line, in one line like every other failure.
int ReportUsage(const CLI::ParseError& error, bool json) {
  return Report(Failure(ExitCode::kUsage, "command line", error.what(), "see orvenix --help"),
                json);
}

}  // namespace

void AddJsonOption(CLI::App& verb, bool& json, const std::string& effect) {
  verb.add_flag("--json", json, effect);
}

int RunCommandLine(int argc, char** argv) {
  const bool json = std::any_of(
      argv, argv + argc, [](const char* word) { return std::string_view(word) == "--json"; });
  CLI::App app(
      "Orvenix: upgrades of handheld devices, from a bundle of files to a device that has "
      "them.",
      "orvenix");
  app.set_version_flag("--version", ORVENIX_VERSION);
  app.require_subcommand(1);
  app.footer(ExitCodeHelp());
  Action action;
  AddBundleVerb(app, action);
  AddJobVerb(app, action);
  AddServeVerb(app, action);
  AddDeviceVerb(app, action);
  AddRunVerb(app, action);
  AddExplainVerb(app, action);
  AddFleetVerb(app, action);
  try {
    RefuseUnknownVerb(app, argc, argv);
    app.parse(argc, argv);
    return static_cast<int>(action());
  } catch (const CLI::Success& help) {
    return app.exit(help);
  } catch (const CLI::ParseError& error) {
    return ReportUsage(error, json);
  } catch (const Failure& failure) {
    return Report(failure, json);
  } catch (const std::exception& error) {
    return Report(Failure(ExitCode::kInternal, "internal error", error.what(), "please report it"),
                  json);
  }
}

}  // namespace tools

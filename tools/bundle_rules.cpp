#include "tools/bundle_rules.h"

#include <arpa/inet.h>

#include <algorithm>
#include <map>

#include "base/text.h"
#include "tools/failure.h"

namespace tools {
namespace {

// Characters that the fields of a device's record hold.
constexpr std::size_t kMaxPathField = 259;
constexpr std::size_t kMaxMaskField = 2007;
constexpr std::size_t kMaxAddress = 23;
constexpr std::size_t kMaxMessage = 63;
// A device counts in 32 bits with a sign.
constexpr std::uint64_t kMaxBytes = 0x7FFFFFFF;
constexpr std::uint64_t kMaxListFile = std::uint64_t{16} << 20U;

bool IsLetter(char letter) {
  return (letter >= 'A' && letter <= 'Z') || (letter >= 'a' && letter <= 'z');
}

[[noreturn]] void Refuse(const std::string& from, const std::string& what,
                         const std::string& advice) {
  throw Failure(ExitCode::kBadInput, from, what, advice);
}

/// A character that no list file, request or device path can carry; 0 when there is none.
char ForbiddenIn(const std::string& path) {
  for (const char letter : path) {
    if (letter < ' ' || letter > '~') return '?';
    if (std::string_view(",<>:\"|?*").find(letter) != std::string_view::npos) return letter;
  }
  return 0;
}

void CheckPathText(const std::string& path, const std::string& what, const std::string& from) {
  const char letter = ForbiddenIn(path);
  if (letter == '?') {
    Refuse(from, what + " holds a character that devices cannot carry",
           "use printable ASCII letters, without a question mark");
  }
  if (letter != 0) {
    Refuse(from, what + " holds a '" + letter + "'",
           letter == ',' ? "a comma divides the fields of the list file; rename the file"
                         : "devices allow no such name; rename the file");
  }
  if (path.size() > kMaxPathField) {
    Refuse(from, what + " has " + std::to_string(path.size()) + " characters",
           "devices keep 259; shorten folders, --name or --dest");
  }
}

void CheckLength(const std::string& option, const std::string& text, std::size_t limit) {
  if (text.size() > limit) {
    throw Failure(ExitCode::kUsage, option, "has " + std::to_string(text.size()) + " characters",
                  "devices keep " + std::to_string(limit));
  }
}

void CheckMasks(const std::string& option, const std::string& masks) {
  if (masks.find_first_of(",\r\n") != std::string::npos ||
      masks.find_first_not_of(" ;") == std::string::npos) {
    throw Failure(ExitCode::kUsage, option, "\"" + masks + "\" is no list of patterns",
                  "divide patterns with blanks or semicolons; '*' takes every device");
  }
  CheckLength(option, masks, kMaxMaskField);
}

void CheckMulticast(const BundleOptions& options) {
  CheckMulticastSetup(*options.multicast);
  const bool for_all =
      options.masks == "*" && std::all_of(options.file_masks.begin(), options.file_masks.end(),
                                          [](const auto& masks) { return masks.second == "*"; });
  if (for_all || !options.multicast->device_text.empty()) return;
  throw Failure(ExitCode::kUsage, "--device-text",
                "is missing, and some files are for certain devices only",
                "give the beginning of the devices' configuration text: without it they take every "
                "file that is announced");
}

}  // namespace

void CheckBundleOptions(const BundleOptions& options) {
  const auto usage = [](const std::string& option, const std::string& what,
                        const std::string& advice) {
    throw Failure(ExitCode::kUsage, option, what, advice);
  };
  if (options.name.empty() || !IsLetter(options.name.front())) {
    usage("--name", "\"" + options.name + "\" does not begin with a letter",
          "devices drop leading digits and signs from what they ask for");
  }
  if (options.name.find_first_of("/\\") != std::string::npos || ForbiddenIn(options.name) != 0) {
    usage("--name", "\"" + options.name + "\" is not a plain name", "use letters, digits and '-'");
  }
  if (options.address.empty() ||
      options.address.find_first_not_of(
          "0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ"
          ".-") != std::string::npos) {
    usage("--address", "\"" + options.address + "\" is neither an IPv4 address nor a host name",
          "give it without http:// and without a port");
  }
  CheckLength("--address", options.address, kMaxAddress);
  if (options.port == 0) usage("--port", "0 is no port", "choose 1 to 65535");
  if (options.destination.empty() || options.destination.front() != '\\' ||
      options.destination.find('/') != std::string::npos) {
    usage("--dest", "\"" + options.destination + "\" is no folder on a device",
          "begin with a backslash, as in '\\Application'");
  }
  for (const auto& [pattern, folder] : options.destinations) {
    if (folder == "RAM:") continue;
    if (folder.empty() || folder.front() != '\\' || folder.find('/') != std::string::npos) {
      usage("--dest-for", "\"" + folder + "\" is no folder on a device",
            "give RAM: or a folder, as in '*.nb0=\\'");
    }
  }
  CheckLength("--program", options.program, kMaxPathField);
  CheckLength("--parameters", options.parameters, kMaxPathField);
  if (options.program.empty() && !options.parameters.empty()) {
    usage("--parameters", "are given without a program", "add --program");
  }
  CheckMasks("--masks", options.masks);
  for (const auto& [pattern, masks] : options.file_masks) CheckMasks("--masks-for", masks);
  in_addr parsed{};
  if (!options.syslog_address.empty() &&
      ::inet_pton(AF_INET, options.syslog_address.c_str(), &parsed) != 1) {
    usage("--syslog", "\"" + options.syslog_address + "\" is no IPv4 address",
          "give it as 10.0.0.2:514");
  }
  CheckLength("--begin-text", options.begin_text, kMaxMessage);
  CheckLength("--end-text", options.end_text, kMaxMessage);
  if (options.multicast) CheckMulticast(options);
}

void CheckBundleFile(const BundleFile& file, const std::string& from) {
  constexpr std::string_view kRam = "RAM:";
  constexpr std::size_t kMaxRamName = 19;
  CheckPathText(file.source, "the published path", from);
  if (base::StartsWith(file.destination, kRam)) {
    const std::string name = file.destination.substr(kRam.size());
    CheckPathText(name, "the name in the flash store", from);
    if (name.size() > kMaxRamName) {
      Refuse(from, "has a name of " + std::to_string(name.size()) + " characters",
             "the flash store keeps 19; rename the file");
    }
  } else {
    CheckPathText(file.destination, "the path on the device", from);
  }
  if (file.source.find('\\') != std::string::npos) {
    Refuse(from, "the name holds a backslash", "devices take it for a folder; rename the file");
  }
  if (file.source.empty() || !IsLetter(file.source.front())) {
    Refuse(from, "the published path does not begin with a letter",
           "devices drop leading digits and signs from what they ask for");
  }
  if (file.size > kMaxBytes) {
    Refuse(from, "is larger than 2 GiB", "devices count a file's bytes in 31 bits");
  }
}

void CheckBundleAsAWhole(const Bundle& bundle) {
  std::map<std::string, std::string> seen;
  for (const BundleFile& file : bundle.files) {
    std::string folded = file.destination;
    std::transform(folded.begin(), folded.end(), folded.begin(), base::LowerAscii);
    const auto [other, is_new] = seen.emplace(folded, file.source);
    if (!is_new) {
      Refuse(file.source, "differs from " + other->second + " in letter case only",
             "devices take both for one file");
    }
  }
  if (bundle.total_size > kMaxBytes) {
    Refuse(bundle.name, "the files are larger than 2 GiB together",
           "devices count a job's bytes in 31 bits; divide the bundle");
  }
  if (bundle.list.size > kMaxListFile) {
    Refuse(bundle.name, "the list file is larger than 16 MiB", "divide the bundle");
  }
}

}  // namespace tools

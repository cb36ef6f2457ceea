// The check of what the device's multicast client is told.
#include <algorithm>

#include "base/number.h"
#include "tools/lint/checks.h"
#include "tools/lint/multicast_line.h"
#include "tools/multicast_setup.h"

namespace tools {
namespace {

constexpr std::uint64_t kLargestPort = 65535;
constexpr std::size_t kLongestText = 63;

void CheckText(const JobCheck& check, const MulticastLine& line, int at) {
  if (!line.cut_off.empty()) {
    check.Add(Rule::kMulticastText, at,
              "behind -HV=" + line.text.value_or("") + " stands " + Quoted(line.cut_off));
  } else if (line.text && line.text->size() > kLongestText) {
    check.Add(Rule::kMulticastText, at,
              "the text of -HV has " + std::to_string(line.text->size()) + " characters");
  }
}

/// The fields of "MultiCast", where they say something else than the client's line.
void CheckKept(const JobCheck& check, const MulticastLine& line) {
  const DeviceJob& job = check.job;
  const auto differs = [&check](const Setting& kept, const std::optional<std::string>& counts,
                                const char* name) {
    if (!kept.given() || kept.text.empty() || kept.text == counts.value_or("")) return;
    check.Add(Rule::kMulticastDiffers, kept.line,
              std::string(name) + " is " + Quoted(kept.text) + ", the client is told " +
                  Quoted(counts.value_or("")));
  };
  differs(job.multicast_address, line.group, "MulticastIP");
  differs(job.multicast_port, line.port, "UDPPort");
}

}  // namespace

void CheckMulticast(const JobCheck& check) {
  const Setting& parameters = check.job.multicast_parameters;
  if (parameters.text.empty()) return;
  const MulticastLine line = ReadMulticastLine(parameters.text);
  const int at = parameters.line;
  CheckText(check, line, at);
  if (line.refused) {
    check.Add(Rule::kMulticastParameters, at, "Parameters are " + Quoted(parameters.text));
    return;
  }
  if (!IsGroupAddress(line.group.value_or(""))) {
    check.Add(Rule::kMulticastGroup, at,
              line.group ? "-A is " + Quoted(*line.group) : std::string("there is no -A"));
  }
  const std::string port = line.port.value_or("");
  if (!IsNumber(port, kLargestPort) || base::LeadingNumber(port) == 0) {
    check.Add(Rule::kMulticastPort, at,
              line.port ? "-P is " + Quoted(*line.port) : std::string("there is no -P"));
  }
  for (const std::string& option : line.ignored) {
    check.Add(Rule::kMulticastOption, at, "the option " + Quoted(option));
  }
  if (line.has_status) {
    check.Add(Rule::kMulticastStatus, at, "Parameters are " + Quoted(parameters.text));
  }
  CheckKept(check, line);
}

}  // namespace tools

#include "tools/multicast_setup.h"

#include <arpa/inet.h>

#include "base/number.h"
#include "tools/failure.h"

namespace tools {
namespace {

constexpr std::uint32_t kLargestPort = 65535;
constexpr std::uint32_t kLargestBlock = 65000;
constexpr std::size_t kLongestText = 63;

[[noreturn]] void Refuse(const std::string& option, const std::string& what,
                         const std::string& advice) {
  throw Failure(ExitCode::kUsage, option, what, advice);
}

/// In host order; 0 for what is no address.
std::uint32_t Parse(const std::string& address) {
  in_addr parsed{};
  return ::inet_pton(AF_INET, address.c_str(), &parsed) == 1 ? ntohl(parsed.s_addr) : 0;
}

std::string Dotted(std::uint32_t address) {
  const in_addr in{htonl(address)};
  char text[INET_ADDRSTRLEN] = {};
  return ::inet_ntop(AF_INET, &in, text, sizeof text) != nullptr ? text : "";
}

void CheckGroup(const std::string& option, const std::string& group) {
  if (IsGroupAddress(group)) return;
  Refuse(option, "\"" + group + "\" is no multicast address",
         "choose one from 224.0.1.0 to 239.255.255.255, for example 239.1.1.1");
}

}  // namespace

bool IsGroupAddress(const std::string& address) {
  return Parse(address) >> 28U == 0xE;
}

MulticastSetup ParseMulticastSetup(const std::string& option) {
  MulticastSetup setup;
  const std::size_t colon = option.find(':');
  setup.group = option.substr(0, colon);
  if (colon != std::string::npos) {
    const std::string port = option.substr(colon + 1);
    const std::uint32_t number = base::LeadingNumber(port);
    if (port.find_first_not_of("0123456789") != std::string::npos || port.size() > 5 ||
        number == 0 || number > kLargestPort) {
      Refuse("--multicast", "\"" + port + "\" is no port", "give it as 239.1.1.1:7000");
    }
    setup.port = static_cast<std::uint16_t>(number);
  }
  CheckGroup("--multicast", setup.group);
  setup.private_group = Dotted(Parse(setup.group) + 1);
  return setup;
}

std::string DeviceTextComplaint(const std::string& text) {
  for (const char letter : text) {
    if (letter == '-' || letter == '/' || letter == ' ') {
      return std::string("holds a '") + letter + "', which ends it: options are divided there";
    }
    if (letter < ' ' || letter > '~') return "holds a character that devices cannot carry";
  }
  if (text.size() > kLongestText) {
    return "has " + std::to_string(text.size()) + " characters, devices keep 63";
  }
  return {};
}

void CheckMulticastSetup(const MulticastSetup& setup) {
  CheckGroup("--multicast", setup.group);
  CheckGroup("--private-group", setup.private_group);
  if (setup.group == setup.private_group) {
    Refuse("--private-group", "is the group of the announcements",
           "choose another one, or leave it out for the next address");
  }
  if (setup.port == 0) Refuse("--multicast", "0 is no port", "give it as 239.1.1.1:7000");
  if (setup.block_size == 0 || setup.block_size > kLargestBlock) {
    Refuse("--block-size", std::to_string(setup.block_size) + " bytes are no block",
           "choose 1 to 65000; 1400 fits one Ethernet frame");
  }
  const std::string complaint = DeviceTextComplaint(setup.device_text);
  if (!complaint.empty()) {
    Refuse("--device-text", "\"" + setup.device_text + "\" " + complaint,
           "give the beginning of the configuration text, as in TQ52");
  }
}

std::string ClientParameters(const MulticastSetup& setup) {
  std::string line = "-A=" + setup.group + " -P=" + std::to_string(setup.port);
  if (!setup.device_text.empty()) line += " -HV=" + setup.device_text;
  return line;
}

}  // namespace tools

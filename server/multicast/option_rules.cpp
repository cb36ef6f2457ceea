#include "server/multicast/option_rules.h"

#include <stdexcept>
#include <string>

namespace server {
namespace {

void Require(bool holds, const std::string& what) {
  if (!holds) throw std::invalid_argument(what);
}

}  // namespace

void CheckOptions(const MulticastOptions& options) {
  Require(IsGroup(options.public_group.address) && options.public_group.port != 0,
          "the public group " + ToText(options.public_group) + " is not a multicast group");
  Require(IsGroup(options.private_group),
          "the private group " + AddressText(options.private_group) + " is not a multicast group");
  Require(options.private_group != options.public_group.address,
          "public and private group are the same");
  Require(options.oack_wait >= std::chrono::milliseconds(1),
          "clients have to be told to wait for an answer");
  Require(options.announce_interval.count() > 0 && options.announce_max > 0,
          "a file has to be announced");
  Require(options.block_size > 0, "a block has to have a size");
  Require(options.start.expected <= options.max_devices,
          "more devices are expected than are kept apart");
  Require(options.poll_group > 0 && options.rounds > 0, "nobody would be served");
}

}  // namespace server

// Which options contradict each other.
#pragma once

#include "server/multicast_options.h"

namespace server {

/// Throws std::invalid_argument for options with which no run can be.
void CheckOptions(const MulticastOptions& options);

}  // namespace server

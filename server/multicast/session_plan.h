// What a session of one file is made of, beside the run's options.
#pragma once

#include <cstdint>

#include "server/multicast_file.h"
#include "server/multicast_options.h"
#include "server/peer.h"

namespace server {

struct SessionPlan {
  const MulticastFile* file = nullptr;
  Blocking blocks;
  std::uint32_t transfer_id = 0;
  bool last_file = false;
  Peer own;           ///< where the server is
  StartPolicy start;  ///< for this file
  /// Whether a pause in the stream of requests is enough to begin, with fewer than expected.
  bool begins_when_quiet = false;
};

}  // namespace server

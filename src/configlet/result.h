// What the entry points answer.
#pragma once

#include <cstdint>

#include "orvenix/configlet.h"

namespace configlet {

enum class IcfgResult : std::uint32_t {
  kOk = ICFG_OK,
  kUnknownName = ICFG_UNKNOWN_NAME,
  kUpgradeRunning = ICFG_UPGRADE_RUNNING,
  kNoSpace = ICFG_NO_SPACE,
  kNoPower = ICFG_NO_POWER,
  kTestFailed = ICFG_TEST_FAILED,
};

}  // namespace configlet

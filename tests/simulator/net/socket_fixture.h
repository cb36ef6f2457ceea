// A device with Windows Sockets started, in either world.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <utility>

#include "simulator/net/sockets.h"

namespace test {

struct VirtualWorld {
  static constexpr WorldKind kKind = WorldKind::kVirtual;
};
struct RealWorld {
  static constexpr WorldKind kKind = WorldKind::kReal;
};

struct WorldNames {
  template <typename World>
  static std::string GetName(int /*index*/) {
    return World::kKind == WorldKind::kVirtual ? "Virtual" : "RealThreadsTest";
  }
};

template <typename World>
class SocketTest : public DeviceTest {
 protected:
  SocketTest() : DeviceTest(World::kKind) { StartWinsock(); }

  /// Runs `action` on a thread of its own once the test's thread waits in a call.
  void OnceTheTestWaits(std::function<void()> action) {
    const sim::SimThread* waiter = sim::World::Current();
    const auto lock = world().Acquire();
    world().Spawn(
        device(), "helper",
        [this, waiter, action = std::move(action)] {
          while (!Waits(*waiter)) Sleep(1);
          action();
          return 0U;
        },
        /*suspended=*/false);
  }

 private:
  bool Waits(const sim::SimThread& thread) {
    const auto lock = world().Acquire();
    return thread.state == sim::SimThread::State::kBlocked;
  }
};
using Worlds = ::testing::Types<VirtualWorld, RealWorld>;

}  // namespace test

// A multicast run on a host of a virtual network, without a thread.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <string_view>
#include <utility>

#include "net/endpoint.h"
#include "net/virtual/virtual_network.h"
#include "net/virtual/virtual_server.h"
#include "server/multicast_run.h"
#include "server/peer.h"
#include "world/world.h"

namespace tools {

/// Carries datagrams and deadlines between a virtual UDP port and its run. The host is added to the
/// network. World and run must outlive it. Everything happens in the network's actions, with the
/// world's lock held: while the world runs, look at the run's figures under that lock only
/// (sim::VirtualNetwork::Enter).
class VirtualMulticast {
 public:
  /// @param local  port 0: any that is free
  VirtualMulticast(sim::World& world, const sim::Endpoint& local, server::MulticastRun& run)
      : run_(run),
        port_(
            world, local,
            [this](sim::VirtualPort& /*port*/, const sim::Endpoint& from, std::string_view bytes) {
              run_.OnDatagram({from.address, from.port}, bytes, now());
              Go();
            }),
        ears_(
            world, {local.address, run.options().public_group.port},
            [this](sim::VirtualPort& /*port*/, const sim::Endpoint& from, std::string_view bytes) {
              run_.OnOverheard({from.address, from.port}, bytes, now());
            }) {
    ears_.Join(run.options().public_group.address);
  }
  ~VirtualMulticast() { *alive_ = false; }
  VirtualMulticast(const VirtualMulticast&) = delete;
  VirtualMulticast& operator=(const VirtualMulticast&) = delete;

  /// Begins the run at once. `ended` is called once when it has finished.
  void Start(std::function<void()> ended = nullptr) {
    const sim::World::Lock lock = port_.network().Enter();
    ended_ = std::move(ended);
    run_.Start({port_.local().address, port_.local().port}, now());
    Go();
  }
  /// After the run has been told something (StartNow, SetRate, Stop).
  void Wake() {
    const sim::World::Lock lock = port_.network().Enter();
    Go();
  }

  [[nodiscard]] const sim::Endpoint& local() const { return port_.local(); }

 private:
  [[nodiscard]] server::Micros now() { return port_.network().now(); }

  void Go() {
    run_.OnTime(now());
    while (const server::Outgoing* next = run_.Next(now())) {
      port_.Send({next->to.address, next->to.port}, next->bytes);
    }
    if (run_.finished()) {
      if (ended_) std::exchange(ended_, nullptr)();
      return;
    }
    const auto deadline = run_.deadline(now());
    if (!deadline || (timer_set_ && timer_at_ <= *deadline && timer_at_ > now())) return;
    timer_set_ = true;
    timer_at_ = std::max(*deadline, now());
    port_.network().At(timer_at_, [this, alive = alive_, at = timer_at_] {
      if (!*alive || !timer_set_ || at != timer_at_) return;
      timer_set_ = false;
      Go();
    });
  }

  server::MulticastRun& run_;
  sim::VirtualPort port_;
  sim::VirtualPort ears_;  ///< hears what is said on the public group, and says nothing
  std::function<void()> ended_;
  std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
  bool timer_set_ = false;
  server::Micros timer_at_{0};
};

}  // namespace tools

#include "world/carrier.h"

#include <utility>

namespace sim {

Carrier::~Carrier() {
  if (!host_.joinable()) return;
  stop_ = true;
  work_.Give();
  host_.join();
}

std::unique_ptr<Fiber> Carrier::Make(std::function<void()> body) {
  auto fiber = std::make_unique<Fiber>([this, body = std::move(body)] {
    AfterSwitch();
    body();
  });
  if (!host_.joinable()) host_ = std::thread([this] { Run(); });
  return fiber;
}

void Carrier::Run() {
  Fiber base;
  base_ = &base;
  for (;;) {
    work_.Await();
    if (stop_) return;
    Fiber::Switch(base, *std::exchange(resumed_, nullptr));
    AfterSwitch();
    // Not before the last light thread has been left: it may be resumed from now on.
    if (SimThread* const woken = std::exchange(to_wake_, nullptr)) woken->turn.Give();
  }
}

void Carrier::Resume(Fiber& fiber) {
  resumed_ = &fiber;
  work_.Give();
}

Fiber& Carrier::Target(SimThread* next) {
  if (next != nullptr && next->runs_on != nullptr) return *next->runs_on;
  to_wake_ = next;
  return *base_;
}

void Carrier::AfterSwitch() {
  ended_.reset();
}

void Carrier::PassOn(Fiber& self, SimThread* next) {
  Fiber::Switch(self, Target(next));
  AfterSwitch();
}

void Carrier::End(std::unique_ptr<Fiber> self, SimThread* next) {
  Fiber& ending = *self;
  ended_ = std::move(self);
  Fiber::SwitchForEver(ending, Target(next));
}

}  // namespace sim

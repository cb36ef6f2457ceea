// Message queues.
#include <algorithm>
#include <chrono>

#include "window/window_system.h"
#include "world/sim_thread.h"

namespace sim {

MessageQueue& WindowSystem::QueueOf(const SimThread& thread) {
  std::unique_ptr<MessageQueue>& queue = queues_[thread.id];
  if (queue == nullptr) queue = std::make_unique<MessageQueue>();
  return *queue;
}

LRESULT WindowSystem::CallProcedure(Lock& lock, const Window& window, UINT message, WPARAM wparam,
                                    LPARAM lparam) {
  HWND handle = window.handle;
  const WNDPROC procedure = window.window_class->procedure;
  lock.unlock();
  const LRESULT result = procedure(handle, message, wparam, lparam);
  lock.lock();
  return result;
}

LRESULT WindowSystem::Send(Lock& lock, HWND handle, UINT message, WPARAM wparam, LPARAM lparam) {
  const Window* window = Find(handle);
  if (window == nullptr || window->owner == nullptr) return 0;
  SimThread& self = *World::Current();
  SimThread& receiver = *window->owner;
  if (&receiver == &self) return CallProcedure(lock, *window, message, wparam, lparam);

  const std::uint64_t key = ++next_sent_;
  SentMessage& sent = sent_[key];
  sent = {handle, message, wparam, lparam, &self, &receiver, false, false, 0};
  QueueOf(receiver).sent.push_back(key);
  world_.Notify(QueueOf(receiver).wake);
  MessageQueue& mine = QueueOf(self);
  while (!sent.done && receiver.state != SimThread::State::kFinished) {
    if (AnswerSent(lock, self)) continue;
    mine.waits = {&mine.wake, &receiver.finished};
    world_.Block(lock, mine.waits, std::nullopt);
  }
  const LRESULT result = sent.done ? sent.result : 0;
  sent_.erase(key);
  return result;
}

bool WindowSystem::AnswerSent(Lock& lock, const SimThread& thread) {
  MessageQueue& queue = QueueOf(thread);
  while (!queue.sent.empty()) {
    const std::uint64_t key = queue.sent.front();
    queue.sent.pop_front();
    const auto found = sent_.find(key);
    if (found == sent_.end() || found->second.done) continue;
    SentMessage& sent = found->second;
    const Window* window = Find(sent.window);
    if (window == nullptr) continue;
    sent.taken = true;
    const LRESULT result = CallProcedure(lock, *window, sent.message, sent.wparam, sent.lparam);
    // The record is still there: its sender waits for `done`, or has been terminated and left it.
    sent.result = result;
    sent.done = true;
    world_.Notify(QueueOf(*sent.sender).wake);
    return true;
  }
  return false;
}

void WindowSystem::AnswerForGone(SentMessage& message) {
  message.done = true;
  world_.Notify(QueueOf(*message.sender).wake);
}

void WindowSystem::Post(const Window& window, UINT message, WPARAM wparam, LPARAM lparam) {
  MSG posted = {};
  posted.hwnd = window.handle;
  posted.message = message;
  posted.wParam = wparam;
  posted.lParam = lparam;
  posted.time = static_cast<DWORD>(
      std::chrono::duration_cast<std::chrono::milliseconds>(world_.now()).count());
  MessageQueue& queue = QueueOf(*window.owner);
  queue.posted.push_back(posted);
  world_.Notify(queue.wake);
}

bool WindowSystem::Filter::Accepts(HWND handle, UINT message) const {
  if (window != nullptr && handle != window) return false;
  return (first == 0 && last == 0) || (message >= first && message <= last);
}

bool WindowSystem::Take(const SimThread& thread, const Filter& filter, bool remove, MSG& message) {
  MessageQueue& queue = QueueOf(thread);
  const auto next = std::find_if(
      queue.posted.begin(), queue.posted.end(),
      [&filter](const MSG& posted) { return filter.Accepts(posted.hwnd, posted.message); });
  if (next != queue.posted.end()) {
    message = *next;
    if (remove) queue.posted.erase(next);
    return true;
  }
  message = {};
  if (queue.quit.has_value()) {
    message.message = WM_QUIT;
    message.wParam = static_cast<WPARAM>(*queue.quit);
    if (remove) queue.quit.reset();
    return true;
  }
  const std::vector<HWND> order = Order();
  for (auto at = order.rbegin(); at != order.rend(); ++at) {
    const Window& window = *windows_.at(*at);
    if (window.owner != &thread || !window.visible || IsEmpty(window.update)) continue;
    if (!filter.Accepts(*at, WM_PAINT)) continue;
    message.hwnd = *at;
    message.message = WM_PAINT;
    return true;
  }
  return false;
}

}  // namespace sim

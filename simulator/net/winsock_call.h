// What the Winsock functions have in common: the gate, the lock, the start-up and the error.
#pragma once

#include "device/device.h"
#include "faults/api_call.h"
#include "net/network.h"
#include "world/sim_thread.h"

namespace sim {

/// One call of a Winsock function. Holds the world's lock from Enter on.
class WinsockCall {
 public:
  explicit WinsockCall(const char* name, int usual_error = WSAENETDOWN)
      : call_(name, static_cast<std::uint32_t>(usual_error)) {}

  template <typename T>
  WinsockCall& Note(const char* argument, T value) {
    call_.Argument(argument, value);
    return *this;
  }

  /// Takes the lock. @return 0, or why the function must not go on.
  [[nodiscard]] int Enter() {
    if (call_.failed()) return static_cast<int>(call_.fault_error());
    lock_ = call_.world().Acquire();
    return network().started() > 0 ? 0 : WSANOTINITIALISED;
  }

  [[nodiscard]] Network& network() const { return call_.device().network(); }
  [[nodiscard]] World& world() const { return call_.world(); }
  [[nodiscard]] World::Lock& lock() { return lock_; }
  [[nodiscard]] ApiCall& gate() { return call_; }
  [[nodiscard]] ThreadTexts& texts() const { return network().texts(call_.thread().id); }

  /// Runs `operation` on an open socket, without waiting.
  template <typename Operation>
  [[nodiscard]] int On(SOCKET number, Operation operation) {
    if (const int error = Enter(); error != 0) return error;
    Socket* socket = network().Find(number);
    return socket != nullptr ? operation(*socket) : WSAENOTSOCK;
  }
  /// Runs `operation` on an open socket, waiting as the socket's mode says.
  template <typename Operation>
  [[nodiscard]] int Run(SOCKET number, unsigned interest, Operation operation) {
    if (const int error = Enter(); error != 0) return error;
    return network().Run(lock_, number, interest, operation);
  }

  /// The function's end: `good` when `error` is 0, else `bad` with the thread's last error set.
  template <typename T>
  T Finish(int error, T good, T bad) {
    if (lock_.owns_lock()) lock_.unlock();
    if (error == 0) return call_.Return(good);
    return call_.Fail(static_cast<std::uint32_t>(error), bad);
  }
  int Finish(int error) { return Finish(error, 0, CE_SOCKET_ERROR); }

 private:
  ApiCall call_;
  World::Lock lock_;
};

}  // namespace sim

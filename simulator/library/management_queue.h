// The device's message queue for its management system, and the library through which programs
// reach it.
//
//   HMODULE library = LoadLibraryW(TEXT("kx_clapi_dll"));
//   auto open = reinterpret_cast<...>(GetProcAddressW(library, TEXT("lapi_open")));
//
// Every message is delivered at once: as a file of the device's folder and to whoever listens.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "ce/types.h"
#include "library/libraries.h"

namespace sim {

class Device;

/// The library's name, and the one it had before.
inline constexpr std::u16string_view kQueueLibrary = u"kx_clapi_dll";
inline constexpr std::u16string_view kOldQueueLibrary = u"kx_lapi_c_wrapper";

struct QueuedMessage {
  std::uint32_t number = 0;  ///< from 1; a device that starts again goes on
  std::string queue;         ///< that the connection was opened for
  std::string destination;   ///< name of who is to have it
  std::string master;        ///< on which machine; empty: this one
  std::string text;          ///< without the zero that ends it
};

/// The library of this queue, under the given name and without the entry point `lacks`.
[[nodiscard]] Library MakeQueueLibrary(std::u16string_view name, std::u16string_view lacks = {});

/// Begins as the profile says. May be used by any thread.
class ManagementQueue {
 public:
  explicit ManagementQueue(Device& device);

  /// Whether connections are accepted from now on.
  void SetOpens(bool opens);

  /// Every message goes to `listener`, too. It is called by the thread that sends, for one message
  /// after the other, and must not call the device's API.
  /// @return its number for StopListening
  std::size_t Listen(std::function<void(const QueuedMessage&)> listener);
  /// Returns once the listener is not being called and will not be again.
  void StopListening(std::size_t listener);

  /// What was delivered since the device started.
  [[nodiscard]] std::vector<QueuedMessage> Messages() const;
  [[nodiscard]] std::size_t open_connections() const;
  /// How often a connection was used or closed that was not open.
  [[nodiscard]] std::size_t bad_uses() const;

  // ---- for the library's functions ----

  /// @return a number that fits 32 bits, never used twice; null when the queue refuses
  HANDLE Open(std::string queue);
  /// Delivers to everybody, whatever becomes of the file.
  /// @param message  number and queue are filled in
  /// @return an error number, 0 for success
  DWORD Write(HANDLE connection, QueuedMessage message);
  bool Close(HANDLE connection);

 private:
  std::uint32_t NextNumber();
  [[nodiscard]] bool Keep(const QueuedMessage& message) const;

  Device& device_;
  /// Taken first: messages are delivered one by one, in the order of their numbers.
  std::mutex delivery_;
  std::map<std::size_t, std::function<void(const QueuedMessage&)>> listeners_;
  std::size_t next_listener_ = 0;
  std::uint32_t last_number_ = 0;  ///< 0 until the first message

  mutable std::mutex mutex_;
  bool opens_;
  std::map<HANDLE, std::string> connections_;  ///< their queues
  std::uint32_t next_connection_ = 1;
  std::size_t bad_uses_ = 0;
  std::vector<QueuedMessage> messages_;
};

}  // namespace sim

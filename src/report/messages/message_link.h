// What the management system is told about an upgrade: a ready-to-work status and device events.
//
// Both are XML documents. A status goes to the management client itself once that has set its
// callbacks (IcfgSetCallbacks), otherwise to the device's message queue; events always go to the
// queue. The queue's library is loaded when the first message needs it. A device without it, or
// with a broken one, loses the messages and nothing else.
//
// Any thread may call any of these. What the callers pass is not kept.
#pragma once

#include <cstdint>

namespace report {

/// States of a ready-to-work status.
inline constexpr int kStateIdle = 1;       ///< no upgrade is under way, or no longer
inline constexpr int kStateUpgrading = 4;  ///< hands off the device

/// Numbers of device events.
inline constexpr std::uint32_t kEventUpgradeFailed = 205180;
inline constexpr std::uint32_t kEventUpgradeStarted = 205181;
inline constexpr std::uint32_t kEventUpgradeComplete = 205182;

/// Starts the link to the message queue as far as it is not started yet: library, entry points,
/// connection. A library, its lapi_open or a connection that is missing is looked for again, and
/// logged again, at every call. The other two entry points are looked up together with lapi_open
/// and, once that was found, never again: without lapi_write all messages are lost, without
/// lapi_close the connection stays. Each call also makes sure that the mutex "UPGRADE_CLIENT"
/// exists, by which other programs see that there is an upgrade client; it stays for the life of
/// the process.
void InitKXTransfer() noexcept;

/// Ends the connection to the message queue; the next message opens another. The library stays
/// loaded.
void CloseTransferHandle() noexcept;

/// Sends a ready-to-work status. The client's callback is called by the calling thread, which holds
/// no lock meanwhile: the client may call the configlet from inside it.
/// @param state   kStateIdle or kStateUpgrading; any number goes through
/// @param reason  goes into the document as it stands, cut to 1,600 characters; null: empty
void SetRWIStatus(int state, const char* reason) noexcept;

/// Sends a device event with the device's local time to the message queue. Without memory for its
/// document it is lost, although the log has its time.
/// @param unique_id  the job's; null counts as empty
/// @param code       one of the numbers above; any number goes through
/// @param text       what the event says besides; null: nothing
void SendDeviceEvent(const char* unique_id, std::uint32_t code, const char* text) noexcept;

}  // namespace report

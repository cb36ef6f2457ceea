#include "report/messages/message_link.h"

#include <coredll.h>

#include <cstddef>

#include "base/text.h"
#include "device/lock.h"
#include "orvenix/configlet.h"
#include "report/log/log.h"
#include "report/messages/documents.h"
#include "report/messages/host_callbacks.h"
#include "report/messages/queue_library.h"

namespace report {
namespace {

/// As old as the process, and without a destructor: library and mutex outlive every job.
///
/// The lock is held from the start of the link to the end of a write, so that no thread closes the
/// connection under another's message, and never while the host is called. Loading the library and
/// calling it may take long: other threads' messages wait for that.
struct Link {
  device::Lock lock;  ///< around what follows
  HANDLE mutex = nullptr;
  HMODULE library = nullptr;
  LapiOpen open = nullptr;
  LapiClose close = nullptr;
  LapiWrite write = nullptr;
  HANDLE transfer = nullptr;  ///< the connection, null while there is none
  std::uint32_t options = 0;  ///< see Options
};
Link link;

// KEPT ODDITY: the two receivers are spelt TW_CLIENT and TW_Event_DB here, and TW_Client and
// TW_EVENT_DB within the documents.
constexpr QueueAddress kClient = {"TW_CLIENT", ""};
constexpr QueueAddress kEventDatabase = {"TW_Event_DB", "~MASTERKX"};

/// The word is the library's to write to, and in its place as long as the process lives.
std::uint32_t* Options() noexcept {
  link.options = 1;
  return &link.options;
}

/// Nobody waits for it: other programs only look whether it exists.
void MarkPresence() noexcept {
  HANDLE const mutex = CreateMutexW(nullptr, FALSE, TEXT("UPGRADE_CLIENT"));
  if (mutex == nullptr) return;
  if (link.mutex != nullptr) CloseHandle(link.mutex);
  link.mutex = mutex;
}

// KEPT ODDITY: a library that is missing is looked for, and logged, with every message again.
bool LoadQueueLibrary() noexcept {
  if (link.library != nullptr) return true;
  Log("Orvenix - InitKXTransfer - LoadLibrary\r\n");
  link.library = LoadLibraryW(TEXT("kx_clapi_dll"));
  if (link.library == nullptr) link.library = LoadLibraryW(TEXT("kx_lapi_c_wrapper"));
  return link.library != nullptr;
}

template <typename Function>
void Find(const WCHAR* name, Function& function) noexcept {
  // By way of the one type that every function's address may be cast to.
  const auto address = reinterpret_cast<void (*)()>(GetProcAddressW(link.library, name));
  function = reinterpret_cast<Function>(address);
}

bool FindFunctions() noexcept {
  if (link.open != nullptr) return true;
  Log("Orvenix - InitKXTransfer - GetHandles\r\n");
  Find(TEXT("lapi_open"), link.open);
  Find(TEXT("lapi_close"), link.close);
  Find(TEXT("lapi_write"), link.write);
  return link.open != nullptr;
}

/// Lock held. @return whether there is a connection.
bool StartLink() noexcept {
  MarkPresence();
  if (!LoadQueueLibrary() || !FindFunctions()) return false;
  if (link.transfer != nullptr) return true;
  Log("Orvenix - InitKXTransfer - open\r\n");
  link.open(&link.transfer, "127.0.0.1", "UPG_KX_QUEUE", 0, 1, 0, 0, Options(), 1);
  return link.transfer != nullptr;
}

/// Lock held, connection open. A library without lapi_write loses the message.
void Write(QueueAddress destination, const char* text, std::size_t length) noexcept {
  if (link.write == nullptr) return;
  QueueAddress source = {};
  link.write(link.transfer, 60, 1, 248, 0, 0, &destination, &source, text,
             static_cast<std::int32_t>(length + 1), 1, 0, 0, Options());
}

void HandToHost(const HostCallbacks& host, const char* text, std::size_t length) noexcept {
  if (host.table->set_data == nullptr) return;
  host.table->set_data(host.context, text, static_cast<std::int32_t>(length + 1), host.table);
}

/// Lock held, connection open.
void SendEvent(DeviceEvent event) noexcept {
  SYSTEMTIME now = {};
  GetLocalTime(&now);
  const base::FixedText<33> timestamp = EventTimestamp(now);
  event.timestamp = timestamp.c_str();
  // KEPT ODDITY: the event's time is logged without a line end: the next line begins behind it.
  Log("%s", event.timestamp);
  xml::XmlDocument document;
  std::uint32_t length = 0;
  const char* const text = WriteEvent(document, event, &length);
  if (text == nullptr) return;
  Log("Orvenix - SendDeviceEvent - send msg\r\n");
  Log("%s", text);
  Log("\r\n");
  Write(kEventDatabase, text, length);
}

}  // namespace

void InitKXTransfer() noexcept {
  const device::LockGuard lock(link.lock);
  StartLink();
}

void CloseTransferHandle() noexcept {
  const device::LockGuard lock(link.lock);
  if (link.transfer == nullptr || link.close == nullptr) return;
  // KEPT ODDITY: logged without the prefix of the other lines, and without a line end.
  Log("CloseTransferHandle");
  link.close(link.transfer);
  link.transfer = nullptr;
}

void SetRWIStatus(int state, const char* reason) noexcept {
  Log("Orvenix - SetRWIStatus - entering\r\n");
  char text[kStatusSize];
  const std::size_t length = FormatStatus(text, state, reason);
  const HostCallbacks host = GetHostCallbacks();
  if (host.table != nullptr) {
    HandToHost(host, text, length);
    return;
  }
  const device::LockGuard lock(link.lock);
  if (!StartLink()) return;
  Log("Orvenix - SetRWIStatus - send msg\r\n");
  Log("Orvenix - SetRWIStatus - send msg lapi write\r\n");
  Write(kClient, text, length);
}

void SendDeviceEvent(const char* unique_id, std::uint32_t code, const char* text) noexcept {
  Log("Orvenix - SendDeviceEvent - entering\r\n");
  const device::LockGuard lock(link.lock);
  if (!StartLink()) return;
  SendEvent({"", unique_id, code, text});
}

}  // namespace report

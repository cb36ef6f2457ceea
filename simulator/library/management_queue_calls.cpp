// The functions of the message queue's library. What most of their numbers mean is the library's
// secret; the trace shows them in their order.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <initializer_list>
#include <string>
#include <string_view>

#include "ce/errors.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "library/management_queue.h"

namespace sim {
namespace {

/// Who gets a message, and who sends it.
struct Party {
  char name[16];
  char master[16];
};

/// A field may fill its place to the last character.
template <std::size_t Size>
std::string FieldText(const char (&field)[Size]) {
  return {field, ::strnlen(field, Size)};
}

/// Everything numeric that a caller passes, as one text for the trace.
std::string Numbers(std::initializer_list<std::int32_t> numbers) {
  std::string text;
  for (const std::int32_t number : numbers) {
    if (!text.empty()) text += ' ';
    text += std::to_string(number);
  }
  return text;
}

std::int32_t OptionsOf(const std::uint32_t* options) {
  return options == nullptr ? 0 : static_cast<std::int32_t>(*options);
}

// NOLINTNEXTLINE(readability-function-size): the library's parameters
std::int32_t LapiOpen(HANDLE* connection, const char* host, const char* queue, std::int32_t n4,
                      std::int32_t n5, std::int32_t n6, std::int32_t n7,
                      const std::uint32_t* options, std::int32_t n9) {
  ApiCall call("lapi_open");
  call.Argument("host", host);
  call.Argument("queue", queue);
  call.Argument("numbers", Numbers({n4, n5, n6, n7, OptionsOf(options), n9}).c_str());
  constexpr std::int32_t kFailed = -1;
  if (call.failed()) return call.Return(kFailed);
  if (connection == nullptr || queue == nullptr) return call.Return(kFailed);
  HANDLE const opened = call.device().messages().Open(queue);
  if (opened == nullptr) return call.Return(kFailed);
  *connection = opened;
  return call.Return(0);
}

// NOLINTNEXTLINE(readability-function-size): the library's parameters
std::int32_t LapiWrite(HANDLE connection, std::int32_t n2, std::int32_t n3, std::int32_t n4,
                       std::int32_t n5, std::int32_t n6, const Party* destination,
                       const Party* source, const char* text, std::int32_t length, std::int32_t n11,
                       std::int32_t n12, std::int32_t n13, const std::uint32_t* options) {
  ApiCall call("lapi_write");
  call.Argument("connection", connection);
  call.Argument("numbers",
                Numbers({n2, n3, n4, n5, n6, n11, n12, n13, OptionsOf(options)}).c_str());
  call.Argument("length", length);
  constexpr std::int32_t kFailed = -1;
  if (call.failed()) return call.Return(kFailed);
  if (destination == nullptr || source == nullptr || text == nullptr || length < 1) {
    return call.Fail(ERROR_INVALID_PARAMETER, kFailed);
  }
  QueuedMessage message;
  message.destination = FieldText(destination->name);
  message.master = FieldText(destination->master);
  call.Argument("destination", message.destination.c_str());
  call.Argument("master", message.master.c_str());
  call.Argument("source", (FieldText(source->name) + FieldText(source->master)).c_str());
  message.text.assign(text, static_cast<std::size_t>(length));
  if (message.text.back() == '\0') message.text.pop_back();
  const DWORD error = call.device().messages().Write(connection, std::move(message));
  return error == ERROR_SUCCESS ? call.Return(0) : call.Fail(error, kFailed);
}

/// A failure that is injected ends the connection all the same: the caller cannot try again.
std::int32_t LapiClose(HANDLE connection) {
  ApiCall call("lapi_close");
  call.Argument("connection", connection);
  constexpr std::int32_t kFailed = -1;
  const bool closed = call.device().messages().Close(connection);
  if (call.failed()) return call.Return(kFailed);
  return closed ? call.Return(0) : call.Fail(ERROR_INVALID_HANDLE, kFailed);
}

template <typename Function>
FARPROC EntryOf(Function* function) {
  return reinterpret_cast<FARPROC>(reinterpret_cast<void (*)()>(function));
}

}  // namespace

Library MakeQueueLibrary(std::u16string_view name, std::u16string_view lacks) {
  Library library{std::u16string(name),
                  {{u"lapi_open", EntryOf(&LapiOpen)},
                   {u"lapi_write", EntryOf(&LapiWrite)},
                   {u"lapi_close", EntryOf(&LapiClose)}}};
  library.entries.erase(std::u16string(lacks));
  return library;
}

}  // namespace sim

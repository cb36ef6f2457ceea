#include "storage/streams.h"

#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "kernel/debug.h"
#include "locale/code_pages.h"
#include "storage/open_file.h"
#include "storage/storage.h"

struct ce_FILE {
  std::shared_ptr<sim::OpenFile> file;
};

namespace {

/// What the stream functions return for a failure.
constexpr int kEndOfFile = -1;

}  // namespace

namespace sim {

Streams::Streams() : console_(std::make_unique<ce_FILE>()) {}
Streams::~Streams() = default;

ce_FILE* Streams::Add(std::shared_ptr<OpenFile> file) {
  auto stream = std::make_unique<ce_FILE>();
  stream->file = std::move(file);
  ce_FILE* const address = stream.get();
  const std::lock_guard<std::mutex> hold(mutex_);
  streams_.emplace(address, std::move(stream));
  return address;
}

std::shared_ptr<OpenFile> Streams::Find(const ce_FILE* stream) const {
  const std::lock_guard<std::mutex> hold(mutex_);
  const auto found = streams_.find(stream);
  return found == streams_.end() ? nullptr : found->second->file;
}

bool Streams::Remove(ce_FILE* stream) {
  std::unique_ptr<ce_FILE> closed;  // outlives the lock: closing the file takes others
  const std::lock_guard<std::mutex> hold(mutex_);
  const auto found = streams_.find(stream);
  if (found == streams_.end()) return false;
  closed = std::move(found->second);
  streams_.erase(found);
  return true;
}

void Streams::Clear() {
  Map closed;
  const std::lock_guard<std::mutex> hold(mutex_);
  closed.swap(streams_);
}

std::size_t Streams::open() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return streams_.size();
}

namespace {

struct StreamMode {
  OpenFile::Mode file;
  DWORD disposition;
};

/// "r", "w" or "a", with "+", "b" and "t" behind it in any order.
std::optional<StreamMode> ParseMode(std::string_view text) {
  if (text.empty()) return std::nullopt;
  StreamMode mode{};
  mode.file.share = FILE_SHARE_READ | FILE_SHARE_WRITE;
  switch (text[0]) {
    case 'r':
      mode.file.access = GENERIC_READ;
      mode.disposition = OPEN_EXISTING;
      break;
    case 'w':
      mode.file.access = GENERIC_WRITE;
      mode.disposition = CREATE_ALWAYS;
      break;
    case 'a':
      mode.file.access = GENERIC_WRITE;
      mode.file.append = true;
      mode.disposition = OPEN_ALWAYS;
      break;
    default: return std::nullopt;
  }
  for (const char letter : text.substr(1)) {
    if (letter == '+') {
      mode.file.access = GENERIC_READ | GENERIC_WRITE;
    } else if (letter != 'b' && letter != 't') {
      return std::nullopt;
    }
  }
  return mode;
}

}  // namespace
}  // namespace sim

ce_FILE* ce_fopen(const char* name, const char* mode) {
  sim::ApiCall call("fopen", ERROR_ACCESS_DENIED);
  call.Argument("name", name);
  call.Argument("mode", mode);
  ce_FILE* const none = nullptr;
  if (call.failed()) return call.Return(none);
  if (name == nullptr || mode == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, none);
  const std::optional<sim::StreamMode> how = sim::ParseMode(mode);
  if (!how) return call.Fail(ERROR_INVALID_PARAMETER, none);
  const std::u16string wide = sim::FromAnsi(name);
  sim::Storage& storage = call.device().storage();
  std::shared_ptr<sim::OpenFile> file;
  bool existed = false;
  const DWORD error = storage.Open({wide.c_str(), how->file, how->disposition, 0}, file, existed);
  if (error != ERROR_SUCCESS) return call.Fail(error, none);
  return call.Return(storage.streams().Add(std::move(file)));
}

std::size_t ce_fwrite(const void* bytes, std::size_t size, std::size_t count, ce_FILE* stream) {
  sim::ApiCall call("fwrite", ERROR_DISK_FULL);
  call.Argument("stream", stream);
  call.Argument("size", size);
  call.Argument("count", count);
  const std::size_t nothing = 0;
  if (call.failed() || size == 0 || count == 0) return call.Return(nothing);
  sim::Streams& streams = call.device().storage().streams();
  const std::shared_ptr<sim::OpenFile> file = streams.Find(stream);
  const bool is_console = stream == streams.console();
  if (file == nullptr && !is_console) return call.Fail(ERROR_INVALID_HANDLE, nothing);
  if (bytes == nullptr || count > std::numeric_limits<DWORD>::max() / size) {
    return call.Fail(ERROR_INVALID_PARAMETER, nothing);
  }
  if (is_console) {
    call.device().debug().AddConsole({static_cast<const char*>(bytes), size * count});
    return call.Return(count);
  }
  DWORD written = 0;
  const DWORD error = file->Write(bytes, static_cast<DWORD>(size * count), written);
  if (error != ERROR_SUCCESS) return call.Fail(error, nothing);
  return call.Return(count);
}

int ce_fclose(ce_FILE* stream) {
  // A failure that is injected closes the stream all the same, as a real one does.
  sim::ApiCall call("fclose", ERROR_DISK_FULL);
  call.Argument("stream", stream);
  if (!call.device().storage().streams().Remove(stream)) {
    return call.Fail(ERROR_INVALID_HANDLE, kEndOfFile);
  }
  return call.Return(call.failed() ? kEndOfFile : 0);
}

/// What is written has reached its place already.
int ce_fflush(ce_FILE* stream) {
  sim::ApiCall call("fflush", ERROR_DISK_FULL);
  call.Argument("stream", stream);
  if (call.failed()) return call.Return(kEndOfFile);
  const sim::Streams& streams = call.device().storage().streams();
  const bool is_open = stream == streams.console() || streams.Find(stream) != nullptr;
  return is_open ? call.Return(0) : call.Fail(ERROR_INVALID_HANDLE, kEndOfFile);
}

ce_FILE* ce_stdout() {
  sim::ApiCall call("stdout", sim::kCannotFail);
  return call.Return(call.device().storage().streams().console());
}

ce_FILE* _getstdfilex(int index) {
  constexpr int kOutput = 1;
  return index == kOutput ? ce_stdout() : nullptr;
}

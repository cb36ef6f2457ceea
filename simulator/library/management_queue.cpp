#include "library/management_queue.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <filesystem>
#include <system_error>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "profile/profile.h"
#include "storage/unique_fd.h"

namespace sim {
namespace {

namespace fs = std::filesystem;

constexpr const char* kFolder = "messages";
constexpr std::uint32_t kHighestNumber = 999'999'999;

/// Names of who gets a message come from the device's programs.
std::string FileNameOf(const QueuedMessage& message) {
  char number[16];
  std::snprintf(number, sizeof number, "%06u-", message.number);
  std::string who = message.destination;
  if (!message.master.empty()) who += '.' + message.master;
  const auto is_plain = [](char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' ||
           c == '-' || c == '~' || c == '.';
  };
  std::replace_if(
      who.begin(), who.end(), [is_plain](char c) { return !is_plain(c); }, '_');
  return number + who + ".xml";
}

/// The highest number of the messages in `folder`, 0 when there are none. Files with higher numbers
/// than a device can reach are somebody else's.
std::uint32_t LastNumberIn(const fs::path& folder) {
  std::uint32_t last = 0;
  std::error_code error;
  for (fs::directory_iterator file(folder, error), end; !error && file != end;
       file.increment(error)) {
    const std::string name = file->path().filename().string();
    std::uint32_t number = 0;
    std::from_chars(name.data(), name.data() + name.size(), number);
    if (number <= kHighestNumber) last = std::max(last, number);
  }
  return last;
}

/// Never writes through a link that somebody has put there.
bool WriteNewFile(const fs::path& path, std::string_view text) {
  constexpr mode_t kMode = 0644;
  const UniqueFd file(::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kMode));
  while (file && !text.empty()) {
    const ssize_t written = ::write(file.get(), text.data(), text.size());
    if (written <= 0) return false;
    text.remove_prefix(static_cast<std::size_t>(written));
  }
  return static_cast<bool>(file);
}

}  // namespace

ManagementQueue::ManagementQueue(Device& device)
    : device_(device), opens_(device.profile().message_queue_opens) {
  const Profile& profile = device.profile();
  const auto wide = [](const std::string& text) {
    return std::u16string(text.begin(), text.end());  // both are names of ASCII letters
  };
  if (profile.message_library.empty()) return;
  device.libraries().Install(
      MakeQueueLibrary(wide(profile.message_library), wide(profile.message_library_lacks)));
}

void ManagementQueue::SetOpens(bool opens) {
  const std::lock_guard<std::mutex> hold(mutex_);
  opens_ = opens;
}

std::size_t ManagementQueue::Listen(std::function<void(const QueuedMessage&)> listener) {
  const std::lock_guard<std::mutex> hold(delivery_);
  listeners_.emplace(next_listener_, std::move(listener));
  return next_listener_++;
}

void ManagementQueue::StopListening(std::size_t listener) {
  const std::lock_guard<std::mutex> hold(delivery_);
  listeners_.erase(listener);
}

std::vector<QueuedMessage> ManagementQueue::Messages() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return messages_;
}

std::size_t ManagementQueue::open_connections() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return connections_.size();
}

std::size_t ManagementQueue::bad_uses() const {
  const std::lock_guard<std::mutex> hold(mutex_);
  return bad_uses_;
}

HANDLE ManagementQueue::Open(std::string queue) {
  constexpr std::uintptr_t kFirst = 0x00E00000;  // no handle and no module has such a number, too
  const std::lock_guard<std::mutex> hold(mutex_);
  if (!opens_) return nullptr;
  auto* const connection = reinterpret_cast<HANDLE>(kFirst + next_connection_++);
  connections_.emplace(connection, std::move(queue));
  return connection;
}

bool ManagementQueue::Close(HANDLE connection) {
  const std::lock_guard<std::mutex> hold(mutex_);
  if (connections_.erase(connection) != 0) return true;
  ++bad_uses_;
  return false;
}

std::uint32_t ManagementQueue::NextNumber() {
  if (last_number_ == 0) last_number_ = LastNumberIn(device_.folder() / kFolder);
  return ++last_number_;
}

bool ManagementQueue::Keep(const QueuedMessage& message) const {
  const fs::path folder = device_.folder() / kFolder;
  std::error_code error;
  fs::create_directory(folder, error);
  if (!fs::is_directory(fs::symlink_status(folder, error))) return false;
  return WriteNewFile(folder / FileNameOf(message), message.text);
}

DWORD ManagementQueue::Write(HANDLE connection, QueuedMessage message) {
  const std::lock_guard<std::mutex> in_order(delivery_);
  {
    const std::lock_guard<std::mutex> hold(mutex_);
    const auto found = connections_.find(connection);
    if (found == connections_.end()) {
      ++bad_uses_;
      return ERROR_INVALID_HANDLE;
    }
    message.queue = found->second;
  }
  message.number = NextNumber();
  const bool kept = Keep(message);
  {
    const std::lock_guard<std::mutex> hold(mutex_);
    messages_.push_back(message);
  }
  for (const auto& [number, listener] : listeners_) listener(message);
  return kept ? ERROR_SUCCESS : ERROR_DISK_FULL;
}

}  // namespace sim

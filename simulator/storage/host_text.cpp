#include "storage/host_text.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>

#include "storage/unique_fd.h"

namespace sim {

bool ReadHostText(const std::filesystem::path& file, std::string& text) {
  text.clear();
  // Not blocking: the name may be a pipe's.
  const UniqueFd fd(::open(file.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!fd) return errno == ENOENT;
  struct stat status {};
  if (::fstat(fd.get(), &status) != 0) return false;
  if (!S_ISREG(status.st_mode)) {
    errno = EINVAL;
    return false;
  }
  std::array<char, 16384> part;
  for (;;) {
    const ssize_t got = ::read(fd.get(), part.data(), part.size());
    if (got == 0) return true;
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return false;
    text.append(part.data(), static_cast<std::size_t>(got));
  }
}

bool WriteAll(int fd, std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(fd, text.data(), text.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return false;
    text.remove_prefix(static_cast<std::size_t>(written));
  }
  return true;
}

bool ReplaceHostText(const std::filesystem::path& file, std::string_view text) {
  const std::filesystem::path fresh = file.string() + ".new";
  static_cast<void>(::unlink(fresh.c_str()));  // left by a program that died
  bool whole = false;
  {
    const UniqueFd fd(::open(fresh.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
    whole = fd && WriteAll(fd.get(), text);
  }
  if (whole && std::rename(fresh.c_str(), file.c_str()) == 0) return true;
  const int error = errno;
  static_cast<void>(::unlink(fresh.c_str()));
  errno = error;
  return false;
}

}  // namespace sim

#include "net/posix/inbox.h"

#include <cerrno>
#include <cstring>

#include "ce/winsock.h"
#include "net/posix/address.h"
#include "net/posix/errors.h"

namespace sim {
namespace {

struct Control {
  alignas(cmsghdr) char room[CMSG_SPACE(sizeof(timespec))];
};

std::pair<std::time_t, long> ArrivalOf(msghdr& message) {
  const cmsghdr* const head = CMSG_FIRSTHDR(&message);
  timespec when{};
  if (head != nullptr && head->cmsg_type == SO_TIMESTAMPNS) {
    std::memcpy(&when, CMSG_DATA(head), sizeof when);
  }
  return {when.tv_sec, when.tv_nsec};
}

}  // namespace

int Inbox::Fill() {
  // Pages that no datagram touches cost nothing.
  if (bytes_ == nullptr) bytes_.reset(new char[kMost * kRoom]);
  std::array<mmsghdr, kMost> messages{};
  std::array<iovec, kMost> places{};
  std::array<Control, kMost> controls;
  std::array<HostAddress, kMost> senders;
  for (std::size_t i = 0; i < kMost; ++i) {
    places[i] = {&bytes_[i * kRoom], kRoom};
    msghdr& message = messages[i].msg_hdr;
    message.msg_name = senders[i].get();
    message.msg_namelen = senders[i].size();
    message.msg_iov = &places[i];
    message.msg_iovlen = 1;
    message.msg_control = controls[i].room;
    message.msg_controllen = sizeof controls[i].room;
  }
  const int taken = ::recvmmsg(file_.get(), messages.data(), kMost, MSG_DONTWAIT, nullptr);
  if (taken < 0) return ToWinsockError(errno);
  if (taken == 0) return WSAEWOULDBLOCK;
  count_ = static_cast<std::size_t>(taken);
  for (std::size_t i = 0; i < count_; ++i) {
    letters_[i] = {senders[i].endpoint(), &bytes_[i * kRoom], messages[i].msg_len,
                   ArrivalOf(messages[i].msg_hdr)};
  }
  return 0;
}

}  // namespace sim

// The host's errors in Winsock's numbers.
#include "net/posix/errors.h"

#include <gtest/gtest.h>

#include <cerrno>

#include "ce/winsock.h"

namespace {

TEST(ToWinsockErrorTest, GivesEachErrorTheNumberThatAProgramLooksFor) {
  const struct {
    int error;
    int winsock;
  } kCases[] = {
      {EAGAIN, WSAEWOULDBLOCK},
      {EINPROGRESS, WSAEWOULDBLOCK},
      {EINTR, WSAEINTR},
      {EACCES, WSAEACCES},
      {EPERM, WSAEACCES},
      {EFAULT, WSAEFAULT},
      {EINVAL, WSAEINVAL},
      {EMFILE, WSAEMFILE},
      {ENFILE, WSAEMFILE},
      {EALREADY, WSAEALREADY},
      {ENOTSOCK, WSAENOTSOCK},
      {EBADF, WSAENOTSOCK},
      {EDESTADDRREQ, WSAEDESTADDRREQ},
      {EMSGSIZE, WSAEMSGSIZE},
      {ENOPROTOOPT, WSAENOPROTOOPT},
      {EPROTONOSUPPORT, WSAEPROTONOSUPPORT},
      {ESOCKTNOSUPPORT, WSAESOCKTNOSUPPORT},
      {EOPNOTSUPP, WSAEOPNOTSUPP},
      {EAFNOSUPPORT, WSAEAFNOSUPPORT},
      {EADDRINUSE, WSAEADDRINUSE},
      {EADDRNOTAVAIL, WSAEADDRNOTAVAIL},
      {ENODEV, WSAEADDRNOTAVAIL},
      {ENETDOWN, WSAENETDOWN},
      {ENETUNREACH, WSAENETUNREACH},
      {ECONNABORTED, WSAECONNABORTED},
      {ECONNRESET, WSAECONNRESET},
      {EPIPE, WSAECONNRESET},
      {ENOBUFS, WSAENOBUFS},
      {ENOMEM, WSAENOBUFS},
      {EISCONN, WSAEISCONN},
      {ENOTCONN, WSAENOTCONN},
      {ESHUTDOWN, WSAESHUTDOWN},
      {ETIMEDOUT, WSAETIMEDOUT},
      {ECONNREFUSED, WSAECONNREFUSED},
      {EHOSTUNREACH, WSAEHOSTUNREACH},
      {EHOSTDOWN, WSAEHOSTUNREACH},
      {EDOM, WSAENETDOWN},  // whatever else the host may say
  };
  for (const auto& c : kCases) EXPECT_EQ(sim::ToWinsockError(c.error), c.winsock) << c.error;
}

}  // namespace

// Windows Sockets. Everything here carries the prefix ce_ or CE_, because the build machine's own
// socket headers own the plain names; <coredll.h> gives a program the documented names.
#pragma once

#include "ce/types.h"

using SOCKET = std::uintptr_t;

inline constexpr SOCKET CE_INVALID_SOCKET = ~static_cast<SOCKET>(0);
inline constexpr int CE_SOCKET_ERROR = -1;
inline constexpr int CE_AF_INET = 2;
inline constexpr int CE_SOCK_STREAM = 1;
inline constexpr int CE_SOCK_DGRAM = 2;
inline constexpr int CE_IPPROTO_IP = 0;
inline constexpr int CE_IPPROTO_TCP = 6;
inline constexpr int CE_IPPROTO_UDP = 17;
inline constexpr int CE_SD_RECEIVE = 0;
inline constexpr int CE_SD_SEND = 1;
inline constexpr int CE_SD_BOTH = 2;
inline constexpr int CE_MSG_PEEK = 2;
inline constexpr std::int32_t CE_FIONREAD = 0x4004667F;
inline constexpr std::int32_t CE_FIONBIO = static_cast<std::int32_t>(0x8004667EU);
inline constexpr int CE_SOL_SOCKET = 0xFFFF;
inline constexpr int CE_SO_REUSEADDR = 0x0004;
inline constexpr int CE_SO_KEEPALIVE = 0x0008;
inline constexpr int CE_SO_BROADCAST = 0x0020;
inline constexpr int CE_SO_LINGER = 0x0080;
inline constexpr int CE_SO_SNDBUF = 0x1001;
inline constexpr int CE_SO_RCVBUF = 0x1002;
inline constexpr int CE_SO_ERROR = 0x1007;
inline constexpr int CE_SO_TYPE = 0x1008;
inline constexpr int CE_TCP_NODELAY = 0x0001;
// The device's own numbers; the desktop's later ones are 12 and 13.
inline constexpr int CE_IP_MULTICAST_IF = 2;
inline constexpr int CE_IP_MULTICAST_TTL = 3;
inline constexpr int CE_IP_MULTICAST_LOOP = 4;
inline constexpr int CE_IP_ADD_MEMBERSHIP = 5;
inline constexpr int CE_IP_DROP_MEMBERSHIP = 6;
inline constexpr std::uint32_t CE_INADDR_ANY = 0;
inline constexpr std::uint32_t CE_INADDR_NONE = 0xFFFFFFFFU;
inline constexpr int CE_FD_SETSIZE = 64;

inline constexpr int WSAEINTR = 10004;
inline constexpr int WSAEACCES = 10013;
inline constexpr int WSAEFAULT = 10014;
inline constexpr int WSAEINVAL = 10022;
inline constexpr int WSAEMFILE = 10024;
inline constexpr int WSAEWOULDBLOCK = 10035;
inline constexpr int WSAEALREADY = 10037;
inline constexpr int WSAENOTSOCK = 10038;
inline constexpr int WSAEDESTADDRREQ = 10039;
inline constexpr int WSAEMSGSIZE = 10040;
inline constexpr int WSAENOPROTOOPT = 10042;
inline constexpr int WSAEPROTONOSUPPORT = 10043;
inline constexpr int WSAESOCKTNOSUPPORT = 10044;
inline constexpr int WSAEOPNOTSUPP = 10045;
inline constexpr int WSAEAFNOSUPPORT = 10047;
inline constexpr int WSAEADDRINUSE = 10048;
inline constexpr int WSAEADDRNOTAVAIL = 10049;
inline constexpr int WSAENETDOWN = 10050;
inline constexpr int WSAENETUNREACH = 10051;
inline constexpr int WSAECONNABORTED = 10053;
inline constexpr int WSAECONNRESET = 10054;
inline constexpr int WSAENOBUFS = 10055;
inline constexpr int WSAEISCONN = 10056;
inline constexpr int WSAENOTCONN = 10057;
inline constexpr int WSAESHUTDOWN = 10058;
inline constexpr int WSAETIMEDOUT = 10060;
inline constexpr int WSAECONNREFUSED = 10061;
inline constexpr int WSAEHOSTUNREACH = 10065;
inline constexpr int WSASYSNOTREADY = 10091;
inline constexpr int WSAVERNOTSUPPORTED = 10092;
inline constexpr int WSANOTINITIALISED = 10093;
inline constexpr int WSAHOST_NOT_FOUND = 11001;

struct ce_in_addr {
  union {
    std::uint32_t s_addr;  ///< network order
    std::uint8_t bytes[4];
  };
};
struct ce_sockaddr {
  std::uint16_t sa_family;
  char sa_data[14];
};
struct ce_sockaddr_in {
  std::int16_t sin_family;
  std::uint16_t sin_port;  ///< network order
  ce_in_addr sin_addr;
  char sin_zero[8];
};
struct ce_ip_mreq {
  ce_in_addr imr_multiaddr;
  ce_in_addr imr_interface;
};
struct ce_linger {
  std::uint16_t l_onoff;
  std::uint16_t l_linger;
};
struct ce_timeval {
  std::int32_t tv_sec;
  std::int32_t tv_usec;
};
struct ce_fd_set {
  std::uint32_t fd_count;
  SOCKET fd_array[CE_FD_SETSIZE];
};
struct ce_hostent {
  char* h_name;
  char** h_aliases;
  std::int16_t h_addrtype;
  std::int16_t h_length;
  char** h_addr_list;
};
struct ce_WSADATA {
  WORD wVersion;
  WORD wHighVersion;
  char szDescription[257];
  char szSystemStatus[129];
  std::uint16_t iMaxSockets;
  std::uint16_t iMaxUdpDg;
  char* lpVendorInfo;
};
static_assert(sizeof(ce_sockaddr_in) == 16 && sizeof(ce_ip_mreq) == 8);

extern "C" {
int ce_WSAStartup(WORD version, ce_WSADATA* data);
int ce_WSACleanup();
int ce_WSAGetLastError();
void ce_WSASetLastError(int error);
SOCKET ce_socket(int family, int type, int protocol);
int ce_closesocket(SOCKET socket);
int ce_bind(SOCKET socket, const ce_sockaddr* address, int size);
int ce_connect(SOCKET socket, const ce_sockaddr* address, int size);
int ce_listen(SOCKET socket, int backlog);
SOCKET ce_accept(SOCKET socket, ce_sockaddr* address, int* size);
int ce_send(SOCKET socket, const char* bytes, int size, int flags);
int ce_recv(SOCKET socket, char* bytes, int size, int flags);
int ce_sendto(SOCKET socket, const char* bytes, int size, int flags, const ce_sockaddr* address,
              int address_size);
int ce_recvfrom(SOCKET socket, char* bytes, int size, int flags, ce_sockaddr* address,
                int* address_size);
int ce_select(int ignored, ce_fd_set* read, ce_fd_set* write, ce_fd_set* except,
              const ce_timeval* timeout);
int ce_shutdown(SOCKET socket, int how);
int ce_ioctlsocket(SOCKET socket, std::int32_t command, std::uint32_t* argument);
int ce_setsockopt(SOCKET socket, int level, int option, const char* value, int size);
int ce_getsockopt(SOCKET socket, int level, int option, char* value, int* size);
int ce_getsockname(SOCKET socket, ce_sockaddr* address, int* size);
int ce_getpeername(SOCKET socket, ce_sockaddr* address, int* size);
int ce_gethostname(char* name, int size);
ce_hostent* ce_gethostbyname(const char* name);
std::uint32_t ce_inet_addr(const char* text);
char* ce_inet_ntoa(ce_in_addr address);
std::uint16_t ce_htons(std::uint16_t value);
std::uint16_t ce_ntohs(std::uint16_t value);
std::uint32_t ce_htonl(std::uint32_t value);
std::uint32_t ce_ntohl(std::uint32_t value);
}

// Gives streams and the Windows Sockets interface their documented names, in place of those that
// the build machine's or the compiler's own headers declare. Included last.
#pragma once

#include "ce/files.h"
#include "ce/winsock.h"

#undef FD_ZERO
#undef FD_SET
#undef FD_CLR
#undef FD_ISSET
#undef FD_SETSIZE
#define FD_SETSIZE CE_FD_SETSIZE
#define FD_ZERO(set) (static_cast<void>((set)->fd_count = 0))
#define FD_SET(socket, set)                                       \
  do {                                                            \
    if ((set)->fd_count < static_cast<unsigned>(CE_FD_SETSIZE)) { \
      (set)->fd_array[(set)->fd_count++] = (socket);              \
    }                                                             \
  } while (false)
inline bool ce_FD_ISSET(SOCKET socket, const ce_fd_set* set) {
  for (std::uint32_t i = 0; i < set->fd_count; ++i) {
    if (set->fd_array[i] == socket) return true;
  }
  return false;
}
#define FD_ISSET(socket, set) ce_FD_ISSET(socket, set)

#define FILE ce_FILE
#define fopen ce_fopen
#define fwrite ce_fwrite
#define fclose ce_fclose
#define fflush ce_fflush
#undef stdout
#define stdout ce_stdout()

#undef in_addr
#define in_addr ce_in_addr
#undef sockaddr
#define sockaddr ce_sockaddr
#undef sockaddr_in
#define sockaddr_in ce_sockaddr_in
#undef ip_mreq
#define ip_mreq ce_ip_mreq
#undef linger
#define linger ce_linger
#undef timeval
#define timeval ce_timeval
#undef fd_set
#define fd_set ce_fd_set
#undef hostent
#define hostent ce_hostent
#undef WSADATA
#define WSADATA ce_WSADATA
#undef WSAStartup
#define WSAStartup ce_WSAStartup
#undef WSACleanup
#define WSACleanup ce_WSACleanup
#undef WSAGetLastError
#define WSAGetLastError ce_WSAGetLastError
#undef WSASetLastError
#define WSASetLastError ce_WSASetLastError
#undef socket
#define socket ce_socket
#undef closesocket
#define closesocket ce_closesocket
#undef bind
#define bind ce_bind
#undef connect
#define connect ce_connect
#undef listen
#define listen ce_listen
#undef accept
#define accept ce_accept
#undef send
#define send ce_send
#undef recv
#define recv ce_recv
#undef sendto
#define sendto ce_sendto
#undef recvfrom
#define recvfrom ce_recvfrom
#undef select
#define select ce_select
#undef shutdown
#define shutdown ce_shutdown
#undef ioctlsocket
#define ioctlsocket ce_ioctlsocket
#undef setsockopt
#define setsockopt ce_setsockopt
#undef getsockopt
#define getsockopt ce_getsockopt
#undef getsockname
#define getsockname ce_getsockname
#undef getpeername
#define getpeername ce_getpeername
#undef gethostname
#define gethostname ce_gethostname
#undef gethostbyname
#define gethostbyname ce_gethostbyname
#undef inet_addr
#define inet_addr ce_inet_addr
#undef inet_ntoa
#define inet_ntoa ce_inet_ntoa
#undef htons
#define htons ce_htons
#undef ntohs
#define ntohs ce_ntohs
#undef htonl
#define htonl ce_htonl
#undef ntohl
#define ntohl ce_ntohl

#undef INVALID_SOCKET
#define INVALID_SOCKET CE_INVALID_SOCKET
#undef SOCKET_ERROR
#define SOCKET_ERROR CE_SOCKET_ERROR
#undef AF_INET
#define AF_INET CE_AF_INET
#undef SOCK_STREAM
#define SOCK_STREAM CE_SOCK_STREAM
#undef SOCK_DGRAM
#define SOCK_DGRAM CE_SOCK_DGRAM
#undef IPPROTO_IP
#define IPPROTO_IP CE_IPPROTO_IP
#undef IPPROTO_TCP
#define IPPROTO_TCP CE_IPPROTO_TCP
#undef IPPROTO_UDP
#define IPPROTO_UDP CE_IPPROTO_UDP
#undef SD_RECEIVE
#define SD_RECEIVE CE_SD_RECEIVE
#undef SD_SEND
#define SD_SEND CE_SD_SEND
#undef SD_BOTH
#define SD_BOTH CE_SD_BOTH
#undef MSG_PEEK
#define MSG_PEEK CE_MSG_PEEK
#undef FIONREAD
#define FIONREAD CE_FIONREAD
#undef FIONBIO
#define FIONBIO CE_FIONBIO
#undef SOL_SOCKET
#define SOL_SOCKET CE_SOL_SOCKET
#undef SO_REUSEADDR
#define SO_REUSEADDR CE_SO_REUSEADDR
#undef SO_KEEPALIVE
#define SO_KEEPALIVE CE_SO_KEEPALIVE
#undef SO_BROADCAST
#define SO_BROADCAST CE_SO_BROADCAST
#undef SO_LINGER
#define SO_LINGER CE_SO_LINGER
#undef SO_SNDBUF
#define SO_SNDBUF CE_SO_SNDBUF
#undef SO_RCVBUF
#define SO_RCVBUF CE_SO_RCVBUF
#undef SO_ERROR
#define SO_ERROR CE_SO_ERROR
#undef SO_TYPE
#define SO_TYPE CE_SO_TYPE
#undef TCP_NODELAY
#define TCP_NODELAY CE_TCP_NODELAY
#undef IP_MULTICAST_IF
#define IP_MULTICAST_IF CE_IP_MULTICAST_IF
#undef IP_MULTICAST_TTL
#define IP_MULTICAST_TTL CE_IP_MULTICAST_TTL
#undef IP_MULTICAST_LOOP
#define IP_MULTICAST_LOOP CE_IP_MULTICAST_LOOP
#undef IP_ADD_MEMBERSHIP
#define IP_ADD_MEMBERSHIP CE_IP_ADD_MEMBERSHIP
#undef IP_DROP_MEMBERSHIP
#define IP_DROP_MEMBERSHIP CE_IP_DROP_MEMBERSHIP
#undef INADDR_ANY
#define INADDR_ANY CE_INADDR_ANY
#undef INADDR_NONE
#define INADDR_NONE CE_INADDR_NONE

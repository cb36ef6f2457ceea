#include "net/posix/posix_transport.h"

#include "net/posix/datagram.h"
#include "net/posix/device_sockets.h"
#include "net/posix/file.h"
#include "net/posix/stream.h"

namespace sim {

int MakePosixTransport(SocketKind kind, DeviceSockets& device,
                       std::unique_ptr<Transport>& transport) {
  const bool stream = kind == SocketKind::kStream;
  SocketFile file;
  const int error = SocketFile::Make(stream ? SOCK_STREAM : SOCK_DGRAM, file);
  if (error != 0) return error;
  if (stream) {
    transport = std::make_unique<PosixStream>(std::move(file), device.own);
  } else {
    transport = std::make_unique<PosixDatagram>(std::move(file), device);
  }
  return 0;
}

}  // namespace sim

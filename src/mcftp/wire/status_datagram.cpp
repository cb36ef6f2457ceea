#include "mcftp/wire/status_datagram.h"

#include "base/byte_reader.h"
#include "base/byte_writer.h"
#include "base/text.h"

namespace mcftp {

std::size_t EncodeStatus(const StatusDatagram& status, std::uint8_t* out,
                         std::size_t capacity) noexcept {
  base::ByteWriter to(out, capacity);
  to.U8(1);
  to.U8(0);
  to.U16(status.percent);
  to.U32(status.total_bytes);
  to.U32(status.file_size);
  to.Text(status.file_name);
  return to.length();
}

bool DecodeStatus(const std::uint8_t* bytes, std::size_t length, StatusDatagram& status) noexcept {
  base::ByteReader in(bytes, length);
  in.Skip(2);
  status.percent = in.U16();
  status.total_bytes = in.U32();
  status.file_size = in.U32();
  status.file_name = base::Part(in.RestAsText(), 0, kMaxStatusName);
  return in.ok();
}

}  // namespace mcftp

// The client's frames on the wire: sockets, groups, cipher, and which frames are nobody's business.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "device/local_memory.h"
#include "mcftp/cipher/blowfish.h"
#include "mcftp/cipher/fixed_key.h"
#include "mcftp/udp_socket/udp_socket.h"
#include "mcftp/wire/frames.h"

namespace mcftp {

/// The cipher with the key of all clients and servers; on the heap, for its size.
class KeyedCipher : public device::OnLocalHeap {
 public:
  KeyedCipher() noexcept : cipher_(FixedKey().bytes, FixedKey::kLength) {}
  [[nodiscard]] const Blowfish& cipher() const noexcept { return cipher_; }

 private:
  Blowfish cipher_;
};

/// A received frame: the header, and the record that its opcode names. Texts and data point into
/// the link's receive buffer and are gone with the next frame.
struct Frame {
  Header header;
  Announcement announcement;
  DataFrame data;
  OptionAck oack;
  ErrorFrame error;
};

/// What decides whether a frame is dropped, of the file that is being received.
struct FileInHand {
  std::string_view name;  ///< empty: none
  std::uint16_t block_size = 0;
  std::uint32_t block_count = 0;
};

/// The public group's socket, the private group, the server and the cipher.
///
/// Frames go out enciphered or in the clear as the last frame came in. The server is whoever sent
/// the last frame that was no DATA frame. Set up by the starting thread, then used by the client's
/// thread alone. Logs nothing.
class FrameLink {
 public:
  /// The longest frame that a client sends is a read request; the cipher needs room behind it.
  static constexpr std::size_t kSendBuffer = 1024;

  FrameLink() noexcept = default;
  FrameLink(const FrameLink&) = delete;
  FrameLink& operator=(const FrameLink&) = delete;

  // ---- set-up ----

  /// @return false when there is no memory.
  [[nodiscard]] bool MakeCipher() noexcept;
  [[nodiscard]] UdpNetwork& network() noexcept { return network_; }
  /// The socket of all frames, bound to the public group's port.
  [[nodiscard]] UdpEndpoint& public_endpoint() noexcept { return public_; }
  [[nodiscard]] bool JoinPublicGroup(const char* group) noexcept;
  /// Whether the first frame goes out enciphered if none has come in before.
  void set_enciphering(bool enciphering) noexcept { enciphering_ = enciphering; }
  void Close() noexcept;

  // ---- private group ----

  /// Joins a file's group. One that is joined already stays so without a call; another one is left.
  /// A group with a port of its own gets a socket of its own.
  /// @param address  as a number, 239.1.1.2 is 0xEF010102
  [[nodiscard]] bool JoinPrivateGroup(std::uint32_t address, std::uint16_t port) noexcept;
  [[nodiscard]] bool private_group_joined() const noexcept { return private_joined_; }
  [[nodiscard]] AddressText private_group_text() const noexcept;
  /// The public group stays joined if it is the private one, too.
  void LeavePrivateGroup() noexcept;

  // ---- frames ----

  /// Where the next frame to send is put together, in the clear.
  [[nodiscard]] std::uint8_t* send_buffer() noexcept { return send_buffer_; }
  /// Sends the frame in the buffer to the server, and enciphers it first if that is how things are.
  /// @param length  0, as an encoder that could not build it returns, fails
  [[nodiscard]] bool Send(std::size_t length) noexcept;
  /// Sends the frame that was sent last once more, byte for byte but with the resend flag. The
  /// client builds its repeated answers anew and never asks for this.
  [[nodiscard]] bool Resend() noexcept;

  /// Waits for a frame. What cannot be a frame, a repeated announcement of the file in hand, DATA
  /// that is not the server's or not the file's: all that is dropped and uses up the wait. A
  /// dropped frame may still switch the cipher; it never says who the server is.
  /// @param timeout_ms  0 waits without limit
  [[nodiscard]] bool Receive(std::uint32_t timeout_ms, const FileInHand& file,
                             Frame& frame) noexcept;

  [[nodiscard]] AddressText server_text() const noexcept { return server_.address_text(); }
  [[nodiscard]] bool enciphering() const noexcept { return enciphering_; }

 private:
  bool Take(const Datagram& datagram, const FileInHand& file, Frame& frame) noexcept;
  bool IsForUs(const Datagram& datagram, const FileInHand& file, const Frame& frame) noexcept;
  bool JoinOnOwnSocket() noexcept;
  bool SendBuffer() noexcept;

  UdpNetwork network_;
  UdpEndpoint public_;
  UdpEndpoint private_;              ///< open only while the private group has another port
  UdpEndpoint server_;               ///< an address only
  std::uint32_t public_group_ = 0;   ///< network order
  std::uint32_t private_group_ = 0;  ///< network order; the group joined last
  std::uint16_t private_port_ = 0;
  bool private_joined_ = false;
  bool private_is_public_ = false;  ///< the file comes over the public group, which is never left
  bool enciphering_ = false;
  device::LocalObject<KeyedCipher> cipher_;
  std::size_t sent_length_ = 0;  ///< of the datagram in the buffer
  std::uint8_t send_buffer_[kSendBuffer] = {};
};

}  // namespace mcftp

// TCP in the virtual world: what the two ends of a connection and the wire between them do.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "net/endpoint.h"
#include "net/virtual/fabric.h"

namespace sim {

/// Bytes in a row: added at the end, taken from the front.
class ByteQueue {
 public:
  void Append(std::string_view bytes) { bytes_.append(bytes); }
  [[nodiscard]] std::string_view view() const { return std::string_view(bytes_).substr(taken_); }
  [[nodiscard]] std::size_t size() const { return bytes_.size() - taken_; }
  [[nodiscard]] bool empty() const { return size() == 0; }
  void Drop(std::size_t count);
  void Clear();

 private:
  std::string bytes_;
  std::size_t taken_ = 0;
};

/// Learns that something about its end has changed: established, broken, bytes or room are there,
/// the peer's end came.
class TcpObserver {
 public:
  virtual ~TcpObserver() = default;
  virtual void Changed() = 0;
};

/// A connection with its two ends: 0 asked for it, 1 granted it. Bytes wait in the sender's buffer
/// until the receiver's has room, travel as segments in order, and free the sender's room when the
/// news of their arrival is back. World's lock held.
class TcpConnection : public std::enable_shared_from_this<TcpConnection> {
 public:
  using Side = unsigned;
  static constexpr std::size_t kDefaultBuffer = 32768;
  /// How long a connection is asked for: three tries, 3, 6 and 12 seconds.
  static constexpr Micros kConnectPatience = std::chrono::seconds(21);

  TcpConnection(Fabric& fabric, const Endpoint& local, const Endpoint& peer);

  /// Asks for the connection; `observer` is told when it stands or has failed.
  void Start(TcpObserver& observer);

  void SetObserver(Side side, TcpObserver* observer) { ends_[side].observer = observer; }
  void SetBuffers(Side side, std::size_t send, std::size_t receive);

  [[nodiscard]] const Endpoint& endpoint(Side side) const { return ends_[side].endpoint; }
  [[nodiscard]] bool established(Side side) const { return ends_[side].established; }
  /// 0, or the Winsock error that ended the connection for this side.
  [[nodiscard]] int error(Side side) const { return ends_[side].error; }
  [[nodiscard]] bool open() const { return !ends_[0].closed || !ends_[1].closed; }

  /// Room in the send buffer.
  [[nodiscard]] std::size_t Room(Side side) const;
  /// @return how many bytes found room.
  std::size_t Write(Side side, std::string_view bytes);
  /// What has arrived and is unread.
  [[nodiscard]] std::string_view Unread(Side side) const { return Incoming(side).arrived.view(); }
  void TakeRead(Side side, std::size_t count);
  /// The peer has ended its stream and all of it is read.
  [[nodiscard]] bool AtEnd(Side side) const;

  void ShutdownSend(Side side);
  /// The end's owner is gone. Unread bytes make it a reset, as `abort` does.
  void Close(Side side, bool abort);
  /// Tears the connection down at both ends, as a broken middle box would.
  void Break();

 private:
  struct End {
    Endpoint endpoint;
    TcpObserver* observer = nullptr;
    bool established = false;
    bool closed = false;
    int error = 0;
  };
  /// One direction, named after its sender.
  struct Stream {
    ByteQueue unsent;
    std::size_t unconfirmed = 0;  ///< sent; their arrival is not known yet
    std::size_t send_limit = kDefaultBuffer;
    std::size_t credit = kDefaultBuffer;  ///< bytes the receiver will still take
    bool end_wanted = false;
    bool end_sent = false;
    bool stalled = false;
    bool lost = false;  ///< what is written goes nowhere
    Micros next_departure{0};
    bool departure_planned = false;
    Micros last_arrival{0};
    std::uint64_t sent = 0;
    std::optional<StreamFault> fault;

    ByteQueue arrived;
    bool end_arrived = false;
    std::size_t receive_limit = kDefaultBuffer;
    std::size_t owed_credit = 0;  ///< room that came free and was not announced
  };

  using Payload = std::shared_ptr<const std::string>;

  static constexpr Side Other(Side side) { return 1 - side; }
  [[nodiscard]] Stream& Incoming(Side side) { return streams_[Other(side)]; }
  [[nodiscard]] const Stream& Incoming(Side side) const { return streams_[Other(side)]; }
  [[nodiscard]] Link& LinkFrom(Side side);

  void Carry(Side from, FrameKind kind, const Payload& bytes, std::function<void()> arrive);
  void AskArrived();
  void Establish(Side side);
  void Fail(Side side, int error);
  void Pump(Side from);
  bool MayDepart(Side from);
  void SendSegment(Side from);
  void SendEnd(Side from);
  void SendReset(Side from, int error);
  bool FireFault(Side from);
  void SegmentArrived(Side from, std::string_view bytes);
  void EndArrived(Side from);
  void Confirm(Side from, std::size_t count);
  void AnnounceRoom(Side side);
  void After(Micros delay, void (TcpConnection::*step)(Side, std::size_t), Side side,
             std::size_t count);
  void AddCredit(Side from, std::size_t count);
  void Tell(Side side);

  Fabric& fabric_;
  std::array<End, 2> ends_;
  std::array<Stream, 2> streams_;
  std::uint64_t patience_ = 0;  ///< action that gives up connecting; 0: none
};

}  // namespace sim

#include "net/virtual/tcp.h"

#include <algorithm>
#include <utility>

#include "ce/winsock.h"

namespace sim {

void ByteQueue::Drop(std::size_t count) {
  taken_ += count;
  if (taken_ == bytes_.size()) {
    Clear();
  } else if (taken_ >= 65536 && taken_ * 2 >= bytes_.size()) {
    bytes_.erase(0, taken_);
    taken_ = 0;
  }
}

void ByteQueue::Clear() {
  bytes_.clear();
  taken_ = 0;
}

TcpConnection::TcpConnection(Fabric& fabric, const Endpoint& local, const Endpoint& peer)
    : fabric_(fabric) {
  ends_[0].endpoint = local;
  ends_[1].endpoint = peer;
}

Link& TcpConnection::LinkFrom(Side side) {
  return fabric_.Between(ends_[side].endpoint.address, ends_[Other(side)].endpoint.address);
}

void TcpConnection::Tell(Side side) {
  if (ends_[side].observer != nullptr) ends_[side].observer->Changed();
}

void TcpConnection::SetBuffers(Side side, std::size_t send, std::size_t receive) {
  streams_[side].send_limit = send;
  Stream& incoming = Incoming(side);
  const std::size_t grown = receive > incoming.receive_limit ? receive - incoming.receive_limit : 0;
  incoming.receive_limit = receive;
  incoming.credit += grown;
}

// ---- the wire ----

/// Sends a frame, which keeps its place behind those sent before it in the same direction.
void TcpConnection::Carry(Side from, FrameKind kind, const Payload& bytes,
                          std::function<void()> arrive) {
  Link& link = LinkFrom(from);
  if (link.stalled()) {
    link.Hold([self = shared_from_this(), from, kind, bytes, arrive = std::move(arrive)] {
      self->Carry(from, kind, bytes, arrive);
    });
    return;
  }
  const Micros now = fabric_.world().now();
  Stream& stream = streams_[from];
  const std::size_t size = bytes != nullptr ? bytes->size() : 0;
  const Micros when = std::max(link.Segment(now, size), stream.last_arrival);
  stream.last_arrival = when;
  if (fabric_.capturing()) {
    const Endpoint& to = ends_[Other(from)].endpoint;
    const std::string copy = bytes != nullptr ? *bytes : std::string();
    fabric_.Record({kind, now, ends_[from].endpoint, to, copy, {{to.address, when}}});
  }
  fabric_.At(when, [self = shared_from_this(), arrive = std::move(arrive)] { arrive(); });
}

// ---- beginning ----

void TcpConnection::Start(TcpObserver& observer) {
  ends_[0].observer = &observer;
  const Address to = ends_[1].endpoint.address;
  const Micros now = fabric_.world().now();
  fabric_.Enlist(shared_from_this());
  patience_ = fabric_.At(now + kConnectPatience, [self = shared_from_this()] {
    self->patience_ = 0;
    self->Fail(0, WSAETIMEDOUT);
  });
  const HostState state = fabric_.State(to);
  if (state == HostState::kUnreachable) {
    fabric_.At(now + LinkFrom(0).profile().delay,
               [self = shared_from_this()] { self->Fail(0, WSAEHOSTUNREACH); });
  }
  if (state != HostState::kUp) return;
  Carry(0, FrameKind::kConnect, {}, [this] { AskArrived(); });
}

void TcpConnection::AskArrived() {
  TcpListener* listener = fabric_.FindListener(ends_[1].endpoint);
  if (listener == nullptr || listener->full()) {
    Carry(1, FrameKind::kReset, {}, [this] { Fail(0, WSAECONNREFUSED); });
    return;
  }
  Establish(1);
  Carry(1, FrameKind::kAccept, {}, [this] {
    if (ends_[0].closed) {
      SendReset(0, WSAECONNRESET);
    } else if (!ends_[0].established && ends_[0].error == 0) {
      Establish(0);
      Pump(0);
      Tell(0);
    }
  });
  listener->Arrived(shared_from_this());
  Pump(1);
}

void TcpConnection::Establish(Side side) {
  if (patience_ != 0 && side == 0) fabric_.world().Cancel(std::exchange(patience_, 0));
  ends_[side].established = true;
  streams_[side].fault =
      fabric_.TakeFault(ends_[side].endpoint.address, ends_[Other(side)].endpoint.address);
}

/// The connection is over for `side`.
void TcpConnection::Fail(Side side, int error) {
  End& end = ends_[side];
  if (end.error != 0 || (error == WSAETIMEDOUT && end.established)) return;
  if (patience_ != 0) fabric_.world().Cancel(std::exchange(patience_, 0));
  end.error = error;
  streams_[side].unsent.Clear();
  streams_[side].lost = true;
  Incoming(side).arrived.Clear();
  Tell(side);
}

// ---- sending ----

std::size_t TcpConnection::Room(Side side) const {
  const Stream& stream = streams_[side];
  const std::size_t used = stream.unsent.size() + stream.unconfirmed;
  return used < stream.send_limit ? stream.send_limit - used : 0;
}

std::size_t TcpConnection::Write(Side side, std::string_view bytes) {
  Stream& stream = streams_[side];
  if (stream.lost) return bytes.size();
  bytes = bytes.substr(0, Room(side));
  stream.unsent.Append(bytes);
  Pump(side);
  return bytes.size();
}

void TcpConnection::ShutdownSend(Side side) {
  streams_[side].end_wanted = true;
  Pump(side);
}

/// Sends what may be sent now.
void TcpConnection::Pump(Side from) {
  if (!ends_[from].established || ends_[from].error != 0) return;
  Stream& stream = streams_[from];
  while (MayDepart(from)) SendSegment(from);
  const bool done = stream.unsent.empty() && !stream.stalled && !stream.lost;
  if (stream.end_wanted && !stream.end_sent && done) SendEnd(from);
}

bool TcpConnection::MayDepart(Side from) {
  Stream& stream = streams_[from];
  if (FireFault(from) || stream.stalled || stream.lost) return false;
  if (stream.unsent.empty() || stream.credit == 0) return false;
  if (stream.next_departure <= fabric_.world().now()) return true;
  if (!std::exchange(stream.departure_planned, true)) {
    fabric_.At(stream.next_departure, [self = shared_from_this(), from] {
      self->streams_[from].departure_planned = false;
      self->Pump(from);
    });
  }
  return false;
}

void TcpConnection::SendSegment(Side from) {
  Stream& stream = streams_[from];
  const LinkProfile& profile = LinkFrom(from).profile();
  std::size_t size = std::max<std::size_t>(profile.segment_bytes, 1);
  size = std::min({size, stream.unsent.size(), stream.credit});
  if (stream.fault) {
    size = static_cast<std::size_t>(
        std::min<std::uint64_t>(size, stream.fault->after_bytes - stream.sent));
  }
  const auto bytes = std::make_shared<const std::string>(stream.unsent.view().substr(0, size));
  stream.unsent.Drop(size);
  stream.sent += size;
  stream.credit -= size;
  stream.unconfirmed += size;
  stream.next_departure = fabric_.world().now() + profile.segment_gap;
  Carry(from, FrameKind::kSegment, bytes, [this, from, bytes] { SegmentArrived(from, *bytes); });
}

void TcpConnection::SendEnd(Side from) {
  streams_[from].end_sent = true;
  Carry(from, FrameKind::kEnd, {}, [this, from] { EndArrived(from); });
}

void TcpConnection::SendReset(Side from, int error) {
  Carry(from, FrameKind::kReset, {}, [this, from, error] { Fail(Other(from), error); });
}

/// Lets the direction's fault happen when its byte has been reached.
bool TcpConnection::FireFault(Side from) {
  Stream& stream = streams_[from];
  if (!stream.fault || stream.sent < stream.fault->after_bytes) return false;
  const StreamFault fault = *stream.fault;
  stream.fault.reset();
  switch (fault.kind) {
    case StreamFaultKind::kReset:
      stream.lost = true;
      SendReset(from, WSAECONNRESET);
      fabric_.At(stream.last_arrival,
                 [self = shared_from_this(), from] { self->Fail(from, WSAECONNRESET); });
      return true;
    case StreamFaultKind::kEnd:
      stream.lost = true;
      stream.unsent.Clear();
      SendEnd(from);
      return true;
    case StreamFaultKind::kStall: break;
  }
  stream.stalled = true;
  if (fault.stall.count() > 0) {
    fabric_.At(fabric_.world().now() + fault.stall, [self = shared_from_this(), from] {
      self->streams_[from].stalled = false;
      self->Pump(from);
    });
  }
  return true;
}

// ---- arriving ----

void TcpConnection::SegmentArrived(Side from, std::string_view bytes) {
  const Side to = Other(from);
  if (ends_[to].error != 0) return;
  if (ends_[to].closed) {
    SendReset(to, WSAECONNRESET);
    return;
  }
  streams_[from].arrived.Append(bytes);
  After(LinkFrom(to).profile().delay, &TcpConnection::Confirm, from, bytes.size());
  Tell(to);
}

void TcpConnection::EndArrived(Side from) {
  streams_[from].end_arrived = true;
  Tell(Other(from));
}

/// Does `step` when `delay` is over: at once when there is none.
void TcpConnection::After(Micros delay, void (TcpConnection::*step)(Side, std::size_t), Side side,
                          std::size_t count) {
  if (delay.count() <= 0) {
    (this->*step)(side, count);
    return;
  }
  fabric_.At(fabric_.world().now() + delay,
             [self = shared_from_this(), step, side, count] { ((*self).*step)(side, count); });
}

void TcpConnection::Confirm(Side from, std::size_t count) {
  streams_[from].unconfirmed -= count;
  if (!ends_[from].closed && ends_[from].error == 0) Tell(from);
}

void TcpConnection::TakeRead(Side side, std::size_t count) {
  Stream& incoming = Incoming(side);
  incoming.arrived.Drop(count);
  incoming.owed_credit += count;
  AnnounceRoom(side);
}

/// Tells the sender of room that came free, but not of every byte.
void TcpConnection::AnnounceRoom(Side side) {
  Stream& incoming = Incoming(side);
  const std::size_t segment = LinkFrom(Other(side)).profile().segment_bytes;
  const std::size_t worth = std::min(2 * segment, incoming.receive_limit / 2);
  if (incoming.owed_credit == 0) return;
  if (incoming.owed_credit < worth && !incoming.arrived.empty()) return;
  After(LinkFrom(side).profile().delay, &TcpConnection::AddCredit, Other(side),
        std::exchange(incoming.owed_credit, 0));
}

void TcpConnection::AddCredit(Side from, std::size_t count) {
  streams_[from].credit += count;
  Pump(from);
}

bool TcpConnection::AtEnd(Side side) const {
  const Stream& incoming = Incoming(side);
  return incoming.end_arrived && incoming.arrived.empty();
}

// ---- ending ----

void TcpConnection::Close(Side side, bool abort) {
  End& end = ends_[side];
  end.observer = nullptr;
  end.closed = true;
  if (patience_ != 0 && side == 0) fabric_.world().Cancel(std::exchange(patience_, 0));
  if (end.error != 0 || !end.established) return;
  if (abort || !Incoming(side).arrived.empty()) {
    streams_[side].unsent.Clear();
    streams_[side].lost = true;
    SendReset(side, WSAECONNRESET);
  } else {
    ShutdownSend(side);
  }
}

void TcpConnection::Break() {
  Fail(0, WSAECONNRESET);
  Fail(1, WSAECONNRESET);
}

}  // namespace sim

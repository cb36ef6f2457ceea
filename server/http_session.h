// One connection of a device to the upgrade server, without a socket and without a clock.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "server/ledger.h"
#include "server/moment.h"
#include "server/request.h"
#include "server/site.h"

namespace server {

struct SessionOptions {
  /// How long the body waits after the head has gone out. A device takes the head from the first
  /// block it receives; a body that came whole with the head would be kept without a CRC check,
  /// attributes or counting, so the body has to come as a block of its own.
  Time body_pause{50};
  /// "CheckPoint-BlockSize:" of every answer; not sent when absent.
  std::optional<std::uint32_t> checkpoint_block_size;

  std::size_t max_head = 8192;           ///< bytes of a request head; longer ones are refused
  std::size_t block_size = 65536;        ///< bytes of a body that are held in memory at once
  Time head_limit{10'000};               ///< a request that has begun must be complete by then
  Time idle_limit{120'000};              ///< a connection without a request is closed
  Time stall_limit{60'000};              ///< a client that takes nothing for so long is dropped
  Time farewell_limit{2'000};            ///< wait for the client's end after a refusal
  std::size_t farewell_bytes = 262'144;  ///< bytes that are read and dropped in that time
};

/// The engine of one connection: bytes and moments go in; bytes, deadlines and the wish to close
/// come out. The driver's loop:
///
///   for every event: OnBytes / OnPeerClosed / OnSent / OnTime, then
///   if closed(): close the socket;
///   if output() is not empty: send it and say OnSent with what went out;
///   if ends_output(): shut down the sending side once;
///   if wants_input(): read; set a timer for deadline().
///
/// Every answer's head is one output of its own, so a driver that sends each output with one call
/// keeps it in one segment. Requests are answered in their order; while an answer is under way, two
/// heads' worth of further input is taken and no more. The client's end of sending ends the
/// connection at once: that is how a device closes, and it reads until we do.
///
/// Any bytes are survived; memory stays within block_size plus three times max_head. Site and
/// ledger must outlive the session; neither may be used by another thread meanwhile.
class HttpSession {
 public:
  HttpSession(Site& site, DeviceLedger& ledger, const SessionOptions& options, std::string address,
              Time now);
  ~HttpSession();
  HttpSession(const HttpSession&) = delete;
  HttpSession& operator=(const HttpSession&) = delete;

  void OnBytes(std::string_view bytes, Time now);
  /// The client will send no more, or the connection broke.
  void OnPeerClosed(Time now);
  /// The first `count` bytes of output() have gone out.
  void OnSent(std::size_t count, Time now);
  /// To be called when deadline() is reached; calls before it change nothing.
  void OnTime(Time now);

  /// What to send next; empty when there is nothing now. Valid until the next call of an On...().
  [[nodiscard]] std::string_view output() const;
  [[nodiscard]] bool wants_input() const;
  [[nodiscard]] bool ends_output() const { return phase_ == Phase::kFarewell; }
  [[nodiscard]] bool closed() const { return phase_ == Phase::kClosed; }
  /// Never in the past of the call that set it; every open session has one.
  [[nodiscard]] Time deadline() const { return deadline_; }

 private:
  enum class Phase : std::uint8_t {
    kReading,    ///< waits for a request
    kAnswering,  ///< sends a head that has no body
    kHead,       ///< sends the head of a file
    kPause,      ///< lets the head arrive alone
    kBody,
    kRefusing,  ///< sends its last words
    kFarewell,  ///< has sent them, and reads until the client has seen them
    kClosed,
  };

  /// What the input begins with.
  enum class Start : std::uint8_t { kPartOfHead, kHeadTooLong, kRequest };
  Start TakeRequest(Request& request);
  void Advance(Time now);
  void Handle(const Request& request, Time now);
  void Serve(const Request& request, Time now);
  void Say(std::string_view answer, Phase phase, Time now);
  void Refuse(std::string_view status, std::string_view why, Time now);
  void NextBlock(Time now);
  void EndFile(Time now);
  void Close(std::string_view why, Time now);
  void WaitForRequest(Time now);

  Site& site_;
  DeviceLedger& ledger_;
  const SessionOptions options_;
  const std::string address_;

  Phase phase_ = Phase::kReading;
  Time deadline_{};
  std::string input_;
  std::size_t dropped_ = 0;  ///< bytes read and thrown away during the farewell

  std::string output_;
  std::size_t output_sent_ = 0;

  std::unique_ptr<SiteFile> file_;
  std::string path_;
  DeviceRecord* device_ = nullptr;
  std::uint64_t body_read_ = 0;  ///< bytes of the body taken from the file
  std::uint64_t body_sent_ = 0;
};

}  // namespace server

// Many blocks in flight, and repair for all devices at once.
#pragma once

#include <cstdint>
#include <optional>

#include "server/multicast/block_log.h"
#include "server/multicast/closing.h"
#include "server/multicast/first_pass.h"
#include "server/multicast/repair.h"
#include "server/multicast/transfer.h"

namespace server {

/// Sends a file in three steps: all blocks but two once (FirstPass), what devices lack of them
/// (Repair), the two that were held back (Closing).
class Pipeline final : public Transfer {
 public:
  explicit Pipeline(TransferDesk& desk)
      : desk_(desk),
        log_(desk.block_count()),
        first_pass_(desk, log_),
        repair_(desk, log_),
        closing_(desk, log_) {}

  void Begin(Micros now) override;
  void Resume(std::uint32_t first_unsent, bool last_sent, Micros now) override;
  void OnJoin(Device& device, Micros now) override;
  void OnAck(Device& device, const mcftp::AckFrame& ack, Micros now) override;
  void OnNak(Device& device, std::uint16_t block, Micros now) override;
  void OnOverrun(Device& device, std::uint16_t percent_x100, std::uint16_t block,
                 Micros now) override;
  void OnGivenUp(Device& device, Micros now) override;
  void OnRate(Micros now) override;
  void OnTime(Micros now) override;
  [[nodiscard]] bool HasBlock(Micros now) override;
  std::uint32_t TakeBlock(Micros now) override;
  [[nodiscard]] bool takes_devices(Micros now) const override;
  [[nodiscard]] std::optional<Micros> deadline(Micros now) override;
  [[nodiscard]] bool done() const override { return step_ == Step::kDone; }

 private:
  enum class Step : std::uint8_t { kFirstPass, kRepair, kClosing, kDone };

  /// Begins the next step when one is over.
  void Go(Micros now);

  TransferDesk& desk_;
  BlockLog log_;
  FirstPass first_pass_;
  Repair repair_;
  Closing closing_;
  Step step_ = Step::kFirstPass;
  Micros began_{0};
  Micros joins_until_{0};  ///< once repairing
};

}  // namespace server

// A flash driver that notes what it is asked.
#pragma once

#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "ce/errors.h"
#include "device/device.h"
#include "driver/drivers.h"
#include "driver/flash_driver.h"
#include "support/hex.h"

namespace test {

/// What came to the driver, in order.
struct DriverRequests {
  struct Request {
    DWORD code;
    std::string input;      ///< hexadecimal; of a block, without the address at its end
    std::uint32_t address;  ///< of a block
    std::string data;       ///< where the address led, for a write
  };
  std::vector<Request> all;
  DWORD failing = 0;  ///< requests of this code fail

  [[nodiscard]] std::vector<DWORD> Codes() const {
    std::vector<DWORD> codes;
    for (const Request& request : all) codes.push_back(request.code);
    return codes;
  }
};

class RecordingDriver final : public sim::StreamDriver {
 public:
  RecordingDriver(sim::Device& device, std::shared_ptr<DriverRequests> requests)
      : inner_(device), requests_(std::move(requests)) {}

  DWORD Control(sim::DriverRequest& request) override {
    const auto* const bytes = static_cast<const std::uint8_t*>(request.input);
    const bool is_block = request.input_size == 40;
    DriverRequests::Request noted{request.code, {}, 0, {}};
    noted.input = ToHex(bytes, is_block ? 36 : request.input_size);
    if (is_block) std::memcpy(&noted.address, bytes + 36, sizeof noted.address);
    if (request.code == 0x22CFFC) {
      std::uint32_t count = 0;
      std::memcpy(&count, bytes + 24, sizeof count);
      noted.data.assign(reinterpret_cast<const char*>(std::uintptr_t{noted.address}), count);
    }
    requests_->all.push_back(std::move(noted));
    return request.code == requests_->failing ? DWORD{ERROR_GEN_FAILURE} : inner_.Control(request);
  }

 private:
  sim::FlashDriver inner_;
  std::shared_ptr<DriverRequests> requests_;
};

/// Puts one in the place of the device's flash driver.
inline std::shared_ptr<DriverRequests> RecordRequests(sim::Device& device) {
  auto requests = std::make_shared<DriverRequests>();
  device.drivers().SetLibrary(u"eflashdrv.dll", [requests](sim::Device& on) {
    return std::make_shared<RecordingDriver>(on, requests);
  });
  return requests;
}

}  // namespace test

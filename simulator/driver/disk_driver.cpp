#include "driver/disk_driver.h"

#include <array>
#include <cstddef>
#include <cstring>

#include "ce/errors.h"

namespace sim {
namespace {

constexpr DWORD kTellChip = 3000;
constexpr std::size_t kAnswerSize = 64;
constexpr std::size_t kCapacityAt = 16;
constexpr std::size_t kGenerationAt = 24;

}  // namespace

DWORD DiskDriver::Control(DriverRequest& request) {
  if (request.code != kTellChip) return ERROR_NOT_SUPPORTED;
  std::array<std::uint8_t, kAnswerSize> answer{};
  if (request.output_size < answer.size()) return ERROR_INSUFFICIENT_BUFFER;
  std::memcpy(answer.data() + kCapacityAt, &capacity_, sizeof capacity_);
  answer[kGenerationAt] = generation_;
  std::memcpy(request.output, answer.data(), answer.size());
  request.returned = answer.size();
  return ERROR_SUCCESS;
}

}  // namespace sim

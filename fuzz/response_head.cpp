// Input: the first block that a client receives. Checks what receiving a file relies on.
#include "http/response_head/response_head.h"

#include <cstdlib>
#include <string_view>

namespace {

constexpr std::uint32_t kBufferSize = 16384;

void Require(bool holds) {
  if (!holds) std::abort();
}

bool Inside(std::string_view part, std::string_view whole) {
  // An empty part may lie nowhere.
  return part.empty() ||
         (part.data() >= whole.data() && part.data() + part.size() <= whole.data() + whole.size());
}

void CheckAccepted(const http::ResponseHead& head, std::string_view block, bool crc_required) {
  Require(block.find("200 OK") != std::string_view::npos);
  Require(head.body_offset >= 2 && head.body_offset <= block.size());
  Require(block[head.body_offset - 1] == '\n');
  Require(head.crc32.has_value() || !crc_required);
  Require(head.checkpoint_size.value_or(0) <= kBufferSize);
}

void Check(std::string_view block, bool crc_required) {
  http::ResponseHead head;
  const http::HeadError error = http::ParseResponseHead(block, crc_required, kBufferSize, head);
  if (head.time_stamp) {
    Require(head.time_stamp->size() <= http::kMaxTimeStamp);
    Require(Inside(*head.time_stamp, block));
    Require(head.time_stamp->find('\r') == std::string_view::npos);
  }
  if (error == http::HeadError::kNone) CheckAccepted(head, block, crc_required);

  http::ResponseHead again;
  Require(http::ParseResponseHead(block, crc_required, kBufferSize, again) == error);
  Require(again.content_length == head.content_length && again.body_offset == head.body_offset);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view block(reinterpret_cast<const char*>(data), size);
  Check(block, true);
  Check(block, false);

  // Without a CRC rule nothing is refused that was accepted with it.
  http::ResponseHead head;
  if (http::ParseResponseHead(block, true, kBufferSize, head) == http::HeadError::kNone) {
    Require(http::ParseResponseHead(block, false, kBufferSize, head) == http::HeadError::kNone);
  }
  return 0;
}

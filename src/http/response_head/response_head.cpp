#include "http/response_head/response_head.h"

#include "base/text.h"

namespace http {
namespace {

constexpr std::uint32_t kLargest = 0xFFFFFFFFU;

/// The text right behind `name`, or nothing when the block lacks the header.
std::optional<std::string_view> Behind(std::string_view block, std::string_view name) noexcept {
  const std::size_t at = block.find(name);
  if (at == std::string_view::npos) return std::nullopt;
  return base::Part(block, at + name.size());
}

struct Number {
  std::uint32_t value = 0;  ///< the largest one when there are too many digits
  bool exact = false;       ///< there were digits and they fit
};

Number ReadNumber(std::string_view text) noexcept {
  std::size_t at = 0;
  while (at < text.size() && (text[at] == ' ' || (text[at] >= '\t' && text[at] <= '\r'))) ++at;
  Number number;
  for (; at < text.size() && text[at] >= '0' && text[at] <= '9'; ++at) {
    const auto digit = static_cast<std::uint32_t>(text[at] - '0');
    if (number.value > (kLargest - digit) / 10) return {kLargest, false};
    number = {number.value * 10 + digit, true};
  }
  return number;
}

std::optional<std::uint32_t> NumberBehind(std::string_view block, std::string_view name) noexcept {
  const auto text = Behind(block, name);
  if (!text) return std::nullopt;
  return ReadNumber(*text).value;
}

/// @return nothing when no empty line ends the head.
std::optional<std::size_t> BodyOffset(std::string_view block) noexcept {
  constexpr std::string_view kEnds[] = {"\r\n\r\n", "\n\n"};
  for (const std::string_view end : kEnds) {
    const std::size_t at = block.find(end);
    if (at != std::string_view::npos) return at + end.size();
  }
  return std::nullopt;
}

}  // namespace

HeadError ParseResponseHead(std::string_view block, bool crc_required, std::uint32_t buffer_size,
                            ResponseHead& head) noexcept {
  head = ResponseHead{};
  if (block.find("200 OK") == std::string_view::npos) return HeadError::kNotOk;
  const auto length_text = Behind(block, "Content-Length:");
  const Number length = ReadNumber(length_text.value_or(std::string_view{}));
  if (!length.exact) return HeadError::kNoLength;
  head.content_length = length.value;
  head.attributes = NumberBehind(block, "Content-Attributes:");
  if (const auto stamp = Behind(block, "Content-timestamp:")) {
    head.time_stamp = base::Part(base::Part(*stamp, 0, stamp->find('\r')), 0, kMaxTimeStamp);
  }
  head.crc32 = NumberBehind(block, "Content-CRC32:");
  if (crc_required && !head.crc32) return HeadError::kNoCrc;
  head.checkpoint_size = NumberBehind(block, "CheckPoint-BlockSize:");
  if (head.checkpoint_size.value_or(0) > buffer_size) return HeadError::kBlockTooLarge;
  const auto body_offset = BodyOffset(block);
  if (!body_offset) return HeadError::kNoEnd;
  head.body_offset = *body_offset;
  return HeadError::kNone;
}

}  // namespace http

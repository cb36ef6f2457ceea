// What a device asks for, read out of the head of one request.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace server {

enum class RequestKind : std::uint8_t {
  kFile,       ///< a file of the bundle
  kReport,     ///< the device says that its transfer is over; it reads no answer
  kBadMethod,  ///< well formed, but not GET
  kMalformed,  ///< not a request at all
};

/// Who asks, in the device's own words; empty where it did not say. Each text is cut at
/// kMaxIdentityText characters and holds printable ASCII only, so that it can be shown anywhere.
struct Identity {
  std::string type;
  std::string family;
  std::string model;
  std::string serial;
  std::string core_name;  ///< the device's unique id
};

struct Request {
  static constexpr std::size_t kMaxIdentityText = 64;
  static constexpr std::size_t kMaxErrorText = 1024;

  RequestKind kind = RequestKind::kMalformed;

  /// As asked for, without the attempt suffix and with every "\" turned into "/". Not checked:
  /// Site decides whether it names something. kFile only.
  std::string path;
  /// The numbers of the suffix ":attempt,total", good for display only; 0 when there is none.
  std::uint32_t attempt = 0;
  std::uint32_t total = 0;

  Identity identity;
  /// Bytes the device fetched by HTTP so far. Devices print it signed: "-1" is 4294967295.
  std::optional<std::uint32_t> bundle_rx;
  std::optional<bool> http_fallback;
  /// Why the job failed; empty for a success. kReport only, cut at kMaxErrorText.
  std::string error;
};

/// Reads the head of one request: the request line and the header lines, without the blank line
/// that ends them. Devices send a path without a leading slash, with blanks as they are, and a tail
/// that counts attempts: "GET apps/big file.bin:3,14 HTTP/1.1". Header names are taken without
/// regard to case, and of several lines of one name the first counts, so that text smuggled in by
/// an error message cannot replace what stands before it.
[[nodiscard]] Request ParseRequest(std::string_view head);

/// `text` with everything but printable ASCII turned into "?", cut at `limit` characters.
[[nodiscard]] std::string Printable(std::string_view text, std::size_t limit);

}  // namespace server

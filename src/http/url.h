// Takes the URL of a file apart.
#pragma once

#include <cstdint>
#include <optional>

#include "base/text.h"

namespace http {

/// Views into the URL.
struct UrlParts {
  base::WideView host;
  std::int32_t port = 0;
  base::WideView path;
};

/// Reads "http://HOST:PORT/PATH", with either kind of slash and "http" in any letter case.
///
/// The first slash behind the "http://" ends host and port and belongs to neither side; the last
/// colon before it parts them. The port is as many digits as there are.
/// @return nothing when the URL does not begin with "http://" or "http:\\".
[[nodiscard]] std::optional<UrlParts> ParseUrl(base::WideView url) noexcept;

/// `path` from its first letter A-Z or a-z on: what the server is asked for.
[[nodiscard]] base::WideView FromFirstLetter(base::WideView path) noexcept;

}  // namespace http

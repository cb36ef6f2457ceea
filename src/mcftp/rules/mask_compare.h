// For which devices a file is.
#pragma once

#include <string_view>

namespace mcftp {

/// Compares one mask of an announcement with a device's MCT, from the left: "?" stands for any
/// character and "*" for all the rest; letter case counts. A line end ends mask and MCT as their
/// own end does.
///
/// KEPT ODDITY: whoever ends first matches: a mask is a prefix of the MCT or the MCT a prefix of
/// the mask, so "MR41-A-X" takes "MR41-A" in, and an empty mask everybody. A mask that begins with
/// a carriage return matches anything.
[[nodiscard]] bool MaskMatches(std::string_view mask, std::string_view mct) noexcept;

/// Takes the next mask off the front of `list`, in which blanks and ";" separate them.
/// @return empty when there is none left.
[[nodiscard]] std::string_view NextMask(std::string_view& list) noexcept;

}  // namespace mcftp

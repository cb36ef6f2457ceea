// The device's calendar: what its world's clock means in dates and times of day.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "ce/types.h"

namespace sim {

class Device;
struct Profile;

/// Hundreds of nanoseconds since 1601-01-01 00:00, the unit of file times.
using FileTicks = std::uint64_t;
inline constexpr FileTicks kTicksPerMillisecond = 10'000;
inline constexpr FileTicks kTicksPerSecond = 1000 * kTicksPerMillisecond;
inline constexpr FileTicks kTicksPerDay = 86'400 * kTicksPerSecond;

/// The UTC time of the device: in a virtual world the profile's start time and what has passed
/// since, in the real world the host's clock.
[[nodiscard]] FileTicks SystemTicks(const Device& device);

/// The UTC time at which a virtual world begins for a device of this profile.
[[nodiscard]] FileTicks StartTicks(const Profile& profile);

/// UTC plus the profile's offset.
[[nodiscard]] FileTicks ToLocalTicks(const Device& device, FileTicks utc);
[[nodiscard]] FileTicks ToSystemTicks(const Device& device, FileTicks local);

[[nodiscard]] FILETIME ToFileTime(FileTicks ticks);
[[nodiscard]] FileTicks ToTicks(const FILETIME& time);

/// @return nothing for times from the year 30828 on, which no calendar call shows.
[[nodiscard]] std::optional<SYSTEMTIME> ToCalendar(FileTicks ticks);
/// @return nothing when the date or time of day does not exist. The day of the week is ignored.
[[nodiscard]] std::optional<FileTicks> FromCalendar(const SYSTEMTIME& time);

/// "2006-03-01 14:05:09". @return nothing for any other text or an impossible time.
[[nodiscard]] std::optional<FileTicks> ParseTime(std::string_view text);

}  // namespace sim

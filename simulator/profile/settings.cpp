#include "profile/settings.h"

#include <array>
#include <charconv>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>

#include "locale/clock.h"
#include "locale/platform_identity.h"

namespace sim {
namespace {

/// "127.0.0.1": four numbers up to 255, nothing else.
bool IsAddress(std::string_view text) {
  int parts = 0;
  for (;;) {
    const std::size_t dot = text.find('.');
    const std::string_view part = text.substr(0, dot);
    std::uint32_t value = 0;
    const auto [end, error] = std::from_chars(part.data(), part.data() + part.size(), value);
    if (error != std::errc() || end != part.data() + part.size()) return false;
    if (value > 255 || part.size() > 3) return false;
    ++parts;
    if (dot == std::string_view::npos) return parts == 4;
    text.remove_prefix(dot + 1);
  }
}

template <typename Record, typename Member>
Setting<Record> Number(std::string_view section, std::string_view key, Member Record::*member,
                       std::int64_t least, std::uint64_t most, std::string_view comment) {
  const auto read = [member, least, most](Record& record, std::string_view text) -> Complaint {
    using Wide = std::conditional_t<std::is_signed_v<Member>, std::int64_t, std::uint64_t>;
    Wide value = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, value);
    const bool is_number = error == std::errc() && stop == end && !text.empty();
    const bool is_low = value < static_cast<Wide>(least);
    const bool is_high = value >= 0 && static_cast<std::uint64_t>(value) > most;
    if (!is_number || is_low || is_high) {
      return "is no number from " + std::to_string(least) + " to " + std::to_string(most) +
             "; give one";
    }
    record.*member = static_cast<Member>(value);
    return {};
  };
  const auto write = [member](const Record& record) { return std::to_string(record.*member); };
  return {section, key, comment, read, write};
}

template <typename Record>
Setting<Record> Percent(std::string_view section, std::string_view key, double Record::*member,
                        std::string_view comment) {
  const auto read = [member](Record& record, std::string_view text) -> Complaint {
    double value = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, value, std::chars_format::fixed);
    if (error != std::errc() || stop != end || !(value >= 0 && value <= 100)) {
      return "is no number from 0 to 100; give one";
    }
    record.*member = value;
    return {};
  };
  const auto write = [member](const Record& record) {
    std::array<char, 32> text{};
    const auto written = std::to_chars(text.data(), text.data() + text.size(), record.*member);
    return std::string(text.data(), written.ptr);
  };
  return {section, key, comment, read, write};
}

Complaint TakeAnyText(std::string_view /*text*/) {
  return {};
}

template <typename Record>
Setting<Record> Text(std::string_view section, std::string_view key, std::string Record::*member,
                     std::string_view comment,
                     Complaint (*check)(std::string_view text) = TakeAnyText) {
  const auto read = [member, check](Record& record, std::string_view text) {
    Complaint complaint = check(text);
    if (complaint.empty()) record.*member = text;
    return complaint;
  };
  return {section, key, comment, read, [member](const Record& record) { return record.*member; }};
}

template <typename Record>
Setting<Record> Switch(std::string_view section, std::string_view key, bool Record::*member,
                       std::string_view comment) {
  const auto read = [member](Record& record, std::string_view text) -> Complaint {
    if (text != "yes" && text != "no") return R"(is neither "yes" nor "no"; write one of them)";
    record.*member = text == "yes";
    return {};
  };
  const auto write = [member](const Record& record) -> std::string {
    return record.*member ? "yes" : "no";
  };
  return {section, key, comment, read, write};
}

Complaint CheckAddress(std::string_view text) {
  if (IsAddress(text)) return {};
  return "is no IPv4 address; write four numbers up to 255 with points between them";
}

Complaint CheckNetworkId(std::string_view text) {
  if (ParseNetworkId(std::string(text))) return {};
  return "is no network address; write six bytes as twelve hexadecimal digits";
}

Complaint CheckTime(std::string_view text) {
  if (ParseTime(text)) return {};
  return R"(is no time; write it like "2006-03-01 14:05:09")";
}

Complaint CheckQueueLibrary(std::string_view text) {
  if (text.empty() || text == "kx_clapi_dll" || text == "kx_lapi_c_wrapper") return {};
  return "is no library of the message queue; write kx_clapi_dll or kx_lapi_c_wrapper";
}

Complaint CheckQueueEntry(std::string_view text) {
  if (text.empty() || text == "lapi_open" || text == "lapi_close" || text == "lapi_write") {
    return {};
  }
  return "is no entry point of the message queue; write lapi_open, lapi_close or lapi_write";
}

Complaint CheckFlashStart(std::string_view text) {
  if (text == "writes" || text == "fails" || text == "restarts") return {};
  return "is nothing that the flash does; write writes, fails or restarts";
}

template <typename T>
constexpr std::uint64_t kMost = static_cast<std::uint64_t>(std::numeric_limits<T>::max());
constexpr std::uint64_t kMostPages = 1U << 19;  // 2 GiB of 4,096-byte pages

std::vector<Setting<Profile>> MakeProfileSettings() {
  using P = Profile;
  return {
      Text("device", "name", &P::name, "How tools call the device."),

      Text("identity", "platform", &P::platform,
           "Platform type; empty: the platform does not say."),
      Text("identity", "configuration", &P::configuration,
           "Configuration text: type, family, model and more."),
      Text("identity", "serial", &P::serial,
           "Serial number, told by the platforms Corvanta Zq and Corvanta MR7."),
      Text("identity", "network_id", &P::network_id,
           "Network address, told by all others: six bytes in the platform's order.",
           CheckNetworkId),
      Number("identity", "os_major", &P::os_major, 0, kMost<std::uint32_t>, "System version."),
      Number("identity", "os_minor", &P::os_minor, 0, kMost<std::uint32_t>, ""),
      Number("identity", "os_build", &P::os_build, 0, kMost<std::uint32_t>, ""),

      Text("network", "host_name", &P::host_name, "Name of the device in its network."),
      Text("network", "address", &P::address, "Its IPv4 address.", CheckAddress),
      Percent("network", "datagram_loss_percent", &P::datagram_loss_percent,
              "Percent of others' datagrams that it does not hear; not in a virtual world."),
      Number("network", "datagram_loss_seed", &P::datagram_loss_seed, 0, kMost<std::uint64_t>,
             "Which of them: the same number loses the same ones of a row."),

      Number("screen", "width", &P::screen_width, 1, 4096, "Pixels."),
      Number("screen", "height", &P::screen_height, 1, 4096, ""),

      Number("memory", "page_size", &P::page_size, 512, 65536, "Bytes a page."),
      Number("memory", "store_pages", &P::store_pages, 0, kMostPages, "Pages of the object store."),
      Number("memory", "ram_pages", &P::ram_pages, 0, kMostPages, "Pages of program memory,"),
      Number("memory", "ram_used_pages", &P::ram_used_pages, 0, kMostPages,
             "and how many of them other programs use."),

      Number("power", "ac_line", &P::ac_line, 0, 255, "0: battery, 1: line, 255: unknown."),
      Number("power", "battery_flag", &P::battery_flag, 0, 255,
             "1: high, 2: low, 4: critical, 8: charging, 128: none, 255: unknown; or sums."),
      Number("power", "battery_percent", &P::battery_percent, 0, 255, "0 to 100; 255: unknown."),

      Text("messages", "library", &P::message_library,
           "Library of the message queue: kx_clapi_dll, kx_lapi_c_wrapper or empty for none.",
           CheckQueueLibrary),
      Text("messages", "lacks", &P::message_library_lacks,
           "Entry point that it lacks: lapi_open, lapi_close, lapi_write or empty for none.",
           CheckQueueEntry),
      Switch("messages", "opens", &P::message_queue_opens, "no: the queue refuses connections."),

      Text("flash", "start", &P::flash_start,
           "Starting it writes what its driver stores, fails, or writes and restarts the device.",
           CheckFlashStart),

      Number("disk", "generation", &P::disk_generation, 0, 255,
             "Flash chip of DSK0:. 7 and 9: G3, 13: G4, 15: H3, others: unknown; 0: no such disk."),
      Number("disk", "capacity", &P::disk_capacity, 0, kMost<std::uint32_t>, "Of it, in bytes."),

      Text("time", "start", &P::start_time, "Local time at which a virtual world begins.",
           CheckTime),
      Number("time", "utc_offset_minutes", &P::utc_offset_minutes, -1440, 1440,
             "Local time less UTC."),
  };
}

}  // namespace

const std::vector<Setting<Profile>>& ProfileSettings() {
  static const std::vector<Setting<Profile>> settings = MakeProfileSettings();
  return settings;
}

const std::vector<Setting<VolumeProfile>>& VolumeSettings() {
  static const std::vector<Setting<VolumeProfile>> settings = {
      Number("volume", "capacity", &VolumeProfile::capacity, 0, kMost<std::int64_t>, "Bytes."),
      Switch("volume", "present", &VolumeProfile::present, "no: the card is not in its slot."),
  };
  return settings;
}

const std::vector<Setting<ProgramProfile>>& ProgramSettings() {
  static const std::vector<Setting<ProgramProfile>> settings = {
      Text("program", "command", &ProgramProfile::command,
           "Host command, with the device's folder in ORVENIX_DEVICE; empty: built in."),
      Number("program", "exit_code", &ProgramProfile::exit_code, 0, kMost<std::uint32_t>,
             "Of the built-in, after so many milliseconds:"),
      Number("program", "run_ms", &ProgramProfile::run_ms, 0, kMost<std::uint32_t>, ""),
  };
  return settings;
}

}  // namespace sim

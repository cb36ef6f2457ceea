// What one simulated device is: the content of its profile file.
#pragma once

#include <cstdint>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace sim {

struct VolumeProfile {
  std::string path;            ///< "\\", "\\Flash File Store", "\\SDMMC Disk", ...
  std::uint64_t capacity = 0;  ///< bytes; the root's is the object store's, from the memory model
  bool present = true;
};

/// What CreateProcessW of a device program does.
struct ProgramProfile {
  std::string command;  ///< host command (the device's folder in ORVENIX_DEVICE); empty: built in
  std::uint32_t exit_code = 0;  ///< of the built-in
  std::uint32_t run_ms = 0;     ///< how long the built-in runs
};

struct ProcessProfile {
  std::string name;  ///< executable name as the snapshot shows it
};

struct Profile {
  std::string name = "handheld";

  // Identity.
  std::string platform = "Corvanta MR7";    ///< empty: the platform does not say
  std::string configuration = "TQ52-A1";    ///< configuration text
  std::string serial = "MR700123";          ///< text serial, on platforms that have one
  std::string network_id = "5E4D3C2B1A00";  ///< six bytes in the order the platform returns them
  std::uint32_t os_major = 5;
  std::uint32_t os_minor = 0;
  std::uint32_t os_build = 1400;

  // Network.
  std::string host_name = "handheld";
  std::string address = "127.0.0.1";
  double datagram_loss_percent = 0;  ///< of datagrams from others; real world only
  std::uint64_t datagram_loss_seed = 1;

  // Screen.
  int screen_width = 240;
  int screen_height = 320;

  // Memory, in pages.
  std::uint32_t page_size = 4096;
  std::uint32_t store_pages = 24576;    ///< 96 MiB object store
  std::uint32_t ram_pages = 8192;       ///< 32 MiB program memory
  std::uint32_t ram_used_pages = 2048;  ///< of program memory, before this program's own blocks

  std::vector<VolumeProfile> volumes;  ///< besides the root

  // Power.
  std::uint8_t ac_line = 1;
  std::uint8_t battery_flag = 1;
  std::uint8_t battery_percent = 90;

  std::vector<ProcessProfile> processes;
  std::map<std::string, ProgramProfile> programs;  ///< by lower-case executable name

  // Message queue.
  std::string message_library = "kx_clapi_dll";  ///< of its library; empty: the device has none
  std::string message_library_lacks;             ///< an entry point that is not there; empty: none
  bool message_queue_opens = true;               ///< false: no connection comes about

  // Firmware.
  std::string flash_start = "writes";  ///< what starting the flash does: writes, fails or restarts
  std::uint8_t disk_generation =
      0;  ///< code of the flash chip of "DSK0:"; 0: there is no such disk
  std::uint32_t disk_capacity = 64U << 20U;  ///< of that chip, in bytes

  // Time.
  std::string start_time = "2006-03-01 14:05:09";  ///< local time at which a virtual world begins
  std::int32_t utc_offset_minutes = 0;
};

/// Reads a profile file. @return false with one line in `error` that says where and what.
bool LoadProfile(const std::filesystem::path& file, Profile& profile, std::string& error);
/// Writes it, with a comment a line for whoever edits it.
bool SaveProfile(const std::filesystem::path& file, const Profile& profile, std::string& error);

}  // namespace sim

#include "tools/fleet/device_program.h"

#include "device/file_crc.h"
#include "mcftp/start.h"

namespace fleet {

std::int32_t RunClient(std::string command_line) {
  return mcftp::StartMulticastClient(command_line.data());
}

bool FileCrc(const std::string& device_path, std::uint32_t& crc) {
  return device::FILECRC32(device_path.c_str(), &crc) == 0;
}

}  // namespace fleet

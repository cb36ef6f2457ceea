#include "product_support/log_lines.h"

#include "support/device_files.h"

namespace test {

std::string ReadLog() {
  return GetFile("\\FileXfer.log").value_or("");
}

std::vector<std::string> LogLines() {
  std::vector<std::string> lines;
  const std::string log = ReadLog();
  for (std::size_t from = 0; from < log.size();) {
    const std::size_t end = log.find("\r\n", from);
    lines.push_back(log.substr(from, end - from));
    from = end == std::string::npos ? log.size() : end + 2;
  }
  return lines;
}

std::vector<std::string> LogLinesWith(std::string_view part) {
  std::vector<std::string> found;
  for (std::string& line : LogLines()) {
    if (line.find(part) != std::string::npos) found.push_back(std::move(line));
  }
  return found;
}

}  // namespace test

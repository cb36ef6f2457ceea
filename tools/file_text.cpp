#include "tools/file_text.h"

#include <fstream>
#include <iterator>
#include <system_error>

#include "tools/failure.h"

namespace tools {

std::string ReadWholeFile(const std::filesystem::path& file, std::size_t limit) {
  std::error_code error;
  const auto status = std::filesystem::status(file, error);
  if (!std::filesystem::exists(status)) {
    throw Failure(ExitCode::kBadInput, file.string(), "there is no such file");
  }
  if (!std::filesystem::is_regular_file(status)) {
    throw Failure(ExitCode::kBadInput, file.string(), "is not a file");
  }
  if (std::filesystem::file_size(file, error) > limit || error) {
    throw Failure(ExitCode::kBadInput, file.string(),
                  "is larger than " + std::to_string(limit) + " bytes");
  }
  std::ifstream in(file, std::ios::binary);
  std::string content{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
  if (!in) throw Failure(ExitCode::kBadInput, file.string(), "cannot be read");
  return content;
}

void WriteWholeFile(const std::filesystem::path& file, std::string_view content) {
  const std::filesystem::path beside = file.string() + ".new";
  std::ofstream out(beside, std::ios::binary | std::ios::trunc);
  out.write(content.data(), static_cast<std::streamsize>(content.size()));
  out.close();
  std::error_code error;
  if (out) std::filesystem::rename(beside, file, error);
  if (!out || error) {
    throw Failure(ExitCode::kCannotWrite, file.string(), "cannot be written",
                  "is the folder there, writable and not full?");
  }
}

}  // namespace tools

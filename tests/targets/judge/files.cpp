#include "targets/judge/files.h"

#include <fstream>
#include <iterator>
#include <stdexcept>

namespace targets {
namespace {

void Write(const std::filesystem::path& file, std::string_view content, std::ios::openmode mode) {
  std::filesystem::create_directories(file.parent_path());
  std::ofstream out(file, std::ios::binary | mode);
  out.write(content.data(), static_cast<std::streamsize>(content.size()));
  if (!out.flush()) throw std::runtime_error(file.string() + " cannot be written");
}

}  // namespace

std::string ReadFile(const std::filesystem::path& file) {
  std::ifstream in(file, std::ios::binary);
  if (!in) throw std::runtime_error(file.string() + " cannot be read");
  return {std::istreambuf_iterator<char>(in), {}};
}

void WriteFile(const std::filesystem::path& file, std::string_view content) {
  Write(file, content, std::ios::trunc);
}

void AppendFile(const std::filesystem::path& file, std::string_view content) {
  Write(file, content, std::ios::app);
}

}  // namespace targets

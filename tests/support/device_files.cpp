#include "support/device_files.h"

#include <stdexcept>
#include <vector>

#include "ce/errors.h"
#include "ce/files.h"
#include "ce/kernel.h"

namespace test {
namespace {

std::u16string Wide(std::string_view text) {
  return {text.begin(), text.end()};
}

void MakeFolders(std::string_view path) {
  for (std::size_t at = path.find('\\', 1); at != std::string_view::npos;
       at = path.find('\\', at + 1)) {
    CreateDirectoryW(Wide(path.substr(0, at)).c_str(), nullptr);
  }
}

}  // namespace

void PutFile(std::string_view path, std::string_view content) {
  MakeFolders(path);
  HANDLE const file = CreateFileW(Wide(path).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                  FILE_ATTRIBUTE_NORMAL, nullptr);
  DWORD written = 0;
  const bool whole =
      file != INVALID_HANDLE_VALUE &&
      WriteFile(file, content.data(), static_cast<DWORD>(content.size()), &written, nullptr) != 0 &&
      written == content.size();
  if (file != INVALID_HANDLE_VALUE) CloseHandle(file);
  if (!whole) throw std::runtime_error("cannot write " + std::string(path));
}

std::optional<std::string> GetFile(std::string_view path) {
  HANDLE const file =
      CreateFileW(Wide(path).c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                  OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) return std::nullopt;
  std::string content(GetFileSize(file, nullptr), '\0');
  DWORD read = 0;
  ReadFile(file, content.data(), static_cast<DWORD>(content.size()), &read, nullptr);
  CloseHandle(file);
  content.resize(read);
  return content;
}

bool Exists(std::string_view path) {
  return AttributesOf(path) != INVALID_FILE_ATTRIBUTES;
}

std::uint32_t AttributesOf(std::string_view path) {
  return GetFileAttributesW(Wide(path).c_str());
}

void SetAttributesOf(std::string_view path, std::uint32_t attributes) {
  if (SetFileAttributesW(Wide(path).c_str(), attributes) == 0) {
    throw std::runtime_error("cannot set attributes of " + std::string(path));
  }
}

}  // namespace test

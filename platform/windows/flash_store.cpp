#define ORVENIX_DESKTOP_NAMES
#include "flash_store.h"

#include <algorithm>
#include <cstring>
#include <string_view>

namespace platform {
namespace {

enum Code : DWORD {
  kTellSize = 0x22CFEE,
  kDelete = 0x22CFF0,
  kRead = 0x22CFF2,
  kSeek = 0x22CFF4,
  kMakeStore = 0x22CFF9,
  kCreate = 0x22CFFA,
  kClose = 0x22CFFB,
  kWrite = 0x22CFFC,
  kStart = 0x22CFFD,
};

// The block of parameters
constexpr std::size_t kNameRoom = 20;
constexpr std::size_t kSizeAt = 20;
constexpr std::size_t kCountAt = 24;
constexpr std::size_t kPositionAt = 32;
constexpr std::size_t kAddressAt = 36;

template <typename Bytes>
std::uint32_t Field(const Bytes& block, std::size_t at) {
  std::uint32_t value = 0;
  std::memcpy(&value, block.data() + at, sizeof value);
  return value;
}

/// @return empty for a name that is empty or does not end.
template <typename Bytes>
std::string NameIn(const Bytes& block) {
  const auto* const text = reinterpret_cast<const char*>(block.data());
  const std::size_t length = std::string_view(text, kNameRoom).find('\0');
  return length == std::string_view::npos ? std::string() : std::string(text, length);
}

/// The caller's bytes. @return null when they are not all in memory.
template <typename Bytes>
std::uint8_t* DataOf(const Bytes& block) {
  const ULONG_PTR first = Field(block, kAddressAt);
  const ULONG_PTR end = first + Field(block, kCountAt);
  MEMORY_BASIC_INFORMATION region = {};
  for (ULONG_PTR at = first; at < end;) {
    const bool known = VirtualQuery(reinterpret_cast<void*>(at), &region, sizeof region) != 0;
    if (!known || region.State != MEM_COMMIT || region.Protect != PAGE_READWRITE) return nullptr;
    at = reinterpret_cast<ULONG_PTR>(region.BaseAddress) + region.RegionSize;
  }
  return reinterpret_cast<std::uint8_t*>(first);
}

/// A file's path: whatever is not plain as "%" and two digits.
std::string PathOf(std::string_view name) {
  constexpr char kDigits[] = "0123456789ABCDEF";
  std::string path = "\\Flash\\";
  const std::size_t begin = path.size();
  for (const char c : name) {
    const auto byte = static_cast<unsigned char>(c);
    const bool letter = (byte | 0x20U) >= 'a' && (byte | 0x20U) <= 'z';
    const bool plain = letter || (c >= '0' && c <= '9') || c == '-' || c == '_';
    if (plain || (c == '.' && path.size() > begin)) {
      path += c;
    } else {
      path += {'%', kDigits[byte >> 4U], kDigits[byte & 0xFU]};
    }
  }
  return path;
}

}  // namespace

DWORD FlashStore::Control(DWORD code, void* input, DWORD input_size) {
  const Guard guard(lock_);
  if (code == kMakeStore) return MakeStore(input, input_size);
  if (code == kStart) return capacity_ == 0 ? ERROR_NOT_READY : WriteFlash();
  Block block;
  if (input == nullptr || input_size != block.size()) return ERROR_INVALID_PARAMETER;
  if (capacity_ == 0) return ERROR_NOT_READY;
  std::memcpy(block.data(), input, block.size());
  switch (code) {
    case kCreate: return Create(block);
    case kDelete: return Delete(block);
    case kClose: return CloseCurrent();
    case kSeek: return Seek(block);
    case kRead: return Read(block);
    case kWrite: return Write(block);
    case kTellSize: break;
    default: return ERROR_NOT_SUPPORTED;
  }
  const DWORD error = TellSize(block);
  std::memcpy(input, block.data(), block.size());
  return error;
}

DWORD FlashStore::MakeStore(const void* input, DWORD input_size) {
  std::uint32_t size = 0;
  if (input == nullptr || input_size != sizeof size) return ERROR_INVALID_PARAMETER;
  std::memcpy(&size, input, sizeof size);
  if (size == 0) return ERROR_INVALID_PARAMETER;
  files_.clear();
  current_.clear();
  capacity_ = size;
  used_ = 0;
  return ERROR_SUCCESS;
}

DWORD FlashStore::Create(const Block& block) {
  std::string name = NameIn(block);
  if (name.empty()) return ERROR_INVALID_NAME;
  const std::uint32_t size = Field(block, kSizeAt);
  const auto found = files_.find(name);
  const bool exists = found != files_.end();
  if (!exists || size != 0) {
    const std::uint64_t others = used_ - (exists ? found->second.content.size() : 0);
    if (size > capacity_ - others) return ERROR_DISK_FULL;
    File fresh;
    fresh.content.resize(size);
    files_[name] = std::move(fresh);
    used_ = others + size;
  }
  current_ = std::move(name);
  position_ = 0;
  return ERROR_SUCCESS;
}

DWORD FlashStore::Delete(const Block& block) {
  const std::string name = NameIn(block);
  const auto found = files_.find(name);
  if (found == files_.end()) return ERROR_FILE_NOT_FOUND;
  used_ -= found->second.content.size();
  files_.erase(found);
  if (current_ == name) current_.clear();
  return ERROR_SUCCESS;
}

const FlashStore::File* FlashStore::Current() const {
  const auto found = files_.find(current_);
  return found == files_.end() ? nullptr : &found->second;
}

FlashStore::File* FlashStore::Current() {
  const auto found = files_.find(current_);
  return found == files_.end() ? nullptr : &found->second;
}

DWORD FlashStore::Write(const Block& block) {
  File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  const std::uint32_t count = Field(block, kCountAt);
  if (position_ > file->content.size() || count > file->content.size() - position_) {
    return ERROR_DISK_FULL;
  }
  if (count == 0) return ERROR_SUCCESS;
  const std::uint8_t* const data = DataOf(block);
  if (data == nullptr) return ERROR_NOACCESS;
  std::copy_n(data, count, file->content.begin() + position_);
  position_ += count;
  file->written = std::max(file->written, position_);
  return ERROR_SUCCESS;
}

DWORD FlashStore::Read(const Block& block) const {
  const File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  const std::uint32_t position = Field(block, kPositionAt);
  const std::uint32_t count = Field(block, kCountAt);
  if (position > file->written || count > file->written - position) return ERROR_HANDLE_EOF;
  if (count == 0) return ERROR_SUCCESS;
  std::uint8_t* const data = DataOf(block);
  if (data == nullptr) return ERROR_NOACCESS;
  std::copy_n(file->content.begin() + position, count, data);
  return ERROR_SUCCESS;
}

DWORD FlashStore::Seek(const Block& block) {
  const File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  const std::uint32_t position = Field(block, kPositionAt);
  if (position > file->content.size()) return ERROR_NEGATIVE_SEEK;
  position_ = position;
  return ERROR_SUCCESS;
}

DWORD FlashStore::TellSize(Block& block) const {
  const File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  std::memcpy(block.data() + kSizeAt, &file->written, sizeof file->written);
  return ERROR_SUCCESS;
}

DWORD FlashStore::CloseCurrent() {
  if (current_.empty()) return ERROR_INVALID_HANDLE;
  current_.clear();
  return ERROR_SUCCESS;
}

DWORD FlashStore::WriteFlash() const {
  CreateDirectoryW(TEXT("\\Flash"), nullptr);
  for (const auto& [name, file] : files_) {
    const HANDLE image = CreateFileA(PathOf(name).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                                     FILE_ATTRIBUTE_NORMAL, nullptr);
    if (image == INVALID_HANDLE_VALUE) return ERROR_WRITE_FAULT;
    DWORD written = 0;
    const BOOL good = WriteFile(image, file.content.data(), file.written, &written, nullptr);
    CloseHandle(image);
    if (good == FALSE || written != file.written) return ERROR_WRITE_FAULT;
  }
  return ERROR_SUCCESS;
}

}  // namespace platform

#include "driver/flash_driver.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string_view>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "memory/memory.h"
#include "trace/trace.h"

namespace sim {
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

/// @return empty for a block whose name is empty or does not end.
template <typename Bytes>
std::string NameIn(const Bytes& block) {
  const auto* const text = reinterpret_cast<const char*>(block.data());
  const std::size_t length = std::string_view(text, kNameRoom).find('\0');
  return length == std::string_view::npos ? std::string() : std::string(text, length);
}

/// A name of a file of the host: every other character as "%" and two digits.
std::string HostName(std::string_view name) {
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  constexpr std::string_view kPlain =
      "-_0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ";
  std::string host;
  for (const char c : name) {
    const auto byte = static_cast<unsigned char>(c);
    const bool plain = kPlain.find(c) != std::string_view::npos || (c == '.' && !host.empty());
    if (plain) {
      host += c;
    } else {
      host += {'%', kDigits[byte >> 4U], kDigits[byte & 0xFU]};
    }
  }
  return host;
}

std::uint32_t Crc32(const std::uint8_t* bytes, std::size_t size) {
  constexpr std::uint32_t kPolynomial = 0xEDB88320U;
  std::array<std::uint32_t, 256> table{};
  for (std::uint32_t i = 0; i < table.size(); ++i) {
    std::uint32_t value = i;
    for (int bit = 0; bit < 8; ++bit) {
      value = (value & 1U) != 0 ? (value >> 1U) ^ kPolynomial : value >> 1U;
    }
    table[i] = value;
  }
  std::uint32_t crc = 0xFFFFFFFFU;
  for (std::size_t i = 0; i < size; ++i) crc = table[(crc ^ bytes[i]) & 0xFFU] ^ (crc >> 8U);
  return ~crc;
}

}  // namespace

FlashDriver::~FlashDriver() {
  device_.memory().ram().Release(capacity_);
}

std::filesystem::path FlashDriver::ImageFile(const Device& device, std::string_view name) {
  return device.folder() / "flash" / HostName(name);
}

std::map<std::string, FlashDriver::File> FlashDriver::Files() const {
  const Hold hold(mutex_);
  return files_;
}

DWORD FlashDriver::Control(DriverRequest& request) {
  if (request.code == kMakeStore) return MakeStore(request);
  if (request.code == kStart) return Start();
  Block block;
  if (request.input_size != block.size()) return ERROR_INVALID_PARAMETER;
  std::memcpy(block.data(), request.input, block.size());
  const DWORD error = Dispatch(request.code, block);
  std::memcpy(request.input, block.data(), block.size());
  return error;
}

DWORD FlashDriver::Dispatch(DWORD code, Block& block) {
  const Hold hold(mutex_);
  if (capacity_ == 0) return ERROR_NOT_READY;
  switch (code) {
    case kCreate: return Create(block);
    case kDelete: return Delete(block);
    case kClose: return CloseCurrent();
    case kTellSize: return TellSize(block);
    case kSeek: return Seek(block);
    case kRead: return Read(block);
    case kWrite: return Write(block);
    default: return ERROR_NOT_SUPPORTED;
  }
}

DWORD FlashDriver::MakeStore(const DriverRequest& request) {
  std::uint32_t size = 0;
  if (request.input_size != sizeof size) return ERROR_INVALID_PARAMETER;
  std::memcpy(&size, request.input, sizeof size);
  if (size == 0) return ERROR_INVALID_PARAMETER;
  const Hold hold(mutex_);
  if (!device_.memory().ram().Exchange(capacity_, size)) return ERROR_OUTOFMEMORY;
  files_.clear();
  current_.clear();
  capacity_ = size;
  used_ = 0;
  return ERROR_SUCCESS;
}

DWORD FlashDriver::Create(const Block& block) {
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

FlashDriver::File* FlashDriver::Current() {
  const auto found = files_.find(current_);
  return found == files_.end() ? nullptr : &found->second;
}

std::uint8_t* FlashDriver::Data(const Block& block) const {
  const std::uint32_t address = Field(block, kAddressAt);
  // Where pointers are longer than the device's, only pages made for it have an address that fits.
  constexpr bool kPointersFit = sizeof(void*) == sizeof address;
  const bool reachable =
      kPointersFit ? address != 0 : device_.memory().InPages(address, Field(block, kCountAt));
  if (!reachable) return nullptr;
  return reinterpret_cast<std::uint8_t*>(static_cast<std::uintptr_t>(address));
}

DWORD FlashDriver::Write(const Block& block) {
  File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  const std::uint32_t count = Field(block, kCountAt);
  if (position_ > file->content.size() || count > file->content.size() - position_) {
    return ERROR_DISK_FULL;
  }
  if (count == 0) return ERROR_SUCCESS;
  const std::uint8_t* const data = Data(block);
  if (data == nullptr) return ERROR_NOACCESS;
  std::copy_n(data, count, file->content.data() + position_);
  position_ += count;
  file->written = std::max(file->written, position_);
  return ERROR_SUCCESS;
}

DWORD FlashDriver::Read(const Block& block) {
  const File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  const std::uint32_t position = Field(block, kPositionAt);
  const std::uint32_t count = Field(block, kCountAt);
  if (position > file->written || count > file->written - position) return ERROR_HANDLE_EOF;
  if (count == 0) return ERROR_SUCCESS;
  std::uint8_t* const data = Data(block);
  if (data == nullptr) return ERROR_NOACCESS;
  std::copy_n(file->content.data() + position, count, data);
  return ERROR_SUCCESS;
}

DWORD FlashDriver::Seek(const Block& block) {
  const File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  const std::uint32_t position = Field(block, kPositionAt);
  if (position > file->content.size()) return ERROR_NEGATIVE_SEEK;
  position_ = position;
  return ERROR_SUCCESS;
}

DWORD FlashDriver::TellSize(Block& block) {
  const File* const file = Current();
  if (file == nullptr) return ERROR_INVALID_HANDLE;
  std::memcpy(block.data() + kSizeAt, &file->written, sizeof file->written);
  return ERROR_SUCCESS;
}

DWORD FlashDriver::Delete(const Block& block) {
  const std::string name = NameIn(block);
  const auto found = files_.find(name);
  if (found == files_.end()) return ERROR_FILE_NOT_FOUND;
  used_ -= found->second.content.size();
  files_.erase(found);
  if (current_ == name) current_.clear();
  return ERROR_SUCCESS;
}

DWORD FlashDriver::CloseCurrent() {
  if (current_.empty()) return ERROR_INVALID_HANDLE;
  current_.clear();
  return ERROR_SUCCESS;
}

DWORD FlashDriver::Start() {
  const std::string& outcome = device_.profile().flash_start;
  if (outcome == "fails") return ERROR_WRITE_FAULT;
  {
    const Hold hold(mutex_);
    if (capacity_ == 0) return ERROR_NOT_READY;
    if (!WriteFlash()) return ERROR_WRITE_FAULT;
  }
  if (outcome == "restarts") device_.drivers().Restart();
  return ERROR_SUCCESS;
}

bool FlashDriver::WriteFlash() const {
  const std::filesystem::path folder = device_.folder() / "flash";
  std::error_code error;
  std::filesystem::create_directories(folder, error);
  std::ofstream record(device_.folder() / "flash.record", std::ios::app);
  for (const auto& [name, file] : files_) {
    std::ofstream image(ImageFile(device_, name), std::ios::binary | std::ios::trunc);
    image.write(reinterpret_cast<const char*>(file.content.data()),
                static_cast<std::streamsize>(file.written));
    image.close();
    std::string line = R"({"us":)" + std::to_string(device_.world().now().count()) + R"(,"name":)";
    AppendJsonText(line, std::string_view(name));
    line += R"(,"size":)" + std::to_string(file.written) + R"(,"crc32":)" +
            std::to_string(Crc32(file.content.data(), file.written)) + "}\n";
    record << line;
    if (!image) return false;
  }
  record.close();
  return static_cast<bool>(record);
}

}  // namespace sim

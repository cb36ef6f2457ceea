#include "device/flash/ram_file.h"

#include <coredll.h>

#include "base/crc32.h"
#include "device/flash/flash_driver.h"

namespace device {
namespace {

constexpr std::uint32_t kBlockSize = 4096;
constexpr char kMirrorFolder[] = "\\SD Card\\RAMFileLog";

struct Store {
  bool made = false;
  std::uint32_t size = 0;  ///< bytes
};
Store store;

// KEPT ODDITY: the value only has to be there. A 0 turns the copies on like any other number.
bool MirrorIsWanted() noexcept {
  RegistryKey key;
  if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("SOFTWARE\\Corvanta\\DevMgmt"), 0, KEY_READ,
                    key.Receive()) != ERROR_SUCCESS) {
    return false;
  }
  DWORD value = 0;
  DWORD size = sizeof value;
  return RegQueryValueExW(key.get(), TEXT("LogRAMFiles"), nullptr, nullptr,
                          reinterpret_cast<BYTE*>(&value), &size) == ERROR_SUCCESS;
}

}  // namespace

void SetRAMSize(std::uint32_t bytes) noexcept {
  store.size = bytes;
}

bool InitRAMStore() noexcept {
  if (store.made) return false;
  store.made = EFL_Helper_Init(store.size);
  if (!store.made) UnloadFlashDriver();
  return store.made;
}

bool HasRAMStore() noexcept {
  return store.made;
}

bool FreeRAMStore() noexcept {
  if (!store.made) return true;
  store.made = false;
  return EFL_Helper_Free();
}

RAMFile::~RAMFile() {
  Close();
}

bool RAMFile::Open(const char* name, std::uint32_t size) noexcept {
  Close();
  // A cut name would be another file's.
  if (!name_.Assign(base::View(name)) || !EFL_Helper_CreateFile(name_.c_str(), size)) {
    name_.Clear();
    return false;
  }
  read_position_ = 0;
  return true;
}

/// Only files that are written have a copy: opening one to read it would make its copy empty.
bool RAMFile::OpenMirrored(const char* name, std::uint32_t size) noexcept {
  if (!Open(name, size)) return false;
  if (MirrorIsWanted()) StartMirror();
  return true;
}

void RAMFile::StartMirror() noexcept {
  mirror_.Reset(new File);
  if (!mirror_) return;
  mirror_->CreateDirectory(kMirrorFolder);
  base::FixedText<kNameSize + sizeof kMirrorFolder> path(kMirrorFolder);
  path.Append("\\");
  path.Append(name_.view());
  mirror_on_ = mirror_->OpenForWriting(path.c_str(), false, 0);
}

/// A full card must not hold up every block that follows.
void RAMFile::WriteMirror(const void* data, std::uint32_t length) noexcept {
  if (mirror_on_) mirror_on_ = mirror_->Write(data, length);
}

bool RAMFile::OpenFile(const char* name, bool for_writing) noexcept {
  return for_writing ? OpenMirrored(name, 0) : Open(name, 0);
}

bool RAMFile::OpenForWriting(const char* name, bool keep, std::uint32_t size) noexcept {
  return OpenMirrored(name, keep ? 0 : size);
}

bool RAMFile::CreateForWriting(const char* name, bool /*share*/, std::uint32_t* error) noexcept {
  const bool opened = OpenMirrored(name, 0);
  if (error != nullptr) *error = opened ? 0 : ERROR_GEN_FAILURE;
  return opened;
}

bool RAMFile::OpenForReading(const char* name, bool /*share*/) noexcept {
  return Open(name, 0);
}

bool RAMFile::Close() noexcept {
  mirror_on_ = false;
  mirror_.Reset();
  if (name_.empty()) return false;
  name_.Clear();
  return EFL_Helper_CloseFile();
}

bool RAMFile::Read(void* buffer, std::uint32_t length, std::uint32_t* read) noexcept {
  if (read != nullptr) *read = 0;
  if (buffer == nullptr || length == 0 || read == nullptr) return false;
  if (name_.empty() || !EFL_Helper_ReadDataEx(buffer, length, read_position_)) return false;
  read_position_ += length;
  *read = length;
  return true;
}

bool RAMFile::Write(const void* data, std::uint32_t length) noexcept {
  if (name_.empty() || !EFL_Helper_WriteData(data, length)) return false;
  WriteMirror(data, length);
  return true;
}

bool RAMFile::Seek(std::uint32_t offset) noexcept {
  return !name_.empty() && EFL_Helper_Seek(offset);
}

bool RAMFile::Flush() noexcept {
  return !name_.empty();
}

bool RAMFile::GetSize(std::uint32_t* size) noexcept {
  *size = 0xFFFFFFFFU;
  return !name_.empty() && EFL_Helper_FileGetSize(size);
}

bool RAMFile::GetTime(TimeKind /*kind*/, FILETIME* /*time*/) noexcept {
  return false;
}

bool RAMFile::GetTime(TimeKind /*kind*/, SYSTEMTIME* /*time*/) noexcept {
  return false;
}

bool RAMFile::SetTime(TimeKind /*kind*/, const FILETIME& /*time*/) noexcept {
  return false;
}

bool RAMFile::SetTime(TimeKind /*kind*/, const SYSTEMTIME& /*time*/) noexcept {
  return false;
}

bool RAMFile::DeleteFile(const char* name, std::uint32_t* error) noexcept {
  const base::FixedText<kNameSize> deleting(name != nullptr ? base::View(name) : name_.view());
  const bool deleted = !deleting.empty() && EFL_Helper_DeleteFile(deleting.c_str());
  if (error != nullptr) *error = deleted ? 0 : ERROR_GEN_FAILURE;
  return deleted;
}

std::uint32_t RAMFile::GetAttributes(const char* /*name*/) noexcept {
  return INVALID_FILE_ATTRIBUTES;
}

bool RAMFile::SetAttributes(const char* /*name*/, std::uint32_t /*mask*/) noexcept {
  return false;
}

std::uint32_t RAMFILECRC32(const char* name, std::uint32_t* crc, std::uint32_t length,
                           const char* /*full_path*/) noexcept {
  *crc = 0;
  const LocalObject<RAMFile> file(new RAMFile);
  const LocalBlock<std::uint8_t> block = LocalBlock<std::uint8_t>::Allocate(kBlockSize);
  if (!file || !block) return ERROR_NOT_ENOUGH_MEMORY;
  if (!file->OpenForReading(name, true)) return ERROR_FILE_NOT_FOUND;
  base::Crc32 sum;
  for (std::uint32_t left = length; left > 0;) {
    const std::uint32_t wanted = left < kBlockSize ? left : kBlockSize;
    std::uint32_t taken = 0;
    if (!file->Read(block.get(), wanted, &taken)) return ERROR_GEN_FAILURE;
    sum.Update(block.get(), taken);
    left -= taken;
  }
  *crc = sum.value();
  return 0;
}

}  // namespace device

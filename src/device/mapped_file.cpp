#include "device/mapped_file.h"

#include "device/wide_text.h"

namespace device {

MappedFile::MappedFile(const char* path) noexcept {
  WideText<MAX_PATH> name;
  if (!name.Assign(path)) return;
  file_.Reset(CreateFileForMappingW(name.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr,
                                    OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!file_) return;
  const DWORD size = GetFileSize(file_.get(), nullptr);
  if (size == 0 || size == INVALID_FILE_SIZE) return;
  mapping_.Reset(CreateFileMappingW(file_.get(), nullptr, PAGE_READONLY, 0, 0, nullptr));
  if (!mapping_) return;
  const void* const view = MapViewOfFile(mapping_.get(), FILE_MAP_READ, 0, 0, 0);
  if (view != nullptr) bytes_ = {static_cast<const char*>(view), size};
}

MappedFile::~MappedFile() {
  if (!bytes_.empty()) UnmapViewOfFile(bytes_.data());
}

}  // namespace device

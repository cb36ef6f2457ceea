#include "storage/mapping.h"

#include <cstring>
#include <new>
#include <utility>

#include "ce/errors.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "storage/open_file.h"
#include "storage/storage.h"

namespace sim {

Mapping::Mapping(Device& device, Source source) : device_(&device), source_(std::move(source)) {
  device.storage().mappings().Add(*this);
}

Mapping::~Mapping() {
  if (device_ == nullptr) return;
  device_->storage().mappings().Remove(*this);
  if (file_handle_ != nullptr) device_->handles().Remove(file_handle_);
}

DWORD Mapping::Load() {
  content_.reset(new (std::nothrow) char[source_.size]);
  if (content_ == nullptr) return ERROR_NOT_ENOUGH_MEMORY;
  if (source_.file != nullptr) return source_.file->Load(content_.get(), source_.size);
  std::memset(content_.get(), 0, source_.size);
  return ERROR_SUCCESS;
}

void Mapping::Store() {
  if (source_.file == nullptr || !source_.writable) return;
  // Nobody is told when this fails, as on the device.
  static_cast<void>(source_.file->Store(content_.get(), source_.size));
}

void Mapping::Detach() {
  device_ = nullptr;
  source_.file = nullptr;
}

Mappings::View Mappings::RemoveView(const void* address) {
  const auto found = views_.find(address);
  if (found == views_.end()) return {};
  View view = std::move(found->second);
  views_.erase(found);
  return view;
}

void Mappings::DetachAll() {
  for (const auto& [address, view] : views_) {
    if (view.writable) view.mapping->Store();
  }
  for (Mapping* mapping : mappings_) mapping->Detach();
  mappings_.clear();
  views_.clear();
}

namespace {

/// Checks what the caller wants of the mapping against its file. @return an error number.
DWORD PrepareFile(Mapping::Source& source, std::uint64_t size) {
  OpenFile& file = *source.file;
  if (!file.mode().mappable) return ERROR_INVALID_HANDLE;
  if (!file.can_read() || (source.writable && !file.can_write())) return ERROR_ACCESS_DENIED;
  const std::uint64_t have = file.size();
  if (size == 0) size = have;
  if (size == 0) return ERROR_FILE_INVALID;
  if (size > have) {
    if (!source.writable) return ERROR_NOT_ENOUGH_MEMORY;
    const DWORD error = file.Lengthen(size);
    if (error != ERROR_SUCCESS) return error;
  }
  source.size = static_cast<std::size_t>(size);
  return ERROR_SUCCESS;
}

}  // namespace
}  // namespace sim

HANDLE CreateFileMappingW(HANDLE file, SECURITY_ATTRIBUTES* /*security*/, DWORD protection,
                          DWORD size_high, DWORD size_low, const WCHAR* name) {
  sim::ApiCall call("CreateFileMappingW", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("file", file);
  call.Argument("protection", protection);
  call.Argument("size", size_low);
  const HANDLE none = nullptr;
  if (call.failed()) return call.Return(none);
  if (protection != PAGE_READONLY && protection != PAGE_READWRITE) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  // Mappings that programs share by name are not simulated.
  if (name != nullptr && *name != 0) return call.Fail(ERROR_NOT_SUPPORTED, none);
  if (size_high != 0) return call.Fail(ERROR_NOT_ENOUGH_MEMORY, none);
  sim::Mapping::Source source;
  source.writable = protection == PAGE_READWRITE;
  source.size = size_low;
  const auto lock = call.world().Acquire();
  sim::HandleTable& handles = call.device().handles();
  if (file != INVALID_HANDLE_VALUE) {
    source.file = handles.FindAs<sim::OpenFile>(file);
    if (source.file == nullptr) return call.Fail(ERROR_INVALID_HANDLE, none);
    const DWORD error = sim::PrepareFile(source, size_low);
    if (error != ERROR_SUCCESS) return call.Fail(error, none);
  } else if (size_low == 0) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  const auto mapping = std::make_shared<sim::Mapping>(call.device(), source);
  if (const DWORD error = mapping->Load(); error != ERROR_SUCCESS) return call.Fail(error, none);
  mapping->OwnHandle(file);
  call.SetError(ERROR_SUCCESS);
  return call.Return(handles.Add(mapping));
}

void* MapViewOfFile(HANDLE mapping, DWORD access, DWORD offset_high, DWORD offset_low,
                    std::size_t size) {
  sim::ApiCall call("MapViewOfFile", ERROR_NOT_ENOUGH_MEMORY);
  call.Argument("mapping", mapping);
  call.Argument("offset", offset_low);
  call.Argument("size", size);
  void* const none = nullptr;
  if (call.failed()) return call.Return(none);
  const auto lock = call.world().Acquire();
  const auto found = call.device().handles().FindAs<sim::Mapping>(mapping);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, none);
  if ((access & (FILE_MAP_READ | FILE_MAP_WRITE)) == 0) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  const bool writable = (access & FILE_MAP_WRITE) != 0;
  if (writable && !found->can_write()) return call.Fail(ERROR_ACCESS_DENIED, none);
  const std::size_t left = offset_low < found->size() ? found->size() - offset_low : 0;
  if (offset_high != 0 || left == 0 || size > left) {
    return call.Fail(ERROR_INVALID_PARAMETER, none);
  }
  char* const view = found->content() + offset_low;
  call.device().storage().mappings().AddView(view, {found, writable});
  return call.Return(static_cast<void*>(view));
}

BOOL UnmapViewOfFile(const void* view) {
  // A failure that is injected unmaps the view all the same: the caller cannot try again.
  sim::ApiCall call("UnmapViewOfFile", ERROR_INVALID_PARAMETER);
  const auto lock = call.world().Acquire();
  const sim::Mappings::View removed = call.device().storage().mappings().RemoveView(view);
  if (removed.mapping == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  if (removed.writable) removed.mapping->Store();
  return call.Return(call.failed() ? FALSE : TRUE);
}

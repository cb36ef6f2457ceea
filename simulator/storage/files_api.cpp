// The calls of the Windows CE API for open files.
#include <cstdint>
#include <memory>

#include "ce/errors.h"
#include "ce/files.h"
#include "device/device.h"
#include "driver/drivers.h"
#include "faults/api_call.h"
#include "locale/clock.h"
#include "storage/open_file.h"
#include "storage/storage.h"

namespace {

HANDLE OpenByName(sim::ApiCall& call, const WCHAR* name, const sim::Storage::OpenRequest& request) {
  call.Argument("name", name);
  call.Argument("access", request.mode.access);
  call.Argument("share", request.mode.share);
  call.Argument("disposition", request.disposition);
  if (call.failed()) return call.Return(INVALID_HANDLE_VALUE);
  std::shared_ptr<sim::OpenFile> file;
  bool existed = false;
  const DWORD error = call.device().storage().Open(request, file, existed);
  if (error != ERROR_SUCCESS) return call.Fail(error, INVALID_HANDLE_VALUE);
  // A success, too, says whether the file had been there.
  const bool may_create =
      request.disposition == CREATE_ALWAYS || request.disposition == OPEN_ALWAYS;
  call.SetError(may_create && existed ? ERROR_ALREADY_EXISTS : ERROR_SUCCESS);
  const auto lock = call.world().Acquire();
  return call.Return(call.device().handles().Add(std::move(file)));
}

/// A device has no file behind it: how it is shared and made is its driver's business.
HANDLE OpenDevice(sim::ApiCall& call, const sim::Storage::OpenRequest& request) {
  const WCHAR* const name = request.name;
  call.Argument("name", name);
  call.Argument("access", request.mode.access);
  call.Argument("share", request.mode.share);
  call.Argument("disposition", request.disposition);
  call.Argument("attributes", request.attributes);
  if (call.failed()) return call.Return(INVALID_HANDLE_VALUE);
  HANDLE opened = INVALID_HANDLE_VALUE;
  const DWORD error = call.device().drivers().Open(name, opened);
  return error == ERROR_SUCCESS ? call.Return(opened) : call.Fail(error, INVALID_HANDLE_VALUE);
}

std::shared_ptr<sim::OpenFile> FindFile(const sim::ApiCall& call, HANDLE handle) {
  const auto lock = call.world().Acquire();
  return call.device().handles().FindAs<sim::OpenFile>(handle);
}

/// Reports an operation's error number, if it is one, and whether there was none.
BOOL Finish(sim::ApiCall& call, DWORD error) {
  return error == ERROR_SUCCESS ? call.Return(TRUE) : call.Fail(error, FALSE);
}

}  // namespace

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
HANDLE CreateFileW(const WCHAR* name, DWORD access, DWORD share, SECURITY_ATTRIBUTES* /*security*/,
                   DWORD disposition, DWORD attributes, HANDLE /*template_file*/) {
  sim::ApiCall call("CreateFileW", ERROR_ACCESS_DENIED);
  const sim::Storage::OpenRequest request{
      name, {access, share, false, false}, disposition, attributes};
  if (sim::Drivers::IsDeviceName(name)) return OpenDevice(call, request);
  return OpenByName(call, name, request);
}

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
HANDLE CreateFileForMappingW(const WCHAR* name, DWORD access, DWORD share,
                             SECURITY_ATTRIBUTES* /*security*/, DWORD disposition, DWORD attributes,
                             HANDLE /*template_file*/) {
  sim::ApiCall call("CreateFileForMappingW", ERROR_ACCESS_DENIED);
  return OpenByName(call, name, {name, {access, share, false, true}, disposition, attributes});
}

BOOL ReadFile(HANDLE file, void* buffer, DWORD size, DWORD* read, OVERLAPPED* overlapped) {
  sim::ApiCall call("ReadFile", ERROR_GEN_FAILURE);
  call.Argument("file", file);
  call.Argument("size", size);
  if (read != nullptr) *read = 0;
  if (call.failed()) return call.Return(FALSE);
  if (read == nullptr || overlapped != nullptr || (buffer == nullptr && size != 0)) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return Finish(call, found->Read(buffer, size, *read));
}

BOOL WriteFile(HANDLE file, const void* buffer, DWORD size, DWORD* written,
               OVERLAPPED* overlapped) {
  sim::ApiCall call("WriteFile", ERROR_DISK_FULL);
  call.Argument("file", file);
  call.Argument("size", size);
  if (written != nullptr) *written = 0;
  if (call.failed()) return call.Return(FALSE);
  if (written == nullptr || overlapped != nullptr || (buffer == nullptr && size != 0)) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return Finish(call, found->Write(buffer, size, *written));
}

DWORD SetFilePointer(HANDLE file, LONG distance, LONG* distance_high, DWORD method) {
  sim::ApiCall call("SetFilePointer", ERROR_INVALID_PARAMETER);
  call.Argument("file", file);
  call.Argument("distance", distance);
  call.Argument("method", method);
  if (call.failed()) return call.Return(INVALID_SET_FILE_POINTER);
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, INVALID_SET_FILE_POINTER);
  // Without the upper half the distance is signed and the position must fit 32 bits.
  const std::int64_t far = distance_high == nullptr
                               ? distance
                               : std::int64_t{*distance_high} * (std::int64_t{1} << 32U) +
                                     static_cast<std::uint32_t>(distance);
  const std::uint64_t most = distance_high == nullptr ? UINT32_MAX : INT64_MAX;
  std::uint64_t position = 0;
  const DWORD error = found->Seek(far, method, most, position);
  if (error != ERROR_SUCCESS) return call.Fail(error, INVALID_SET_FILE_POINTER);
  if (distance_high != nullptr) *distance_high = static_cast<LONG>(position >> 32U);
  // The lower half may look like the failure: no error tells them apart.
  call.SetError(ERROR_SUCCESS);
  return call.Return(static_cast<DWORD>(position & 0xFFFFFFFFU));
}

DWORD GetFileSize(HANDLE file, DWORD* size_high) {
  sim::ApiCall call("GetFileSize", ERROR_INVALID_HANDLE);
  call.Argument("file", file);
  if (call.failed()) return call.Return(INVALID_FILE_SIZE);
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, INVALID_FILE_SIZE);
  const std::uint64_t size = found->size();
  if (size_high != nullptr) *size_high = static_cast<DWORD>(size >> 32U);
  call.SetError(ERROR_SUCCESS);
  return call.Return(static_cast<DWORD>(size & 0xFFFFFFFFU));
}

BOOL SetEndOfFile(HANDLE file) {
  sim::ApiCall call("SetEndOfFile", ERROR_DISK_FULL);
  call.Argument("file", file);
  if (call.failed()) return call.Return(FALSE);
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return Finish(call, found->SetEnd());
}

BOOL FlushFileBuffers(HANDLE file) {
  sim::ApiCall call("FlushFileBuffers", ERROR_DISK_FULL);
  call.Argument("file", file);
  if (call.failed()) return call.Return(FALSE);
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return Finish(call, found->Flush());
}

BOOL GetFileTime(HANDLE file, FILETIME* creation, FILETIME* access, FILETIME* write) {
  sim::ApiCall call("GetFileTime", ERROR_INVALID_HANDLE);
  call.Argument("file", file);
  if (call.failed()) return call.Return(FALSE);
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  const sim::FileRecord record = found->record();
  if (creation != nullptr) *creation = sim::ToFileTime(record.created);
  if (access != nullptr) *access = sim::ToFileTime(record.accessed);
  if (write != nullptr) *write = sim::ToFileTime(record.written);
  return call.Return(TRUE);
}

BOOL SetFileTime(HANDLE file, const FILETIME* creation, const FILETIME* access,
                 const FILETIME* write) {
  sim::ApiCall call("SetFileTime", ERROR_ACCESS_DENIED);
  call.Argument("file", file);
  if (call.failed()) return call.Return(FALSE);
  const std::shared_ptr<sim::OpenFile> found = FindFile(call, file);
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return Finish(call, found->SetTimes(creation, access, write));
}

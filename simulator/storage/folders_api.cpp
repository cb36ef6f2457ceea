// The calls of the Windows CE API for files and folders by name.
#include <memory>

#include "ce/errors.h"
#include "ce/files.h"
#include "device/device.h"
#include "faults/api_call.h"
#include "storage/storage.h"

namespace {

BOOL Finish(sim::ApiCall& call, DWORD error) {
  return error == ERROR_SUCCESS ? call.Return(TRUE) : call.Fail(error, FALSE);
}

}  // namespace

BOOL DeleteFileW(const WCHAR* name) {
  sim::ApiCall call("DeleteFileW", ERROR_ACCESS_DENIED);
  call.Argument("name", name);
  if (call.failed()) return call.Return(FALSE);
  return Finish(call, call.device().storage().Delete(name));
}

BOOL MoveFileW(const WCHAR* from, const WCHAR* to) {
  sim::ApiCall call("MoveFileW", ERROR_ACCESS_DENIED);
  call.Argument("from", from);
  call.Argument("to", to);
  if (call.failed()) return call.Return(FALSE);
  return Finish(call, call.device().storage().Move(from, to));
}

BOOL CopyFileW(const WCHAR* from, const WCHAR* to, BOOL fail_if_exists) {
  sim::ApiCall call("CopyFileW", ERROR_DISK_FULL);
  call.Argument("from", from);
  call.Argument("to", to);
  call.Argument("fail_if_exists", fail_if_exists);
  if (call.failed()) return call.Return(FALSE);
  return Finish(call, call.device().storage().Copy(from, to, fail_if_exists != FALSE));
}

BOOL CreateDirectoryW(const WCHAR* name, SECURITY_ATTRIBUTES* /*security*/) {
  sim::ApiCall call("CreateDirectoryW", ERROR_ACCESS_DENIED);
  call.Argument("name", name);
  if (call.failed()) return call.Return(FALSE);
  return Finish(call, call.device().storage().CreateFolder(name));
}

BOOL RemoveDirectoryW(const WCHAR* name) {
  sim::ApiCall call("RemoveDirectoryW", ERROR_ACCESS_DENIED);
  call.Argument("name", name);
  if (call.failed()) return call.Return(FALSE);
  return Finish(call, call.device().storage().RemoveFolder(name));
}

DWORD GetFileAttributesW(const WCHAR* name) {
  sim::ApiCall call("GetFileAttributesW", ERROR_FILE_NOT_FOUND);
  call.Argument("name", name);
  if (call.failed()) return call.Return(INVALID_FILE_ATTRIBUTES);
  DWORD attributes = 0;
  const DWORD error = call.device().storage().GetAttributes(name, attributes);
  if (error != ERROR_SUCCESS) return call.Fail(error, INVALID_FILE_ATTRIBUTES);
  return call.Return(attributes);
}

BOOL SetFileAttributesW(const WCHAR* name, DWORD attributes) {
  sim::ApiCall call("SetFileAttributesW", ERROR_ACCESS_DENIED);
  call.Argument("name", name);
  call.Argument("attributes", attributes);
  if (call.failed()) return call.Return(FALSE);
  return Finish(call, call.device().storage().SetAttributes(name, attributes));
}

HANDLE FindFirstFileW(const WCHAR* pattern, WIN32_FIND_DATAW* data) {
  sim::ApiCall call("FindFirstFileW", ERROR_FILE_NOT_FOUND);
  call.Argument("pattern", pattern);
  if (call.failed()) return call.Return(INVALID_HANDLE_VALUE);
  if (data == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, INVALID_HANDLE_VALUE);
  std::shared_ptr<sim::Search> search;
  const DWORD error = call.device().storage().FindFirst(pattern, search, *data);
  if (error != ERROR_SUCCESS) return call.Fail(error, INVALID_HANDLE_VALUE);
  const auto lock = call.world().Acquire();
  return call.Return(call.device().handles().Add(std::move(search)));
}

BOOL FindNextFileW(HANDLE search, WIN32_FIND_DATAW* data) {
  sim::ApiCall call("FindNextFileW", ERROR_NO_MORE_FILES);
  call.Argument("search", search);
  if (call.failed()) return call.Return(FALSE);
  if (data == nullptr) return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  std::shared_ptr<sim::Search> found;
  {
    const auto lock = call.world().Acquire();
    found = call.device().handles().FindAs<sim::Search>(search);
  }
  if (found == nullptr) return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  return Finish(call, call.device().storage().FindNext(*found, *data));
}

BOOL FindClose(HANDLE search) {
  // A failure that is injected closes the search all the same: the caller cannot try again.
  sim::ApiCall call("FindClose", ERROR_INVALID_HANDLE);
  call.Argument("search", search);
  const auto lock = call.world().Acquire();
  sim::HandleTable& handles = call.device().handles();
  if (handles.FindAs<sim::Search>(search) == nullptr) {
    return call.Fail(ERROR_INVALID_HANDLE, FALSE);
  }
  handles.Remove(search);
  return call.Return(call.failed() ? FALSE : TRUE);
}

BOOL GetDiskFreeSpaceExW(const WCHAR* folder, ULARGE_INTEGER* available, ULARGE_INTEGER* total,
                         ULARGE_INTEGER* total_free) {
  sim::ApiCall call("GetDiskFreeSpaceExW", ERROR_PATH_NOT_FOUND);
  call.Argument("folder", folder);
  if (call.failed()) return call.Return(FALSE);
  constexpr const WCHAR* kRoot = u"\\";
  sim::Space::Figures room{};
  const DWORD error = call.device().storage().FreeSpace(folder == nullptr ? kRoot : folder, room);
  if (error != ERROR_SUCCESS) return call.Fail(error, FALSE);
  if (available != nullptr) available->QuadPart = room.free();
  if (total != nullptr) total->QuadPart = room.capacity;
  if (total_free != nullptr) total_free->QuadPart = room.free();
  return call.Return(TRUE);
}

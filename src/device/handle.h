// Owners of the platform's handles.
#pragma once

#include <coredll.h>

#include <utility>

namespace device {

/// How one kind of handle is recognised as empty and given back. The platform has two different
/// "no handle" values, which the kinds keep apart.
struct FileHandleKind {
  using Value = HANDLE;
  static Value Empty() noexcept { return INVALID_HANDLE_VALUE; }
  static void Close(Value handle) noexcept { CloseHandle(handle); }
};
struct SearchHandleKind {
  using Value = HANDLE;
  static Value Empty() noexcept { return INVALID_HANDLE_VALUE; }
  static void Close(Value handle) noexcept { FindClose(handle); }
};
struct SnapshotHandleKind {
  using Value = HANDLE;
  static Value Empty() noexcept { return INVALID_HANDLE_VALUE; }
  static void Close(Value handle) noexcept { CloseToolhelp32Snapshot(handle); }
};
/// Events, threads, processes, mutexes, mappings: whatever CloseHandle ends and null stands for.
struct ObjectHandleKind {
  using Value = HANDLE;
  static Value Empty() noexcept { return nullptr; }
  static void Close(Value handle) noexcept { CloseHandle(handle); }
};
struct RegistryKeyKind {
  using Value = HKEY;
  static Value Empty() noexcept { return nullptr; }
  static void Close(Value key) noexcept { RegCloseKey(key); }
};

/// Owns one handle and closes it once, on every path out of a scope.
template <typename Kind>
class [[nodiscard]] UniqueHandle {
 public:
  using Value = typename Kind::Value;

  explicit UniqueHandle(Value handle = Kind::Empty()) noexcept : handle_(handle) {}
  ~UniqueHandle() { Reset(); }
  UniqueHandle(UniqueHandle&& other) noexcept : handle_(other.Release()) {}
  UniqueHandle& operator=(UniqueHandle&& other) noexcept {
    if (this != &other) Reset(other.Release());
    return *this;
  }

  [[nodiscard]] explicit operator bool() const noexcept { return handle_ != Kind::Empty(); }
  [[nodiscard]] Value get() const noexcept { return handle_; }

  /// Closes what is owned and takes `handle` on.
  void Reset(Value handle = Kind::Empty()) noexcept {
    const Value closing = std::exchange(handle_, handle);
    if (closing != Kind::Empty()) Kind::Close(closing);
  }
  /// Gives the handle up without closing it.
  [[nodiscard]] Value Release() noexcept { return std::exchange(handle_, Kind::Empty()); }
  /// For calls that return a handle through a pointer; closes what was owned.
  [[nodiscard]] Value* Receive() noexcept {
    Reset();
    return &handle_;
  }

 private:
  Value handle_;
};

using FileHandle = UniqueHandle<FileHandleKind>;
using SearchHandle = UniqueHandle<SearchHandleKind>;
using SnapshotHandle = UniqueHandle<SnapshotHandleKind>;
using ObjectHandle = UniqueHandle<ObjectHandleKind>;
using EventHandle = ObjectHandle;
using ThreadHandle = ObjectHandle;
using ProcessHandle = ObjectHandle;
using MappingHandle = ObjectHandle;
using RegistryKey = UniqueHandle<RegistryKeyKind>;

}  // namespace device

// The gate that every API call passes.
//
//   BOOL DeleteFileW(const WCHAR* name) {
//     sim::ApiCall call("DeleteFileW", ERROR_ACCESS_DENIED);
//     call.Argument("name", name);
//     if (call.failed()) return call.Return(FALSE);
//     ...
//     return call.Return(TRUE);           // or call.Fail(ERROR_FILE_NOT_FOUND, FALSE)
//   }
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>

#include "ce/errors.h"
#include "ce/types.h"

namespace sim {

class Device;
class World;
struct SimThread;

/// For calls that have no failure to report.
inline constexpr std::uint32_t kCannotFail = 0xFFFFFFFFU;

class ApiCall {
 public:
  /// Counts the call and asks the device's faults about it. Ends the program, with the name of the
  /// call, when the calling thread belongs to no device.
  /// @param name  a literal
  /// @param usual_error  last error of an injected failure whose rule names none; kCannotFail for
  ///   calls without a failure
  explicit ApiCall(const char* name, std::uint32_t usual_error = ERROR_GEN_FAILURE);
  /// Writes the trace line.
  ~ApiCall();
  ApiCall(const ApiCall&) = delete;
  ApiCall& operator=(const ApiCall&) = delete;

  /// A rule lets this call fail; the last error is set already.
  [[nodiscard]] bool failed() const { return failed_; }
  [[nodiscard]] std::uint32_t fault_error() const { return fault_error_; }
  [[nodiscard]] Device& device() const { return *device_; }
  [[nodiscard]] World& world() const;
  [[nodiscard]] SimThread& thread() const { return *thread_; }

  // Arguments for the trace; nothing is formatted while the trace is off. Name every argument that
  // says what the call is about; an address as such (not a handle) shows as "address".
  void Argument(const char* name, const WCHAR* text);
  void Argument(const char* name, const char* text);
  void Argument(const char* name, std::int64_t value);
  template <typename T, std::enable_if_t<std::is_integral_v<T>, int> = 0>
  void Argument(const char* name, T value) {
    Argument(name, static_cast<std::int64_t>(value));
  }
  void Argument(const char* name, const void* handle);

  /// Passes the result on, noting it for the trace.
  template <typename T>
  T Return(T result) {
    if constexpr (std::is_pointer_v<T>) {
      NoteResult(reinterpret_cast<const void*>(result));
    } else {
      NoteResult(static_cast<std::int64_t>(result));
    }
    return result;
  }
  /// Sets the thread's last error and passes the result on.
  template <typename T>
  T Fail(std::uint32_t error, T result) {
    SetError(error);
    return Return(result);
  }
  void SetError(std::uint32_t error);

 private:
  void NoteResult(std::int64_t result);
  void NoteResult(const void* result);
  void WriteTrace();
  void StartArgument(const char* name);

  const char* name_;
  SimThread* thread_;
  Device* device_;
  bool failed_ = false;
  bool traced_ = false;
  std::uint32_t fault_error_ = 0;
  const char* outer_call_ = nullptr;
  std::string result_;  ///< of the trace line; empty for a call without result
  std::string arguments_;
};

}  // namespace sim

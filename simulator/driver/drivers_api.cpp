// The calls of the API for drivers.
#include "ce/errors.h"
#include "ce/files.h"
#include "ce/system.h"
#include "device/device.h"
#include "driver/drivers.h"
#include "faults/api_call.h"

HANDLE ActivateDevice(const WCHAR* key, DWORD /*client_information*/) {
  sim::ApiCall call("ActivateDevice", ERROR_FILE_NOT_FOUND);
  call.Argument("key", key);
  HANDLE handle = nullptr;
  if (call.failed()) return call.Return(handle);
  const DWORD error = call.device().drivers().Activate(key, handle);
  return error == ERROR_SUCCESS ? call.Return(handle) : call.Fail(error, HANDLE{nullptr});
}

BOOL DeactivateDevice(HANDLE device) {
  sim::ApiCall call("DeactivateDevice", ERROR_INVALID_HANDLE);
  call.Argument("device", device);
  if (call.failed()) return call.Return(FALSE);
  const DWORD error = call.device().drivers().Deactivate(device);
  return error == ERROR_SUCCESS ? call.Return(TRUE) : call.Fail(error, FALSE);
}

// NOLINTNEXTLINE(readability-function-size): the platform's parameters
BOOL DeviceIoControl(HANDLE device, DWORD code, void* input, DWORD input_size, void* output,
                     DWORD output_size, DWORD* returned, OVERLAPPED* overlapped) {
  sim::ApiCall call("DeviceIoControl", ERROR_GEN_FAILURE);
  call.Argument("device", device);
  call.Argument("code", code);
  call.Argument("input_size", input_size);
  call.Argument("output_size", output_size);
  if (returned != nullptr) *returned = 0;
  if (call.failed()) return call.Return(FALSE);
  const bool lacks_buffer =
      (input == nullptr && input_size != 0) || (output == nullptr && output_size != 0);
  if (returned == nullptr || overlapped != nullptr || lacks_buffer) {
    return call.Fail(ERROR_INVALID_PARAMETER, FALSE);
  }
  sim::DriverRequest request{code, input, input_size, output, output_size, 0};
  const DWORD error = call.device().drivers().Control(device, request);
  *returned = request.returned;
  return error == ERROR_SUCCESS ? call.Return(TRUE) : call.Fail(error, FALSE);
}

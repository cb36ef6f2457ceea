#include "device/flash/flash_driver.h"

#include <cstring>

#include "base/format.h"
#include "base/text.h"
#include "device/flash/low_buffer.h"
#include "device/flash/registry_helpers.h"
#include "device/handle.h"

namespace device {
namespace {

constexpr WCHAR kDriverKey[] = TEXT("Drivers\\Eflashdrv");
constexpr WCHAR kLoadedDevice[] = TEXT("HDEVICE");
constexpr WCHAR kDriverName[] = TEXT("CEEFLDRV");

/// One thing to ask of the driver.
struct Operation {
  DWORD code;
  const WCHAR* name;                   ///< as the debug output calls it
  const WCHAR* line_start = TEXT("");  ///< of the lines on success and failed request
};
constexpr const WCHAR* kNewLine = TEXT("\r\n");
constexpr Operation kInit = {0x22CFF9, TEXT("EFL_Helper_Init"), kNewLine};
constexpr Operation kStart = {0x22CFFD, TEXT("EFL_Helper_Start_EFLASH")};
constexpr Operation kCreateFile = {0x22CFFA, TEXT("EFL_Helper_CreateFile")};
constexpr Operation kCloseFile = {0x22CFFB, TEXT("EFL_Helper_CloseFile")};
constexpr Operation kWriteData = {0x22CFFC, TEXT("EFL_Helper_WriteData"), kNewLine};
constexpr Operation kSeek = {0x22CFF4, TEXT("EFL_Helper_Seek"), kNewLine};
constexpr Operation kReadData = {0x22CFF2, TEXT("EFL_Helper_ReadDataEx"), kNewLine};
constexpr Operation kGetSize = {0x22CFEE, TEXT("EFL_Helper_FileGetSize"), kNewLine};
constexpr Operation kDeleteFile = {0x22CFF0, TEXT("EFL_Helper_DeleteFile")};
constexpr Operation kFree = {0, TEXT("EFL_Helper_Free")};

/// The driver as this process has it open, and what its requests share.
// KEPT ODDITY: the block is one for all requests, and each sets only its own fields: a write goes
// out with the position of the last seek beside it, a seek with the count of the last write.
struct Driver {
  HANDLE device = nullptr;  ///< null: not open
  FlashParameters block = {};
  LowBuffer bounce;
};
Driver driver;

constexpr bool kPointersFit = sizeof(void*) == sizeof(std::uint32_t);

std::uint32_t In32Bits(const void* pointer_or_handle) noexcept {
  return static_cast<std::uint32_t>(reinterpret_cast<UINT_PTR>(pointer_or_handle));
}

// ---- loading ----

/// Closes the key that RegEnter opened.
void LeaveKey() noexcept {
  RegExit();
  NKDbgPrintfW(TEXT("--%s: DONE!\r\n"), kDriverName);
}

bool EnterKey() noexcept {
  if (RegEnter(kDriverKey)) return true;
  NKDbgPrintfW(TEXT("Could not create/open the key %s ...cannot continue.\r\n"), kDriverKey);
  return false;
}

bool Activate() noexcept {
  RegSetString(TEXT("Prefix"), TEXT("EFL"));
  RegSetString(TEXT("Dll"), TEXT("eflashdrv.dll"));
  RegSetString(TEXT("FriendlyName"), TEXT("Corvanta Eflash Driver"));
  RegSetDword(TEXT("Order"), 3);
  RegSetDword(TEXT("Ioctl"), 4);
  const void* const loaded = ActivateDevice(kDriverKey, 0);
  if (loaded == nullptr) {
    NKDbgPrintfW(TEXT("%s : Couldn't ActivateDevice(EFLASHDRV.DLL)...stopping\r\n"), kDriverName);
    return false;
  }
  RegSetDword(kLoadedDevice, In32Bits(loaded));
  return true;
}

bool Load() noexcept {
  if (!EnterKey()) return false;
  std::uint32_t loaded = 0;
  bool is_loaded = GetRegistryValue(OpenKey(), kLoadedDevice, &loaded);
  if (is_loaded) {
    NKDbgPrintfW(TEXT("EFLASHDRV already loaded...stopping.\r\n"));
  } else {
    is_loaded = Activate();
  }
  LeaveKey();
  return is_loaded;
}

void CloseDevice() noexcept {
  if (driver.device != nullptr) CloseHandle(driver.device);
  driver.device = nullptr;
  driver.bounce.Free();
}

/// A driver that is open already stays open when it cannot be opened anew.
bool OpenDevice() noexcept {
  const HANDLE opened =
      CreateFileW(TEXT("EFL1:"), GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING,
                  FILE_ATTRIBUTE_NORMAL | FILE_FLAG_WRITE_THROUGH, nullptr);
  if (opened == INVALID_HANDLE_VALUE) {
    NKDbgPrintfW(TEXT("EFL_Helper_Init::Can't open EFL1!\r\n"));
    return false;
  }
  CloseDevice();
  driver.device = opened;
  return true;
}

// ---- asking ----

bool IsOpen(const Operation& operation) noexcept {
  if (driver.device != nullptr) return true;
  NKDbgPrintfW(TEXT("%s::Invalid Handle.\r\n"), operation.name);
  return false;
}

bool Fail(const Operation& operation) noexcept {
  NKDbgPrintfW(TEXT("%s%s::DeviceIoControl Failed.\r\n"), operation.line_start, operation.name);
  return false;
}

bool Succeed(const Operation& operation) noexcept {
  NKDbgPrintfW(TEXT("%s%s:: SUCCESS!.\r\n"), operation.line_start, operation.name);
  return true;
}

bool Send(const Operation& operation, void* input, std::size_t size) noexcept {
  DWORD returned = 0;
  return DeviceIoControl(driver.device, operation.code, input, static_cast<DWORD>(size), nullptr, 0,
                         &returned, nullptr) != 0;
}

bool Ask(const Operation& operation, FlashParameters& block) noexcept {
  return Send(operation, &block, sizeof block) ? Succeed(operation) : Fail(operation);
}

void SetName(FlashParameters& block, const char* name) noexcept {
  std::memset(block.name, 0, sizeof block.name);
  base::CopyText<char>(block.name, sizeof block.name, base::View(name));
}

/// To the program's own output, where whoever watches a device sees which file is written.
void PrintName(const char* name) noexcept {
  char line[64];
  const std::size_t length = base::Format(line, sizeof line, "EFLASH FileName: %s", name);
  fwrite(line, 1, length, stdout);
  fflush(stdout);
}

}  // namespace

void UnloadFlashDriver() noexcept {
  CloseDevice();
  if (!EnterKey()) return;
  std::uint32_t loaded = 0;
  if (GetRegistryValue(OpenKey(), kLoadedDevice, &loaded)) {
    DeactivateDevice(reinterpret_cast<HANDLE>(static_cast<UINT_PTR>(loaded)));
  }
  const auto result = RegDeleteValueW(OpenKey(), kLoadedDevice);
  if (result != ERROR_SUCCESS) {
    NKDbgPrintfW(TEXT("RegDeleteValue failed %d.\r\n"), static_cast<int>(result));
  }
  LeaveKey();
}

bool EFL_Helper_Init(std::uint32_t bytes) noexcept {
  if (!Load() || !OpenDevice()) return false;
  if (!Send(kInit, &bytes, sizeof bytes)) return Fail(kInit);
  NKDbgPrintfW(TEXT("\r\nEFL_Helper_Init:: SUCCESS, Allocated %d Bytes!\r\n"),
               static_cast<int>(bytes));
  return true;
}

bool EFL_Helper_Start_EFLASH() noexcept {
  if (!IsOpen(kStart)) return false;
  return Send(kStart, nullptr, 0) ? Succeed(kStart) : Fail(kStart);
}

bool EFL_Helper_CreateFile(const char* name, std::uint32_t size) noexcept {
  if (!IsOpen(kCreateFile)) return false;
  SetName(driver.block, name);
  driver.block.size = size;
  PrintName(driver.block.name);
  return Ask(kCreateFile, driver.block);
}

bool EFL_Helper_FileGetSize(std::uint32_t* size) noexcept {
  if (!IsOpen(kGetSize) || !Ask(kGetSize, driver.block)) return false;
  *size = driver.block.size;
  return true;
}

bool EFL_Helper_Seek(std::uint32_t position) noexcept {
  if (!IsOpen(kSeek)) return false;
  driver.block.position = position;
  return Ask(kSeek, driver.block);
}

bool EFL_Helper_WriteData(const void* data, std::uint32_t count) noexcept {
  if (!IsOpen(kWriteData)) return false;
  const void* reachable = data;
  if constexpr (!kPointersFit) {
    std::uint8_t* const bounce = driver.bounce.Reserve(count);
    if (bounce == nullptr) return Fail(kWriteData);
    if (count != 0) std::memcpy(bounce, data, count);
    reachable = bounce;
  }
  driver.block.count = count;
  driver.block.address = In32Bits(reachable);
  return Ask(kWriteData, driver.block);
}

bool EFL_Helper_ReadDataEx(void* buffer, std::uint32_t count, std::uint32_t position) noexcept {
  if (!IsOpen(kReadData)) return false;
  void* reachable = buffer;
  if constexpr (!kPointersFit) {
    reachable = driver.bounce.Reserve(count);
    if (reachable == nullptr) return Fail(kReadData);
  }
  driver.block.count = count;
  driver.block.position = position;
  driver.block.address = In32Bits(reachable);
  if (!Ask(kReadData, driver.block)) return false;
  if constexpr (!kPointersFit) {
    if (count != 0) std::memcpy(buffer, reachable, count);
  }
  return true;
}

bool EFL_Helper_CloseFile() noexcept {
  return IsOpen(kCloseFile) && Ask(kCloseFile, driver.block);
}

bool EFL_Helper_DeleteFile(const char* name) noexcept {
  if (!IsOpen(kDeleteFile)) return false;
  FlashParameters block = {};
  SetName(block, name);
  return Ask(kDeleteFile, block);
}

bool EFL_Helper_Free() noexcept {
  if (!IsOpen(kFree)) return false;
  UnloadFlashDriver();
  return true;
}

}  // namespace device

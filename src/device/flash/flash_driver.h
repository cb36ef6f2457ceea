// The flash driver of the device: loading it, and every request that it understands.
//
// The driver keeps files in a store in memory and, when it is told to, writes them into the flash.
// One of its files is current. Each function says how it went in the kernel's debug output and
// returns whether it worked; the words are fixed. Not for two threads at once: all of them share
// one handle and one block of parameters.
#pragma once

#include <coredll.h>

#include <cstddef>
#include <cstdint>

namespace device {

/// What goes to the driver with most requests, in the processor's byte order; it answers through
/// the same block. Pointers have 32 bits there, on every machine.
struct FlashParameters {
  char name[20];           ///< with its terminator
  std::uint32_t size;      ///< of the file, in bytes
  std::uint32_t count;     ///< of bytes to write or read
  std::uint32_t unused;    ///< the driver's own
  std::uint32_t position;  ///< in the file
  std::uint32_t address;   ///< of the bytes to write, or of the room for what is read
};
static_assert(sizeof(FlashParameters) == 40);
static_assert(offsetof(FlashParameters, name) == 0 && offsetof(FlashParameters, size) == 20);
static_assert(offsetof(FlashParameters, count) == 24 && offsetof(FlashParameters, unused) == 28);
static_assert(offsetof(FlashParameters, position) == 32);
static_assert(offsetof(FlashParameters, address) == 36);

// Names that reports and debug output have in common.
// NOLINTBEGIN(readability-identifier-naming)

/// Loads the driver unless the registry says that it is, opens it and has it make a store.
/// @param bytes  size of the store; an earlier store goes, with its files
bool EFL_Helper_Init(std::uint32_t bytes) noexcept;

/// Begins to write what is stored into the flash. A device may restart before this returns.
bool EFL_Helper_Start_EFLASH() noexcept;

/// Makes a file and makes it current.
/// @param name  cut to 19 characters, here and in EFL_Helper_DeleteFile
/// @param size  in bytes; 0 opens the file of that name as it is
bool EFL_Helper_CreateFile(const char* name, std::uint32_t size) noexcept;

/// @param size  receives the current file's size in bytes; unchanged on failure
bool EFL_Helper_FileGetSize(std::uint32_t* size) noexcept;

/// Sets where the current file is written next.
bool EFL_Helper_Seek(std::uint32_t position) noexcept;

/// Writes to the current file.
/// @param data  anywhere in memory
bool EFL_Helper_WriteData(const void* data, std::uint32_t count) noexcept;

/// Reads from the current file. The position of EFL_Helper_Seek stays the driver's business.
/// @param buffer  has room for `count` bytes, anywhere in memory; unchanged on failure
bool EFL_Helper_ReadDataEx(void* buffer, std::uint32_t count, std::uint32_t position) noexcept;

/// No file is current from here on.
bool EFL_Helper_CloseFile() noexcept;

bool EFL_Helper_DeleteFile(const char* name) noexcept;

/// Closes the driver and unloads it; its store goes, with all files.
bool EFL_Helper_Free() noexcept;

// NOLINTEND(readability-identifier-naming)

/// Closes the driver, if it is open, and unloads what the registry says is loaded.
void UnloadFlashDriver() noexcept;

}  // namespace device

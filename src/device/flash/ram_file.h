// Files in the store of the flash driver: firmware goes there and must not touch a file system.
#pragma once

#include <cstdint>

#include "device/file.h"

namespace device {

// Names that other texts of the system have for these.
// NOLINTBEGIN(readability-identifier-naming)

/// Sets how large the store is to be when it is made, in bytes.
void SetRAMSize(std::uint32_t bytes) noexcept;

/// Loads the flash driver and makes the store.
/// @return false also when the store is there already: then nothing was done, and it has the size
///   that it got first. Ask HasRAMStore before.
// KEPT ODDITY: nothing is sent to start the flash here. That request writes the store into the
// flash, so it is sent once, when everything is in the store.
bool InitRAMStore() noexcept;

/// Whether the store has been made, by whomever.
[[nodiscard]] bool HasRAMStore() noexcept;

/// Gives the store and the driver up; InitRAMStore may then make another one.
/// @return true also when there is none.
bool FreeRAMStore() noexcept;

/// A file of the store. It has neither times nor attributes: asking for them fails.
///
/// Names are those inside the store, without "RAM:". The store has one current file; opening a
/// second object takes it away from the first. Used by the upgrade thread, and by the multicast
/// client's while the upgrade thread waits for it.
///
/// While a value "LogRAMFiles" stands in the registry, a copy of everything written is kept on the
/// storage card, in "\SD Card\RAMFileLog". The copy is for diagnosis: it holds the bytes in the
/// order of the writes, whatever was sought, and ends where it could not be written.
class RAMFile final : public File {
 public:
  RAMFile() noexcept = default;
  ~RAMFile() override;

  /// For writing: as OpenForWriting without a size.
  bool OpenFile(const char* name, bool for_writing) noexcept override;
  /// @param keep  leaves an existing file as it is; else it is made new, `size` bytes large
  /// @param size  most bytes that the file can hold; 0 opens an existing file as it is
  bool OpenForWriting(const char* name, bool keep, std::uint32_t size) noexcept override;
  /// @param error  receives 0 or ERROR_GEN_FAILURE; may be null
  bool CreateForWriting(const char* name, bool share, std::uint32_t* error) noexcept override;
  bool OpenForReading(const char* name, bool share) noexcept override;
  bool Close() noexcept override;
  /// Reads at a position of its own, which begins at 0 and which only reading moves.
  /// @param length  above 0; less is not read, so bytes behind the file's end are a failure
  /// @param read    never null; receives `length` on success, 0 else
  bool Read(void* buffer, std::uint32_t length, std::uint32_t* read) noexcept override;
  bool Write(const void* data, std::uint32_t length) noexcept override;
  /// Sets where writing goes on.
  bool Seek(std::uint32_t offset) noexcept override;
  /// Nothing is held back: true while a file is open.
  bool Flush() noexcept override;
  /// @param size  receives 0xFFFFFFFF on failure
  bool GetSize(std::uint32_t* size) noexcept override;

  bool GetTime(TimeKind kind, FILETIME* time) noexcept override;
  bool GetTime(TimeKind kind, SYSTEMTIME* time) noexcept override;
  bool SetTime(TimeKind kind, const FILETIME& time) noexcept override;
  bool SetTime(TimeKind kind, const SYSTEMTIME& time) noexcept override;
  /// @param name  null for the open file; nothing is deleted for an empty name
  bool DeleteFile(const char* name, std::uint32_t* error) noexcept override;
  std::uint32_t GetAttributes(const char* name) noexcept override;
  bool SetAttributes(const char* name, std::uint32_t mask) noexcept override;

 private:
  bool Open(const char* name, std::uint32_t size) noexcept;
  bool OpenMirrored(const char* name, std::uint32_t size) noexcept;
  void StartMirror() noexcept;
  void WriteMirror(const void* data, std::uint32_t length) noexcept;

  base::FixedText<kNameSize> name_;  ///< empty: none is open
  bool mirror_on_ = false;
  LocalObject<File> mirror_;
  std::uint32_t read_position_ = 0;
};

/// Computes the CRC-32 of the first `length` bytes of a file of the store, in blocks of 4,096
/// bytes. Length 0 gives 0.
///
/// @param name       inside the store, without "RAM:"
/// @param crc        receives the value, 0 when it could not be computed
/// @param full_path  as the job names the file
/// @return 0, or an error when the file cannot be opened or is shorter.
std::uint32_t RAMFILECRC32(const char* name, std::uint32_t* crc, std::uint32_t length,
                           const char* full_path) noexcept;

// NOLINTEND(readability-identifier-naming)

}  // namespace device

// The driver "eflashdrv.dll": keeps files in program memory and writes them into the device's flash
// when it is told to.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "driver/drivers.h"

namespace sim {

class Device;

/// One store of a size that its user asks for, with named files in it, one of which is current.
///
/// The requests carry a block of 40 bytes: the name at offset 0, size at 20, count at 24, position
/// at 32 and the address of the caller's data at 36, which must lie in pages of VirtualAlloc. The
/// driver answers through the same block.
///
///   0x22CFF9  make the store; the input is its size in bytes. An earlier one goes with its files
///   0x22CFFA  make a file of `size` bytes and make it current; size 0 takes the file of that name
///             as it is, if there is one
///   0x22CFFB  no file is current
///   0x22CFFC  write `count` bytes at the current file's position, which moves on
///   0x22CFF4  set the position
///   0x22CFF2  read `count` bytes at `position`
///   0x22CFEE  tell the current file's size: the end of what was written to it
///   0x22CFF0  delete the file of that name
///   0x22CFFD  write all files into the flash
///
/// Refused is what a driver refuses: requests without a store or a current file, blocks of another
/// size, names without terminator, files that do not fit, bytes behind a file's end.
class FlashDriver final : public StreamDriver {
 public:
  explicit FlashDriver(Device& device) : device_(device) {}
  /// Gives the store's memory back.
  ~FlashDriver() override;

  DWORD Control(DriverRequest& request) override;

  // ---- for tests and tools ----

  struct File {
    std::vector<std::uint8_t> content;  ///< as large as the file may become
    std::uint32_t written = 0;          ///< where what was written ends
  };
  /// Where an image of this name lies once it is flashed.
  [[nodiscard]] static std::filesystem::path ImageFile(const Device& device, std::string_view name);
  /// A copy of the store.
  [[nodiscard]] std::map<std::string, File> Files() const;

 private:
  static constexpr std::size_t kBlockSize = 40;
  using Block = std::array<std::uint8_t, kBlockSize>;
  using Hold = std::lock_guard<std::mutex>;

  DWORD Dispatch(DWORD code, Block& block);
  DWORD MakeStore(const DriverRequest& request);
  // With the lock held:
  DWORD Create(const Block& block);
  DWORD Write(const Block& block);
  DWORD Read(const Block& block);
  DWORD Seek(const Block& block);
  DWORD TellSize(Block& block);
  DWORD Delete(const Block& block);
  DWORD CloseCurrent();
  [[nodiscard]] File* Current();
  /// The caller's bytes. @return null when they are not where the driver reaches them.
  [[nodiscard]] std::uint8_t* Data(const Block& block) const;
  DWORD Start();
  /// Puts the files into the device's flash folder and says so in its record.
  [[nodiscard]] bool WriteFlash() const;

  Device& device_;
  mutable std::mutex mutex_;
  std::uint32_t capacity_ = 0;  ///< 0: there is no store
  std::uint64_t used_ = 0;
  std::map<std::string, File> files_;
  std::string current_;  ///< empty: none
  std::uint32_t position_ = 0;
};

}  // namespace sim

// A stand-in for the device's flash driver: a store in memory with named files, one of which is
// current. It understands the requests of the real one. A desktop has no flash: what would be
// written there becomes files in the folder "\Flash" of the current drive.
#pragma once

#include <coredll.h>

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "guard.h"

namespace platform {

class FlashStore {
 public:
  /// One request, with its block of parameters, through which it is answered.
  /// @return an error number, ERROR_SUCCESS for success.
  DWORD Control(DWORD code, void* input, DWORD input_size);

 private:
  static constexpr std::size_t kBlockSize = 40;
  using Block = std::array<std::uint8_t, kBlockSize>;
  struct File {
    std::vector<std::uint8_t> content;  ///< as large as the file may become
    std::uint32_t written = 0;          ///< where what was written ends
  };

  DWORD MakeStore(const void* input, DWORD input_size);
  DWORD Create(const Block& block);
  DWORD Delete(const Block& block);
  DWORD Write(const Block& block);
  DWORD Read(const Block& block) const;
  DWORD Seek(const Block& block);
  DWORD TellSize(Block& block) const;
  DWORD CloseCurrent();
  DWORD WriteFlash() const;
  File* Current();
  [[nodiscard]] const File* Current() const;

  Lock lock_;
  std::uint32_t capacity_ = 0;  ///< 0: there is no store
  std::uint64_t used_ = 0;
  std::map<std::string, File> files_;
  std::string current_;  ///< empty: none
  std::uint32_t position_ = 0;
};

}  // namespace platform

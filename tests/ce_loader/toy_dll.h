// Devices with a small DLL on them, for the loader's tests.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>

#include "ce/kernel.h"
#include "loader/mapped_image.h"
#include "support/device_test.h"

namespace test {

/// The bytes of toy.dll, converted from what the linker has left. Made once in a process.
[[nodiscard]] const std::string& ToyDll();

/// The same file with another word at offset `at`, and the checksum that it then should have.
[[nodiscard]] std::string WithWord(std::string dll, std::size_t at, std::uint32_t word);

/// A device with the toy, as "\toy.dll", and the loader for it.
class ToyTest : public DeviceTest {
 protected:
  ToyTest();
  ~ToyTest() override;

  /// What the loader is told from now on.
  static void LoadWith(const loader::Options& options);
  /// Loads the toy. @return its module, null when it is refused
  HMODULE Load();
  /// A function of the loaded toy. The test ends when there is none.
  template <typename Kind>
  Kind* Find(const char16_t* name) {
    return reinterpret_cast<Kind*>(FindAny(name));
  }

  HMODULE module_ = nullptr;

 private:
  loader::Function FindAny(const char16_t* name);
};

}  // namespace test

// A DLL's image in memory: placed, relocated, bound to the functions that it imports, protected.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "loader/gates.h"
#include "tools/elf2pe/pe_reader.h"

namespace loader {

/// Where an image goes and how it is entered.
struct Options {
  /// Nothing: where the image was linked for, or anywhere when that place is taken. 0: anywhere.
  std::optional<std::uint32_t> base;
  /// Every function of the DLL that is called from outside runs with a stack pointer of 4 modulo 8.
  bool misaligned = false;
};

/// Options that the environment gives: ORVENIX_CE_BASE, a number as in C, and
/// ORVENIX_CE_MISALIGNED, anything but empty or "0".
[[nodiscard]] Options OptionsFromEnvironment();

class MappedImage {
 public:
  /// Functions that the host does not have are bound to a gate that ends the program when it is
  /// called.
  /// @throws elf2pe::Refusal when the image cannot be placed
  MappedImage(const elf2pe::PeImage& image, const Options& options);
  ~MappedImage();
  MappedImage(const MappedImage&) = delete;
  MappedImage& operator=(const MappedImage&) = delete;

  [[nodiscard]] std::uint32_t base() const;
  [[nodiscard]] std::uint32_t size() const { return size_; }
  /// The function or variable at `rva`, which lies in the image.
  [[nodiscard]] Function At(std::uint32_t rva) const;

 private:
  void Bind(const elf2pe::PeImage& image, bool misaligned);
  void Protect(const elf2pe::PeImage& image) const;

  std::uint32_t size_;
  char* base_;
  std::vector<std::string> missing_;  ///< what the gates to nothing say
  Gates imports_;
};

}  // namespace loader

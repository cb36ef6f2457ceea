#include "loader/mapped_image.h"

#include <sys/mman.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string>
#include <system_error>
#include <utility>

#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/refusal.h"

namespace loader {
namespace {

using elf2pe::Hex;
using elf2pe::PeImage;
using elf2pe::Refusal;

/// @return null when the host has no room there
char* Reserve(std::uint32_t base, std::uint32_t size) {
  void* const wanted = reinterpret_cast<void*>(std::uintptr_t{base});
  void* const got = mmap(wanted, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (got == MAP_FAILED) return nullptr;
  if (base == 0 || got == wanted) return static_cast<char*>(got);
  munmap(got, size);
  return nullptr;
}

char* Place(const PeImage& image, const Options& options) {
  constexpr std::uint32_t kAnywhere = 0;
  const std::uint32_t base = options.base.value_or(image.image_base);
  if (base % elf2pe::pe::kSectionAlignment != 0) {
    throw Refusal("no image begins at " + Hex(base) + ", within a page");
  }
  char* place = Reserve(base, image.image_size);
  if (place == nullptr && !options.base) place = Reserve(kAnywhere, image.image_size);
  if (place == nullptr) {
    throw Refusal("there is no room for " + Hex(image.image_size) + " bytes at " + Hex(base));
  }
  return place;
}

}  // namespace

Options OptionsFromEnvironment() {
  Options options;
  const char* const base = std::getenv("ORVENIX_CE_BASE");
  if (base != nullptr && *base != '\0') {
    char* end = nullptr;
    options.base = static_cast<std::uint32_t>(std::strtoul(base, &end, 0));
    if (*end != '\0') throw Refusal("ORVENIX_CE_BASE is no address: " + std::string(base));
  }
  const char* const misaligned = std::getenv("ORVENIX_CE_MISALIGNED");
  options.misaligned =
      misaligned != nullptr && *misaligned != '\0' && std::strcmp(misaligned, "0") != 0;
  return options;
}

MappedImage::MappedImage(const PeImage& image, const Options& options)
    : size_(image.image_size), base_(Place(image, options)) {
  const std::string memory = elf2pe::MemoryImage(image, base());
  std::memcpy(base_, memory.data(), size_);
  Bind(image, options.misaligned);
  Protect(image);
  __builtin___clear_cache(base_, base_ + size_);
}

MappedImage::~MappedImage() {
  munmap(base_, size_);
}

std::uint32_t MappedImage::base() const {
  return static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(base_));
}

Function MappedImage::At(std::uint32_t rva) const {
  return reinterpret_cast<Function>(base_ + rva);
}

void MappedImage::Bind(const PeImage& image, bool misaligned) {
  std::vector<Gate> gates;
  std::vector<std::uint32_t> slots;
  std::vector<std::pair<std::size_t, std::string>> missing;
  for (const elf2pe::PeImportedDll& dll : image.imports) {
    for (const elf2pe::PeImport& import : dll.functions) {
      const HostFunction* const host = FindHostFunction(dll.name, import.name);
      if (host != nullptr) {
        gates.push_back(
            {Gate::Kind::kOut, misaligned ? host->misaligned : host->function, nullptr});
      } else {
        missing.emplace_back(gates.size(), import.name + " of " + dll.name);
        gates.push_back({Gate::Kind::kMissing, nullptr, nullptr});
      }
      slots.push_back(import.slot);
    }
  }
  for (auto& [gate, name] : missing) missing_.push_back(std::move(name));
  for (std::size_t i = 0; i < missing.size(); ++i) {
    gates[missing[i].first].name = missing_[i].c_str();
  }
  imports_ = Gates(gates);
  for (std::size_t i = 0; i < slots.size(); ++i) {
    const Function gate = imports_.At(i);
    std::memcpy(base_ + slots[i], &gate, sizeof gate);
  }
}

void MappedImage::Protect(const PeImage& image) const {
  const auto protect = [](char* begin, std::size_t size, int protection) {
    if (mprotect(begin, size, protection) == 0) return;
    throw std::system_error(errno, std::generic_category(), "protecting the image");
  };
  protect(base_, size_, PROT_READ);
  for (const elf2pe::PeSection& section : image.sections) {
    int protection = PROT_READ;
    if ((section.characteristics & elf2pe::pe::kExecute) != 0) protection |= PROT_EXEC;
    if ((section.characteristics & elf2pe::pe::kWrite) != 0) protection |= PROT_WRITE;
    protect(base_ + section.rva, section.virtual_size, protection);
  }
}

}  // namespace loader

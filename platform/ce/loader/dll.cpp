#include "loader/dll.h"

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <string>
#include <system_error>

#include "loader/host_callbacks.h"
#include "text/names.h"
#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/refusal.h"

namespace loader {
namespace {

constexpr std::string_view kSetCallbacks = "IcfgSetCallbacks";

}  // namespace

std::string ReadDllFile(const std::filesystem::path& file) {
  std::error_code error;
  const std::uintmax_t size = std::filesystem::file_size(file, error);
  if (error) throw elf2pe::Refusal("it cannot be read: " + error.message());
  if (size > elf2pe::pe::kMaxImageSize) throw elf2pe::Refusal("it is too large for a DLL");
  std::string bytes(static_cast<std::size_t>(size), '\0');
  std::ifstream stream(file, std::ios::binary);
  stream.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
  if (!stream) throw elf2pe::Refusal("it cannot be read");
  return bytes;
}

Dll::Dll(const std::filesystem::path& file, const Options& options)
    : misaligned_(options.misaligned) {
  const std::string bytes = ReadDllFile(file);
  elf2pe::PeImage image = elf2pe::ReadPe(bytes);
  image_ = std::make_unique<MappedImage>(image, options);
  entry_ = image.entry;
  exports_ = std::move(image.exports);
}

Function Dll::Way(std::uint32_t rva) const {
  Function const function = image_->At(rva);
  return misaligned_ ? LastingGate(Gate::Kind::kMisaligned, function) : function;
}

bool Dll::Enter(HMODULE module, DWORD reason) {
  using Entry = BOOL (*)(HINSTANCE instance, DWORD reason, void* reserved);
  return reinterpret_cast<Entry>(Way(entry_))(module, reason, nullptr) != FALSE;
}

FARPROC Dll::Find(std::u16string_view name) const {
  const std::string wanted = sim::ToHostText(name);
  const auto found =
      std::lower_bound(exports_.begin(), exports_.end(), wanted,
                       [](const elf2pe::PeExport& a, const std::string& b) { return a.name < b; });
  if (found == exports_.end() || found->name != wanted) return nullptr;
  Function way = Way(found->rva);
  if (misaligned_ && wanted == kSetCallbacks) way = CallbacksThroughGates(way);
  return reinterpret_cast<FARPROC>(way);
}

sim::LibraryReader DllReader(const Options& options) {
  return [options](const std::filesystem::path& file) -> std::unique_ptr<sim::LibraryCode> {
    try {
      return std::make_unique<Dll>(file, options);
    } catch (const elf2pe::Refusal& refusal) {
      std::fprintf(stderr, "ce_loader: %s: %s\n", file.c_str(), refusal.what());
    } catch (const std::system_error& error) {
      std::fprintf(stderr, "ce_loader: %s: %s\n", file.c_str(), error.what());
    }
    return nullptr;
  };
}

}  // namespace loader

#include "ce_loader/toy_dll.h"

#include <stdexcept>
#include <utility>

#include "library/library_code.h"
#include "loader/dll.h"
#include "support/device_files.h"
#include "tools/elf2pe/convert.h"
#include "tools/elf2pe/fields.h"
#include "tools/elf2pe/pe_format.h"
#include "tools/elf2pe/pe_writer.h"

namespace test {
namespace {

std::size_t ChecksumField() {
  return elf2pe::DosPart().size() + 4 + elf2pe::SizeInFile<elf2pe::pe::FileHeader>() +
         elf2pe::pe::kChecksumOffset;
}

}  // namespace

const std::string& ToyDll() {
  static const std::string dll = [] {
    elf2pe::DllOptions options;
    options.name = "toy.dll";
    options.exports = elf2pe::ReadExportList(loader::ReadDllFile(ORVENIX_TOY_EXPORTS));
    return elf2pe::Convert(elf2pe::ReadLinkedImage(loader::ReadDllFile(ORVENIX_TOY_ELF)), options);
  }();
  return dll;
}

std::string WithWord(std::string dll, std::size_t at, std::uint32_t word) {
  elf2pe::SetWord(dll, at, word);
  const std::size_t field = ChecksumField();
  elf2pe::SetWord(dll, field, elf2pe::PeChecksum(dll, field));
  return dll;
}

ToyTest::ToyTest() {
  LoadWith(loader::OptionsFromEnvironment());
  PutFile("\\toy.dll", ToyDll());
}

ToyTest::~ToyTest() {
  if (module_ != nullptr) FreeLibrary(module_);
  sim::SetLibraryReader({});
}

void ToyTest::LoadWith(const loader::Options& options) {
  sim::SetLibraryReader(loader::DllReader(options));
}

HMODULE ToyTest::Load() {
  module_ = LoadLibraryW(u"\\toy.dll");
  return module_;
}

loader::Function ToyTest::FindAny(const char16_t* name) {
  const FARPROC function = GetProcAddressW(module_, name);
  if (function == nullptr) throw std::runtime_error("the toy lacks a function");
  return reinterpret_cast<loader::Function>(function);
}

}  // namespace test

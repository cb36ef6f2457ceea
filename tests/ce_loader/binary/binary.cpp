#include "ce_loader/binary/binary.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <stdexcept>
#include <string>

#include "loader/dll.h"
#include "text/names.h"
#include "tools/elf2pe/elf_reader.h"
#include "tools/elf2pe/pe_format.h"

namespace {

/// A thunk: which export it stands for, and where it jumps.
struct Thunk {
  const char* name;
  loader::Function* slot;
};

}  // namespace

extern "C" const Thunk loader_exports[];  // closed by a record of zeros

namespace {

/// No module of a device has this number.
const HMODULE kModule = reinterpret_cast<HMODULE>(0x00E00000);

class LoadedBinary {
 public:
  LoadedBinary()
      : dll_(ORVENIX_CE_DLL, loader::OptionsFromEnvironment()),
        elf_bytes_(loader::ReadDllFile(ORVENIX_CE_ELF)),
        elf_(elf2pe::ReadElf(elf_bytes_)) {
    if (!dll_.Enter(kModule, DLL_PROCESS_ATTACH)) throw std::runtime_error("it refuses");
    for (const Thunk* thunk = loader_exports; thunk->name != nullptr; ++thunk) {
      const std::string name = thunk->name;
      const FARPROC function = dll_.Find(std::u16string(name.begin(), name.end()));
      if (function == nullptr) throw std::runtime_error("it does not export " + name);
      *thunk->slot = reinterpret_cast<loader::Function>(function);
    }
  }

  [[nodiscard]] void* Variable(std::string_view name) const {
    const auto is_it = [name](const elf2pe::ElfSymbol& symbol) { return symbol.name == name; };
    const auto found = std::find_if(elf_.symbols.begin(), elf_.symbols.end(), is_it);
    if (found == elf_.symbols.end() ||
        std::find_if(found + 1, elf_.symbols.end(), is_it) != elf_.symbols.end()) {
      throw std::runtime_error("there is no one symbol " + std::string(name));
    }
    return reinterpret_cast<void*>(
        reinterpret_cast<std::uintptr_t>(dll_.image().At(found->value - elf2pe::pe::kImageBase)));
  }

 private:
  loader::Dll dll_;
  const std::string elf_bytes_;
  const elf2pe::ElfImage elf_;
};

[[noreturn]] void End(const std::exception& problem) {
  std::fprintf(stderr, "%s: %s\n", ORVENIX_CE_DLL, problem.what());
  std::exit(1);
}

const LoadedBinary& Loaded() {
  try {
    // As old as the process: its threads may outlive everything else here.
    static const LoadedBinary* const loaded = new LoadedBinary;
    return *loaded;
  } catch (const std::exception& problem) {
    End(problem);
  }
}

// Before main, and so once for the processes of all tests
[[maybe_unused]] const LoadedBinary& kLoaded = Loaded();

}  // namespace

void* binary::Variable(std::string_view name) {
  try {
    return Loaded().Variable(name);
  } catch (const std::exception& problem) {
    End(problem);
  }
}

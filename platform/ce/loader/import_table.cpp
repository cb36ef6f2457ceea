#include "loader/import_table.h"

#include <algorithm>

namespace loader {
namespace {

char Lower(char letter) {
  return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

bool SameLibrary(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](char x, char y) { return Lower(x) == Lower(y); });
}

}  // namespace

const HostFunction* FindHostFunction(std::string_view library, std::string_view name) {
  const HostFunction* const end = kHostFunctions + kHostFunctionCount;
  const HostFunction* const found =
      std::find_if(kHostFunctions, end, [&](const HostFunction& function) {
        return function.name == name && SameLibrary(function.library, library);
      });
  return found != end ? found : nullptr;
}

}  // namespace loader

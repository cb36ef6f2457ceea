#include "upgrade/registry_tests.h"

#include <coredll.h>

#include "base/number.h"
#include "base/text.h"
#include "device/handle.h"
#include "device/wide_text.h"
#include "report/log/log.h"

namespace upgrade {
namespace {

using report::Log;

constexpr char kTypeText[] = "REG_SZ";
constexpr char kTypeNumber[] = "REG_DWORD";

/// The registry's value under test.
struct Value {
  static constexpr DWORD kTextBytes = 512;

  DWORD type = 0;
  DWORD size = 0;  ///< bytes
  DWORD number = 0;
  WCHAR text[kTextBytes / sizeof(WCHAR)] = {};  ///< need not be terminated
};

/// Leaves `root` as it is for a name that is none.
void ReadRoot(std::string_view name, HKEY* root) noexcept {
  if (name == "HKEY_LOCAL_MACHINE") *root = HKEY_LOCAL_MACHINE;
  if (name == "HKEY_CURRENT_USER") *root = HKEY_CURRENT_USER;
  if (name == "HKEY_CLASSES_ROOT") *root = HKEY_CLASSES_ROOT;
  if (name == "HKEY_USERS") *root = HKEY_USERS;
}

/// Every field of a test fits, whoever has left out its terminator.
using FieldText = device::WideText<sizeof(tagRegistryTest::key) + 1>;

bool OpenKey(HKEY root, std::string_view path, device::RegistryKey* key) noexcept {
  FieldText name;
  return name.Assign(path) &&
         RegOpenKeyExW(root, name.c_str(), 0, KEY_READ, key->Receive()) == ERROR_SUCCESS;
}

bool Query(HKEY key, const tagRegistryTest& test, Value* value) noexcept {
  FieldText name;
  if (!name.Assign(base::FieldView(test.value_name))) return false;
  const bool as_number = base::FieldView(test.type) == kTypeNumber;
  value->size = as_number ? static_cast<DWORD>(sizeof value->number) : Value::kTextBytes;
  BYTE* const data =
      as_number ? reinterpret_cast<BYTE*>(&value->number) : reinterpret_cast<BYTE*>(value->text);
  return RegQueryValueExW(key, name.c_str(), nullptr, &value->type, data, &value->size) ==
         ERROR_SUCCESS;
}

constexpr int Order(std::uint32_t a, std::uint32_t b) noexcept {
  return a < b ? -1 : a > b ? 1 : 0;
}

/// By their bytes, and always -1, 0 or 1: what a library's comparison gives for texts that differ
/// by more than one would decide about the exact comparisons of Holds.
int Order(std::string_view a, std::string_view b) noexcept {
  for (std::size_t i = 0; i < a.size() && i < b.size(); ++i) {
    const int order = Order(static_cast<std::uint8_t>(a[i]), static_cast<std::uint8_t>(b[i]));
    if (order != 0) return order;
  }
  return Order(static_cast<std::uint32_t>(a.size()), static_cast<std::uint32_t>(b.size()));
}

/// KEPT ODDITY: "LT" and "GT" ask for exactly -1 and 1 while the others ask for a sign, and letter
/// case counts in all of them.
constexpr bool Holds(std::string_view operation, int order) noexcept {
  if (operation == "EQ") return order == 0;
  if (operation == "NEQ") return order != 0;
  if (operation == "LT") return order == -1;
  if (operation == "LTE") return order <= 0;
  if (operation == "GT") return order == 1;
  if (operation == "GTE") return order >= 0;
  return false;
}

bool NumberHolds(const tagRegistryTest& test, const Value& value) noexcept {
  if (value.size != sizeof value.number) return false;  // a damaged registry
  const std::uint32_t expected = base::LeadingNumber(base::FieldView(test.value));
  return Holds(base::FieldView(test.operation),
               Order(static_cast<std::uint32_t>(value.number), expected));
}

bool TextHolds(const tagRegistryTest& test, const Value& value) noexcept {
  constexpr std::size_t kMostBytesAUnit = 4;
  device::NarrowText<Value::kTextBytes / sizeof(WCHAR) * kMostBytesAUnit + 1> text;
  const DWORD size = value.size < Value::kTextBytes ? value.size : Value::kTextBytes;
  const base::WideView units(value.text, size / sizeof(WCHAR));
  if (!text.Assign(base::Part(units, 0, units.find(WCHAR{})))) return false;
  return Holds(base::FieldView(test.operation), Order(text.view(), base::FieldView(test.value)));
}

bool Passes(const tagRegistryTest& test, HKEY root) noexcept {
  device::RegistryKey key;
  if (!OpenKey(root, base::FieldView(test.key), &key)) {
    Log("Orvenix - PerformTests - No such key\r\n");
    return false;
  }
  Value value;
  if (!Query(key.get(), test, &value)) {
    Log("Orvenix - PerformTests - No such valuename\r\n");
    return false;
  }
  const std::string_view type = base::FieldView(test.type);
  if (value.type == REG_DWORD) return type == kTypeNumber && NumberHolds(test, value);
  if (value.type == REG_SZ) return type == kTypeText && TextHolds(test, value);
  Log("Orvenix - PerformTests - Unsupported reg type\r\n");
  return false;
}

void Report(std::string_view message, char* failure_text, std::size_t size) noexcept {
  Log("Orvenix - PerformTests - failed test\r\n");
  if (failure_text == nullptr || size == 0) return;
  base::CopyText<char>(failure_text, size, message);
  Log("%s\r\n", failure_text);
}

}  // namespace

bool PerformTests(const UpgradeConfig& job, char* failure_text, std::size_t size) noexcept {
  Log("PerformTests - %d\r\n", static_cast<int>(job.RegistryTests().size()));
  if (job.RegistryTests().incomplete()) {
    // Nobody knows what the lost one would have asked for: better no upgrade than a wrong one.
    Report({}, failure_text, size);
    return false;
  }
  HKEY root = HKEY_LOCAL_MACHINE;
  for (const tagRegistryTest* test : job.RegistryTests()) {
    if (test == nullptr) {
      Log("PerformTests - invalid registry item pointer\r\n");
      continue;
    }
    ReadRoot(base::FieldView(test->root), &root);
    if (!Passes(*test, root)) {
      Report(base::FieldView(test->error_message), failure_text, size);
      return false;
    }
  }
  return true;
}

}  // namespace upgrade

#include "driver/drivers.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "ce/errors.h"
#include "ce/system.h"
#include "device/device.h"
#include "driver/disk_driver.h"
#include "driver/flash_driver.h"
#include "locale/code_pages.h"
#include "profile/profile.h"
#include "registry/registry.h"

namespace sim {
namespace {

constexpr std::size_t kPrefixLength = 3;
constexpr std::size_t kNameLength = kPrefixLength + 2;  // with the number and the colon
constexpr std::int32_t kNumbers = 10;

bool IsDigit(WCHAR c) {
  return c >= u'0' && c <= u'9';
}

WCHAR Capital(WCHAR c) {
  return c >= u'a' && c <= u'z' ? static_cast<WCHAR>(c - u'a' + u'A') : c;
}

bool IsNameCharacter(WCHAR c) {
  const WCHAR capital = Capital(c);
  return IsDigit(c) || (capital >= u'A' && capital <= u'Z');
}

std::u16string Capitals(std::u16string_view text) {
  std::u16string capitals(text);
  std::transform(capitals.begin(), capitals.end(), capitals.begin(), Capital);
  return capitals;
}

/// The text of a REG_SZ value, up to its terminator.
bool ReadText(const Registry& registry, HKEY key, const WCHAR* name, std::u16string& text) {
  RegistryValue value;
  if (registry.Query(key, name, value) != ERROR_SUCCESS || value.type != REG_SZ) return false;
  text.resize(value.data.size() / sizeof(WCHAR));
  if (!text.empty()) std::memcpy(text.data(), value.data.data(), text.size() * sizeof(WCHAR));
  text.resize(std::min(text.find(u'\0'), text.size()));
  return true;
}

bool ReadNumber(const Registry& registry, HKEY key, const WCHAR* name, std::uint32_t& number) {
  RegistryValue value;
  if (registry.Query(key, name, value) != ERROR_SUCCESS || value.type != REG_DWORD ||
      value.data.size() != sizeof number) {
    return false;
  }
  std::memcpy(&number, value.data.data(), sizeof number);
  return true;
}

}  // namespace

/// What a handle of CreateFileW stands for.
class Drivers::Opened final : public KernelObject {
 public:
  explicit Opened(std::weak_ptr<Loaded> loaded) : loaded_(std::move(loaded)) {}
  /// Null once the driver is gone.
  [[nodiscard]] std::shared_ptr<Loaded> loaded() const { return loaded_.lock(); }

 private:
  std::weak_ptr<Loaded> loaded_;
};

Drivers::Drivers(Device& device) : device_(device) {
  SetLibrary(u"eflashdrv.dll", [](Device& on) { return std::make_shared<FlashDriver>(on); });
  const Profile& profile = device.profile();
  if (profile.disk_generation == 0) return;
  AddBuiltIn(u"DSK0:",
             std::make_shared<DiskDriver>(profile.disk_generation, profile.disk_capacity));
}

Drivers::~Drivers() = default;

void Drivers::SetLibrary(std::u16string_view dll, Factory factory) {
  const World::Lock lock = device_.world().Acquire();
  libraries_[Capitals(dll)] = std::move(factory);
}

void Drivers::AddBuiltIn(std::u16string_view name, std::shared_ptr<StreamDriver> driver) {
  const World::Lock lock = device_.world().Acquire();
  built_in_.push_back(std::make_shared<Loaded>(Loaded{Capitals(name), std::move(driver)}));
}

std::vector<std::string> Drivers::Names() const {
  const World::Lock lock = device_.world().Acquire();
  std::vector<std::string> names;
  for (const auto& loaded : built_in_) names.push_back(ToUtf8(loaded->name));
  for (const auto& [handle, loaded] : activated_) names.push_back(ToUtf8(loaded->name));
  std::sort(names.begin(), names.end());
  return names;
}

void Drivers::Restart() {
  World::Lock lock = device_.world().Acquire();
  restart_requested_ = true;
  for (;;) device_.world().Block(lock, {&end_}, std::nullopt);
}

bool Drivers::restart_requested() const {
  const World::Lock lock = device_.world().Acquire();
  return restart_requested_;
}

bool Drivers::IsDeviceName(const WCHAR* name) {
  if (name == nullptr) return false;
  for (std::size_t i = 0; i < kPrefixLength; ++i) {
    if (!IsNameCharacter(name[i])) return false;
  }
  return IsDigit(name[kPrefixLength]) && name[kPrefixLength + 1] == u':' && name[kNameLength] == 0;
}

DWORD Drivers::Describe(const WCHAR* key, Description& description) const {
  if (key == nullptr) return ERROR_INVALID_PARAMETER;
  Registry& registry = device_.registry();
  HKEY opened = nullptr;
  const DWORD error = registry.Open(HKEY_LOCAL_MACHINE, key, opened);
  if (error != ERROR_SUCCESS) return error;
  const bool described = ReadText(registry, opened, u"Dll", description.dll) &&
                         ReadText(registry, opened, u"Prefix", description.prefix);
  std::uint32_t index = 0;
  if (ReadNumber(registry, opened, u"Index", index) && index < kNumbers) {
    description.index = static_cast<std::int32_t>(index);
  }
  registry.Close(opened);
  if (!described) return ERROR_FILE_NOT_FOUND;
  const std::u16string& prefix = description.prefix;
  const bool valid =
      prefix.size() == kPrefixLength && std::all_of(prefix.begin(), prefix.end(), IsNameCharacter);
  return valid ? ERROR_SUCCESS : ERROR_INVALID_PARAMETER;
}

std::shared_ptr<Drivers::Loaded> Drivers::Find(std::u16string_view name) const {
  for (const auto& loaded : built_in_) {
    if (loaded->name == name) return loaded;
  }
  for (const auto& [handle, loaded] : activated_) {
    if (loaded->name == name) return loaded;
  }
  return nullptr;
}

std::u16string Drivers::FreeName(const Description& description) const {
  const bool any = description.index < 0;
  for (std::int32_t step = 1; step <= kNumbers; ++step) {
    const std::int32_t number = any ? step % kNumbers : description.index;
    std::u16string name = Capitals(description.prefix);
    name += static_cast<WCHAR>(u'0' + number);
    name += u':';
    if (Find(name) == nullptr) return name;
    if (!any) break;
  }
  return {};
}

DWORD Drivers::Activate(const WCHAR* key, HANDLE& handle) {
  Description description;
  const DWORD error = Describe(key, description);
  if (error != ERROR_SUCCESS) return error;
  const World::Lock lock = device_.world().Acquire();
  const auto library = libraries_.find(Capitals(description.dll));
  if (library == libraries_.end() || !library->second) return ERROR_FILE_NOT_FOUND;
  std::u16string name = FreeName(description);
  if (name.empty()) return ERROR_ALREADY_EXISTS;
  // The object only gives the driver its number: a handle of it means nothing to other calls.
  handle = device_.handles().Add(std::make_shared<KernelObject>());
  activated_[handle] = std::make_shared<Loaded>(Loaded{std::move(name), library->second(device_)});
  return ERROR_SUCCESS;
}

DWORD Drivers::Deactivate(HANDLE handle) {
  const World::Lock lock = device_.world().Acquire();
  if (activated_.erase(handle) == 0) return ERROR_INVALID_HANDLE;
  device_.handles().Remove(handle);
  return ERROR_SUCCESS;
}

DWORD Drivers::Open(const WCHAR* name, HANDLE& opened) {
  const World::Lock lock = device_.world().Acquire();
  const std::shared_ptr<Loaded> loaded = Find(Capitals(name));
  if (loaded == nullptr) return ERROR_DEV_NOT_EXIST;
  opened = device_.handles().Add(std::make_shared<Opened>(loaded));
  return ERROR_SUCCESS;
}

DWORD Drivers::Control(HANDLE opened, DriverRequest& request) {
  std::shared_ptr<StreamDriver> driver;
  {
    const World::Lock lock = device_.world().Acquire();
    const std::shared_ptr<Opened> device = device_.handles().FindAs<Opened>(opened);
    const std::shared_ptr<Loaded> loaded = device == nullptr ? nullptr : device->loaded();
    if (loaded == nullptr) return ERROR_INVALID_HANDLE;
    driver = loaded->driver;
  }
  return driver->Control(request);
}

}  // namespace sim

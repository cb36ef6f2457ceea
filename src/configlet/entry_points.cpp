// The functions that the host calls.
#include <cstdint>
#include <cstring>
#include <string_view>

#include "base/text.h"
#include "configlet/fields.h"
#include "configlet/groups.h"
#include "configlet/result.h"
#include "configlet/version/version.h"
#include "configlet/walk.h"
#include "orvenix/configlet.h"
#include "report/log/log.h"
#include "report/messages/host_callbacks.h"

namespace {

using configlet::IcfgResult;

constexpr std::uint32_t kInterfaceVersion = 2;
constexpr std::uint32_t kSchemaMajor = 1;
constexpr std::uint32_t kSchemaMinor = 0;
constexpr std::uint32_t kNoFurtherInstance = 1;

const char* TextOrEmpty(const char* text) noexcept {
  return text != nullptr ? text : "";
}

std::uint32_t Answer(IcfgResult result) noexcept {
  return static_cast<std::uint32_t>(result);
}

void Store(std::uint32_t* out, std::uint32_t value) noexcept {
  if (out != nullptr) *out = value;
}

}  // namespace

std::uint32_t IcfgGetInterfaceVersion() noexcept {
  return kInterfaceVersion;
}

std::uint32_t IcfgGetSchemaVersion(std::uint32_t /*unused*/, std::uint32_t* major,
                                   std::uint32_t* minor) noexcept {
  Store(major, kSchemaMajor);
  Store(minor, kSchemaMinor);
  return Answer(IcfgResult::kOk);
}

std::uint32_t IcfgInitialize() noexcept {
  configlet::TheWalk().group.Clear();
  configlet::WriteVersionFiles();
  return Answer(IcfgResult::kOk);
}

std::uint32_t IcfgSetCallbacks(std::uintptr_t context, const IcfgCallbacks* table) noexcept {
  report::SetHostCallbacks({context, table});
  return Answer(IcfgResult::kOk);
}

std::uint32_t IcfgBeginGroup(const char* name, std::uint32_t /*unused*/,
                             std::uint32_t mode) noexcept {
  const char* const text = TextOrEmpty(name);
  configlet::Walk& walk = configlet::TheWalk();
  walk.group.Assign(text);  // also a name that is refused below
  report::Log("IcfgBeginGroup - %s\r\n", text);
  const configlet::GroupRow* const row = configlet::FindGroup(text);
  if (row == nullptr) return Answer(IcfgResult::kUnknownName);
  return Answer(row->begin != nullptr ? row->begin(walk, mode) : IcfgResult::kOk);
}

std::uint32_t IcfgSetField(const char* name, std::uint32_t /*unused*/, const char* value) noexcept {
  const char* const text = TextOrEmpty(value);
  report::Log("IcfgSetField - %s, %s\r\n", TextOrEmpty(name), text);
  const configlet::FieldRow* const row = configlet::FindField(TextOrEmpty(name));
  if (row == nullptr) return Answer(IcfgResult::kUnknownName);
  const configlet::WalkLock lock;
  row->apply(configlet::TheWalk(), text);
  return Answer(IcfgResult::kOk);
}

std::uint32_t IcfgGetField(const char* name, std::uint32_t /*unused*/, std::uint32_t /*unused*/,
                           char* text, std::uint32_t* length) noexcept {
  constexpr std::string_view kAnswered = "Protocol Version";
  constexpr std::string_view kVersion = configlet::kVersionText;
  const std::string_view asked = TextOrEmpty(name);
  if (!base::EqualIgnoringCase(base::Part(kAnswered, 0, asked.size()), asked)) {
    return Answer(IcfgResult::kUnknownName);
  }
  report::Log("Getting MCFTP Version\r\n");
  if (text != nullptr) std::memcpy(text, kVersion.data(), kVersion.size() + 1);
  Store(length, static_cast<std::uint32_t>(kVersion.size()));
  report::Log("MCFTP Version = %s\r\n", kVersion.data());
  return Answer(IcfgResult::kOk);
}

std::uint32_t IcfgEndGroup(const char* name, std::uint32_t /*unused*/,
                           std::uint32_t /*unused*/) noexcept {
  const configlet::GroupRow* const row = configlet::FindGroup(TextOrEmpty(name));
  if (row == nullptr || row->end == nullptr) return Answer(IcfgResult::kOk);
  return Answer(row->end(configlet::TheWalk()));
}

std::uint32_t IcfgGetFirstInstance(std::uint32_t /*unused*/, char* name) noexcept {
  if (name != nullptr) *name = '\0';
  return Answer(IcfgResult::kOk);
}

std::uint32_t IcfgGetNextInstance() noexcept {
  return kNoFurtherInstance;
}

std::uint32_t IcfgUninitialize() noexcept {
  return Answer(IcfgResult::kOk);
}

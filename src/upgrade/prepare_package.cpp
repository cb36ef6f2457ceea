#include "upgrade/prepare_package.h"

#include <coredll.h>

#include "device/file.h"
#include "device/local_memory.h"
#include "device/mapped_file.h"
#include "device/wide_text.h"
#include "upgrade/package/cabinet.h"
#include "upgrade/package/setup_file.h"

namespace upgrade {
namespace {

constexpr std::uint32_t kProtecting =
    FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN | FILE_ATTRIBUTE_SYSTEM;

/// @return kNameOrRegistry also when there was no such key: nothing was installed then.
PackageResult ForgetInstallation(const SetupFile::RegistryKey& key) noexcept {
  device::WideText<SetupFile::RegistryKey::capacity()> name;
  // An empty name would mean the root itself.
  if (!name.Assign(key.view())) return PackageResult::kNameOrRegistry;
  const bool deleted = RegDeleteKeyW(HKEY_LOCAL_MACHINE, name.c_str()) == ERROR_SUCCESS;
  return deleted ? PackageResult::kDone : PackageResult::kNameOrRegistry;
}

void Unprotect(device::File& files, const char* path) noexcept {
  const std::uint32_t mask = files.GetAttributes(path);
  if (mask == INVALID_FILE_ATTRIBUTES || (mask & FILE_ATTRIBUTE_DIRECTORY) != 0) return;
  if ((mask & kProtecting) != 0) files.SetAttributes(path, mask & ~kProtecting);
}

/// @param before  what came of the step before, for the case that not one file can be looked at
PackageResult UnprotectFiles(const SetupFile& setup, PackageResult before) noexcept {
  EntryIndex files(setup.stored(), setup.files());
  EntryIndex strings(setup.stored(), setup.strings());
  const std::uint32_t file_count = files.table().count;
  const std::uint32_t file_slots = files.SlotsFor(file_count);
  const std::uint32_t string_slots = strings.SlotsFor(0xFFFF);
  const auto slots = device::LocalBlock<std::uint32_t>::Allocate(file_slots + string_slots);
  if (!slots) return before == PackageResult::kDone ? PackageResult::kCannotRead : before;
  files.Build(slots.get(), file_slots);
  strings.Build(slots.get() + file_slots, string_slots);

  // KEPT ODDITY: files are numbered from 1 by most packages and from 0 by some, so one number more
  // is tried than there are files. One that does not exist is passed over.
  device::File file_system;
  PackageResult result = PackageResult::kDone;
  for (std::uint32_t id = 0; id <= file_count; ++id) {
    InstalledPath path;
    result = setup.ReadPath(id, files, strings, &path);
    if (result == PackageResult::kDone) Unprotect(file_system, path.c_str());
  }
  return result;
}

}  // namespace

PackageResult PreparePackage(const char* cabinet) noexcept {
  const device::MappedFile file(cabinet);
  if (!file.is_open()) return PackageResult::kCannotOpen;
  StoredFile stored;
  PackageResult result = FindSetupFile(file.bytes(), &stored);
  if (result != PackageResult::kDone) return result;
  const SetupFile setup(stored);
  SetupFile::RegistryKey key;
  result = setup.ReadKey(&key);
  if (result != PackageResult::kDone) return result;
  // The files are prepared whatever comes of the key.
  return UnprotectFiles(setup, ForgetInstallation(key));
}

}  // namespace upgrade

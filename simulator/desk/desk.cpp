#include "desk/desk.h"

#include <exception>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>

#include "device/device.h"
#include "profile/profile.h"
#include "world/world.h"

namespace fs = std::filesystem;

namespace {

constexpr const char* kProfileFile = "device.profile";

sim::Profile ProfileOf(const fs::path& folder) {
  sim::Profile profile;
  std::string error;
  const fs::path file = folder / kProfileFile;
  if (fs::exists(file) && !sim::LoadProfile(file, profile, error)) throw std::runtime_error(error);
  return profile;
}

void Tell(const char* text, char* reason, std::size_t size) noexcept {
  if (reason == nullptr || size == 0) return;
  std::size_t length = 0;
  for (; text[length] != 0 && length + 1 < size; ++length) reason[length] = text[length];
  reason[length] = 0;
}

}  // namespace

/// The members end from the last to the first.
struct CesimDevice {
  explicit CesimDevice(const fs::path& folder)
      : world(sim::World::MakeReal()), device(*world, ProfileOf(folder), folder), program(device) {}

  std::unique_ptr<sim::World> world;
  sim::Device device;
  sim::AttachedThread program;
};

CesimDevice* CesimBegin(const char* folder, char* reason, std::size_t size) noexcept {
  try {
    const fs::path path = fs::absolute(folder);
    fs::create_directories(path);
    return new CesimDevice(path);
  } catch (const std::exception& error) {
    Tell(error.what(), reason, size);
    return nullptr;
  }
}

void CesimEnd(CesimDevice* device) noexcept {
  delete device;
}

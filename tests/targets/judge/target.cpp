#include "targets/judge/target.h"

#include <stdlib.h>

#include <cstdlib>
#include <fstream>
#include <stdexcept>
#include <system_error>

#include "targets/judge/files.h"

namespace targets {
namespace {

namespace fs = std::filesystem;

constexpr const char* kHurry = "20";
const fs::path kBuilds = ORVENIX_BUILDS;
const fs::path kSources = ORVENIX_SOURCES;

std::string Missing(std::initializer_list<fs::path> files, const std::string& advice) {
  for (const fs::path& file : files) {
    if (!fs::exists(file)) return file.string() + " is not there: " + advice;
  }
  return "";
}

bool HasProgram(const std::string& name) {
  return std::system(("command -v " + name + " >/dev/null").c_str()) == 0;
}

/// A handheld without a past, but for the library.
void MakeDevice(const fs::path& run, const fs::path& library) {
  fs::create_directories(run / "device/storage");
  WriteFile(run / "device/device.profile", "");
  fs::copy_file(library, run / "device/storage/orvenix.dll");
}

class Linux final : public Target {
 public:
  [[nodiscard]] std::string name() const override { return "linux"; }
  [[nodiscard]] std::string WhyNot() const override { return ""; }
  [[nodiscard]] std::vector<std::string> Command(const fs::path& run) const override {
    MakeDevice(run, ORVENIX_LINUX_LIBRARY);
    return {ORVENIX_LINUX_HOST, (run / "device").string(), kHurry};
  }
};

class Device final : public Target {
 public:
  [[nodiscard]] std::string name() const override { return "device"; }
  [[nodiscard]] std::string WhyNot() const override {
    if (!HasProgram("qemu-arm")) return "qemu-arm is missing (Debian package qemu-user)";
    return Missing({host_, library_}, "./test ce ce-loader-build makes it");
  }
  [[nodiscard]] std::vector<std::string> Command(const fs::path& run) const override {
    MakeDevice(run, library_);
    // A caller on the device has no reason to align its stack to more than 4 bytes.
    ::setenv("ORVENIX_CE_MISALIGNED", "1", 1);
    return {"qemu-arm", host_.string(), (run / "device").string(), kHurry};
  }

 private:
  const fs::path host_ = kBuilds / "ce-loader/bin/target_host";
  const fs::path library_ = kBuilds / "ce/orvenix.dll";
};

/// Each run has a prefix of its own, because its server owns the sockets of all its programs and
/// so must live in the run's network. It shares the files of the common one and has its own
/// registry and drives.
class Windows final : public Target {
 public:
  [[nodiscard]] std::string name() const override { return "windows"; }
  [[nodiscard]] std::string WhyNot() const override {
    if (!Runs("--why-not")) return "Wine is missing (Debian package wine64)";
    return Missing({host_, library_}, "./test windows makes it");
  }
  void Prepare() const override {
    if (!Runs("--prepare")) {
      throw std::runtime_error("no Wine prefix could be made");
    }
  }
  [[nodiscard]] std::vector<std::string> Command(const fs::path& run) const override {
    MakeDevice(run, library_);
    const fs::path prefix = run / "prefix";
    if (!Runs("--branch '" + prefix.string() + "'")) {
      throw std::runtime_error("no Wine prefix could be made");
    }
    ::setenv("ORVENIX_WINE_PREFIX", prefix.c_str(), 1);
    return {"python3",   kSources / "scripts/wine_run.py",
            "--folder",  run / "device/storage",
            "--timeout", "100",
            host_};
  }
  void TidyUp(const fs::path& run) const override {
    static_cast<void>(Runs("--stop"));
    std::error_code ignored;
    fs::rename(run / "device/storage/messages", run / "device/messages", ignored);
    fs::rename(run / "device/storage/Flash", run / "device/flash", ignored);
    std::string left_behind;  // by the server, where it talks to its programs
    std::ifstream(run / "prefix/wineserver") >> left_behind;
    if (left_behind.rfind("wine-", 0) == 0) {
      fs::remove_all(fs::temp_directory_path() / left_behind, ignored);
    }
    fs::remove_all(run / "prefix", ignored);
  }

 private:
  /// Has the script that knows Wine do something.
  static bool Runs(const std::string& what) {
    const std::string script = (kSources / "scripts/wine_run.py").string();
    return std::system(("python3 '" + script + "' " + what + " >/dev/null 2>&1").c_str()) == 0;
  }

  const fs::path host_ = kBuilds / "windows/bin/target_host.exe";
  const fs::path library_ = kBuilds / "windows/bin/orvenix.dll";
};

}  // namespace

const Target& LinuxTarget() {
  static const Linux target;
  return target;
}

const Target& DeviceTarget() {
  static const Device target;
  return target;
}

const Target& WindowsTarget() {
  static const Windows target;
  return target;
}

}  // namespace targets

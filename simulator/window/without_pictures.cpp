// What stands in for the picture libraries in a build without them.
#ifndef CESIM_PICTURES

#include "window/font.h"
#include "window/image.h"

namespace sim {
namespace {

constexpr const char* kWithout =
    "this build of the simulator has no pictures (configure it with -DCESIM_PICTURES=ON)";

}  // namespace

std::unique_ptr<Font> MakeSystemFont() {
  return MakeBitmapFont();
}

bool HavePictures() {
  return false;
}

bool WritePng(const Image&, const std::filesystem::path& file, std::string& error) {
  error = "cannot write the picture " + file.string() + ": " + kWithout;
  return false;
}

bool ReadPng(const std::filesystem::path& file, Image&, std::string& error) {
  error = "cannot read the picture " + file.string() + ": " + kWithout;
  return false;
}

}  // namespace sim

#endif

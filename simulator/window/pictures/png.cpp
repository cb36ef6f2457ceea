// PNG files through libpng's simple interface.
#include <png.h>

#include <cstring>

#include "window/image.h"

namespace sim {
namespace {

constexpr std::uint32_t kLargestSide = 16384;

std::string Say(const std::filesystem::path& file, const char* what, const png_image& png) {
  return "cannot " + std::string(what) + " the picture " + file.string() + ": " + png.message;
}

}  // namespace

bool HavePictures() {
  return true;
}

bool WritePng(const Image& image, const std::filesystem::path& file, std::string& error) {
  png_image png = {};
  png.version = PNG_IMAGE_VERSION;
  png.width = static_cast<png_uint_32>(image.width);
  png.height = static_cast<png_uint_32>(image.height);
  png.format = PNG_FORMAT_RGB;
  if (png_image_write_to_file(&png, file.c_str(), 0, image.rgb.data(), 0, nullptr) != 0)
    return true;
  error = Say(file, "write", png);
  return false;
}

bool ReadPng(const std::filesystem::path& file, Image& image, std::string& error) {
  png_image png = {};
  png.version = PNG_IMAGE_VERSION;
  if (png_image_begin_read_from_file(&png, file.c_str()) == 0) {
    error = Say(file, "read", png);
    return false;
  }
  if (png.width > kLargestSide || png.height > kLargestSide) {
    png_image_free(&png);
    error = "cannot read the picture " + file.string() + ": it is too large";
    return false;
  }
  png.format = PNG_FORMAT_RGB;
  Image read(static_cast<int>(png.width), static_cast<int>(png.height), 0);
  if (png_image_finish_read(&png, nullptr, read.rgb.data(), 0, nullptr) == 0) {
    error = Say(file, "read", png);
    return false;
  }
  image = std::move(read);
  return true;
}

}  // namespace sim

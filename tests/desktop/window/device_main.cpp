// usage: simulated_window <state> <picture.ppm> <seven sizes of the font>
//
// What the simulated device shows in the same state, with a font of the sizes of another one: the
// window's lines and bars stand where the font's sizes put them.
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>

#include "device/device.h"
#include "profile/profile.h"
#include "window/font.h"
#include "window/screen.h"
#include "window/window_system.h"
#include "world/sim_thread.h"
#include "world/world.h"
// Last: the platform's header renames some of the build machine's names.
#include "state.h"

namespace {

class ResizedFont final : public sim::Font {
 public:
  explicit ResizedFont(const sim::FontMetrics& metrics) : metrics_(metrics) {}
  [[nodiscard]] const sim::FontMetrics& metrics() const override { return metrics_; }
  const sim::Glyph& GlyphOf(char16_t unit) override { return letters_->GlyphOf(unit); }

 private:
  sim::FontMetrics metrics_;
  std::unique_ptr<sim::Font> letters_ = sim::MakeSystemFont();
};

void Write(const sim::Image& picture, const char* path) {
  std::ofstream file(path, std::ios::binary);
  file << "P6 " << picture.width << ' ' << picture.height << " 255\n";
  file.write(reinterpret_cast<const char*>(picture.rgb.data()),
             static_cast<std::streamsize>(picture.rgb.size()));
}

}  // namespace

int main(int count, char** arguments) {
  if (count != 10) return 2;
  const auto size = [arguments](int index) { return std::atoi(arguments[index]); };
  const std::filesystem::path folder =
      std::filesystem::path(arguments[2]).replace_extension("device");
  const std::unique_ptr<sim::World> world = sim::World::MakeVirtual();
  sim::Device device(*world, sim::Profile{}, folder);
  device.screen().system().SetFont(std::make_unique<ResizedFont>(
      sim::FontMetrics{size(3), size(4), size(5), size(6), size(7), size(8), size(9)}));
  const sim::AttachedThread program(device, "window test");
  window_test::ShowState(arguments[1]);
  Sleep(1);
  Write(device.screen().Snapshot(), arguments[2]);
  report::CloseProgressWindow();
  return 0;
}

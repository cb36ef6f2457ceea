#pragma once

namespace sim {

class Device;

class Screen {
 public:
  explicit Screen(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

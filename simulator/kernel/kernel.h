#pragma once

namespace sim {

class Device;

class Kernel {
 public:
  explicit Kernel(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

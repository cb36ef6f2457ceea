#pragma once

namespace sim {

class Device;

class Power {
 public:
  explicit Power(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

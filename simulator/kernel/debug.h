#pragma once

namespace sim {

class Device;

class Debug {
 public:
  explicit Debug(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

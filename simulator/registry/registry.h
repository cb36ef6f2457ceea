#pragma once

namespace sim {

class Device;

class Registry {
 public:
  explicit Registry(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

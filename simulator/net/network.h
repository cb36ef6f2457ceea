#pragma once

namespace sim {

class Device;

class Network {
 public:
  explicit Network(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

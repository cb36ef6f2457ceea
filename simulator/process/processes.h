#pragma once

namespace sim {

class Device;

class Processes {
 public:
  explicit Processes(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

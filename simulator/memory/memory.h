#pragma once

namespace sim {

class Device;

class Memory {
 public:
  explicit Memory(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

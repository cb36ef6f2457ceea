#pragma once

namespace sim {

class Device;

class Storage {
 public:
  explicit Storage(Device& device) : device_(device) {}

 private:
  [[maybe_unused]] Device& device_;
};

}  // namespace sim

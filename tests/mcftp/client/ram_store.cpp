// Compiled like the product, which has no run-time type information for its classes.
#include "mcftp/client/ram_store.h"

#include <algorithm>

#include "device/file.h"

namespace test {

RamStore* ram_store = nullptr;

namespace {

class RamFile final : public device::File {
 public:
  RamFile() noexcept { ++ram_store->files; }
  ~RamFile() override { --ram_store->files; }
  bool OpenForWriting(const char* name, bool /*keep*/, std::uint32_t size) noexcept override {
    ram_store->opened = name;
    ram_store->size = size;
    return !ram_store->refuses;
  }
  bool Close() noexcept override { return true; }
  bool Write(const void* data, std::uint32_t length) noexcept override {
    std::string& content = ram_store->content;
    content.resize(std::max<std::size_t>(content.size(), at_ + length));
    std::copy_n(static_cast<const char*>(data), length, content.begin() + at_);
    return true;
  }
  bool Seek(std::uint32_t offset) noexcept override {
    at_ = offset;
    return true;
  }
  bool Flush() noexcept override { return true; }
  bool GetSize(std::uint32_t* size) noexcept override {
    *size = static_cast<std::uint32_t>(ram_store->content.size());
    return true;
  }
  // A store keeps neither times nor attributes.
  bool SetTime(device::TimeKind /*kind*/, const FILETIME& /*time*/) noexcept override {
    return false;
  }
  bool SetTime(device::TimeKind /*kind*/, const SYSTEMTIME& /*time*/) noexcept override {
    return false;
  }
  bool SetAttributes(const char* /*name*/, std::uint32_t /*mask*/) noexcept override {
    return false;
  }

 private:
  std::uint32_t at_ = 0;
};

}  // namespace

device::File* MakeRamFile(const char* name) {
  ram_store->made = name;
  return new RamFile;
}

}  // namespace test

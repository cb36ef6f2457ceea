// Files mapped into memory.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <set>

#include "ce/files.h"
#include "kernel/handle_table.h"

namespace sim {

class Device;
class Mappings;
class OpenFile;

/// A mapping and its file's content. The content is a block of its own of exactly the mapped size,
/// so that the sanitizers see a step past the end; what a program writes into it reaches the file
/// when a writable view is unmapped. World's lock held throughout.
class Mapping final : public KernelObject {
 public:
  struct Source {
    std::shared_ptr<OpenFile> file;  ///< null: memory only
    bool writable = false;
    std::size_t size = 0;  ///< bytes, not 0
  };
  Mapping(Device& device, Source source);
  ~Mapping() override;

  /// Reads the content. @return an error number, 0 for success.
  DWORD Load();
  /// From now on closing the mapping closes this handle, too.
  void OwnHandle(HANDLE file) { file_handle_ = file; }
  [[nodiscard]] char* content() { return content_.get(); }
  [[nodiscard]] std::size_t size() const { return source_.size; }
  [[nodiscard]] bool can_write() const { return source_.writable; }
  /// Writes the content back into the file.
  void Store();
  /// Gives up the file: the device ends.
  void Detach();

 private:
  Device* device_;  ///< null after Detach
  Source source_;
  HANDLE file_handle_ = nullptr;
  std::unique_ptr<char[]> content_;
};

/// The mappings of a device and their views. World's lock held, except for Detach and open_views.
class Mappings {
 public:
  struct View {
    std::shared_ptr<Mapping> mapping;
    bool writable = false;
  };
  void AddView(const void* address, View view) { views_.emplace(address, std::move(view)); }
  /// @return the view that began there, with no mapping when none did.
  View RemoveView(const void* address);
  void Add(Mapping& mapping) { mappings_.insert(&mapping); }
  void Remove(Mapping& mapping) { mappings_.erase(&mapping); }
  void DetachAll();
  [[nodiscard]] std::size_t views() const { return views_.size(); }

 private:
  std::multimap<const void*, View> views_;
  std::set<Mapping*> mappings_;
};

}  // namespace sim

// A device's files.
//
// They lie in `storage/` of the device's folder: what the device calls \Windows\a.exe is
// storage/Windows/a.exe, with the names in UTF-8. Beside it, `storage.attributes` holds what the
// host cannot: attributes and times (see FileRecords). Whatever is put into `storage/` by other
// means is found by the device too, as an archive file with the host's time; while the device runs,
// Recount says how much room it takes.
#pragma once

#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "ce/files.h"
#include "memory/space.h"
#include "storage/device_path.h"
#include "storage/file_records.h"
#include "storage/folder_names.h"
#include "storage/host_folder.h"
#include "storage/mapping.h"
#include "storage/open_file.h"
#include "storage/parked_files.h"
#include "storage/shared_parts.h"
#include "storage/streams.h"
#include "storage/unique_fd.h"
#include "storage/volume.h"

namespace sim {

class Device;

/// Attributes that a program can give a file; ROM files come with the device.
inline constexpr DWORD kSettableAttributes = FILE_ATTRIBUTE_READONLY | FILE_ATTRIBUTE_HIDDEN |
                                             FILE_ATTRIBUTE_SYSTEM | FILE_ATTRIBUTE_ARCHIVE |
                                             FILE_ATTRIBUTE_TEMPORARY;

/// Where a path of the device leads.
struct Location {
  Volume* volume = nullptr;
  UniqueFd owned_folder;
  int folder = -1;                 ///< the host's folder that holds the entry, or would
  std::string folder_path;         ///< below `storage/`, with a "/" at its end unless empty
  std::u16string leaf;             ///< the last name as asked for
  std::optional<HostEntry> entry;  ///< what is there
  bool volume_root = false;        ///< the path names the root or a volume's folder, card in or not
  bool closed = false;             ///< the path ended with a backslash

  /// The entry's path below `storage/`.
  [[nodiscard]] std::string path() const;
};

/// One walk over a folder's entries, in a fixed order. Entries that vanish meanwhile are left out.
class Search final : public KernelObject {
 public:
  Search(Location where, std::vector<std::u16string> found)
      : location(std::move(where)), names(std::move(found)) {}
  Location location;  ///< of the pattern
  std::vector<std::u16string> names;
  std::size_t next = 0;
};

class Storage {
 public:
  /// Opens the device's folder, making what is missing of it.
  /// @throws std::runtime_error with the path and the reason.
  explicit Storage(Device& device);
  /// Closes what the device's programs have left open.
  ~Storage();
  Storage(const Storage&) = delete;
  Storage& operator=(const Storage&) = delete;

  // ---- for tests and tools; any thread ----

  /// Sets all attributes of a file or folder, FILE_ATTRIBUTE_INROM included, which no program can.
  /// @return an error number, 0 for success.
  DWORD SetAllAttributes(const WCHAR* name, DWORD attributes);
  /// Puts a card in or takes it out. Its files stay in the device's folder; open ones answer
  /// ERROR_NOT_READY. @return false when the profile names no such volume.
  bool SetVolumePresent(const WCHAR* name, bool present);
  /// Counts what every volume holds anew, after somebody else has changed `storage/`.
  void Recount();
  /// Says what this device and others are about to receive: files made or written from now on that
  /// have bytes of `content` at the same place take no room on the host for them. HostPath and Copy
  /// put them there after all; the device's end does not.
  void ShareContent(SharedContent content);
  /// The host's path of an existing file or folder.
  [[nodiscard]] std::optional<std::filesystem::path> HostPath(const WCHAR* name);
  [[nodiscard]] bool Exists(const WCHAR* name) { return HostPath(name).has_value(); }
  /// Files that are open, by a handle, a stream or a mapping.
  [[nodiscard]] std::size_t open_files() const;

  // ---- for the API functions; error numbers, 0 for success ----

  struct OpenRequest {
    const WCHAR* name = nullptr;
    OpenFile::Mode mode;
    DWORD disposition = 0;
    DWORD attributes = 0;  ///< of a new file
  };
  /// @param existed  whether the file had been there before
  DWORD Open(const OpenRequest& request, std::shared_ptr<OpenFile>& file, bool& existed);
  DWORD Delete(const WCHAR* name);
  DWORD Move(const WCHAR* from, const WCHAR* to);
  /// Copies content, attributes and the time of writing. A copy that does not fit changes nothing.
  DWORD Copy(const WCHAR* from, const WCHAR* to, bool fail_if_exists);
  DWORD CreateFolder(const WCHAR* name);
  DWORD RemoveFolder(const WCHAR* name);
  DWORD GetAttributes(const WCHAR* name, DWORD& attributes);
  DWORD SetAttributes(const WCHAR* name, DWORD attributes);
  DWORD FindFirst(const WCHAR* pattern, std::shared_ptr<Search>& search, WIN32_FIND_DATAW& data);
  DWORD FindNext(Search& search, WIN32_FIND_DATAW& data);
  /// Answers for any path on a volume, whether or not it exists there. A name in the root that is
  /// neither file, folder nor volume is taken for a volume that the device does not have.
  DWORD FreeSpace(const WCHAR* name, Space::Figures& room);

  [[nodiscard]] Streams& streams() { return streams_; }
  [[nodiscard]] Mappings& mappings() { return mappings_; }

  /// Keeps a file's record on the host when it has changed. The node's lock is held.
  void Keep(FileNode& node);
  /// Keeps it, and all other files' records, now. The node's lock is held.
  void Flush(FileNode& node);
  void Close(OpenFile& file);

 private:
  using Hold = std::lock_guard<std::mutex>;

  void ReadProfile();
  void MakeVolumeFolder(const Volume& volume);
  [[nodiscard]] Volume* VolumeNamed(std::u16string_view name) const;
  /// Counts the bytes on every volume, naming each entry's path below `storage/`.
  void Count(const std::function<void(const std::string&)>& seen);
  static std::uint64_t CountFolder(int folder, const std::string& path, int depth,
                                   const std::function<void(const std::string&)>& seen);

  // With the storage's lock held:
  DWORD Locate(const WCHAR* name, Location& location);
  DWORD LocateParsed(const DevicePath& path, Location& location);
  /// The record of an entry, or the one that a stranger's file gets.
  [[nodiscard]] FileRecord RecordOf(const Location& location) const;
  void SetRecord(const Location& location, const FileRecord& record);
  [[nodiscard]] static DWORD ShownAttributes(const Location& location, const FileRecord& record);
  DWORD ChangeAttributes(const WCHAR* name, DWORD attributes, DWORD settable);
  bool Describe(Search& search, const std::u16string& name, WIN32_FIND_DATAW& data);
  /// The node of a file that is open, null for any other.
  [[nodiscard]] std::shared_ptr<FileNode> FindNode(const HostEntry& entry) const;
  [[nodiscard]] bool OpenBelow(const std::string& path) const;
  [[nodiscard]] DWORD CheckOpen(const OpenRequest& request, const Location& location) const;
  DWORD OpenHost(const OpenRequest& request, Location& location, UniqueFd& fd);
  std::shared_ptr<FileNode> EnterNode(const Location& location);
  DWORD MakeFresh(FileNode& node, int fd, const OpenRequest& request);
  DWORD Unlink(const Location& location);
  /// Writes what the entry has of the shared content to the host.
  void PutSharedParts(const Location& location);
  [[nodiscard]] DWORD CheckMove(const Location& from, const Location& to) const;
  [[nodiscard]] DWORD CheckCopy(const Location& from, const Location& to,
                                bool fail_if_exists) const;
  DWORD CopyTo(const Location& from, Location& to);

  Device& device_;
  std::filesystem::path folder_;
  UniqueFd root_fd_;
  std::unique_ptr<FileRecords> records_;
  std::vector<std::unique_ptr<Volume>> volumes_;  ///< the root first
  mutable std::mutex mutex_;
  FolderNames folder_names_;
  ParkedFiles parked_;
  using NodeKey = std::pair<std::uint64_t, std::uint64_t>;  ///< device and inode
  std::map<NodeKey, std::weak_ptr<FileNode>> nodes_;
  SharedContent shared_content_;  ///< null: none
  std::map<NodeKey, std::shared_ptr<SharedParts>> shared_parts_;
  std::set<OpenFile*> open_files_;
  Streams streams_;
  Mappings mappings_;
};

}  // namespace sim

// One upgrade job: where the files come from, which they are, what to clean, test, stop and start.
#pragma once

#include <cstddef>
#include <cstdint>
#include <new>
#include <type_traits>

#include "orvenix/export.h"
#include "orvenix/pointer_list.h"

namespace orvenix {

/// The platform's 16-bit text unit: what its header calls WCHAR.
using WideChar = std::conditional_t<sizeof(wchar_t) == 2, wchar_t, char16_t>;

class ConfigurationReader;  // fills a job from a configuration file

}  // namespace orvenix

/// One file to fetch. Made with LocalAlloc and zeroed; all texts are zero-terminated.
struct tagDownloadFile {  // NOLINT(readability-identifier-naming): callers know this name
  char source[260];       ///< path or name on the server
  char destination[260];  ///< path on the device
  char crc[32];           ///< expected CRC-32 as text, unsigned decimal
  char masks[2008];       ///< which devices want it by multicast, separated by blanks or ';'
  char work_area[40];     ///< kept for callers that count on the record's size; always zero
  char size[32];          ///< bytes as text, empty when unknown
};

/// Space that must be free in one store. Made with LocalAlloc.
struct tagStorageReq {      // NOLINT(readability-identifier-naming): callers know this name
  char name[260];           ///< the store's folder, or "RAM:"
  char required_space[32];  ///< bytes as decimal text
};

/// One registry test. Made with LocalAlloc and zeroed.
struct tagRegistryTest {  // NOLINT(readability-identifier-naming): callers know this name
  char root[260];         ///< "HKEY_LOCAL_MACHINE", ...
  char key[260];
  char value_name[260];
  char value[260];  ///< what the registry's value is compared with
  char type[24];
  char error_message[256];  ///< reported when the test fails
  char operation[12];       ///< how the two values are compared
};

/// One package of operating-system firmware. Made with new, which like a job's gives null when
/// there is no memory.
struct FirmwarePackage {
  std::int32_t count = 0;  ///< image files
  char base[256] = {};     ///< leading part of their names
  char destination_folder[256] = {};
  char source_folder[256] = {};
  char command_line[256] = {};
  char additional_parameters[256] = {};

  static void* operator new(std::size_t size) noexcept;
  static void* operator new(std::size_t size, const std::nothrow_t& tag) noexcept;
  static void operator delete(void* package) noexcept;
  static void operator delete(void* package, const std::nothrow_t& tag) noexcept;
};

static_assert(sizeof(tagDownloadFile) == 2632 && sizeof(tagStorageReq) == 292 &&
                  sizeof(tagRegistryTest) == 1332 && sizeof(FirmwarePackage) == 1284,
              "outside callers allocate these records by their size");

/// One upgrade job and the identity of the device that carries it out.
///
/// Getters of texts point into the record. Setters cut a text that is longer than its field (the
/// field's size less one for the terminating zero, given as [n] below); a null text counts as
/// empty. No operation reports a failure: what cannot be listed for want of memory is freed, and
/// the list says that it is incomplete().
///
/// Nothing here locks. One thread fills a job and hands it to StartUpgradeThread, which then owns
/// it; until then it belongs to whoever made it.
class ORVENIX_EXPORT UpgradeConfig {
 public:
  /// The defaults, with empty lists, and the device's identity. Allocates nothing but a few bytes
  /// of stack; asks the platform for the identity once a process.
  UpgradeConfig() noexcept;

  /// A copy has the same texts and numbers and lists the same elements: both records then own them,
  /// so only one of the two may be destroyed.
  UpgradeConfig(const UpgradeConfig& other) noexcept;

  /// The same. Elements that this record listed before are not freed, because a copy may own them.
  UpgradeConfig& operator=(const UpgradeConfig& other) noexcept;

  /// Frees every element of every list and the multicast file list, each once however often it was
  /// added.
  ~UpgradeConfig();

  /// Records live in LocalAlloc memory, whichever form of `new` makes them. @return null when there
  /// is none.
  static void* operator new(std::size_t size) noexcept;
  static void* operator new(std::size_t size, const std::nothrow_t& /*tag*/) noexcept {
    return operator new(size);
  }
  static void operator delete(void* record) noexcept;
  static void operator delete(void* record, const std::nothrow_t& /*tag*/) noexcept {
    operator delete(record);
  }

  /// Reads serial number, manufacturing string, type, model, family and unique id from the device;
  /// what it does not tell stays empty. Sets the flash size to "0".
  void GetDeviceInfo() noexcept;

  // ---- transfer ----
  [[nodiscard]] int GetXferPacketSize() const noexcept;  ///< bytes per file read or write, 4096

  // ---- HTTP server ----
  [[nodiscard]] int GetHTTPPort() const noexcept;  ///< 80 unless set
  void SetHTTPPort(int port) noexcept;
  [[nodiscard]] const char* GetHTTPIPAddress() const noexcept;
  void SetHTTPIPAddress(const char* address) noexcept;  ///< [24]
  [[nodiscard]] const char* GetBaseURL() const noexcept;
  void SetBaseURL(const char* url) noexcept;  ///< [256]

  // ---- multicast ----
  [[nodiscard]] const char* GetMCIp() const noexcept;
  void SetMCIp(const char* address) noexcept;  ///< group address [24]
  [[nodiscard]] const char* GetMCEncryptionKey() const noexcept;
  void SetMCEncryptionKey(const char* key) noexcept;    ///< [256]
  [[nodiscard]] int GetMulticastPort() const noexcept;  ///< UDP port, 0 unless set
  void SetMulticastPort(int port) noexcept;
  [[nodiscard]] int GetMulticastBlockSize() const noexcept;  ///< bytes, 4096 unless set
  void SetMulticastBlockSize(int bytes) noexcept;
  [[nodiscard]] const char* GetMCProcessParms() const noexcept;
  void SetMCProcessParms(const char* parameters) noexcept;  ///< client's command line [260]
  /// The one record of a multicast transfer, null when there is none.
  [[nodiscard]] tagDownloadFile* GetMCFileList() const noexcept;
  /// Takes `list` over. An earlier one is not freed.
  void AddMCFileList(tagDownloadFile* list) noexcept;

  // ---- what runs afterwards ----
  [[nodiscard]] const char* GetProcessName() const noexcept;
  void SetProcessName(const char* program) noexcept;  ///< [260]
  [[nodiscard]] const char* GetProcessParms() const noexcept;
  void SetProcessParms(const char* command_line) noexcept;  ///< [260]
  /// Adds a blank and `text` to the process parameters; a null text adds nothing.
  void AppendFlashWriterParms(const char* text) noexcept;
  [[nodiscard]] int GetProcessWait() const noexcept;  ///< 1: the program's end is waited for
  void SetProcessWait(int wait) noexcept;

  // ---- display and reports ----
  [[nodiscard]] int GetShowGUI() const noexcept;  ///< 1: the progress window is shown
  void SetShowGUI(int show) noexcept;
  [[nodiscard]] const char* GetSysLogIP() const noexcept;
  void SetSysLogIP(const char* address) noexcept;    ///< [32]
  [[nodiscard]] int GetSysLogPort() const noexcept;  ///< 0..65535, 0: no syslog
  void SetSysLogPort(int port) noexcept;             ///< keeps the low 16 bits
  [[nodiscard]] const char* GetUpgBeginMsg() const noexcept;
  void SetUpgBeginMsg(const char* text) noexcept;  ///< [64]
  [[nodiscard]] const char* GetUpgEndMsg() const noexcept;
  void SetUpgEndMsg(const char* text) noexcept;  ///< [64]

  // ---- configuration file ----
  /// Adds what an upgrade configuration file says, in the order of the file: lists grow, other
  /// values are replaced. Only a base URL that is set already stays. docs/formats/configuration.md
  /// describes the file; texts longer than their field are cut.
  ///
  /// The file is "\windows\<name>" or, when there is no such file, "\Flash File Store\<name>". The
  /// one in "\windows" is deleted afterwards, even when it could not be opened or understood.
  ///
  /// @param name  converted with the device's code page; null counts as empty. A path of more than
  ///   259 characters cannot be opened.
  /// @return 0 when the file cannot be opened, otherwise 1. That is also the answer when what could
  ///   be read is malformed, or there is no memory for its elements, which adds nothing; and when
  ///   there is no memory for its bytes, which adds nothing and deletes nothing. A list that there
  ///   was no memory for the whole of says that it is incomplete.
  int LoadFromFile(const orvenix::WideChar* name) noexcept;

  /// Writes what the job holds, line by line and cut at 4095 characters, to the library's
  /// diagnostic output. A release has none: nothing happens there.
  void DumpData() const noexcept;

  [[nodiscard]] const char* GetVersion() const noexcept;
  [[nodiscard]] const char* GetFlashFileStore() const noexcept;
  void SetFlashFileStore(const char* folder) noexcept;  ///< [64]
  [[nodiscard]] const char* GetFlashFileFolder() const noexcept;
  [[nodiscard]] const char* GetINFFileSrc() const noexcept;
  [[nodiscard]] const char* GetINFFile() const noexcept;
  [[nodiscard]] int GetDownloadLoopCount() const noexcept;
  [[nodiscard]] int GetFirmwarePackageCount() const noexcept;  ///< seen, selected or not
  [[nodiscard]] int IsMultiPass() const noexcept;  ///< 1: a selected package names a pass

  // ---- the device ----
  [[nodiscard]] const char* GetSerialNumber() const noexcept;
  [[nodiscard]] const char* GetUniqueId() const noexcept;
  [[nodiscard]] const char* GetMfgString() const noexcept;
  [[nodiscard]] const char* GetType() const noexcept;
  [[nodiscard]] const char* GetFamily() const noexcept;
  [[nodiscard]] const char* GetModel() const noexcept;
  [[nodiscard]] const char* GetFlash() const noexcept;

  // ---- lists ----
  // Add...(text) keeps a copy. Add...(pointer) takes the record over, LocalAlloc's unless said
  // otherwise; adding one twice lists it twice. A null pointer is listed as null.
  void AddFileSave(const char* path) noexcept;
  void AddFileDelete(const char* path) noexcept;
  void AddStopProcess(const char* program) noexcept;
  void AddDownloadFile(tagDownloadFile* file) noexcept;
  void AddFirmwarePkg(FirmwarePackage* package) noexcept;  ///< made with new
  void AddStorageReqEntry(tagStorageReq* requirement) noexcept;
  void AddRegistryTest(tagRegistryTest* test) noexcept;

  [[nodiscard]] const orvenix::PointerList<FirmwarePackage>& FirmwarePackages() const noexcept;
  [[nodiscard]] const orvenix::PointerList<tagDownloadFile>& DownloadFiles() const noexcept;
  [[nodiscard]] const orvenix::PointerList<tagStorageReq>& StorageRequirements() const noexcept;
  [[nodiscard]] const orvenix::PointerList<char>& FilesToDelete() const noexcept;
  [[nodiscard]] const orvenix::PointerList<char>& FilesToSave() const noexcept;
  [[nodiscard]] const orvenix::PointerList<char>& ProcessesToStop() const noexcept;
  [[nodiscard]] const orvenix::PointerList<tagRegistryTest>& RegistryTests() const noexcept;

 private:
  friend class orvenix::ConfigurationReader;

  /// Everything but the lists, with the defaults of a new job.
  struct Fields {
    std::int32_t transfer_packet_size = 4096;
    std::int32_t http_port = 80;
    char http_address[24] = {};
    char base_url[256] = {};
    char multicast_address[24] = {};
    char multicast_key[256] = {};
    std::int32_t multicast_port = 0;
    std::int32_t multicast_block_size = 4096;
    char multicast_parameters[260] = {};
    char version[64] = {};
    char process_name[260] = {};
    std::int32_t process_wait = 1;
    char process_parameters[260] = {};
    char flash_file_store[64] = {};
    std::int32_t show_gui = 1;
    char syslog_address[32] = {};
    std::uint16_t syslog_port = 0;
    char manufacturing_string[32] = {};
    char serial_number[32] = {};
    char type[12] = {};
    char model[12] = {};
    char family[12] = {};
    char unique_id[64] = {};
    char flash[12] = {};
    char flash_file_folder[128] = {};
    char inf_source[260] = {};
    char inf_file[64] = {};
    char begin_message[64] = {};
    char end_message[64] = {};
    std::int32_t download_loop_count = 0;
    std::int32_t firmware_package_count = 0;
    std::int32_t multi_pass = 0;
    tagDownloadFile* multicast_list = nullptr;
  };

  Fields fields_;
  orvenix::PointerList<FirmwarePackage> firmware_packages_;
  orvenix::PointerList<tagDownloadFile> download_files_;
  orvenix::PointerList<tagStorageReq> storage_requirements_;
  orvenix::PointerList<char> files_to_delete_;
  orvenix::PointerList<char> files_to_save_;
  orvenix::PointerList<char> processes_to_stop_;
  orvenix::PointerList<tagRegistryTest> registry_tests_;
};

// One allocator for all records of a job, so that the job can free what its callers made.
inline void* FirmwarePackage::operator new(std::size_t size) noexcept {
  return UpgradeConfig::operator new(size);
}
inline void* FirmwarePackage::operator new(std::size_t size,
                                           const std::nothrow_t& /*tag*/) noexcept {
  return UpgradeConfig::operator new(size);
}
inline void FirmwarePackage::operator delete(void* package) noexcept {
  UpgradeConfig::operator delete(package);
}
inline void FirmwarePackage::operator delete(void* package,
                                             const std::nothrow_t& /*tag*/) noexcept {
  UpgradeConfig::operator delete(package);
}

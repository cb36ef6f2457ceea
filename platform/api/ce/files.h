// Files, folders, mappings and the C stream functions that the device has.
#pragma once

#include "ce/types.h"

inline constexpr DWORD GENERIC_READ = 0x80000000U;
inline constexpr DWORD GENERIC_WRITE = 0x40000000U;
inline constexpr DWORD FILE_SHARE_READ = 1;
inline constexpr DWORD FILE_SHARE_WRITE = 2;
inline constexpr DWORD CREATE_NEW = 1;
inline constexpr DWORD CREATE_ALWAYS = 2;
inline constexpr DWORD OPEN_EXISTING = 3;
inline constexpr DWORD OPEN_ALWAYS = 4;
inline constexpr DWORD TRUNCATE_EXISTING = 5;

inline constexpr DWORD FILE_ATTRIBUTE_READONLY = 0x1;
inline constexpr DWORD FILE_ATTRIBUTE_HIDDEN = 0x2;
inline constexpr DWORD FILE_ATTRIBUTE_SYSTEM = 0x4;
inline constexpr DWORD FILE_ATTRIBUTE_DIRECTORY = 0x10;
inline constexpr DWORD FILE_ATTRIBUTE_ARCHIVE = 0x20;
inline constexpr DWORD FILE_ATTRIBUTE_INROM = 0x40;
inline constexpr DWORD FILE_ATTRIBUTE_NORMAL = 0x80;
inline constexpr DWORD FILE_ATTRIBUTE_TEMPORARY = 0x100;
inline constexpr DWORD FILE_FLAG_WRITE_THROUGH = 0x80000000U;

inline constexpr DWORD INVALID_FILE_SIZE = 0xFFFFFFFFU;
inline constexpr DWORD INVALID_SET_FILE_POINTER = 0xFFFFFFFFU;
inline constexpr DWORD INVALID_FILE_ATTRIBUTES = 0xFFFFFFFFU;
inline constexpr DWORD FILE_BEGIN = 0;
inline constexpr DWORD FILE_CURRENT = 1;
inline constexpr DWORD FILE_END = 2;

inline constexpr DWORD PAGE_READONLY = 2;
inline constexpr DWORD PAGE_READWRITE = 4;
inline constexpr DWORD FILE_MAP_WRITE = 2;
inline constexpr DWORD FILE_MAP_READ = 4;

struct OVERLAPPED;

struct WIN32_FIND_DATAW {
  DWORD dwFileAttributes;
  FILETIME ftCreationTime;
  FILETIME ftLastAccessTime;
  FILETIME ftLastWriteTime;
  DWORD nFileSizeHigh;
  DWORD nFileSizeLow;
  DWORD dwOID;  // the device's own member; it lists no alternate name
  WCHAR cFileName[MAX_PATH];
};
static_assert(sizeof(WIN32_FIND_DATAW) == 560, "the device's layout");

/// A buffered stream, as `fopen` of the device gives it.
struct ce_FILE;

extern "C" {
HANDLE CreateFileW(const WCHAR* name, DWORD access, DWORD share, SECURITY_ATTRIBUTES* security,
                   DWORD disposition, DWORD attributes, HANDLE template_file);
BOOL ReadFile(HANDLE file, void* buffer, DWORD size, DWORD* read, OVERLAPPED* overlapped);
BOOL WriteFile(HANDLE file, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* overlapped);
DWORD SetFilePointer(HANDLE file, LONG distance, LONG* distance_high, DWORD method);
DWORD GetFileSize(HANDLE file, DWORD* size_high);
BOOL SetEndOfFile(HANDLE file);
BOOL FlushFileBuffers(HANDLE file);
BOOL GetFileTime(HANDLE file, FILETIME* creation, FILETIME* access, FILETIME* write);
BOOL SetFileTime(HANDLE file, const FILETIME* creation, const FILETIME* access,
                 const FILETIME* write);
BOOL DeleteFileW(const WCHAR* name);
BOOL MoveFileW(const WCHAR* from, const WCHAR* to);
BOOL CopyFileW(const WCHAR* from, const WCHAR* to, BOOL fail_if_exists);
BOOL CreateDirectoryW(const WCHAR* name, SECURITY_ATTRIBUTES* security);
BOOL RemoveDirectoryW(const WCHAR* name);
DWORD GetFileAttributesW(const WCHAR* name);
BOOL SetFileAttributesW(const WCHAR* name, DWORD attributes);
HANDLE FindFirstFileW(const WCHAR* pattern, WIN32_FIND_DATAW* data);
BOOL FindNextFileW(HANDLE search, WIN32_FIND_DATAW* data);
BOOL FindClose(HANDLE search);
BOOL GetDiskFreeSpaceExW(const WCHAR* folder, ULARGE_INTEGER* available, ULARGE_INTEGER* total,
                         ULARGE_INTEGER* total_free);
/// Opens a file for mapping; on the device only a file opened this way can be mapped.
HANDLE CreateFileForMappingW(const WCHAR* name, DWORD access, DWORD share,
                             SECURITY_ATTRIBUTES* security, DWORD disposition, DWORD attributes,
                             HANDLE template_file);
/// Takes over `file` on the device: closing the mapping closes the file.
HANDLE CreateFileMappingW(HANDLE file, SECURITY_ATTRIBUTES* security, DWORD protection,
                          DWORD size_high, DWORD size_low, const WCHAR* name);
void* MapViewOfFile(HANDLE mapping, DWORD access, DWORD offset_high, DWORD offset_low,
                    std::size_t size);
BOOL UnmapViewOfFile(const void* view);
/// Asks the driver behind an open device. `returned` is never null.
BOOL DeviceIoControl(HANDLE device, DWORD code, void* input, DWORD input_size, void* output,
                     DWORD output_size, DWORD* returned, OVERLAPPED* overlapped);

ce_FILE* ce_fopen(const char* name, const char* mode);
std::size_t ce_fwrite(const void* bytes, std::size_t size, std::size_t count, ce_FILE* stream);
int ce_fclose(ce_FILE* stream);
int ce_fflush(ce_FILE* stream);
/// The stream that the device calls `stdout`: its programs' console.
ce_FILE* ce_stdout();
/// What the device's library has in its place: standard input, output and errors by number from 0.
ce_FILE* _getstdfilex(int index);
/// What the device's library has in its place: standard input, output and errors by number from 0.
ce_FILE* _getstdfilex(int index);
}

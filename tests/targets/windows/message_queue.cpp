// "kx_clapi_dll", the device's message queue, for machines that have none: every message becomes a
// file in "\messages" of the current drive, named and numbered as the simulated device does it.
#define ORVENIX_DESKTOP_NAMES  // the system's own functions, not what stands in for a device's
#include <coredll.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>

namespace {

/// Who gets a message, or sends it: texts padded with zeros, which 16 characters fill.
struct Party {
  char name[16];
  char master[16];
};

std::string FieldText(const char (&field)[16]) {
  return {field, ::strnlen(field, sizeof field)};
}

LONG last_number = 0;

}  // namespace

#define QUEUE_EXPORT extern "C" __declspec(dllexport)

QUEUE_EXPORT std::int32_t lapi_open(HANDLE* connection, const char* /*host*/, const char* /*queue*/,
                                    std::int32_t, std::int32_t, std::int32_t, std::int32_t,
                                    std::uint32_t* /*options*/, std::int32_t) {
  *connection = reinterpret_cast<HANDLE>(std::uintptr_t{1});
  return 0;
}

QUEUE_EXPORT std::int32_t lapi_write(HANDLE /*connection*/, std::int32_t, std::int32_t,
                                     std::int32_t, std::int32_t, std::int32_t, Party* destination,
                                     Party* /*source*/, const char* text, std::int32_t length,
                                     std::int32_t, std::int32_t, std::int32_t,
                                     std::uint32_t* /*options*/) {
  const LONG number = InterlockedIncrement(&last_number);
  std::string who = FieldText(destination->name);
  if (destination->master[0] != '\0') who += '.' + FieldText(destination->master);
  char name[128];
  std::snprintf(name, sizeof name, "\\messages\\%06ld-%s.xml", number, who.c_str());
  CreateDirectoryW(TEXT("\\messages"), nullptr);
  HANDLE const file = CreateFileA(name, GENERIC_WRITE, 0, nullptr, CREATE_NEW, 0, nullptr);
  if (file == INVALID_HANDLE_VALUE) return -1;
  DWORD written = 0;
  WriteFile(file, text, static_cast<DWORD>(length - 1), &written, nullptr);
  CloseHandle(file);
  return 0;
}

QUEUE_EXPORT std::int32_t lapi_close(HANDLE /*connection*/) {
  return 0;
}

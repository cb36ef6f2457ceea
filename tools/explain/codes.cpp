// The system's numbers.
#include <iterator>

#include "tools/exit_codes.h"
#include "tools/explain/catalogue.h"

namespace tools {
namespace {

constexpr CodeRow kCodes[] = {
    // ---- results of the configlet's functions ----
    {CodeKind::kResult, 0x00000000, "ok", "done", ""},
    {CodeKind::kResult, 0x822B0003, "unknown-name",
     "the configlet knows no group or field of this name", "correct the name in the job"},
    {CodeKind::kResult, 0xC4111001, "upgrade-running",
     "\"Upgrade\" was begun while an upgrade is in progress", "wait for the end of the upgrade"},
    {CodeKind::kResult, 0xC4111002, "no-space",
     "the last storage requirement of the job is not met, or the job has none",
     "make room on the device, lower RequiredSpace, or add a storage requirement"},
    {CodeKind::kResult, 0xC4111003, "no-power",
     "neither line power nor a battery that is exactly high, low or charging",
     "put the device into its cradle"},
    {CodeKind::kResult, 0xC4111005, "test-failed", "a registry test of the job failed",
     "see the test's error message, the device's registry and the job's tests"},

    // ---- device events ----
    {CodeKind::kEvent, 205180, "upgrade-failed",
     "the upgrade failed or could not start; the event's text says why", "see the event's text"},
    {CodeKind::kEvent, 205181, "upgrade-started", "the upgrade thread has started", ""},
    {CodeKind::kEvent, 205182, "upgrade-complete",
     "the upgrade ended well; files that could not be brought do not count as a failure", ""},

    // ---- states of the ready-to-work status ----
    {CodeKind::kState, 1, "ended",
     "the upgrade has ended, or a registry test kept it from starting", "the reason says which"},
    {CodeKind::kState, 4, "upgrading", "an upgrade is in progress", ""},

    // ---- errors of the operating system ----
    {CodeKind::kError, 0, "ERROR_SUCCESS", "no error", ""},
    {CodeKind::kError, 1, "ERROR_INVALID_FUNCTION", "the device does not offer this call", ""},
    {CodeKind::kError, 2, "ERROR_FILE_NOT_FOUND", "there is no such file, key or value",
     "check its name"},
    {CodeKind::kError, 3, "ERROR_PATH_NOT_FOUND", "a folder of the path does not exist",
     "check the folders of the path; is the storage card in?"},
    {CodeKind::kError, 4, "ERROR_TOO_MANY_OPEN_FILES", "too many files are open",
     "restart the device"},
    {CodeKind::kError, 5, "ERROR_ACCESS_DENIED", "access is denied: read-only, in ROM, or a folder",
     "clear the attributes, or choose another path"},
    {CodeKind::kError, 6, "ERROR_INVALID_HANDLE", "a handle was closed or never open", ""},
    {CodeKind::kError, 8, "ERROR_NOT_ENOUGH_MEMORY", "there is too little memory",
     "end programs, or restart the device"},
    {CodeKind::kError, 14, "ERROR_OUTOFMEMORY", "there is too little memory",
     "end programs, or restart the device"},
    {CodeKind::kError, 17, "ERROR_NOT_SAME_DEVICE", "the two paths lie on different volumes", ""},
    {CodeKind::kError, 18, "ERROR_NO_MORE_FILES", "there is no further file", ""},
    {CodeKind::kError, 21, "ERROR_NOT_READY", "the volume is not ready", "put the storage card in"},
    {CodeKind::kError, 31, "ERROR_GEN_FAILURE", "a driver failed", "restart the device"},
    {CodeKind::kError, 32, "ERROR_SHARING_VIOLATION", "another program has the file open",
     "stop that program with the job's StopProcess"},
    {CodeKind::kError, 38, "ERROR_HANDLE_EOF", "the end of the file was reached", ""},
    {CodeKind::kError, 50, "ERROR_NOT_SUPPORTED", "the device does not offer this", ""},
    {CodeKind::kError, 80, "ERROR_FILE_EXISTS", "the file is there already", ""},
    {CodeKind::kError, 87, "ERROR_INVALID_PARAMETER", "a parameter is wrong", ""},
    {CodeKind::kError, 112, "ERROR_DISK_FULL", "the volume is full", "make room on the device"},
    {CodeKind::kError, 120, "ERROR_CALL_NOT_IMPLEMENTED", "the device does not offer this call",
     ""},
    {CodeKind::kError, 122, "ERROR_INSUFFICIENT_BUFFER", "a value is larger than its buffer", ""},
    {CodeKind::kError, 123, "ERROR_INVALID_NAME", "the name holds characters that no file may have",
     "correct the path"},
    {CodeKind::kError, 126, "ERROR_MOD_NOT_FOUND", "a library could not be loaded",
     "install it on the device"},
    {CodeKind::kError, 127, "ERROR_PROC_NOT_FOUND", "a library lacks a function",
     "install a library of the right version"},
    {CodeKind::kError, 131, "ERROR_NEGATIVE_SEEK", "a position before the beginning of a file", ""},
    {CodeKind::kError, 145, "ERROR_DIR_NOT_EMPTY", "the folder is not empty", ""},
    {CodeKind::kError, 161, "ERROR_BAD_PATHNAME", "the path is wrong", "correct the path"},
    {CodeKind::kError, 183, "ERROR_ALREADY_EXISTS", "there is one of this name already", ""},
    {CodeKind::kError, 206, "ERROR_FILENAME_EXCED_RANGE", "the path is longer than 259 characters",
     "shorten the path"},
    {CodeKind::kError, 234, "ERROR_MORE_DATA", "a registry value is larger than its buffer", ""},
    {CodeKind::kError, 259, "ERROR_NO_MORE_ITEMS", "there is no further entry", ""},
    {CodeKind::kError, 1004, "ERROR_INVALID_FLAGS", "flags are wrong", ""},
    {CodeKind::kError, 1006, "ERROR_FILE_INVALID",
     "the file was changed or removed while it was open", ""},
    {CodeKind::kError, 1010, "ERROR_BADKEY", "a registry key is wrong", ""},
    {CodeKind::kError, 1018, "ERROR_KEY_DELETED", "the registry key was deleted", ""},
    {CodeKind::kError, 1113, "ERROR_NO_UNICODE_TRANSLATION",
     "a character is not in the device's code page", "use ASCII characters"},
    {CodeKind::kError, 1400, "ERROR_INVALID_WINDOW_HANDLE", "the window is gone", ""},

    // ---- errors of the sockets ----
    {CodeKind::kError, 10004, "WSAEINTR", "the wait was interrupted", ""},
    {CodeKind::kError, 10013, "WSAEACCES", "access to the address is denied", ""},
    {CodeKind::kError, 10014, "WSAEFAULT", "a pointer is wrong", ""},
    {CodeKind::kError, 10022, "WSAEINVAL", "a parameter is wrong", ""},
    {CodeKind::kError, 10024, "WSAEMFILE", "too many sockets are open", "restart the device"},
    {CodeKind::kError, 10035, "WSAEWOULDBLOCK", "the send buffer is full; it is tried again", ""},
    {CodeKind::kError, 10037, "WSAEALREADY", "the socket is connecting already", ""},
    {CodeKind::kError, 10038, "WSAENOTSOCK", "the socket was closed", ""},
    {CodeKind::kError, 10039, "WSAEDESTADDRREQ", "an address is missing",
     "check the job's addresses"},
    {CodeKind::kError, 10040, "WSAEMSGSIZE", "a datagram is larger than its buffer", ""},
    {CodeKind::kError, 10042, "WSAENOPROTOOPT", "the device knows no such socket option", ""},
    {CodeKind::kError, 10043, "WSAEPROTONOSUPPORT", "the device knows no such protocol", ""},
    {CodeKind::kError, 10047, "WSAEAFNOSUPPORT", "the device knows no such kind of address", ""},
    {CodeKind::kError, 10048, "WSAEADDRINUSE", "the port is in use", "end the program that has it"},
    {CodeKind::kError, 10049, "WSAEADDRNOTAVAIL",
     "the address cannot be used; is the server's name known?",
     "check BaseURL: scheme, address, and no path without a port"},
    {CodeKind::kError, 10050, "WSAENETDOWN", "the network is down",
     "check the radio and the cradle"},
    {CodeKind::kError, 10051, "WSAENETUNREACH", "there is no way to the server's network",
     "check BaseURL and the device's network settings"},
    {CodeKind::kError, 10053, "WSAECONNABORTED", "the device ended the connection",
     "check the radio's coverage"},
    {CodeKind::kError, 10054, "WSAECONNRESET", "the server or a firewall ended the connection",
     "check the server's log"},
    {CodeKind::kError, 10055, "WSAENOBUFS", "there is too little memory for the network",
     "restart the device"},
    {CodeKind::kError, 10056, "WSAEISCONN", "the socket is connected already", ""},
    {CodeKind::kError, 10057, "WSAENOTCONN", "the socket is not connected", ""},
    {CodeKind::kError, 10058, "WSAESHUTDOWN", "the socket was shut down", ""},
    {CodeKind::kError, 10060, "WSAETIMEDOUT", "the server did not answer in time",
     "check that the server runs and that no firewall stands between"},
    {CodeKind::kError, 10061, "WSAECONNREFUSED", "no server listens at this address and port",
     "start the server, or correct BaseURL and HTTPPort"},
    {CodeKind::kError, 10065, "WSAEHOSTUNREACH", "there is no way to the server",
     "check BaseURL and the device's network settings"},
    {CodeKind::kError, 10093, "WSANOTINITIALISED", "the sockets were not started", ""},
    {CodeKind::kError, 11001, "WSAHOST_NOT_FOUND", "the server's name is not known",
     "give the server's address in BaseURL"},

    // ---- failed requests ----
    {CodeKind::kRequest, 1, "bad ret 1", "the path to ask for holds no letter",
     "rename the file on the server so that its path begins with a letter"},
    {CodeKind::kRequest, 2, "bad ret 2", "the request could not be sent whole",
     "check the radio's coverage"},
    {CodeKind::kRequest, 3, "bad ret 3", "no answer came in time",
     "check the server's load and the network"},
    {CodeKind::kRequest, 4, "bad ret 4", "the server closed the connection without an answer",
     "check the server's log"},
    {CodeKind::kRequest, 5, "bad ret 5",
     "the answer is not \"200 OK\"; usually there is no such file",
     "put the file on the server, or take it off the list"},
    {CodeKind::kRequest, 6, "bad ret 6", "the answer has no Content-Length in its first segment",
     "use the upgrade server; no proxy between"},
    {CodeKind::kRequest, 7, "bad ret 7", "the answer has no Content-CRC32 in its first segment",
     "use the upgrade server; no proxy between"},
    {CodeKind::kRequest, 8, "bad ret 8", "the answer's CheckPoint-BlockSize is above 16384",
     "lower the server's checkpoint block size"},

    // ---- XML documents ----
    {CodeKind::kXml, 1, "no text", "the text ends where a tag was expected, or is empty",
     "correct the document"},
    {CodeKind::kXml, 2, "too deep", "elements are nested more than 64 deep", "nest less deeply"},
    {CodeKind::kXml, 3, "stray end tag", "an end tag without an open element",
     "correct the document"},
    {CodeKind::kXml, 4, "no root", "there is no root element", "correct the document"},
    {CodeKind::kXml, 5, "open tag",
     "the text ends inside a tag, or an end tag is not closed by \">\"", "correct the document"},
    {CodeKind::kXml, 6, "wrong end tag",
     "an end tag has another name than the open element; CDATA is not known",
     "correct the document"},
    {CodeKind::kXml, 7, "open comment", "a comment is not closed", "close it with -->"},
    {CodeKind::kXml, 8, "attribute",
     "an attribute has no \"=\" or its value is not closed; DOCTYPE is not known",
     "correct the document"},
    {CodeKind::kXml, 10, "no quotes", "an attribute's value is not in quotes",
     "correct the document"},
    {CodeKind::kXml, 11, "no memory", "there is too little memory for the document",
     "restart the device"},
    {CodeKind::kXml, 12, "stray slash", "a \"/\" in a tag is not followed by \">\"",
     "correct the document"},

    // ---- preparing a package; the installer is started all the same ----
    {CodeKind::kPackage, 1, "cannot open", "the cabinet cannot be opened",
     "write a blank before its path in the Parameters"},
    {CodeKind::kPackage, 2, "seek", "a position in the cabinet cannot be reached",
     "bring the cabinet anew"},
    {CodeKind::kPackage, 3, "read", "the cabinet ends early, or an entry is missing",
     "bring the cabinet anew"},
    {CodeKind::kPackage, 5, "no cabinet", "the file is no cabinet", "check the Parameters"},
    {CodeKind::kPackage, 6, "no setup file",
     "the cabinet has no setup file that is stored uncompressed",
     "make the cabinet without compression"},
    {CodeKind::kPackage, 7, "name or registry",
     "a name is too long, or the registry key was not there", ""},
};

constexpr std::size_t kExitCodeCount = std::size(kExitCodes);

/// The program's own exit codes stand in their own table.
struct AllCodes {
  CodeRow rows[std::size(kCodes) + kExitCodeCount];
};

constexpr AllCodes Join() {
  AllCodes all{};
  std::size_t count = 0;
  for (const CodeRow& row : kCodes) all.rows[count++] = row;
  for (const ExitCodeRow& row : kExitCodes) {
    all.rows[count++] = {CodeKind::kExit, static_cast<std::uint32_t>(row.code), row.name,
                         row.meaning, ""};
  }
  return all;
}

constexpr AllCodes kAll = Join();

}  // namespace

const char* NameOf(CodeKind kind) {
  switch (kind) {
    case CodeKind::kNone: return "";
    case CodeKind::kResult: return "result";
    case CodeKind::kEvent: return "event";
    case CodeKind::kState: return "state";
    case CodeKind::kError: return "error";
    case CodeKind::kRequest: return "request";
    case CodeKind::kXml: return "xml";
    case CodeKind::kPackage: return "package";
    case CodeKind::kExit: return "exit-code";
  }
  return "";
}

CodeRows Codes() {
  return {kAll.rows, std::size(kAll.rows)};
}

const CodeRow* FindCode(CodeKind kind, std::uint32_t value) {
  for (const CodeRow& row : kAll.rows) {
    if (row.kind == kind && row.value == value) return &row;
  }
  return nullptr;
}

}  // namespace tools

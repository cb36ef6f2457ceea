// Winsock's start-up, error number, host names, addresses in text and byte orders.
#include <cstdio>
#include <cstring>
#include <optional>
#include <string_view>

#include "ce/winsock.h"
#include "net/winsock_call.h"

namespace {

using sim::Address;
using sim::ApiCall;
using sim::kCannotFail;
using sim::SwapOrder;
using sim::ThreadTexts;
using sim::WinsockCall;

constexpr WORD kHighestVersion = MAKEWORD(2, 2);

/// The version the library speaks with a program that can use up to `wanted`, 0 for none.
WORD GrantVersion(WORD wanted) {
  const BYTE major = LOBYTE(wanted);
  const BYTE minor = HIBYTE(wanted);
  if (major == 0) return 0;
  if (major == 1) return minor == 0 ? MAKEWORD(1, 0) : MAKEWORD(1, 1);
  if (major == 2 && minor < 2) return wanted;
  return kHighestVersion;
}

[[nodiscard]] bool IsSpace(char c) {
  return c == ' ' || (c >= '\t' && c <= '\r');
}

[[nodiscard]] unsigned DigitValue(char c) {
  if (c >= '0' && c <= '9') return static_cast<unsigned>(c - '0');
  if (c >= 'a' && c <= 'f') return static_cast<unsigned>(c - 'a') + 10;
  if (c >= 'A' && c <= 'F') return static_cast<unsigned>(c - 'A') + 10;
  return 16;
}

/// Takes one part of an address off the front of `text`: decimal, octal with a leading 0 or
/// hexadecimal with a leading 0x.
std::optional<std::uint32_t> TakePart(std::string_view& text) {
  unsigned base = 10;
  bool digits = false;
  if (text.size() > 1 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X')) {
    base = 16;
    text.remove_prefix(2);
  } else if (!text.empty() && text[0] == '0') {
    base = 8;
  }
  std::uint64_t value = 0;
  while (!text.empty() && DigitValue(text[0]) < base) {
    value = value * base + DigitValue(text[0]);
    if (value > 0xFFFFFFFFU) return std::nullopt;
    digits = true;
    text.remove_prefix(1);
  }
  if (!digits) return std::nullopt;
  return static_cast<std::uint32_t>(value);
}

/// An address in dots: one to four parts, of which the last fills all bytes that are left. White
/// space ends the text. Host order.
std::optional<Address> ParseDots(std::string_view text) {
  std::uint32_t parts[4] = {};
  unsigned count = 0;
  for (;;) {
    const std::optional<std::uint32_t> part = TakePart(text);
    if (!part) return std::nullopt;
    parts[count++] = *part;
    if (text.empty() || IsSpace(text[0])) break;
    if (text[0] != '.' || count == 4) return std::nullopt;
    text.remove_prefix(1);
  }
  Address address = 0;
  for (unsigned i = 0; i + 1 < count; ++i) {
    if (parts[i] > 255) return std::nullopt;
    address |= parts[i] << (24 - 8 * i);
  }
  const std::uint64_t room = std::uint64_t{1} << (8 * (5 - count));
  if (parts[count - 1] >= room) return std::nullopt;
  return address | parts[count - 1];
}

/// Fills the thread's answer of gethostbyname.
ce_hostent* Answer(ThreadTexts& texts, std::string_view name, Address address) {
  texts.host_name = name;
  texts.host_address = SwapOrder(address);
  texts.addresses[0] = reinterpret_cast<char*>(&texts.host_address);
  texts.host.h_name = texts.host_name.data();
  texts.host.h_aliases = texts.aliases;
  texts.host.h_addrtype = CE_AF_INET;
  texts.host.h_length = sizeof texts.host_address;
  texts.host.h_addr_list = texts.addresses;
  return &texts.host;
}

}  // namespace

extern "C" {

int ce_WSAStartup(WORD version, ce_WSADATA* data) {
  ApiCall call("WSAStartup", WSASYSNOTREADY);
  call.Argument("version", version);
  // The one function that gives its error as its result.
  if (call.failed()) return call.Return(static_cast<int>(call.fault_error()));
  if (data == nullptr) return call.Return(WSAEFAULT);
  const WORD granted = GrantVersion(version);
  *data = {};
  data->wVersion = granted == 0 ? kHighestVersion : granted;
  data->wHighVersion = kHighestVersion;
  if (granted == 0) return call.Return(WSAVERNOTSUPPORTED);
  const sim::World::Lock lock = call.world().Acquire();
  call.device().network().StartUp();
  return call.Return(0);
}

int ce_WSACleanup() {
  WinsockCall call("WSACleanup");
  const int error = call.Enter();
  if (error == 0) call.network().CleanUp();
  return call.Finish(error);
}

int ce_WSAGetLastError() {
  ApiCall call("WSAGetLastError", kCannotFail);
  return call.Return(static_cast<int>(call.thread().last_error));
}

void ce_WSASetLastError(int error) {
  ApiCall call("WSASetLastError", kCannotFail);
  call.Argument("error", error);
  call.thread().last_error = static_cast<std::uint32_t>(error);
}

int ce_gethostname(char* name, int size) {
  WinsockCall call("gethostname");
  int error = call.Enter();
  const std::string& own = call.gate().device().profile().host_name;
  const bool fits = name != nullptr && size > 0 && static_cast<std::size_t>(size) > own.size();
  if (error == 0 && !fits) error = WSAEFAULT;
  if (error == 0) std::memcpy(name, own.c_str(), own.size() + 1);
  return call.Finish(error);
}

ce_hostent* ce_gethostbyname(const char* name) {
  WinsockCall call("gethostbyname", WSAHOST_NOT_FOUND);
  call.Note("name", name);
  ce_hostent* const none = nullptr;
  const int error = call.Enter();
  if (error != 0) return call.Finish(error, none, none);
  const std::string_view asked = name != nullptr ? std::string_view(name) : std::string_view();
  std::optional<Address> address = ParseDots(asked);
  if (!address) address = call.network().Resolve(asked);
  if (!address) return call.Finish(WSAHOST_NOT_FOUND, none, none);
  const std::string& own = call.gate().device().profile().host_name;
  ce_hostent* const answer = Answer(call.texts(), asked.empty() ? own : asked, *address);
  // Addresses differ from run to run, so they stay out of the trace.
  call.Finish(0, 1, 0);
  return answer;
}

std::uint32_t ce_inet_addr(const char* text) {
  ApiCall call("inet_addr", kCannotFail);
  call.Argument("text", text);
  if (text == nullptr) return call.Return(CE_INADDR_NONE);
  const std::string_view dots = text;
  // As on the device: no text, or one blank, is the address 0.
  if (dots.empty() || dots == " ") return call.Return(std::uint32_t{0});
  const std::optional<Address> address = ParseDots(dots);
  return call.Return(address ? SwapOrder(*address) : CE_INADDR_NONE);
}

char* ce_inet_ntoa(ce_in_addr address) {
  ApiCall call("inet_ntoa", WSAENOBUFS);
  char* const none = nullptr;
  if (call.failed()) return call.Return(none);
  const sim::World::Lock lock = call.world().Acquire();
  ThreadTexts& texts = call.device().network().texts(call.thread().id);
  std::snprintf(texts.dotted, sizeof texts.dotted, "%s",
                sim::ToText(SwapOrder(address.s_addr)).c_str());
  call.Return(1);
  return texts.dotted;
}

std::uint16_t ce_htons(std::uint16_t value) {
  ApiCall call("htons", kCannotFail);
  return call.Return(SwapOrder(value));
}

std::uint16_t ce_ntohs(std::uint16_t value) {
  ApiCall call("ntohs", kCannotFail);
  return call.Return(SwapOrder(value));
}

std::uint32_t ce_htonl(std::uint32_t value) {
  ApiCall call("htonl", kCannotFail);
  return call.Return(SwapOrder(value));
}

std::uint32_t ce_ntohl(std::uint32_t value) {
  ApiCall call("ntohl", kCannotFail);
  return call.Return(SwapOrder(value));
}

}  // extern "C"

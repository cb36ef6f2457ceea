// Code pages and letter case.
#include <algorithm>
#include <climits>
#include <cstring>
#include <optional>
#include <string>

#include "ce/errors.h"
#include "ce/system.h"
#include "faults/api_call.h"
#include "locale/code_pages.h"
#include "text/names.h"

namespace {

bool IsAnsi(UINT code_page) {
  return code_page == CP_ACP || code_page == 1252;
}

/// The units to convert: all of `length`, or with a negative length all up to and including the
/// terminating zero.
template <typename Char>
std::basic_string_view<Char> Input(const Char* text, int length) {
  if (length >= 0) return {text, static_cast<std::size_t>(length)};
  return {text, std::char_traits<Char>::length(text) + 1};
}

template <typename Char>
bool ValidBuffers(const void* input, int length, const Char* output, int size) {
  if (input == nullptr || length == 0 || size < 0) return false;
  return size == 0 || (output != nullptr && static_cast<const void*>(output) != input);
}

/// Hands the converted text over: only counted when no room was offered.
template <typename Char>
int Deliver(sim::ApiCall& call, const std::basic_string<Char>& converted, Char* output, int size) {
  if (converted.size() > static_cast<std::size_t>(INT_MAX)) {
    return call.Fail(ERROR_INVALID_PARAMETER, 0);
  }
  const int needed = static_cast<int>(converted.size());
  if (size == 0) return call.Return(needed);
  std::copy_n(converted.data(), std::min(needed, size), output);
  if (needed > size) return call.Fail(ERROR_INSUFFICIENT_BUFFER, 0);
  return call.Return(needed);
}

}  // namespace

extern "C" int MultiByteToWideChar(UINT code_page, DWORD flags, const char* text, int length,
                                   WCHAR* wide, int size) {
  sim::ApiCall call("MultiByteToWideChar", ERROR_INSUFFICIENT_BUFFER);
  call.Argument("code_page", code_page);
  call.Argument("length", length);
  if (call.failed()) return call.Return(0);
  if (!ValidBuffers(text, length, wide, size)) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  const std::string_view input = Input(text, length);
  if (IsAnsi(code_page)) return Deliver(call, sim::FromAnsi(input), wide, size);
  if (code_page != CP_UTF8) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  if ((flags & ~MB_ERR_INVALID_CHARS) != 0) return call.Fail(ERROR_INVALID_FLAGS, 0);
  bool malformed = false;
  const std::u16string converted = sim::FromUtf8(input, malformed);
  if (malformed && flags != 0) return call.Fail(ERROR_NO_UNICODE_TRANSLATION, 0);
  return Deliver(call, converted, wide, size);
}

// NOLINTNEXTLINE(readability-function-size): the platform's own parameters
extern "C" int WideCharToMultiByte(UINT code_page, DWORD flags, const WCHAR* wide, int length,
                                   char* text, int size, const char* default_char,
                                   BOOL* used_default) {
  sim::ApiCall call("WideCharToMultiByte", ERROR_INSUFFICIENT_BUFFER);
  call.Argument("code_page", code_page);
  call.Argument("length", length);
  if (call.failed()) return call.Return(0);
  if (!ValidBuffers(wide, length, text, size)) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  const std::u16string_view input = Input(wide, length);
  if (IsAnsi(code_page)) {
    bool substituted = false;
    const char substitute = default_char != nullptr ? *default_char : '?';
    const std::string converted = sim::ToAnsi(input, substitute, substituted);
    if (used_default != nullptr) *used_default = substituted ? TRUE : FALSE;
    return Deliver(call, converted, text, size);
  }
  const bool defaults = default_char != nullptr || used_default != nullptr;
  if (code_page != CP_UTF8 || defaults) return call.Fail(ERROR_INVALID_PARAMETER, 0);
  if (flags != 0) return call.Fail(ERROR_INVALID_FLAGS, 0);
  return Deliver(call, sim::ToUtf8(input), text, size);
}

extern "C" DWORD CharLowerBuffW(WCHAR* text, DWORD length) {
  sim::ApiCall call("CharLowerBuffW", sim::kCannotFail);
  call.Argument("length", length);
  for (DWORD i = 0; i < length; ++i) text[i] = sim::FoldCase(text[i]);
  return call.Return(length);
}

// The C library's memory and text functions, as far as the library and the compiler call them.
// Compiled so that no loop in here is taken for one of these functions and calls itself.
#include <cstddef>

#include "blocks.h"

using ce_runtime::Byte;

extern "C" {

void* memcpy(void* to, const void* from, std::size_t size) {
  ce_runtime::CopyUp(static_cast<Byte*>(to), static_cast<const Byte*>(from), size);
  return to;
}

void* memmove(void* to, const void* from, std::size_t size) {
  ce_runtime::Move(static_cast<Byte*>(to), static_cast<const Byte*>(from), size);
  return to;
}

void* memset(void* to, int value, std::size_t size) {
  ce_runtime::Fill(static_cast<Byte*>(to), static_cast<Byte>(value), size);
  return to;
}

int memcmp(const void* first, const void* second, std::size_t size) {
  return ce_runtime::Compare(static_cast<const Byte*>(first), static_cast<const Byte*>(second),
                             size);
}

void* memchr(const void* block, int value, std::size_t size) {
  return const_cast<Byte*>(
      ce_runtime::Find(static_cast<const Byte*>(block), static_cast<Byte>(value), size));
}

std::size_t strlen(const char* text) {
  return ce_runtime::Length(text);
}

int strcmp(const char* first, const char* second) {
  for (; *first != 0 && *first == *second; ++first) ++second;
  return static_cast<int>(static_cast<Byte>(*first)) - static_cast<int>(static_cast<Byte>(*second));
}

char* strchr(const char* text, int value) {
  // The zero at the end can be looked for, too.
  return const_cast<char*>(
      ce_runtime::Find(text, static_cast<char>(value), ce_runtime::Length(text) + 1));
}

char* strstr(const char* text, const char* part) {
  return const_cast<char*>(ce_runtime::FindText(text, part));
}

std::size_t wcslen(const wchar_t* text) {
  return ce_runtime::Length(text);
}

wchar_t* wmemchr(const wchar_t* text, wchar_t value, std::size_t count) {
  return const_cast<wchar_t*>(ce_runtime::Find(text, value, count));
}

int wmemcmp(const wchar_t* first, const wchar_t* second, std::size_t count) {
  for (; count > 0; --count, ++first, ++second) {
    if (*first != *second) return *first < *second ? -1 : 1;
  }
  return 0;
}

}  // extern "C"

#include "loader/gates.h"

#include <sys/mman.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <mutex>
#include <system_error>
#include <utility>

#if !defined(__arm__)
#error "gates are made of ARM code"
#endif

// Each is entered with the gate's own word in ip, and everything else as the caller left it. Nobody
// unwinds through them: what lies above is not the host's.
extern "C" {
void loader_leave_dll();
void loader_enter_misaligned();
void loader_call_missing();
[[noreturn]] void loader_missing(const char* name);
}

asm(R"(
.text
.arm
.p2align 2
.macro loader_gate name, shift
.type \name, %function
\name:
  .fnstart
  .cantunwind
  .cfi_startproc
  push {r4, r5, r6, lr}
  .cfi_def_cfa_offset 16
  .cfi_offset r4, -16
  .cfi_offset r5, -12
  .cfi_offset r6, -8
  .cfi_offset lr, -4
  mov r4, sp
  .cfi_def_cfa_register r4
  add r5, sp, #16
  sub sp, sp, #48
  bic sp, sp, #7
  sub sp, sp, #\shift
  mov lr, sp
  .rept 12
  ldr r6, [r5], #4
  str r6, [lr], #4
  .endr
  mov lr, pc
  bx ip
  mov sp, r4
  .cfi_def_cfa_register sp
  pop {r4, r5, r6, lr}
  bx lr
  .cfi_endproc
  .fnend
.size \name, . - \name
.endm

loader_gate loader_leave_dll, 0
loader_gate loader_enter_misaligned, 4

.type loader_call_missing, %function
loader_call_missing:
  .fnstart
  .cantunwind
  bic sp, sp, #7
  mov r0, ip
  bl loader_missing
  .fnend
.size loader_call_missing, . - loader_call_missing
)");

void loader_missing(const char* name) {
  std::fflush(stdout);
  std::fprintf(stderr, "ce_loader: the DLL calls %s, which this device does not have\n", name);
  std::_Exit(1);
}

namespace loader {
namespace {

// A gate in memory: two instructions and the two words that they load.
constexpr std::uint32_t kLoadIp = 0xE59FC000;  // ldr ip, [pc]: the first word
constexpr std::uint32_t kLoadPc = 0xE59FF000;  // ldr pc, [pc]: the second
constexpr std::size_t kWords = 4;

std::uint32_t Word(Function function) {
  return static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(function));
}

void Write(const Gate& gate, std::uint32_t* code) {
  code[0] = kLoadIp;
  code[1] = kLoadPc;
  code[2] = Word(gate.function);
  switch (gate.kind) {
    case Gate::Kind::kOut: code[3] = Word(&loader_leave_dll); return;
    case Gate::Kind::kMisaligned: code[3] = Word(&loader_enter_misaligned); return;
    case Gate::Kind::kMissing:
      code[2] = static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(gate.name));
      code[3] = Word(&loader_call_missing);
      return;
  }
}

}  // namespace

Gates::Gates(const std::vector<Gate>& gates) {
  if (gates.empty()) return;
  size_ = gates.size() * kWords * sizeof(std::uint32_t);
  void* const memory =
      mmap(nullptr, size_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) throw std::system_error(errno, std::generic_category(), "gates");
  code_ = static_cast<std::uint32_t*>(memory);
  for (std::size_t i = 0; i < gates.size(); ++i) Write(gates[i], code_ + i * kWords);
  if (mprotect(code_, size_, PROT_READ | PROT_EXEC) != 0) {
    throw std::system_error(errno, std::generic_category(), "gates");
  }
  auto* const begin = static_cast<char*>(memory);
  __builtin___clear_cache(begin, begin + size_);
}

Gates::~Gates() {
  if (code_ != nullptr) munmap(code_, size_);
}

Gates::Gates(Gates&& other) noexcept
    : code_(std::exchange(other.code_, nullptr)), size_(std::exchange(other.size_, 0)) {}

Gates& Gates::operator=(Gates&& other) noexcept {
  std::swap(code_, other.code_);
  std::swap(size_, other.size_);
  return *this;
}

Function Gates::At(std::size_t index) const {
  return reinterpret_cast<Function>(code_ + index * kWords);
}

Function LastingGate(Gate::Kind kind, Function function) {
  static std::mutex mutex;
  static std::map<std::pair<Gate::Kind, Function>, Gates> made;
  const std::lock_guard<std::mutex> hold(mutex);
  const auto key = std::make_pair(kind, function);
  auto found = made.find(key);
  if (found == made.end()) {
    found = made.emplace(key, Gates({Gate{kind, function, nullptr}})).first;
  }
  return found->second.At(0);
}

}  // namespace loader

#include "world/fiber.h"

#include <cxxabi.h>
#include <pthread.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <system_error>
#include <utility>

#if !defined(__x86_64__)
#include <ucontext.h>
#endif

// Present under the sanitizers only, which want to know on which stack the program is.
// NOLINTBEGIN(bugprone-reserved-identifier, readability-identifier-naming): the sanitizers' names
extern "C" {
__attribute__((weak)) void __sanitizer_start_switch_fiber(void** fake_stack, const void* bottom,
                                                          std::size_t size);
__attribute__((weak)) void __sanitizer_finish_switch_fiber(void* fake_stack, const void** bottom,
                                                           std::size_t* size);
__attribute__((weak)) void* __tsan_get_current_fiber();
__attribute__((weak)) void* __tsan_create_fiber(unsigned flags);
__attribute__((weak)) void __tsan_destroy_fiber(void* fiber);
__attribute__((weak)) void __tsan_switch_to_fiber(void* fiber, unsigned flags);
}
// NOLINTEND(bugprone-reserved-identifier, readability-identifier-naming)

namespace sim {
namespace {

/// Only what is touched of it takes memory.
constexpr std::size_t kStackSize = 512 * 1024;

/// The fiber that is being entered for the first time.
thread_local Fiber* entering = nullptr;

std::size_t PageSize() {
  return static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
}

}  // namespace

// ---- the switch itself ----

#if defined(__x86_64__)

// What the callee must preserve goes onto the stack, and the stack pointer to where the caller
// says.
extern "C" void cesim_switch_stack(void** left_at, void* go_to);
asm(R"(
.text
.p2align 4
.type cesim_switch_stack, @function
cesim_switch_stack:
  pushq %rbp
  pushq %rbx
  pushq %r12
  pushq %r13
  pushq %r14
  pushq %r15
  movq %rsp, (%rdi)
  movq %rsi, %rsp
  popq %r15
  popq %r14
  popq %r13
  popq %r12
  popq %rbx
  popq %rbp
  ret
.size cesim_switch_stack, . - cesim_switch_stack
)");

void Fiber::Prepare() {
  constexpr std::size_t kPreserved = 6;
  auto* place = reinterpret_cast<std::uintptr_t*>(bottom_ + size_);
  *--place = 0;  // nobody to return to; also aligns the stack as behind a call
  *--place = reinterpret_cast<std::uintptr_t>(&Fiber::Enter);
  for (std::size_t i = 0; i < kPreserved; ++i) *--place = 0;
  place_ = place;
}

namespace {
void Jump(void** left_at, void** go_to) {
  cesim_switch_stack(left_at, *go_to);
}
void FreePlace(void* /*place*/) {}
}  // namespace

#else

void Fiber::Prepare() {
  auto* const context = new ucontext_t;
  place_ = context;
  getcontext(context);
  context->uc_stack.ss_sp = bottom_;
  context->uc_stack.ss_size = size_;
  context->uc_link = nullptr;
  makecontext(context, &Fiber::Enter, 0);
}

namespace {
void Jump(void** left_at, void** go_to) {
  if (*left_at == nullptr) *left_at = new ucontext_t;
  swapcontext(static_cast<ucontext_t*>(*left_at), static_cast<ucontext_t*>(*go_to));
}
void FreePlace(void* place) {
  delete static_cast<ucontext_t*>(place);
}
}  // namespace

#endif

// ---- fibers ----

Fiber::Fiber() {
  pthread_attr_t attributes;
  if (pthread_getattr_np(pthread_self(), &attributes) == 0) {
    void* bottom = nullptr;
    pthread_attr_getstack(&attributes, &bottom, &size_);
    bottom_ = static_cast<char*>(bottom);
    pthread_attr_destroy(&attributes);
  }
  if (__tsan_get_current_fiber != nullptr) tsan_fiber_ = __tsan_get_current_fiber();
}

Fiber::Fiber(std::function<void()> body) : body_(std::move(body)) {
  const std::size_t guard = PageSize();
  void* const mapping = mmap(nullptr, guard + kStackSize, PROT_READ | PROT_WRITE,
                             MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | MAP_STACK, -1, 0);
  if (mapping == MAP_FAILED) throw std::system_error(errno, std::generic_category(), "a stack");
  mapping_ = static_cast<char*>(mapping);
  mprotect(mapping_, guard, PROT_NONE);
  bottom_ = mapping_ + guard;
  size_ = kStackSize;
  if (__tsan_create_fiber != nullptr) tsan_fiber_ = __tsan_create_fiber(0);
  Prepare();
}

Fiber::~Fiber() {
  FreePlace(place_);
  if (mapping_ == nullptr) return;
  if (__tsan_destroy_fiber != nullptr) __tsan_destroy_fiber(tsan_fiber_);
  munmap(mapping_, static_cast<std::size_t>(bottom_ - mapping_) + size_);
}

void Fiber::Enter() {
  if (__sanitizer_finish_switch_fiber != nullptr) {
    __sanitizer_finish_switch_fiber(nullptr, nullptr, nullptr);
  }
  std::exchange(entering, nullptr)->body_();
  std::abort();
}

void Fiber::Go(Fiber& from, Fiber& to, bool for_ever) {
  void* const globals = abi::__cxa_get_globals();
  std::memcpy(from.exceptions_.data(), globals, from.exceptions_.size());
  std::memcpy(globals, to.exceptions_.data(), to.exceptions_.size());
  if (to.body_) entering = &to;  // looked at by one that begins, and by no other
  if (__sanitizer_start_switch_fiber != nullptr) {
    __sanitizer_start_switch_fiber(for_ever ? nullptr : &from.fake_stack_, to.bottom_, to.size_);
  }
  if (__tsan_switch_to_fiber != nullptr) __tsan_switch_to_fiber(to.tsan_fiber_, 0);
  Jump(&from.place_, &to.place_);
  if (__sanitizer_finish_switch_fiber != nullptr) {
    __sanitizer_finish_switch_fiber(from.fake_stack_, nullptr, nullptr);
  }
}

void Fiber::Switch(Fiber& from, Fiber& to) {
  Go(from, to, false);
}

void Fiber::SwitchForEver(Fiber& from, Fiber& to) {
  Go(from, to, true);
  std::abort();
}

}  // namespace sim

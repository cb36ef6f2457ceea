// Calls in both directions, with the stack as the device has it and as the host does.
#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>

#include "ce_loader/toy_dll.h"
#include "kernel/debug.h"
#include "loader/gates.h"

namespace {

__attribute__((noinline)) std::uint32_t StackHere() {
  std::uint32_t stack = 0;
  asm volatile("mov %0, sp" : "=r"(stack));
  return stack & 7U;
}

/// Everything runs in both ways.
class CallsTest : public test::ToyTest, public testing::WithParamInterface<bool> {
 protected:
  CallsTest() {
    LoadWith({std::nullopt, GetParam()});
    EXPECT_NE(Load(), nullptr);
  }
  /// A function of the host as the DLL may call it.
  template <typename Callback>
  static Callback ForTheDll(Callback callback) {
    if (!GetParam()) return callback;
    return reinterpret_cast<Callback>(loader::LastingGate(
        loader::Gate::Kind::kOut, reinterpret_cast<loader::Function>(callback)));
  }
  /// The stack pointer, modulo 8, that functions of the DLL see.
  static std::uint32_t Expected() { return GetParam() ? 4 : 0; }
};

INSTANTIATE_TEST_SUITE_P(Stack, CallsTest, testing::Values(false, true),
                         [](const auto& way) { return way.param ? "Misaligned" : "Aligned"; });

TEST_P(CallsTest, EnterExportsThreadsAndWindowProcedures) {
  EXPECT_EQ(Find<std::uint32_t()>(u"ToyStack")(), Expected());
  EXPECT_EQ(Find<std::uint32_t()>(u"ToyStackOfThread")(), Expected());
  EXPECT_EQ(Find<std::uint32_t()>(u"ToyStackOfWindow")(), Expected());
}

TEST_P(CallsTest, BringEightArgumentsAndAResult) {
  auto* const add = Find<int(int, int, int, int, int, int, int, int)>(u"ToyAddEight");
  EXPECT_EQ(add(1, 2, 3, 4, 5, 6, 7, 8), 204);
  EXPECT_EQ(add(8, 7, 6, 5, 4, 3, 2, 1), 120);
}

TEST_P(CallsTest, BringTwelveWordsToTheDevicesFunctions) {
  Find<void()>(u"ToyPrint")();
  EXPECT_EQ(device().debug().KernelText(), "1 2 3 4 5 6 7 8 9 10 eleven\n");
}

TEST_P(CallsTest, ReachTheHostWithItsOwnStack) {
  auto* const callback = ForTheDll(+[](int a, int b, int c, int d, int e, int f) {
    EXPECT_EQ(StackHere(), 0U);
    return a + 10 * b + 100 * c + 1000 * d + 10000 * e + 100000 * f;
  });
  EXPECT_EQ(Find<int(decltype(callback))>(u"ToyCallBack")(callback), 654321);
}

TEST_P(CallsTest, ComeBackOnTwoThreads) {
  struct Seen {
    std::atomic<int> calls{0};
    std::atomic<std::uint32_t> stacks{0};
  } seen;
  auto* const callback = ForTheDll(+[](int number, void* context) {
    auto& found = *static_cast<Seen*>(context);
    ++found.calls;
    found.stacks += StackHere();
    Sleep(10);  // both are inside
    return number + 20;
  });
  EXPECT_EQ(Find<int(decltype(callback), void*)>(u"ToyCallOnThreads")(callback, &seen), 42);
  EXPECT_EQ(seen.calls, 2);
  EXPECT_EQ(seen.stacks, 0U);
}

TEST_P(CallsTest, AreLeftWhereTheirThreadIsEnded) {
  auto* const callback = ForTheDll(+[](int, void*) {
    Sleep(INFINITE);
    return 0;
  });
  auto* const call = Find<int(decltype(callback), void*)>(u"ToyCallOnThreads");
  auto body = [&] { return static_cast<DWORD>(call(callback, nullptr)); };
  HANDLE const thread = CreateThread(
      nullptr, 0, [](void* work) { return (*static_cast<decltype(body)*>(work))(); }, &body, 0,
      nullptr);
  Sleep(10);
  EXPECT_TRUE(TerminateThread(thread, 5));
  DWORD code = 0;
  WaitForSingleObject(thread, INFINITE);
  EXPECT_TRUE(GetExitCodeThread(thread, &code));
  EXPECT_EQ(code, 5U);
  CloseHandle(thread);
}

}  // namespace

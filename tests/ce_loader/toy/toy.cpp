// A small DLL of the device that tells how it was loaded and how it is called.
#include <coredll.h>

#include <cstdint>

// No constant, and so not seen through by the compiler.
#define TOY_EXPORT __attribute__((noinline, used))

extern "C" {
void NotOnAnyDevice();

using ToyCallback = int (*)(int number, void* context);
using ToyWideCallback = int (*)(int, int, int, int, int, int);
}

namespace {

int attached = 0;
int calls = 0;  // in .bss
HINSTANCE module = nullptr;
int counter = 40;  // in .data

/// Words that have to be moved with the image.
const char* const kTable[] = {"zero", "one", "two"};

struct Job {
  ToyCallback callback;
  void* context;
  DWORD result;
};

/// Where the stack is, modulo 8.
__attribute__((noinline)) std::uint32_t StackHere() {
  std::uint32_t stack = 0;
  asm volatile("mov %0, sp" : "=r"(stack));
  return stack & 7U;
}

DWORD Threaded(void* argument) {
  auto& job = *static_cast<Job*>(argument);
  job.result = static_cast<DWORD>(job.callback(1, job.context));
  return 0;
}

DWORD StackOfThread(void* argument) {
  static_cast<Job*>(argument)->result = StackHere();
  return 0;
}

std::uint32_t stack_of_window = 99;
WNDCLASSW window_class;

LRESULT OnMessage(HWND /*window*/, UINT message, WPARAM /*wparam*/, LPARAM /*lparam*/) {
  if (message == WM_CREATE) stack_of_window = StackHere();
  return message == WM_CREATE ? 0 : 1;
}

HANDLE Start(LPTHREAD_START_ROUTINE function, Job& job) {
  return CreateThread(nullptr, 0, function, &job, 0, nullptr);
}

DWORD ResultOf(HANDLE thread, const Job& job) {
  WaitForSingleObject(thread, INFINITE);
  CloseHandle(thread);
  return job.result;
}

}  // namespace

extern "C" {

TOY_EXPORT BOOL _DllMainCRTStartup(HINSTANCE instance, DWORD reason, void* /*reserved*/) {
  module = instance;
  attached += reason == DLL_PROCESS_ATTACH ? 1 : -1;
  SetLastError(4711);
  return TRUE;
}

TOY_EXPORT int ToyAttached() {
  return attached;
}

TOY_EXPORT HINSTANCE ToyInstance() {
  return module;
}

TOY_EXPORT int ToyCount() {
  return ++counter + ++calls;
}

TOY_EXPORT const char* ToyTable(int index) {
  return kTable[index];
}

TOY_EXPORT std::uint32_t ToyStack() {
  return StackHere();
}

TOY_EXPORT std::uint32_t ToyStackOfThread() {
  Job job = {nullptr, nullptr, 98};
  return ResultOf(Start(&StackOfThread, job), job);
}

TOY_EXPORT std::uint32_t ToyStackOfWindow() {
  window_class.lpfnWndProc = &OnMessage;
  window_class.hInstance = module;
  window_class.lpszClassName = TEXT("Toy");
  RegisterClassW(&window_class);
  DestroyWindow(
      CreateWindowExW(0, TEXT("Toy"), nullptr, 0, 0, 0, 10, 10, nullptr, nullptr, module, nullptr));
  return stack_of_window;
}

TOY_EXPORT int ToyAddEight(int a, int b, int c, int d, int e, int f, int g, int h) {
  return a + 2 * b + 3 * c + 4 * d + 5 * e + 6 * f + 7 * g + 8 * h;
}

TOY_EXPORT int ToyCallBack(ToyWideCallback callback) {
  return callback(1, 2, 3, 4, 5, 6);
}

/// On two threads at once. @return the sum of what the calls return
TOY_EXPORT int ToyCallOnThreads(ToyCallback callback, void* context) {
  Job first = {callback, context, 0};
  Job second = {callback, context, 0};
  HANDLE const threads[] = {Start(&Threaded, first), Start(&Threaded, second)};
  return static_cast<int>(ResultOf(threads[0], first) + ResultOf(threads[1], second));
}

/// Twelve words, eleven of them on the stack.
TOY_EXPORT void ToyPrint() {
  NKDbgPrintfW(TEXT("%d %d %d %d %d %d %d %d %d %d %s\n"), 1, 2, 3, 4, 5, 6, 7, 8, 9, 10,
               TEXT("eleven"));
}

TOY_EXPORT std::uint32_t ToySwap(std::uint32_t word) {
  return htons(static_cast<std::uint16_t>(word));
}

TOY_EXPORT void ToyCallMissing() {
  NotOnAnyDevice();
}

TOY_EXPORT void ToyWriteCode() {
  *reinterpret_cast<volatile std::uint32_t*>(&ToyStack) = 0;
}

TOY_EXPORT void ToyWriteConstant() {
  *const_cast<const char* volatile*>(kTable) = nullptr;
}

}  // extern "C"

// A DLL of the device that shows what the run time does around a library's code and below it. The
// library itself has no objects that are set up by code; this one has.
#include <coredll.h>

#include <cstdint>
#include <cstring>
#include <string_view>

#define PROBE_EXPORT __attribute__((noinline, used, visibility("default")))

namespace {

class Witness {
 public:
  explicit Witness(const WCHAR* name) noexcept : name_(name) {
    NKDbgPrintfW(TEXT("%s made, "), name_);
  }
  ~Witness() { NKDbgPrintfW(TEXT("%s gone, "), name_); }
  Witness(const Witness&) = delete;
  Witness& operator=(const Witness&) = delete;

 private:
  const WCHAR* name_;
};

// They use one another in this order.
Witness first(TEXT("first"));
Witness second(TEXT("second"));

constexpr DWORD kAttached = 1;

class Shape {
 public:
  Shape() noexcept = default;
  Shape(const Shape&) = delete;
  Shape& operator=(const Shape&) = delete;
  virtual ~Shape() = default;
  [[nodiscard]] virtual int Area() const noexcept = 0;
};

class Square final : public Shape {
 public:
  explicit Square(int side) noexcept : side_(side) {}
  ~Square() override { NKDbgPrintfW(TEXT("square %d gone"), side_); }
  [[nodiscard]] int Area() const noexcept override { return side_ * side_; }

 private:
  int side_;
};

}  // namespace

extern "C" {

BOOL DllMain(HINSTANCE instance, DWORD reason, void* /*reserved*/);
PROBE_EXPORT int ProbeArea(int side);
PROBE_EXPORT std::uint32_t ProbeDivide(std::uint32_t high, std::uint32_t low, std::uint32_t by);
PROBE_EXPORT int ProbePercent(std::uint32_t part, std::uint32_t whole);
PROBE_EXPORT void ProbeMove(char* to, const char* from, std::uint32_t size);
PROBE_EXPORT std::uint32_t ProbeLength(const WCHAR* text);
PROBE_EXPORT int ProbeSignal(HANDLE event);

BOOL DllMain(HINSTANCE instance, DWORD reason, void* /*reserved*/) {
  const WCHAR* const what = reason == kAttached ? TEXT("attached") : TEXT("detached, ");
  NKDbgPrintfW(instance == nullptr ? TEXT("nowhere") : what);
  return TRUE;
}

int ProbeArea(int side) {
  const Shape* const shape = new Square(side);
  const int area = shape->Area();
  delete shape;
  return area;
}

std::uint32_t ProbeDivide(std::uint32_t high, std::uint32_t low, std::uint32_t by) {
  return static_cast<std::uint32_t>(((std::uint64_t{high} << 32U) | low) / by);
}

int ProbePercent(std::uint32_t part, std::uint32_t whole) {
  return static_cast<int>(static_cast<float>(part) / static_cast<float>(whole) * 100.0F);
}

void ProbeMove(char* to, const char* from, std::uint32_t size) {
  std::memmove(to, from, size);
}

std::uint32_t ProbeLength(const WCHAR* text) {
  return static_cast<std::uint32_t>(std::char_traits<WCHAR>::length(text));
}

int ProbeSignal(HANDLE event) {
  return SetEvent(event);
}

}  // extern "C"

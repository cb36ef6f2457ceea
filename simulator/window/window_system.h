// The windows, message queues and drawing tools of one device, behind the API functions.
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "ce/window.h"
#include "window/font.h"
#include "window/image.h"
#include "window/screen.h"
#include "world/world.h"

namespace sim {

class ApiCall;

inline constexpr COLORREF kDesktopColour = RGB(72, 96, 120);
inline constexpr COLORREF kBlack = RGB(0, 0, 0);
inline constexpr COLORREF kWhite = RGB(255, 255, 255);

struct WindowClass {
  std::u16string name;
  WNDPROC procedure = nullptr;
  HBRUSH background = nullptr;
  ATOM atom = 0;
};

struct Window {
  HWND handle = nullptr;
  const WindowClass* window_class = nullptr;
  std::u16string title;
  DWORD style = 0;
  DWORD extended_style = 0;
  SimThread* owner = nullptr;  ///< null: the desktop
  RECT frame = {};             ///< screen coordinates
  int border = 0;
  bool visible = false;
  bool placed = false;  ///< has been told its place and size
  bool going = false;   ///< DestroyWindow is under way
  RECT update = {};     ///< what is to be painted, client coordinates; empty: nothing
  bool erase = false;
  Image surface;  ///< the whole window with its border
  std::vector<Drawn> shown;

  [[nodiscard]] RECT client() const {
    return {0, 0, frame.right - frame.left - 2 * border, frame.bottom - frame.top - 2 * border};
  }
};

/// A message that its sender waits for.
struct SentMessage {
  HWND window = nullptr;
  UINT message = 0;
  WPARAM wparam = 0;
  LPARAM lparam = 0;
  SimThread* sender = nullptr;
  SimThread* receiver = nullptr;
  bool taken = false;  ///< its window procedure has been entered
  bool done = false;
  LRESULT result = 0;
};

/// One thread's messages. What a thread blocks with stands here and not on its stack, because a
/// thread that is terminated leaves its stack without unwinding it.
struct MessageQueue {
  std::deque<MSG> posted;
  std::deque<std::uint64_t> sent;  ///< keys of messages to this thread
  std::optional<int> quit;
  WaitQueue wake;
  World::Queues waits;
};

struct Pen {
  int style = PS_SOLID;
  int width = 1;
  COLORREF colour = kBlack;
};

struct Brush {
  bool hollow = false;
  COLORREF colour = kWhite;
};

/// A pen, a brush or the font; exactly one of the first two is set, or none for the font.
struct GdiObject {
  std::optional<Pen> pen;
  std::optional<Brush> brush;
  bool stock = false;
};

struct DeviceContext {
  HWND window = nullptr;
  RECT clip = {};  ///< client coordinates
  bool painting = false;
  bool erase = false;
  HGDIOBJ pen = nullptr;
  HGDIOBJ brush = nullptr;
  HGDIOBJ font = nullptr;
  int background_mode = OPAQUE;
  COLORREF text_colour = kBlack;
  std::vector<Drawn> calls;
};

/// All members want the world's lock; those that take it as an argument give it up while a window
/// procedure runs or the thread waits.
class WindowSystem {
 public:
  using Lock = World::Lock;

  explicit WindowSystem(Device& device);
  WindowSystem(const WindowSystem&) = delete;
  WindowSystem& operator=(const WindowSystem&) = delete;

  // ---- classes and windows ----
  /// @return null when the name is taken.
  const WindowClass* Register(const WNDCLASSW& definition);
  [[nodiscard]] const WindowClass* ClassOf(const WCHAR* name_or_atom) const;
  /// A window that is there and not of a thread that has ended.
  [[nodiscard]] Window* Find(HWND handle);
  Window& Create(const WindowClass& window_class, std::u16string title, SimThread& owner);
  /// Forgets the window and everything that is on its way to it.
  void Remove(HWND handle);
  [[nodiscard]] Window& desktop() { return *windows_.at(desktop_); }
  /// From the bottom up, without windows of threads that have ended.
  [[nodiscard]] std::vector<HWND> Order();
  void Raise(const Window& window);
  void Activate(Lock& lock, HWND handle);
  [[nodiscard]] HWND active() const { return active_; }
  bool Show(Lock& lock, HWND handle, bool activate);
  bool Hide(Lock& lock, HWND handle);
  void Destroy(Lock& lock, HWND handle);
  void Invalidate(Window& window, const RECT* area, bool erase);

  // ---- messages ----
  MessageQueue& QueueOf(const SimThread& thread);
  /// Calls the window's procedure, on the window's own thread; another one waits for it meanwhile
  /// and answers what is sent to itself. @return 0 when the window is gone or goes.
  LRESULT Send(Lock& lock, HWND handle, UINT message, WPARAM wparam, LPARAM lparam);
  /// Puts a message into the queue of the window's thread.
  void Post(const Window& window, UINT message, WPARAM wparam, LPARAM lparam);
  /// Calls the procedure here and now.
  LRESULT CallProcedure(Lock& lock, const Window& window, UINT message, WPARAM wparam,
                        LPARAM lparam);
  /// Answers one message that another thread has sent to the caller. @return false without one.
  bool AnswerSent(Lock& lock, const SimThread& thread);
  struct Filter {
    HWND window = nullptr;
    UINT first = 0;
    UINT last = 0;
    [[nodiscard]] bool Accepts(HWND handle, UINT message) const;
  };
  /// The next message of the thread, WM_QUIT and WM_PAINT included.
  bool Take(const SimThread& thread, const Filter& filter, bool remove, MSG& message);

  // ---- drawing ----
  HDC OpenContext(HWND handle, const RECT& clip, bool painting);
  [[nodiscard]] DeviceContext* ContextOf(HDC handle);
  /// Ends the context and keeps what it has drawn.
  void CloseContext(HDC handle);
  HGDIOBJ AddObject(GdiObject object);
  [[nodiscard]] const GdiObject* ObjectOf(HGDIOBJ handle) const;
  bool RemoveObject(HGDIOBJ handle);
  [[nodiscard]] Pen PenOf(const DeviceContext& context) const;
  [[nodiscard]] Brush BrushOf(const DeviceContext& context) const;
  /// The object that a brush argument stands for, a system colour plus 1 included.
  [[nodiscard]] std::optional<Brush> BackgroundBrush(HBRUSH brush) const;
  [[nodiscard]] Font& font();
  /// Another font than the system's, before anything is drawn.
  void SetFont(std::unique_ptr<Font> font) { font_ = std::move(font); }
  [[nodiscard]] Image Compose();

  // ---- what the screen's public face keeps ----
  std::uint64_t finished_paints = 0;
  std::function<void(const FinishedPaint&)> paint_listener;
  std::filesystem::path paint_folder;
  std::vector<ShownMessageBox> message_boxes;
  std::function<int(const ShownMessageBox&)> message_box_answer;
  [[nodiscard]] std::size_t gdi_objects() const;
  [[nodiscard]] std::size_t device_contexts() const { return contexts_.size(); }

  [[nodiscard]] Device& device() { return device_; }

 private:
  template <typename Handle>
  Handle NewHandle() {
    next_handle_ += 4;
    return reinterpret_cast<Handle>(static_cast<std::uintptr_t>(next_handle_));
  }
  void AddStockObjects();
  void AnswerForGone(SentMessage& message);
  [[nodiscard]] HWND TopVisible();

  Device& device_;
  World& world_;
  std::uint32_t next_handle_ = 0x10000;
  HWND desktop_ = nullptr;
  HWND active_ = nullptr;
  ATOM next_atom_ = 0xC000;
  std::vector<std::unique_ptr<WindowClass>> classes_;
  std::map<HWND, std::unique_ptr<Window>> windows_;
  std::vector<HWND> order_;  ///< from the bottom up, without the desktop
  std::map<std::uint32_t, std::unique_ptr<MessageQueue>> queues_;
  std::uint64_t next_sent_ = 0;
  std::map<std::uint64_t, SentMessage> sent_;
  std::map<HDC, DeviceContext> contexts_;
  std::map<HGDIOBJ, GdiObject> objects_;
  std::unique_ptr<Font> font_;
};

/// Where the calls of a device's programs go.
WindowSystem& SystemOf(const ApiCall& call);

}  // namespace sim

// A device's screen as somebody who stands before it sees it: the picture, the windows, and what
// has been drawn into them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <variant>
#include <vector>

#include "ce/window.h"
#include "window/image.h"

namespace sim {

class Device;
class WindowSystem;

// Drawing calls, in client coordinates of their window.

struct DrawnRectangle {
  RECT area;
  int pen_width;
  COLORREF outline;
  COLORREF inside;
};

struct DrawnLine {
  std::vector<POINT> points;
  int pen_width;
  COLORREF colour;
};

struct DrawnText {
  RECT area;  ///< the characters' cells
  std::u16string text;
  COLORREF colour;
};

using Drawn = std::variant<DrawnRectangle, DrawnLine, DrawnText>;

/// What a drawing call covers at most, client coordinates.
RECT BoundsOf(const Drawn& drawn);

/// One BeginPaint to EndPaint.
struct FinishedPaint {
  std::uint64_t number = 0;  ///< from 1, over all windows
  HWND window = nullptr;
  RECT area = {};      ///< the update rectangle, client coordinates
  bool erase = false;  ///< the background was to be erased and the window did not
  std::vector<Drawn> calls;
};

struct WindowInfo {
  HWND handle = nullptr;
  std::u16string class_name;
  std::u16string title;
  DWORD style = 0;
  DWORD extended_style = 0;
  RECT frame = {};  ///< screen coordinates
  bool visible = false;
  bool active = false;
  std::uint32_t thread_id = 0;
};

struct ShownMessageBox {
  std::u16string text;
  std::u16string caption;
  UINT style = 0;
};

/// Any thread may call any of these, without the world's lock.
class Screen {
 public:
  explicit Screen(Device& device);
  ~Screen();
  Screen(const Screen&) = delete;
  Screen& operator=(const Screen&) = delete;

  /// The whole screen as it looks now.
  [[nodiscard]] Image Snapshot() const;
  /// @return false, with one line in `error`, when the file cannot be written.
  bool SavePng(const std::filesystem::path& file, std::string& error) const;

  /// Called on the painting thread after each EndPaint; an empty function ends it.
  void OnPaint(std::function<void(const FinishedPaint&)> listener);
  /// Saves the screen after each paint as paint-000001.png, ... in `folder`, which is made when it
  /// does not exist; an empty path ends it. The first file that cannot be written ends it too,
  /// with a line on the standard error output.
  void SavePaints(std::filesystem::path folder);
  [[nodiscard]] std::uint64_t finished_paints() const;

  /// All windows, the top one first.
  [[nodiscard]] std::vector<WindowInfo> Windows() const;
  /// The drawing calls whose result a window still shows, in the order they were made: those of
  /// earlier paints as far as no later paint covers them. Empty for an unknown window.
  [[nodiscard]] std::vector<Drawn> Shown(HWND window) const;

  /// Message boxes so far. A box never waits: it is answered at once, by `answer` or with IDOK.
  [[nodiscard]] std::vector<ShownMessageBox> MessageBoxes() const;
  void AnswerMessageBoxes(std::function<int(const ShownMessageBox&)> answer);

  /// Pens that exist and device contexts that are in use: what programs have not given back.
  [[nodiscard]] std::size_t gdi_objects() const;
  [[nodiscard]] std::size_t device_contexts() const;

  /// What stands behind the API functions.
  [[nodiscard]] WindowSystem& system() const { return *system_; }

 private:
  Device& device_;
  std::unique_ptr<WindowSystem> system_;
};

}  // namespace sim

// usage: progress_window <state>
//
// Shows the progress window until a file "done" stands in the root folder. Writes the sizes of its
// font to "font" first, and makes the file "shown" when everything is painted.
#include "state.h"

namespace {

constexpr int kLongestWaitMs = 30000;

/// One message that comes back when the window's thread has done all it had to do.
void Settle() {
  const HWND window = FindWindowW(TEXT("TWUpgrade"), nullptr);
  for (int i = 0; i < 3; ++i) {
    SendMessageW(window, WM_NULL, 0, 0);
    UpdateWindow(window);
    Sleep(50);
  }
}

void WriteFont() {
  const HDC dc = GetDC(nullptr);
  TEXTMETRICW font = {};
  GetTextMetricsW(dc, &font);
  ReleaseDC(nullptr, dc);
  FILE* const file = fopen("\\font", "w");
  if (file == nullptr) return;
  std::fprintf(file, "%ld %ld %ld %ld %ld %ld %ld\n", font.tmHeight, font.tmAscent, font.tmDescent,
               font.tmInternalLeading, font.tmExternalLeading, font.tmAveCharWidth,
               font.tmMaxCharWidth);
  fclose(file);
}

}  // namespace

int main(int count, char** arguments) {
  if (count != 2) return 2;
  WriteFont();
  window_test::ShowState(arguments[1]);
  Settle();
  CloseHandle(CreateFileW(TEXT("\\shown"), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                          FILE_ATTRIBUTE_NORMAL, nullptr));
  int waited = 0;
  while (GetFileAttributesW(TEXT("\\done")) == INVALID_FILE_ATTRIBUTES && waited < kLongestWaitMs) {
    Sleep(20);
    waited += 20;
  }
  report::CloseProgressWindow();
  return waited < kLongestWaitMs ? 0 : 1;
}

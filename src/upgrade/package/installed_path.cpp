#include "upgrade/package/installed_path.h"

namespace upgrade {
namespace {

/// The folders of "%CE1%", "%CE2%" and so on. Platforms with a desktop have other ones.
constexpr std::string_view kFolders[] = {
    "\\Program Files",                         // 1
    "\\Windows",                               // 2
    "",                                        // 3
    "\\Windows\\StartUp",                      // 4
    "\\My Documents",                          // 5
    "",                                        // 6
    "",                                        // 7
    "",                                        // 8
    "",                                        // 9
    "",                                        // 10
    "\\Windows\\Start Menu\\Programs",         // 11
    "",                                        // 12
    "",                                        // 13
    "\\Windows\\Start Menu\\Programs\\Games",  // 14
    "\\Windows\\Fonts",                        // 15
    "",                                        // 16
    "\\Windows\\Start Menu",                   // 17
};
constexpr std::size_t kFolderCount = sizeof kFolders / sizeof kFolders[0];
static_assert(kFolderCount == 17);

struct Macro {
  std::size_t size = 0;  ///< of its text; 0: there is none
  std::size_t number = 0;
};

/// The macro that `text` begins with.
constexpr Macro MacroAt(std::string_view text) noexcept {
  constexpr std::string_view kStart = "%CE";
  if (!base::StartsWith(text, kStart)) return {};
  Macro macro{kStart.size(), 0};
  while (macro.size < text.size() && macro.size < kStart.size() + 2 && text[macro.size] >= '0' &&
         text[macro.size] <= '9') {
    macro.number = macro.number * 10 + static_cast<std::size_t>(text[macro.size++] - '0');
  }
  // "%CE05%" is none either.
  const bool known = macro.number >= 1 && macro.number <= kFolderCount && text[3] != '0';
  const bool closed = macro.size < text.size() && text[macro.size] == '%';
  return known && closed ? Macro{macro.size + 1, macro.number} : Macro{};
}
static_assert(MacroAt("%CE1%\\A").size == 5 && MacroAt("%CE17%").number == 17);
static_assert(MacroAt("%CE0%").size == 0 && MacroAt("%CE18%").size == 0);
static_assert(MacroAt("%CE05%").size == 0 && MacroAt("%CE111%").size == 0);
static_assert(MacroAt("%CE%").size == 0 && MacroAt("%CE1").size == 0 && MacroAt("%ce1%").size == 0);

}  // namespace

void InstalledPath::AddFolder(std::string_view text) noexcept {
  while (!text.empty()) {
    const Macro macro = MacroAt(text);
    if (macro.size > 0) {
      AddText(FolderOfMacro(macro.number));
      text.remove_prefix(macro.size);
    } else {
      AddText(base::Part(text, 0, 1));
      text.remove_prefix(1);
    }
  }
}

std::string_view InstalledPath::FolderOfMacro(std::size_t number) noexcept {
  return number >= 1 && number <= kFolderCount ? kFolders[number - 1] : std::string_view{};
}

void InstalledPath::AddText(std::string_view text) noexcept {
  for (const char letter : text) {
    const bool doubled = letter == '\\' && size_ > 0 && path_.c_str()[size_ - 1] == '\\';
    if (doubled || size_ == kSize - 1) continue;
    path_.data()[size_++] = letter;  // behind it stand zeros
  }
}

}  // namespace upgrade

#include "xml/generated_text.h"

namespace xml {

std::string TextGenerator::Blanks(std::size_t at_least) {
  std::string blanks;
  const std::size_t count = at_least + (dice_.Roll(4) == 0 ? dice_.Roll(3) : 0);
  for (std::size_t i = 0; i < count; ++i) blanks += " \t\n\r"[dice_.Roll(4)];
  return blanks;
}

std::string TextGenerator::Name() {
  return dice_.Word("a b Group Field Name x-1 y.2 z_3 n:s \xC3\xA4\xE2\x82\xAC Q A") +
         (dice_.Roll(3) == 0 ? std::to_string(dice_.Roll(1000)) : "");
}

/// @param quote  what may not stand in the text as it is; empty between tags
std::string TextGenerator::Text(std::string_view quote) {
  static constexpr const char* kParts[] = {
      "&amp;", "&lt;", "&gt;", "&quot;", "&apos;", "&amp;lt;", "&nbsp;",
      "& ",    "&",    "text", " ",      "\n",     "\t",       "\xC3\xBC\xE2\x82\xAC",
      "1234",  "'",    "\"",   ">",      "=/>",    "]",        "&&",
      "&amp",  "&LT;", "\r\n", "\x01"};
  std::string text;
  const std::size_t parts = dice_.Roll(4) == 0 ? dice_.Roll(30) : dice_.Roll(4);
  for (std::size_t i = 0; i < parts; ++i) {
    const std::string part = kParts[dice_.Roll(std::size(kParts))];
    if (quote.empty() || part != quote) text += part;
    if (!quote.empty() && dice_.Roll(9) == 0) text += "<x>";
  }
  return text;
}

void TextGenerator::Attributes(std::string& out) {
  const std::size_t count = dice_.Roll(3) == 0 ? dice_.Roll(6) : dice_.Roll(2);
  for (std::size_t i = 0; i < count; ++i) {
    const std::string quote = dice_.Roll(2) == 0 ? "'" : "\"";
    // The number keeps two attributes of an element apart.
    out += Blanks(1) + Name() + "." + std::to_string(i) + Blanks(0) + "=" + Blanks(0);
    out += quote + Text(quote) + quote;
  }
}

void TextGenerator::Misc(std::string& out) {
  out += Blanks(0);
  if (dice_.Roll(6) == 0) out += "<!-- <a> & -- " + Blanks(0) + "'-->";
  if (dice_.Roll(8) == 0) out += "<?target some='data'" + Blanks(0) + "?>";
  out += Blanks(0);
}

void TextGenerator::Content(int level, std::string& out) {
  out += Text("");
  if (dice_.Roll(2) == 0 && level > 2) return;
  const std::size_t children = dice_.Roll(5);
  for (std::size_t i = 0; i < children && left_ > 0; ++i) {
    Misc(out);
    Element(level + 1, out);
    out += dice_.Roll(3) == 0 ? Text("") : "";
  }
  Misc(out);
}

void TextGenerator::Element(int level, std::string& out) {
  --left_;
  const std::string name = Name();
  out += "<" + name;
  Attributes(out);
  out += Blanks(0);
  if (level == 64 || dice_.Roll(4) == 0) {
    out += "/>";
    return;
  }
  out += ">";
  Content(level, out);
  out += "</" + name + Blanks(0) + ">";
}

std::string TextGenerator::Document() {
  left_ = static_cast<int>(dice_.Roll(200));
  std::string text = dice_.Roll(4) == 0 ? "\xEF\xBB\xBF" : "";
  if (dice_.Roll(2) == 0) text += "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n";
  Misc(text);
  // Some documents use all levels that there are.
  const int depth = dice_.Roll(5) == 0 ? 62 : 0;
  for (int level = 0; level < depth; ++level) text += "<deep>";
  Element(depth, text);
  for (int level = 0; level < depth; ++level) text += "</deep>";
  Misc(text);
  return text;
}

}  // namespace xml

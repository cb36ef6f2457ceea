// The five predefined entities, which are all that documents here know.
#pragma once

#include <string_view>

namespace xml {

struct Entity {
  std::string_view text;
  char byte;
};

inline constexpr Entity kEntities[] = {
    {"&amp;", '&'}, {"&lt;", '<'}, {"&gt;", '>'}, {"&quot;", '"'}, {"&apos;", '\''},
};

}  // namespace xml

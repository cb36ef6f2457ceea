#include "mcftp/mcast_log.h"

#include <coredll.h>

#include "base/format.h"

namespace mcftp {

void AppendToMcastLog(const char* line) noexcept {
  char text[128];
  const std::size_t length = base::Format(text, sizeof text, "%s\n", line);
  FILE* const file = fopen("\\mcast.log", "ab");  // as text the line feed would become two bytes
  if (file == nullptr) return;
  fwrite(text, 1, length, file);
  fclose(file);
}

}  // namespace mcftp

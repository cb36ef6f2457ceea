// A client that counts its log lines, for tests that use the host's sockets themselves.
#include <atomic>
#include <string>

#include "mcftp/start.h"

namespace test {

std::int32_t RunCountingClient(const std::string& options, std::atomic<int>& lines) {
  mcftp::ClientOwner owner;
  owner.context = &lines;
  owner.log = [](void* context, const WCHAR* /*line*/) {
    static_cast<std::atomic<int>*>(context)->fetch_add(1);
  };
  return mcftp::StartMulticastClient(options.c_str(), &owner);
}

}  // namespace test

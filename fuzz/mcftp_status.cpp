// Input: a datagram of progress, from anyone. Checks what whoever shows it relies on.
#include <cstdlib>
#include <vector>

#include "mcftp/wire/status_datagram.h"

namespace {

void Require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  mcftp::StatusDatagram status;
  if (!mcftp::DecodeStatus(data, size, status)) {
    Require(size < mcftp::kStatusNameOffset);
    return 0;
  }
  const std::string_view name = status.file_name;
  Require(name.size() <= mcftp::kMaxStatusName);
  Require(name.size() <= size - mcftp::kStatusNameOffset);
  Require(name.find('\0') == std::string_view::npos);

  std::vector<std::uint8_t> written(name.size() + 13);
  Require(mcftp::EncodeStatus(status, written.data(), written.size()) == written.size());
  mcftp::StatusDatagram again;
  Require(mcftp::DecodeStatus(written.data(), written.size(), again));
  Require(again.percent == status.percent && again.total_bytes == status.total_bytes &&
          again.file_size == status.file_size && again.file_name == name);
  return 0;
}

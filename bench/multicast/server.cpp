// Sends one file by multicast with the server's own engine; prints one JSON line of figures.
//
//   bench_multicast_server FILE DEVICE_PATH ADDRESS RECEIVERS BLOCK_SIZE RATE_MBIT WINDOW [encrypt]

#include <asio/io_context.hpp>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "process_figures.h"
#include "server/multicast_driver.h"
#include "server/multicast_run.h"

namespace {

server::MulticastOptions ReadOptions(char** arguments, bool encrypt) {
  server::MulticastOptions options;
  options.start.expected = static_cast<std::uint32_t>(std::atoi(arguments[4]));
  options.block_size = static_cast<std::uint16_t>(std::atoi(arguments[5]));
  options.rate = std::strtoull(arguments[6], nullptr, 10) * 1'000'000;
  const int window = std::atoi(arguments[7]);
  if (window > 0) options.window = static_cast<std::uint32_t>(window);
  options.encrypt = encrypt;
  return options;
}

double Seconds(server::Micros span) {
  return std::chrono::duration<double>(span).count();
}

}  // namespace

int main(int count, char** arguments) {
  if (count != 8 && count != 9) {
    std::fprintf(stderr,
                 "usage: bench_multicast_server FILE DEVICE_PATH ADDRESS RECEIVERS BLOCK_SIZE "
                 "RATE_MBIT WINDOW [encrypt]\n");
    return 2;
  }
  server::MulticastFile file;
  file.device_path = arguments[2];
  file.content = server::OpenContent(arguments[1]);
  server::MulticastRun run(ReadOptions(arguments, count == 9), {file});
  server::MulticastSocketOptions socket;
  socket.address = arguments[3];

  asio::io_context loop;
  server::MulticastDriver driver(loop, run, socket);
  driver.Start([&driver] { driver.Close(); });
  loop.run();

  const server::FileFigures& sent = run.figures().files.front();
  std::printf(
      "{\"transfer_s\": %.6f, \"wire_bytes\": %llu, \"first_pass\": %llu, \"repairs\": %llu, "
      "\"control\": %llu, \"naks\": %llu, \"acks\": %llu, \"proven\": %zu, \"cpu_s\": %.6f}\n",
      Seconds(sent.ended - sent.data_began), static_cast<unsigned long long>(sent.wire_bytes),
      static_cast<unsigned long long>(sent.first_pass_frames),
      static_cast<unsigned long long>(sent.repair_frames),
      static_cast<unsigned long long>(sent.control_frames),
      static_cast<unsigned long long>(sent.naks), static_cast<unsigned long long>(sent.acks),
      sent.Count(server::DeviceState::kProven), bench::ProcessorSeconds());
  return 0;
}

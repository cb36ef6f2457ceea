// The multicast half of `orvenix serve`.
#pragma once

#include <asio/io_context.hpp>
#include <filesystem>
#include <functional>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>

#include "server/multicast_figures.h"
#include "tools/bundle.h"
#include "tools/serve.h"

namespace tools {

/// Sends the announced files of a bundle to their group while the loop runs.
class MulticastService {
 public:
  /// Opens files and socket. Throws Failure: kBadInput for files that cannot be sent,
  /// kCannotListen when the group cannot be reached from here, kUsage.
  /// @param tree     the bundle's served folder
  /// @param address  of the HTTP server
  MulticastService(asio::io_context& loop, const Bundle& bundle, const std::filesystem::path& tree,
                   const std::string& address, const ServeMulticast& options);
  ~MulticastService();
  MulticastService(const MulticastService&) = delete;
  MulticastService& operator=(const MulticastService&) = delete;

  /// Begins to announce. `listener` is told of everything that happens.
  void Start(server::MulticastListener listener);
  /// Ends it: devices that are not done are reported as they are.
  void Stop();

  void StartNow();
  /// @param bits_per_second  0: no limit
  void SetRate(std::uint64_t bits_per_second);
  /// A quarter more, or a fifth less, than the limit; without a limit, than what is sent now.
  void ChangeRate(bool faster);

  [[nodiscard]] const server::MulticastFigures& figures() const;
  /// Whether the capture, if there is one, holds every datagram so far.
  [[nodiscard]] bool captured() const;
  /// "announcing 12 files on 239.1.1.1:7000 from 127.0.0.2:40123 (lo), ttl 1, loop on"
  [[nodiscard]] std::string Headline() const;
  [[nodiscard]] nlohmann::ordered_json HeadlineJson() const;
  /// How far the file under way is; null when no blocks are sent.
  [[nodiscard]] nlohmann::ordered_json Progress();
  [[nodiscard]] std::string ProgressLine() const;
  /// What it looks like now, for a terminal.
  [[nodiscard]] std::string Table(std::size_t rows);

 private:
  class Body;
  std::unique_ptr<Body> body_;
};

}  // namespace tools

#include "tools/serve.h"

#include <unistd.h>

#include <asio/io_context.hpp>
#include <asio/signal_set.hpp>
#include <asio/steady_timer.hpp>
#include <csignal>
#include <iostream>
#include <memory>
#include <optional>
#include <system_error>

#include "server/http_server.h"
#include "tools/bundle.h"
#include "tools/device_table.h"
#include "tools/failure.h"
#include "tools/file_text.h"
#include "tools/lint/lint.h"
#include "tools/multicast_table.h"
#include "tools/serve_control.h"
#include "tools/serve_multicast.h"

namespace tools {
namespace {

namespace fs = std::filesystem;

constexpr std::chrono::milliseconds kRedraw{250};
constexpr std::chrono::milliseconds kProgress{1000};
constexpr std::size_t kTableRows = 30;

/// What is to be served, and what its bundle says about where.
struct Source {
  fs::path root;
  fs::path job;            ///< of a bundle that has one
  fs::path configuration;  ///< the same
  std::string address = "127.0.0.1";
  std::uint16_t port = 8080;
  std::optional<Bundle> bundle;  ///< none: any folder of files
};

Source FindSource(const fs::path& named) {
  fs::path folder = named;
  if (fs::is_regular_file(named)) {
    folder = named.parent_path().empty() ? fs::path(".") : named.parent_path();
    if (!fs::exists(folder / kBundleManifest)) {
      throw Failure(ExitCode::kBadInput, named.string(), "does not belong to a bundle",
                    "name a bundle's folder, or the job.xml in it");
    }
  }
  if (!fs::is_directory(folder)) {
    throw Failure(ExitCode::kBadInput, named.string(), "there is no such bundle or folder",
                  "make one with 'orvenix bundle make'");
  }
  Source source;
  source.root = folder;
  if (!fs::exists(folder / kBundleManifest)) return source;
  source.bundle = ReadBundle(folder);
  source.root = folder / kBundleTree;
  if (fs::exists(folder / kBundleJob)) source.job = folder / kBundleJob;
  if (fs::exists(folder / kBundleConfiguration)) {
    source.configuration = folder / kBundleConfiguration;
  }
  source.address = source.bundle->address;
  source.port = source.bundle->port;
  return source;
}

/// Options that mean nothing here would only mislead.
void RefuseIdleOptions(const ServeMulticast& multicast) {
  if (multicast.expected == 0 && multicast.minimum == 0 && !multicast.start_now &&
      multicast.rounds == 1 && multicast.session.empty() && multicast.pcap.empty()) {
    return;
  }
  throw Failure(ExitCode::kUsage, "multicast", "the bundle is not made for it",
                "make it with 'orvenix bundle make ... --multicast 239.1.1.1:7000'");
}

class ServeRun {
 public:
  explicit ServeRun(const ServeOptions& options)
      : options_(options),
        source_(FindSource(options.bundle)),
        site_(source_.root),
        signals_(loop_, SIGINT, SIGTERM),
        redraw_(loop_),
        progress_(loop_),
        table_(!options.json && ::isatty(STDOUT_FILENO) == 1) {}

  ExitCode Run() {
    if (source_.bundle) SetAttributes(*source_.bundle);
    inventory_ = site_.Warm();
    if (!options_.force && !source_.job.empty()) RefuseBadJob();
    if (!options_.force && !source_.configuration.empty()) RefuseBadConfiguration();
    server::RaiseDescriptorLimit();
    ledger_.SetListener([this](const server::Event& event) { OnEvent(event); });
    Listen();
    Announce();
    if (!options_.multicast.off) StartMulticast();
    signals_.async_wait([this](const asio::error_code& error, int) {
      if (!error) Stop();
    });
    if (table_) Redraw();
    loop_.run();
    if (table_) std::cout << "\x1b[H\x1b[J" << FormatTable(ledger_, kTableRows) << std::flush;
    WriteReport();
    return ExitCode::kOk;
  }

 private:
  void SetAttributes(const Bundle& bundle) {
    for (const BundleFile& file : bundle.files) {
      if (file.attributes != 0) site_.SetAttributes(file.source, file.attributes);
    }
  }

  /// After Warm(), so that no file is read twice for its checksum.
  void RefuseBadJob() {
    const std::string name = source_.job.string();
    Refuse(name, LintJob(ReadJob(source_.job), name, &site_));
  }
  void RefuseBadConfiguration() {
    const std::string name = source_.configuration.string();
    Refuse(name, LintConfiguration(ReadWholeFile(source_.configuration), name, &site_));
  }
  void Refuse(const std::string& name, const Findings& findings) const {
    if (options_.json && findings.Count(Level::kError) > 0) Print(FindingsJson(name, findings));
    RefuseErrors(name, findings, "see 'orvenix job lint', or serve it all the same with --force");
  }

  void Listen() {
    server::HttpServerOptions http;
    http.address = options_.address.value_or(source_.address);
    http.port = options_.port.value_or(source_.port);
    http.max_connections = options_.max_connections;
    http.session.body_pause = server::Time(options_.pause_ms);
    http.session.checkpoint_block_size = options_.checkpoint_block_size;
    address_ = http.address;
    try {
      server_ = std::make_unique<server::HttpServer>(loop_, site_, ledger_, http);
    } catch (const std::system_error& error) {
      throw Failure(ExitCode::kCannotListen, http.address + ":" + std::to_string(http.port),
                    error.code().message(), "choose another --address or --port");
    }
  }

  void Announce() {
    if (options_.json) {
      Print({{"event", "listening"},
             {"address", address_},
             {"port", server_->port()},
             {"files", inventory_.files},
             {"bytes", inventory_.bytes}});
    } else {
      std::cout << "serving " << inventory_.files << " files, " << FormatBytes(inventory_.bytes)
                << ", at http://" << address_ << ":" << server_->port() << " (Ctrl-C ends it)"
                << std::endl;
    }
  }

  void StartMulticast() {
    if (!source_.bundle || !source_.bundle->multicast) {
      RefuseIdleOptions(options_.multicast);
      return;
    }
    multicast_ = std::make_unique<MulticastService>(loop_, *source_.bundle, source_.root, address_,
                                                    options_.multicast);
    if (options_.json) {
      Print(multicast_->HeadlineJson());
    } else {
      std::cout << multicast_->Headline() << std::endl;
    }
    control_ = std::make_unique<ServeControl>(
        loop_, [this](const ServeCommand& command) { Obey(command); },
        [this](const std::string& line) { Remark("no command: " + line); });
    multicast_->Start([this](const server::MulticastEvent& event) { OnMulticast(event); });
    ReportProgress();
  }

  void Obey(const ServeCommand& command) {
    switch (command.kind) {
      case ServeCommand::Kind::kRate: multicast_->SetRate(command.rate); break;
      case ServeCommand::Kind::kFaster: multicast_->ChangeRate(true); break;
      case ServeCommand::Kind::kSlower: multicast_->ChangeRate(false); break;
      case ServeCommand::Kind::kStart: multicast_->StartNow(); return;
    }
    Remark("rate " + FormatRate(multicast_->figures().rate));
  }

  /// A line of the server's own; a table has its own place for what it says.
  void Remark(const std::string& text) const {
    if (options_.json) {
      Print({{"event", "remark"}, {"text", text}});
    } else if (!table_) {
      std::cout << text << std::endl;
    }
  }

  void OnMulticast(const server::MulticastEvent& event) {
    if (options_.json) {
      Print(ToJson(event, start_));
    } else if (!table_) {
      std::cout << ToLine(event, start_) << std::endl;
    }
  }

  /// Where no table is shown: how far the file is that blocks are sent of.
  void ReportProgress() {
    if (table_) return;
    const nlohmann::ordered_json progress = multicast_->Progress();
    if (!progress.is_null() && options_.json) Print(progress);
    if (!progress.is_null() && !options_.json) std::cout << multicast_->ProgressLine() << std::endl;
    progress_.expires_after(kProgress);
    progress_.async_wait([this](const asio::error_code& error) {
      if (!error) ReportProgress();
    });
  }

  static void Print(const nlohmann::ordered_json& json) {
    std::cout << json.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace) << std::endl;
  }

  void OnEvent(const server::Event& event) {
    if (options_.json) {
      Print(ToJson(event, start_));
    } else if (!table_) {
      std::cout << ToLine(event, start_) << std::endl;
    }
    if (event.kind == server::EventKind::kReport && ++reports_ == options_.until_reports) {
      // Not at once: the device still has to close its connection.
      ending_ = true;
      redraw_.expires_after(kRedraw);
      redraw_.async_wait([this](const asio::error_code& error) {
        if (!error) Stop();
      });
    }
  }

  void Redraw() {
    if (ending_) return;
    std::cout << "\x1b[H\x1b[J"
              << "serving " << inventory_.files << " files at http://" << address_ << ":"
              << server_->port() << ", " << server_->figures().connections
              << " connections (Ctrl-C ends it)\n\n";
    if (multicast_ != nullptr) {
      std::cout << multicast_->Headline() << "; keys: + faster, - slower, s start now\n"
                << multicast_->Table(kTableRows) << "\n";
    }
    std::cout << FormatTable(ledger_, kTableRows) << std::flush;
    redraw_.expires_after(kRedraw);
    redraw_.async_wait([this](const asio::error_code& error) {
      if (!error) Redraw();
    });
  }

  void Stop() {
    signals_.cancel();
    redraw_.cancel();
    progress_.cancel();
    server_->Stop();
    if (control_ != nullptr) control_->Stop();
    if (multicast_ != nullptr) multicast_->Stop();
  }

  void WriteReport() {
    nlohmann::ordered_json devices = nlohmann::ordered_json::array();
    for (const auto& [key, device] : ledger_.devices()) devices.push_back(ToJson(device));
    const server::HttpServerFigures& figures = server_->figures();
    nlohmann::ordered_json report{{"event", "ended"},
                                  {"seconds", Seconds()},
                                  {"files", inventory_.files},
                                  {"bytes", inventory_.bytes},
                                  {"connections", figures.accepted},
                                  {"most_connections", figures.most_connections},
                                  {"turned_away", figures.turned_away},
                                  {"bad_requests", ledger_.bad_requests()},
                                  {"devices", devices}};
    const bool captured = multicast_ == nullptr || multicast_->captured();
    if (multicast_ != nullptr) report["multicast"] = ToJson(multicast_->figures());
    if (!captured) report["multicast"]["capture"] = "cut";
    if (!options_.report.empty()) WriteWholeFile(options_.report, report.dump(2) + "\n");
    if (options_.json) Print(report);
    if (!options_.json) {
      std::cout << "ended: " << devices.size() << " devices, " << reports_ << " reports, "
                << figures.most_connections << " connections at once at most" << std::endl;
      if (multicast_ != nullptr) std::cout << FormatMulticastReport(multicast_->figures());
      if (!captured) std::cout << "the capture is cut: it could not be written to its end\n";
      std::cout << std::flush;
    }
  }

  [[nodiscard]] double Seconds() const {
    return std::chrono::duration<double>(server::Now() - start_).count();
  }

  const ServeOptions options_;
  const Source source_;
  server::Site site_;
  server::DeviceLedger ledger_;
  asio::io_context loop_;
  asio::signal_set signals_;
  asio::steady_timer redraw_;
  asio::steady_timer progress_;
  const bool table_;
  const server::Time start_ = server::Now();
  server::Site::Inventory inventory_;
  std::unique_ptr<server::HttpServer> server_;
  std::unique_ptr<MulticastService> multicast_;
  std::unique_ptr<ServeControl> control_;
  std::string address_;
  std::uint64_t reports_ = 0;
  bool ending_ = false;
};

}  // namespace

ExitCode Serve(const ServeOptions& options) {
  return ServeRun(options).Run();
}

}  // namespace tools

// From the options to a running client.
#include <coredll.h>

#include "mcftp/client.h"
#include "mcftp/mcast_log.h"

namespace mcftp {
namespace {

constexpr char kStateMachineVersion[] = "1.0";
constexpr int kProtocolVersion = 3;

bool NamesEndpoint(const base::FixedText<16>& address, std::uint16_t port) noexcept {
  const std::uint32_t number = ParseAddress(address.c_str());
  return port != 0 && number != INADDR_NONE && number != 0;
}

/// Gives `endpoint` a socket and the address it sends to; without a socket it keeps none.
bool OpenTowards(UdpEndpoint& endpoint, const base::FixedText<16>& address,
                 std::uint16_t port) noexcept {
  if (!endpoint.Create()) return false;
  endpoint.SetAddress(ParseAddress(address.c_str()));
  endpoint.SetPort(port);
  return true;
}

}  // namespace

bool McftpClient::Start(const CommandLine& options, const ClientOwner& owner) noexcept {
  options_ = options;
  AppendToMcastLog("Initializing callbacks");
  owner_ = owner;
  AppendToMcastLog("Starting the client protocol engine (state machine)");
  AppendToMcastLog("Registry - creating keys and loading values");
  LoadSettings(settings_);  // with whatever could be read
  AppendToMcastLog("Registry updated");
  if (settings_.load_client == 0) {
    AppendToMcastLog("Client configured NOT to load!");
    return false;
  }
  link_.set_enciphering(settings_.encryption_enabled != 0);
  overrun_ = OverrunWatch(settings_.rx_blocks_before_overrun, settings_.overrun_percent_threshold);
  AppendToMcastLog("Initializing the multicast client");
  if (!Initialize()) {
    AppendToMcastLog("Failed to initialize the multicast client!");
    link_.Close();
    return false;
  }
  AppendToMcastLog("Socket API initialized");
  return StartThread();
}

bool McftpClient::StartThread() noexcept {
  AppendToMcastLog("Creating state machine thread");
  const device::ThreadHandle thread(
      thread_ended_ ? CreateThread(nullptr, 0, &StateMachineThread, this, 0, nullptr) : nullptr);
  thread_started_ = static_cast<bool>(thread);
  AppendToMcastLog(thread_started_ ? "State machine thread created"
                                   : "Failed to create state machine thread!");
  return thread_started_;
}

bool McftpClient::Initialize() noexcept {
  Log("Instantiating blowfish object");
  if (!link_.MakeCipher()) {
    Log("Failed to instantiate blowfish object!");
    return false;
  }
  Log("Blowfish object instantiated");
  Log("Initialize the socket API");
  if (!link_.network().Start()) {
    Log("Socket API initialization failed!");
    return false;
  }
  Log("Socket API initialized");
  OpenDebugSocket();
  OpenUserInterfaceSockets();
  if (!OpenPublicSocket()) return false;
  LogBanner();
  return true;
}

void McftpClient::OpenDebugSocket() noexcept {
  if (!NamesEndpoint(options_.debug, options_.debug_port)) return;
  Log("Create socket for communication with remote UI (syslog server)");
  if (OpenTowards(debug_, options_.debug, options_.debug_port)) {
    Log("Remote debug (%s:%u)", debug_.address_text().c_str(),
        static_cast<unsigned>(debug_.port()));
  } else {
    Log("Failed to create UDP socket (syslog server)");
  }
}

void McftpClient::OpenUserInterfaceSockets() noexcept {
  if (NamesEndpoint(options_.local_ui, options_.local_ui_port)) {
    Log("Create socket for communication with local UI (FT configlet)");
    if (OpenTowards(local_ui_, options_.local_ui, options_.local_ui_port)) {
      Log("Local UI (%s:%u)", local_ui_.address_text().c_str(),
          static_cast<unsigned>(local_ui_.port()));
    } else {
      Log("Failed to create UDP socket (local UI)");
      Log("Failed to create UDP socket for communication with local UI");
    }
  }
  Log("Create socket for communication with remote UI (Upgrade Monitor)");
  if (!remote_ui_.Create()) {
    Log("Failed to create UDP socket (remote UI)");
    Log("Failed to create UDP socket for communication with remote UI");
  }
}

bool McftpClient::OpenPublicSocket() noexcept {
  UdpEndpoint& socket = link_.public_endpoint();
  Log("Create multicast socket");
  if (!socket.Create()) {
    Log("CreateMulticast() failed");
    Log("Failed to create multicast socket!");
    return false;
  }
  Log("Allow reuse of the local address");
  if (!socket.AllowAddressReuse()) {
    Log("ReuseAddress() failed");
    Log("Failed to allow reuse of the local address");
    return false;
  }
  Log("Bind socket to port/interface");
  if (!socket.Bind(options_.public_port)) {
    Log("Bind() failed");
    Log("Failed to bind socket to port/interface");
    return false;
  }
  Log("Socket bound to %s", socket.address_text().c_str());
  Log("Join the public multicast group where file transfers will be announced");
  if (!link_.JoinPublicGroup(options_.public_group.c_str())) {
    Log("Add membership failed!");
    return false;
  }
  Log("Public multicast group %s joined", options_.public_group.c_str());
  return true;
}

void McftpClient::LogBanner() noexcept {
  const UdpNetwork& network = link_.network();
  Log("Initialization successful");
  Log("Multicast File Transfer Client (Built: %s %s)", __DATE__, __TIME__);
  Log("Host Name: %s", network.host_name());
  Log("FQDN: %s", network.full_name());
  Log("IP Address: %s", network.own_address_text().c_str());
  Log("State Machine v%s", kStateMachineVersion);
  Log("Protocol v%d", kProtocolVersion);
  Log("Receive Timeout: %d", static_cast<int>(settings_.receive_timeout_ms));
  Log("Overrun Threshold: %d", static_cast<int>(settings_.overrun_percent_threshold));
  Log("Minimum blocks before overrun: %d", static_cast<int>(settings_.rx_blocks_before_overrun));
  Log("Initialization complete");
}

}  // namespace mcftp

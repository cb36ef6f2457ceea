// The texts of the multicast client: of \mcast.log, which has its start, and of what it tells a log
// server.
#include <iterator>

#include "tools/explain/catalogue.h"

namespace tools {
namespace {

constexpr Weight kStep = Weight::kStep;
constexpr Weight kGood = Weight::kGood;
constexpr Weight kTrouble = Weight::kTrouble;
constexpr Weight kFatal = Weight::kFatal;

constexpr TextRow Say(const char* format, Weight weight, const char* meaning,
                      const char* remedy = "") {
  return {format, false, Phase::kMulticast, weight, CodeKind::kNone, meaning, remedy};
}

constexpr TextRow kTexts[] = {
    Say("Command line parsed and multicast client instantiated", kStep,
        "the client's command line is good"),
    Say("Initializing callbacks", kStep, "the client learns whom to tell of its end"),
    Say("Starting the client protocol engine (state machine)", kStep, "the client starts"),
    Say("Registry - creating keys and loading values", kStep,
        "its settings are read, or written with their usual values"),
    Say("Registry updated", kStep, "its settings are read"),
    Say("Client configured NOT to load!", kFatal,
        "the registry forbids the client; all files come by HTTP",
        "set LoadClient to 1 below Software\\Corvanta\\Device Management\\MCFTP Client"),
    Say("Initializing the multicast client", kStep, "sockets and cipher are made"),
    Say("Failed to initialize the multicast client!", kFatal,
        "a socket could not be had, or the group not joined; all files come by HTTP",
        "check -A and -P in the job: orvenix job lint"),
    Say("Socket API initialized", kStep, "sockets can be used"),
    Say("Creating state machine thread", kStep, "the client's thread is made"),
    Say("State machine thread created", kGood, "the client runs"),
    Say("Failed to create state machine thread!", kFatal,
        "there is no thread for the client; all files come by HTTP", "restart the device"),
    Say("Last file flag is set, shutting down state machine", kStep,
        "the last file was empty: the mark of the end"),
    Say("Last file flag set", kStep, "the announced file is the last one of the run"),
    Say("McftpClient::StateMachineThread started", kStep, "the client's thread runs"),
    Say("McftpClient::StateMachineThread stopping", kStep, "the client's thread ends"),
    Say("Client shutting down...", kStep, "the client ends"),
    Say("Add membership failed!", kFatal, "the public group could not be joined",
        "give a multicast address in -A"),
    Say("Bind() failed", kFatal, "the group's port could not be had",
        "choose another port, or end the program that has it"),
    Say("Waiting for a Multicast MCFTP Server to announce a file...", kStep,
        "it waits for a file, at most 300 s"),
    Say("WRQ Timeout", kTrouble, "no file was announced in 300 s; the client ends",
        "is the server running, and on the same network? see its TTL"),
    Say("Announcement on %s for:", kStep, "a file is announced; its name is in the next line"),
    Say("Device MCT: %s", kStep, "the device's text, which masks are compared with"),
    Say("MCT and mask compare, receiving file", kStep, "the file is meant for this device"),
    Say("MCT and mask did NOT compare, NOT receiving file", kStep,
        "the file is meant for other devices"),
    Say("Error creating: %s", kTrouble,
        "the folder of the file could not be made; the file comes by HTTP",
        "the client makes the last folder of a path only"),
    Say("Error opening: %s", kTrouble, "the file could not be made; it comes by HTTP",
        "is it open, read-only, or its folder missing?"),
    Say("Opening: %s", kStep, "the file is made"),
    Say("Establishing session with %s", kStep, "the server is asked for the file"),
    Say("RRQ sent to %s", kStep, "the server is asked for the file"),
    Say("RRQ Retry: %u", kTrouble, "the server has not answered and is asked again",
        "are frames lost? see the server's report"),
    Say("Server not responding to RRQ", kTrouble,
        "the server does not answer; this file comes by HTTP",
        "can the device reach the server's address? see firewalls"),
    Say("Timeout waiting for Option Ack, retrying...", kTrouble,
        "the server has not answered in time"),
    Say("Private multicast group joined: %s", kGood, "blocks of the file will be heard"),
    Say("Failed to join private multicast group: %s", kTrouble,
        "the group of the blocks could not be joined; the file comes by HTTP",
        "choose another private group"),
    Say("Client elected initial master client (ACK mode)", kStep,
        "this device sets the pace: it answers every block"),
    Say("Client elected master client (NAK mode)", kStep, "this device says what it lacks"),
    Say("Client transitioned to passive mode", kStep, "this device only listens"),
    Say("Transitioning from NAK to ACK mode", kStep, "it has what it lacked and sets the pace"),
    Say("NAKing block %u of %u", kStep, "it asks for the first block that it lacks"),
    Say("Duplicate frame received, block #%u", kStep, "a block came that was there already"),
    Say("<< OVERRUN ERROR: ", kTrouble,
        "blocks come faster than this device can take them, or are lost",
        "lower the server's --rate"),
    Say("Rx file timed out - transfer aborted", kTrouble,
        "no block came for 32 s; the file comes by HTTP", "see the server's report"),
    Say("Failed to write block #%u", kTrouble, "a block could not be written",
        "make room on the device"),
    Say("Rx size mismatch (", kTrouble,
        "the file is shorter than announced; validation fetches it by HTTP"),
    Say("File transfer complete (", kGood, "every block of the file is there"),
    Say("Dallying...", kStep, "it waits 5 s for the server's last word"),
    Say("Dally timeout expired", kStep, "nothing more came for this file"),
    Say("Leaving multicast group: %s", kStep, "the group of the blocks is left"),
};

}  // namespace

TextRows ClientTexts() {
  return {kTexts, std::size(kTexts)};
}

}  // namespace tools

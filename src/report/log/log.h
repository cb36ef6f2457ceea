// The transfer log: one line to "\FileXfer.log" or, when the job names a server, to syslog.
#pragma once

namespace report {

/// Longest message in characters; what is longer is cut.
inline constexpr int kMaxLogMessage = 1024;

/// Formats a message like base::Format and writes it as it stands: callers end their lines with
/// "\r\n" themselves.
///
/// Without a syslog port the message is appended to "\FileXfer.log", which is closed again at once,
/// so that a reset of the device loses one line at most; nothing limits the file's size. With a
/// port it leaves as one datagram with the local date and time, and the file, which is opened all
/// the same, receives nothing. What cannot be written or sent is dropped without a word.
///
/// Any thread. Text from outside is an argument, never the format. The last error of the calling
/// thread is the same afterwards.
[[gnu::format(printf, 1, 2)]] void Log(const char* format, ...) noexcept;

/// Chooses where the lines go from now on, until the next call; jobs do not end it.
///
/// A port other than 0 and an address that reads as dotted IPv4 open a UDP socket to that server;
/// if there is no socket to be had, lines go to the file. With a port other than 0 and any other
/// address there is no socket, and lines are lost. Starts Windows Sockets itself and keeps it
/// started for as long as the socket lives.
///
/// @param port     the server's UDP port, of which 16 bits count; 0: lines go to the file
/// @param address  copied; null counts as empty
void SetSyslogTarget(int port, const char* address) noexcept;

/// Closes the log file if a line sent to syslog left it open. The next line opens it again.
void CloseLogFile() noexcept;

}  // namespace report

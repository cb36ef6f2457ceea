// A program of the device that starts an upgrade itself, without a management host.
#pragma once

struct Wanted {
  const char* server;  // dotted address
  const char* port;
  const char* source;       // the file, as the server knows it
  const char* destination;  // on the device
  const char* crc;          // unsigned decimal
};

/// Fetches one file in upgrade-client mode and waits for the end of the upgrade. To be called by a
/// thread of the device.
/// @return false when no upgrade was started
bool Fetch(const Wanted& wanted);

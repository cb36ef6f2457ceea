// The process's one HTTP client and what the upgrade engine does with it beside fetching.
#pragma once

#include "http/http_client.h"
#include "orvenix/upgrade_config.h"

namespace http {

/// The client, from the first fetch or report of a run until ReleaseJobClient. All four functions
/// belong to the upgrade thread.
/// @return null when there is none.
[[nodiscard]] CHTTPClient* JobClient() noexcept;

/// The client for fetching the job's files: made, with Windows Sockets started, when there is none.
/// A new one waits 20,000 ms, names the device by the job's identity texts and moves the progress
/// window's file bar. Starting Windows Sockets is tried again at every call until it succeeds.
/// @return null when there is no memory for one.
[[nodiscard]] CHTTPClient* CreateJobClient(const UpgradeConfig& job) noexcept;

/// Reports to the job's server that the transfer is over. Every failure is silent but for the
/// missing log lines. A client made here, because nothing was fetched, waits 10,000 ms and knows no
/// identity but the core name.
/// @param error_text  why the job failed; null or empty when it did not
void SendUpgradeComplete(const UpgradeConfig& job, const char* error_text) noexcept;

/// Closes the connection at once, frees the client and gives Windows Sockets back. Nothing when
/// there is no client.
void ReleaseJobClient() noexcept;

}  // namespace http

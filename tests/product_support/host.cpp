#include "product_support/host.h"

#include <algorithm>
#include <ostream>

#include "ce/kernel.h"
#include "configlet/walk.h"
#include "kernel/handle_table.h"
#include "kernel/kernel.h"
#include "library/management_queue.h"
#include "memory/memory.h"
#include "net/network.h"
#include "orvenix/configlet.h"
#include "power/power.h"
#include "window/screen.h"

namespace test {
namespace {

void Set(const char* name, const std::string& value) {
  if (!value.empty()) IcfgSetField(name, 0, value.c_str());
}

void SetFile(const HostFile& file) {
  Set("Source", file.source);
  Set("Dest", file.destination);
  Set("MCTMask", file.masks);
  Set("CRC", file.crc);
}

void WalkFiles(const HostJob& job) {
  if (job.list) {
    IcfgBeginGroup("FileList", 0, 0);
    SetFile(*job.list);
    IcfgEndGroup("FileList", 0, 0);
  }
  IcfgBeginGroup("Download", 0, 0);
  for (const HostFile& file : job.files) {
    IcfgBeginGroup("File", 0, 0);
    SetFile(file);
    IcfgEndGroup("File", 0, 0);
  }
  IcfgEndGroup("Download", 0, 0);
}

void WalkTests(const HostJob& job) {
  IcfgBeginGroup("Tests", 0, 0);
  for (const HostTest& test : job.tests) {
    IcfgBeginGroup("Registry", 0, 0);
    Set("Key", test.key);
    Set("ValueName", test.value_name);
    Set("Type", test.type);
    Set("Operator", test.operation);
    Set("Value", test.value);
    Set("ErrorMsg", test.message);
    IcfgEndGroup("Registry", 0, 0);
  }
  IcfgEndGroup("Tests", 0, 0);
}

void WalkCleanup(const std::vector<std::string>& files, const char* action) {
  IcfgBeginGroup("DiskCleanup", 0, 0);
  for (const std::string& file : files) {
    IcfgBeginGroup("File", 0, 0);
    Set("Name", file);
    Set("Action", action);
    IcfgEndGroup("File", 0, 0);
  }
  IcfgEndGroup("DiskCleanup", 0, 0);
}

void WalkPreparation(const HostJob& job) {
  if (!job.tests.empty()) WalkTests(job);
  for (const std::string& program : job.stop) {
    IcfgBeginGroup("StopProcess", 0, 0);
    Set("Process", program);
    IcfgEndGroup("StopProcess", 0, 0);
  }
  if (!job.cleared.empty()) WalkCleanup(job.cleared, "Delete");
  if (!job.saved.empty()) WalkCleanup(job.saved, "Save");
}

}  // namespace

std::uint32_t WalkJob(const HostJob& job) {
  IcfgBeginGroup("Orvenix", 0, 0);
  const std::uint32_t result = IcfgBeginGroup("Upgrade", 0, 0);
  Set("ShowGUI", job.show_gui ? "true" : "false");
  IcfgBeginGroup("Syslog", 0, 0);
  Set("Port", job.syslog_port);
  Set("Address", job.syslog_address);
  IcfgEndGroup("Syslog", 0, 0);
  Set("BeginText", job.begin_text);
  Set("EndText", job.end_text);
  IcfgBeginGroup("HTTPServer", 0, 0);
  Set("BaseURL", job.base_url);
  IcfgEndGroup("HTTPServer", 0, 0);
  WalkPreparation(job);
  WalkFiles(job);
  if (!job.program.empty()) {
    IcfgBeginGroup("StartProcess", 0, 0);
    Set("Process", job.program);
    Set("Parameters", job.parameters);
    Set("Wait", job.wait);
    IcfgEndGroup("StartProcess", 0, 0);
  }
  if (!job.multicast.empty()) {
    IcfgBeginGroup("MulticastClient", 0, 0);
    Set("Parameters", job.multicast);
    IcfgEndGroup("MulticastClient", 0, 0);
  }
  IcfgBeginGroup("StorageRequirements", 0, 0);
  IcfgBeginGroup("Store", 0, 0);
  Set("Name", job.store);
  Set("RequiredSpace", job.required_space);
  IcfgEndGroup("Store", 0, 0);
  IcfgEndGroup("StorageRequirements", 0, 0);
  return result;
}

std::uint32_t EndJob() {
  const std::uint32_t result = IcfgEndGroup("Upgrade", 0, 0);
  IcfgEndGroup("Orvenix", 0, 0);
  return result;
}

bool AwaitEndOfJobs(sim::Device& device, std::uint32_t limit_s) {
  for (std::uint32_t waited = 0; device.kernel().LiveThreads() > 1; ++waited) {
    if (waited >= limit_s) return false;
    Sleep(1000);
  }
  return true;
}

bool IsRelease(std::string_view call) {
  static constexpr std::string_view kReleases[] = {
      "CloseHandle",     "FindClose",   "RegCloseKey",   "ReleasePowerRequirement",
      "UnmapViewOfFile", "WSACleanup",  "DestroyWindow", "CloseToolhelp32Snapshot",
      "TerminateThread", "closesocket", "PostMessageW",  "DeactivateDevice"};
  return std::find(std::begin(kReleases), std::end(kReleases), call) != std::end(kReleases);
}

Holdings HoldingsOf(sim::Device& device) {
  Holdings holdings;
  holdings.handles = device.kernel().OpenHandles();
  const std::vector<std::string> names = device.kernel().NamedObjects();
  const bool marked = std::find(names.begin(), names.end(), "UPGRADE_CLIENT") != names.end();
  if (marked) --holdings.handles;
  holdings.sockets = device.network().open_sockets();
  holdings.blocks = device.memory().live_blocks();
  holdings.gdi_objects = device.screen().gdi_objects();
  holdings.device_contexts = device.screen().device_contexts();
  holdings.power_requirements = device.power().Held().size();
  holdings.windows = device.screen().Windows().size();
  holdings.queue_connections = device.messages().open_connections();
  const auto lock = device.world().Acquire();
  holdings.sockets_started = device.network().started();
  return holdings;
}

void PrintTo(const Holdings& holdings, std::ostream* out) {
  *out << holdings.handles << " handles, " << holdings.sockets << " sockets, " << holdings.blocks
       << " blocks, " << holdings.gdi_objects << " pens, " << holdings.device_contexts
       << " device contexts, " << holdings.power_requirements << " power requirements, "
       << holdings.windows << " windows, " << holdings.queue_connections
       << " connections to the queue, sockets started " << holdings.sockets_started << " times";
}

void DropKeptJob() {
  configlet::Walk& walk = configlet::TheWalk();
  UpgradeConfig* const job = walk.job;
  if (job != nullptr) configlet::ForgetJob(job);
  delete job;
  walk.download_file.Forget();
  walk.storage.Forget();
  walk.registry_test.Forget();
}

}  // namespace test

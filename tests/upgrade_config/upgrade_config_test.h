// The fixture of the job record's tests, and what they look at it with.
#pragma once

#include <gmock/gmock.h>

#include <cstring>
#include <new>
#include <string>
#include <vector>

#include "ce/errors.h"
#include "ce/system.h"
#include "faults/faults.h"
#include "memory/memory.h"
#include "orvenix/upgrade_config.h"
#include "support/device_test.h"

namespace test {

class UpgradeConfigTest : public DeviceTest {
 protected:
  [[nodiscard]] std::size_t Blocks() { return device().memory().live_blocks(); }

  template <typename Record>
  static Record* NewRecord() {
    return static_cast<Record*>(LocalAlloc(LPTR, sizeof(Record)));
  }
};

template <typename T>
std::vector<T*> Elements(const orvenix::PointerList<T>& list) {
  std::vector<T*> elements;
  for (T* element : list) elements.push_back(element);
  EXPECT_EQ(elements.size(), list.size());
  EXPECT_EQ(elements.empty(), list.empty());
  return elements;
}

inline std::vector<std::string> Texts(const orvenix::PointerList<char>& list) {
  std::vector<std::string> texts;
  for (const char* text : list) texts.emplace_back(text);
  return texts;
}

struct TextField {
  const char* name;
  const char* (UpgradeConfig::*get)() const noexcept;
  void (UpgradeConfig::*set)(const char*) noexcept;
  std::size_t size;
};

using U = UpgradeConfig;
inline const TextField kTextFields[] = {
    {"HTTPIPAddress", &U::GetHTTPIPAddress, &U::SetHTTPIPAddress, 24},
    {"BaseURL", &U::GetBaseURL, &U::SetBaseURL, 256},
    {"MCIp", &U::GetMCIp, &U::SetMCIp, 24},
    {"MCEncryptionKey", &U::GetMCEncryptionKey, &U::SetMCEncryptionKey, 256},
    {"MCProcessParms", &U::GetMCProcessParms, &U::SetMCProcessParms, 260},
    {"ProcessName", &U::GetProcessName, &U::SetProcessName, 260},
    {"ProcessParms", &U::GetProcessParms, &U::SetProcessParms, 260},
    {"FlashFileStore", &U::GetFlashFileStore, &U::SetFlashFileStore, 64},
    {"SysLogIP", &U::GetSysLogIP, &U::SetSysLogIP, 32},
    {"UpgBeginMsg", &U::GetUpgBeginMsg, &U::SetUpgBeginMsg, 64},
    {"UpgEndMsg", &U::GetUpgEndMsg, &U::SetUpgEndMsg, 64},
};

}  // namespace test

// Several real threads make jobs, and with them read the device's identity, at once.
#include <gtest/gtest.h>

#include <atomic>
#include <string_view>

#include "ce/kernel.h"
#include "orvenix/upgrade_config.h"
#include "support/device_test.h"

namespace device {
namespace {

constexpr int kThreads = 4;
constexpr int kJobsEach = 50;

std::atomic<int> whole_identities;

DWORD MakeJobs(void* /*unused*/) {
  for (int i = 0; i < kJobsEach; ++i) {
    const UpgradeConfig job;
    const bool whole = std::string_view(job.GetUniqueId()) == "TQ52MR700123" &&
                       std::string_view(job.GetSerialNumber()) == "MR700123" &&
                       std::string_view(job.GetMfgString()) == "TQ52-A1";
    if (whole) whole_identities.fetch_add(1);
  }
  return 0;
}

class IdentityThreadsTest : public RealDeviceTest {};

TEST_F(IdentityThreadsTest, GiveEveryJobTheWholeIdentity) {
  HANDLE threads[kThreads] = {};
  for (HANDLE& thread : threads) {
    thread = CreateThread(nullptr, 0, MakeJobs, nullptr, 0, nullptr);
    ASSERT_NE(thread, nullptr);
  }
  for (HANDLE thread : threads) {
    EXPECT_EQ(WaitForSingleObject(thread, INFINITE), WAIT_OBJECT_0);
    CloseHandle(thread);
  }

  EXPECT_EQ(whole_identities.load(), kThreads * kJobsEach);
}

}  // namespace
}  // namespace device

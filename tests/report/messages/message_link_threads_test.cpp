#include <algorithm>
#include <atomic>
#include <cstring>

#include "ce/kernel.h"
#include "library/management_queue.h"
#include "orvenix/configlet.h"
#include "report/messages/message_link_test.h"

namespace report {
namespace {

using ::testing::Contains;

// ---- from several threads ----

class MessageLinkThreadsTest : public RealDeviceTest {
 protected:
  /// Whether the event is there whole, at whatever time it was sent.
  static bool HasEvent(const std::vector<std::string>& lines, const char* name, int number) {
    const auto code = static_cast<std::uint32_t>(number);
    const std::string told = "TW_Event_DB@~MASTERKX: " + EventText(kNow, name, code, name);
    const std::size_t time = told.find(kNow);
    const std::string begin = told.substr(0, time);
    const std::string end = told.substr(time + std::strlen(kNow));
    return std::any_of(lines.begin(), lines.end(), [&](const std::string& line) {
      const std::size_t size = line.size();
      if (size != told.size() && size != begin.size() + std::strlen(kTime) + end.size())
        return false;
      return line.compare(0, begin.size(), begin) == 0 &&
             line.compare(size - end.size(), end.size(), end) == 0;
    });
  }
};

TEST_F(MessageLinkThreadsTest, SendsEveryMessageWholeWhileOthersCloseTheConnection) {
  constexpr int kMessages = 40;
  test::MessageRecord record(device());
  const auto work = [](void* text) -> DWORD {
    const auto* const name = static_cast<const char*>(text);
    for (int i = 0; i < kMessages; ++i) {
      SetRWIStatus(i, name);
      SendDeviceEvent(name, static_cast<std::uint32_t>(i), name);
      if (i % 8 == 7) CloseTransferHandle();
    }
    return 0;
  };
  char names[][8] = {"one", "two"};
  HANDLE threads[2];
  for (int i = 0; i < 2; ++i) {
    threads[i] = CreateThread(nullptr, 0, work, names[i], 0, nullptr);
    ASSERT_NE(threads[i], nullptr);
  }
  for (HANDLE thread : threads) {
    EXPECT_EQ(WaitForSingleObject(thread, INFINITE), WAIT_OBJECT_0);
    CloseHandle(thread);
  }
  const std::vector<std::string> lines = record.Lines();
  EXPECT_EQ(lines.size(), 4U * kMessages);
  EXPECT_EQ(device().messages().bad_uses(), 0U) << "nobody closed it under another's message";
  for (const char* name : names) {
    for (int i = 0; i < kMessages; ++i) {
      EXPECT_THAT(lines, Contains("TW_CLIENT: " + StatusText(i, name)));
      EXPECT_TRUE(HasEvent(lines, name, i)) << name << ' ' << i;
    }
  }
}

TEST_F(MessageLinkThreadsTest, GivesTheHostContextAndTableAsTheyWereSetTogether) {
  struct Host {
    IcfgCallbacks callbacks{};
    std::atomic<int> heard{0};
    static int Take(std::uintptr_t context, const char*, std::int32_t, const IcfgCallbacks* table) {
      auto& host = *reinterpret_cast<Host*>(context);
      EXPECT_EQ(table, &host.callbacks);
      ++host.heard;
      return 0;
    }
  };
  static Host hosts[2];
  for (Host& host : hosts) host.callbacks.set_data = &Host::Take;
  IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(&hosts[0]), &hosts[0].callbacks);
  HANDLE const thread = CreateThread(
      nullptr, 0,
      [](void*) -> DWORD {
        for (int i = 0; i < 200; ++i) {
          Host& host = hosts[i % 2];
          IcfgSetCallbacks(reinterpret_cast<std::uintptr_t>(&host), &host.callbacks);
        }
        return 0;
      },
      nullptr, 0, nullptr);
  for (int i = 0; i < 50; ++i) SetRWIStatus(4, "x");
  WaitForSingleObject(thread, INFINITE);
  CloseHandle(thread);
  EXPECT_EQ(hosts[0].heard + hosts[1].heard, 50);
}

}  // namespace
}  // namespace report

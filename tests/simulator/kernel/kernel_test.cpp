// What the kernel tells tests and tools, and the sides of it that the platform does not document.
#include "kernel/kernel.h"

#include <gtest/gtest.h>

#include <functional>
#include <utility>
#include <vector>

#include "ce/errors.h"
#include "ce/kernel.h"
#include "faults/faults.h"
#include "kernel/debug.h"
#include "support/device_test.h"

namespace {

using std::chrono::milliseconds;

class KernelTest : public DeviceTest {
 protected:
  HANDLE Start(std::function<DWORD()> body) {
    bodies_.push_back(std::make_unique<std::function<DWORD()>>(std::move(body)));
    return CreateThread(
        nullptr, 0, [](void* run) { return (*static_cast<std::function<DWORD()>*>(run))(); },
        bodies_.back().get(), 0, nullptr);
  }

 private:
  std::vector<std::unique_ptr<std::function<DWORD()>>> bodies_;
};

TEST_F(KernelTest, RecordsEverySleepWithItsLength) {
  Sleep(50);
  Sleep(0);
  Sleep(3000);
  const std::vector<sim::SleepRecord> sleeps = device().kernel().Sleeps();
  ASSERT_EQ(sleeps.size(), 3U);
  EXPECT_EQ(sleeps[0].length_ms, 50U);
  EXPECT_EQ(sleeps[1].length_ms, 0U);
  EXPECT_EQ(sleeps[2].length_ms, 3000U);
  EXPECT_EQ(sleeps[1].at, milliseconds(50));
  EXPECT_EQ(sleeps[2].thread, GetCurrentThreadId());
  device().kernel().ForgetSleeps();
  EXPECT_TRUE(device().kernel().Sleeps().empty());
}

TEST_F(KernelTest, NotesSleepsThatItIsToldToSkip) {
  device().kernel().SkipSleeps();
  Sleep(3000);

  EXPECT_LT(world().now(), milliseconds(3000));
  ASSERT_EQ(device().kernel().Sleeps().size(), 1U);
  EXPECT_EQ(device().kernel().Sleeps()[0].length_ms, 3000U);
}

TEST_F(KernelTest, ShortensSleepsButNoOtherWaits) {
  device().kernel().ShortenSleeps(20);
  Sleep(3000);

  EXPECT_EQ(world().now(), milliseconds(150));
  EXPECT_EQ(device().kernel().Sleeps().back().length_ms, 3000U) << "as the program asked";
  HANDLE event = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  EXPECT_EQ(WaitForSingleObject(event, 1000), WAIT_TIMEOUT);
  EXPECT_EQ(world().now(), milliseconds(1150));
}

TEST_F(KernelTest, KnowsTheNamedObjectsThatExist) {
  HANDLE event = CreateEventW(nullptr, TRUE, FALSE, u"TW_UPGRADE_IN_PROGRESS");
  HANDLE mutex = CreateMutexW(nullptr, FALSE, u"A mutex");
  CreateSemaphoreW(nullptr, 0, 1, nullptr);
  CreateEventW(nullptr, TRUE, FALSE, u"");
  EXPECT_EQ(device().kernel().NamedObjects(),
            (std::vector<std::string>{"A mutex", "TW_UPGRADE_IN_PROGRESS"}));
  CloseHandle(mutex);
  EXPECT_EQ(device().kernel().NamedObjects(), std::vector<std::string>{"TW_UPGRADE_IN_PROGRESS"});
  CloseHandle(event);
  EXPECT_TRUE(device().kernel().NamedObjects().empty());
}

TEST_F(KernelTest, KindsOfObjectsDoNotShareTheirNames) {
  CreateEventW(nullptr, TRUE, FALSE, u"one name");
  EXPECT_NE(CreateMutexW(nullptr, FALSE, u"one name"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  EXPECT_NE(CreateSemaphoreW(nullptr, 0, 1, u"one name"), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
}

TEST_F(KernelTest, CountsLiveThreadsHandlesAndSections) {
  const sim::Kernel& kernel = device().kernel();
  EXPECT_EQ(kernel.LiveThreads(), 1U);
  HANDLE thread = Start([] {
    Sleep(10);
    return 0U;
  });
  EXPECT_EQ(kernel.LiveThreads(), 2U);
  EXPECT_EQ(kernel.OpenHandles(), 1U);
  WaitForSingleObject(thread, INFINITE);
  EXPECT_EQ(kernel.LiveThreads(), 1U);
  CloseHandle(thread);
  EXPECT_EQ(kernel.OpenHandles(), 0U);
  CRITICAL_SECTION section;
  InitializeCriticalSection(&section);
  EXPECT_EQ(kernel.CriticalSections(), 1U);
  DeleteCriticalSection(&section);
  EXPECT_EQ(kernel.CriticalSections(), 0U);
}

TEST_F(KernelTest, HandleNumbersAreSmallAndNeverUsedAgain) {
  HANDLE first = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  CloseHandle(first);
  HANDLE second = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  EXPECT_NE(first, second);
  EXPECT_LT(reinterpret_cast<std::uintptr_t>(second), 0x10000U);
  EXPECT_EQ(reinterpret_cast<std::uintptr_t>(second) % 4, 0U);
}

TEST_F(KernelTest, TickCountWrapsAround) {
  device().kernel().SetTickBase(0xFFFFFFF0U);
  const DWORD before = GetTickCount();
  Sleep(32);
  EXPECT_EQ(before, 0xFFFFFFF0U);
  EXPECT_EQ(GetTickCount(), 0x10U);
  EXPECT_EQ(GetTickCount() - before, 32U);
}

TEST_F(KernelTest, AWaitForAllTakesNothingBeforeEverythingIsThere) {
  HANDLE objects[] = {CreateEventW(nullptr, FALSE, TRUE, nullptr),
                      CreateSemaphoreW(nullptr, 0, 1, nullptr)};
  EXPECT_EQ(WaitForMultipleObjects(2, objects, TRUE, 5), WAIT_TIMEOUT);
  EXPECT_EQ(WaitForSingleObject(objects[0], 0), WAIT_OBJECT_0) << "was not taken";
  SetEvent(objects[0]);
  HANDLE poster = Start([&] {
    Sleep(5);
    ReleaseSemaphore(objects[1], 1, nullptr);
    return 0U;
  });
  EXPECT_EQ(WaitForMultipleObjects(2, objects, TRUE, INFINITE), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(objects[0], 0), WAIT_TIMEOUT);
  EXPECT_EQ(WaitForSingleObject(objects[1], 0), WAIT_TIMEOUT);
  WaitForSingleObject(poster, INFINITE);
}

TEST_F(KernelTest, AnEventGoesToWhoWaitedLongestAndNotToWhoComesLater) {
  HANDLE event = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  std::string order;
  HANDLE threads[] = {Start([&] {
                        WaitForSingleObject(event, INFINITE);
                        order += 'a';
                        return 0U;
                      }),
                      Start([&] {
                        WaitForSingleObject(event, INFINITE);
                        order += 'b';
                        return 0U;
                      })};
  Sleep(1);
  SetEvent(event);
  // The event is thread a's already, though it has not run yet.
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  SetEvent(event);
  WaitForMultipleObjects(2, threads, TRUE, INFINITE);
  EXPECT_EQ(order, "ab");
}

TEST_F(KernelTest, OneSignalEndsOneWaitAndTheNextSignalAnother) {
  HANDLE events[] = {CreateEventW(nullptr, FALSE, FALSE, nullptr),
                     CreateEventW(nullptr, FALSE, FALSE, nullptr)};
  HANDLE thread = Start([&] { return WaitForMultipleObjects(2, events, FALSE, INFINITE); });
  Sleep(1);
  SetEvent(events[1]);
  SetEvent(events[0]);
  WaitForSingleObject(thread, INFINITE);
  DWORD code = 0;
  GetExitCodeThread(thread, &code);
  EXPECT_EQ(code, WAIT_OBJECT_0 + 1) << "the first signal decided";
  EXPECT_EQ(WaitForSingleObject(events[0], 0), WAIT_OBJECT_0) << "the second is still there";
}

TEST_F(KernelTest, PulseReleasesAllWaitersOfAManualEventAndOneOfAnAutomaticOne) {
  for (const bool manual : {true, false}) {
    HANDLE event = CreateEventW(nullptr, manual ? TRUE : FALSE, FALSE, nullptr);
    int released = 0;
    HANDLE threads[3];
    for (HANDLE& thread : threads) {
      thread = Start([&] {
        if (WaitForSingleObject(event, 1000) == WAIT_OBJECT_0) ++released;
        return 0U;
      });
    }
    Sleep(1);
    PulseEvent(event);
    WaitForMultipleObjects(3, threads, TRUE, INFINITE);
    EXPECT_EQ(released, manual ? 3 : 1);
  }
}

TEST_F(KernelTest, EventModifyDoesWhatTheThreeCallsOverItDo) {
  HANDLE event = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  EXPECT_NE(EventModify(event, EVENT_SET), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_OBJECT_0);
  EXPECT_NE(EventModify(event, EVENT_PULSE), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  EventModify(event, EVENT_SET);
  EXPECT_NE(EventModify(event, EVENT_RESET), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  EXPECT_EQ(EventModify(event, 4), FALSE);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
}

TEST_F(KernelTest, AThreadThatKeepsEnteringASectionDoesNotStarveTheOthers) {
  CRITICAL_SECTION section;
  InitializeCriticalSection(&section);
  int turns = 0;
  bool stop = false;
  HANDLE greedy = Start([&] {
    while (!stop) {
      EnterCriticalSection(&section);
      Sleep(1);
      LeaveCriticalSection(&section);
      ++turns;
    }
    return 0U;
  });
  Sleep(0);
  EnterCriticalSection(&section);
  EXPECT_LE(turns, 1);
  stop = true;
  LeaveCriticalSection(&section);
  WaitForSingleObject(greedy, INFINITE);
  DeleteCriticalSection(&section);
}

TEST_F(KernelTest, AThreadTerminatedInTheLineForASectionGivesItsPlaceUp) {
  CRITICAL_SECTION section;
  InitializeCriticalSection(&section);
  EnterCriticalSection(&section);
  HANDLE first = Start([&] {
    EnterCriticalSection(&section);
    return 1U;
  });
  HANDLE second = Start([&] {
    EnterCriticalSection(&section);
    LeaveCriticalSection(&section);
    return 2U;
  });
  Sleep(1);
  // The section is handed to a thread that is about to leave, and has to go on to the next.
  TerminateThread(first, 0);
  LeaveCriticalSection(&section);
  EXPECT_EQ(WaitForSingleObject(second, 1000), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(first, 1000), WAIT_OBJECT_0);
  DeleteCriticalSection(&section);
}

TEST_F(KernelTest, AMutexOfATerminatedThreadIsAbandoned) {
  HANDLE mutex = CreateMutexW(nullptr, FALSE, nullptr);
  HANDLE thread = Start([&] {
    WaitForSingleObject(mutex, INFINITE);
    Sleep(INFINITE);
    return 0U;
  });
  Sleep(1);
  TerminateThread(thread, 0);
  EXPECT_EQ(WaitForSingleObject(mutex, 1000), WAIT_ABANDONED_0);
}

TEST_F(KernelTest, AMutexMayGoBeforeItsOwner) {
  HANDLE thread = Start([] {
    CloseHandle(CreateMutexW(nullptr, TRUE, nullptr));
    return 0U;
  });
  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
}

TEST_F(KernelTest, AThreadCanTerminateItself) {
  HANDLE self = nullptr;
  bool went_on = false;
  HANDLE thread = Start([&] {
    Sleep(1);
    TerminateThread(self, 12);
    went_on = true;
    return 0U;
  });
  self = thread;
  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
  DWORD code = 0;
  GetExitCodeThread(thread, &code);
  EXPECT_EQ(code, 12U);
  EXPECT_FALSE(went_on);
}

TEST_F(KernelTest, AThreadTerminatedBeforeItsFirstStepNeverRuns) {
  bool ran = false;
  HANDLE thread = Start([&] {
    ran = true;
    return 0U;
  });
  TerminateThread(thread, 3);
  EXPECT_EQ(WaitForSingleObject(thread, 1000), WAIT_OBJECT_0);
  EXPECT_FALSE(ran);
}

TEST_F(KernelTest, AnEndedThreadKeepsItsExitCodeWhenItIsTerminatedAgain) {
  HANDLE thread = Start([] { return 4U; });
  WaitForSingleObject(thread, INFINITE);
  TerminateThread(thread, 5);
  DWORD code = 0;
  GetExitCodeThread(thread, &code);
  EXPECT_EQ(code, 4U);
}

TEST_F(KernelTest, ARestartEndsThreadsThatHoldAndWaitForEverything) {
  HANDLE mutex = CreateMutexW(nullptr, FALSE, u"held");
  CRITICAL_SECTION section;
  InitializeCriticalSection(&section);
  for (int i = 0; i < 3; ++i) {
    Start([&] {
      EnterCriticalSection(&section);
      WaitForSingleObject(mutex, INFINITE);
      Sleep(INFINITE);
      return 0U;
    });
  }
  Sleep(10);
  Restart();
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
  EXPECT_EQ(device().kernel().OpenHandles(), 0U);
  EXPECT_TRUE(device().kernel().NamedObjects().empty());
}

TEST_F(KernelTest, ALoopAroundAFailingWaitStillLetsTimePass) {
  const sim::Micros before = world().now();
  for (int i = 0; i < 10; ++i) {
    EXPECT_EQ(WaitForSingleObject(nullptr, INFINITE), WAIT_FAILED);
  }
  EXPECT_EQ(world().now() - before, sim::Micros(10));
}

TEST_F(KernelTest, ThreadCreationFailsOnDemand) {
  device().faults().Add({"CreateThread", 1, 1, 0});
  DWORD id = 77;
  EXPECT_EQ(CreateThread(
                nullptr, 0, [](void*) -> DWORD { return 0; }, nullptr, 0, &id),
            nullptr);
  EXPECT_EQ(GetLastError(), ERROR_NOT_ENOUGH_MEMORY);
  EXPECT_EQ(id, 77U);
  EXPECT_EQ(device().kernel().LiveThreads(), 1U);
}

using KernelDeathTest = KernelTest;

TEST_F(KernelDeathTest, MisusedCriticalSectionsEndTheProgram) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  CRITICAL_SECTION never{};
  EXPECT_DEATH(EnterCriticalSection(&never), "EnterCriticalSection of a section that is not init");
  EXPECT_DEATH(
      {
        CRITICAL_SECTION free;
        InitializeCriticalSection(&free);
        LeaveCriticalSection(&free);
      },
      "LeaveCriticalSection by a thread that does not own");
}

TEST(KernelOutsideDeathTest, ACallByAThreadOfNoDeviceEndsTheProgram) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(Sleep(1), "Sleep called by a thread that belongs to no simulated device");
}

}  // namespace

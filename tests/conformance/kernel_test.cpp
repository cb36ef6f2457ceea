// Threads, synchronisation, time and the last error as the platform documents them. Includes
// nothing but the platform, so that the same tests can judge another one.
//
// Outputs and the last error are poisoned before each call: a call may change what it documents and
// nothing else.
#include <gtest/gtest.h>

#include <cstring>

#include "conformance/differences.h"
#include "coredll.h"

namespace {

using conformance::Difference;
using conformance::Differs;

constexpr DWORD kPoison = 0xA5A5A5A5U;

/// An output with guards on both sides.
class Guarded {
 public:
  DWORD* output() { return &words_[1]; }
  [[nodiscard]] DWORD value() const {
    EXPECT_EQ(words_[0], kPoison) << "written before the output";
    EXPECT_EQ(words_[2], kPoison) << "written behind the output";
    return words_[1];
  }

 private:
  DWORD words_[3] = {kPoison, kPoison, kPoison};
};

class KernelConformance : public ::testing::Test {
 protected:
  void SetUp() override { SetLastError(kPoison); }

  static HANDLE MakeEvent(bool manual_reset, bool set) {
    HANDLE event = CreateEventW(nullptr, manual_reset ? TRUE : FALSE, set ? TRUE : FALSE, nullptr);
    EXPECT_NE(event, HANDLE{});
    SetLastError(kPoison);
    return event;
  }

  static HANDLE Start(LPTHREAD_START_ROUTINE routine, void* argument = nullptr) {
    HANDLE thread = CreateThread(nullptr, 0, routine, argument, 0, nullptr);
    EXPECT_NE(thread, HANDLE{});
    return thread;
  }

  static void Join(HANDLE thread) {
    EXPECT_EQ(WaitForSingleObject(thread, 60000), WAIT_OBJECT_0);
    EXPECT_NE(CloseHandle(thread), FALSE);
  }
};

HANDLE HandleOf(unsigned number) {
  return reinterpret_cast<HANDLE>(static_cast<DWORD_PTR>(number));
}

// ---- last error ----

TEST_F(KernelConformance, LastErrorIsWhatWasSetLast) {
  SetLastError(0);
  EXPECT_EQ(GetLastError(), 0U);
  SetLastError(0xFFFFFFFFU);
  EXPECT_EQ(GetLastError(), 0xFFFFFFFFU);
}

TEST_F(KernelConformance, EachThreadHasALastErrorOfItsOwnThatBeginsAtZero) {
  Guarded seen;
  HANDLE thread = Start(
      [](void* output) -> DWORD {
        *static_cast<DWORD*>(output) = GetLastError();
        SetLastError(5);
        return 0;
      },
      seen.output());
  SetLastError(kPoison);
  WaitForSingleObject(thread, INFINITE);
  EXPECT_EQ(GetLastError(), kPoison);
  EXPECT_EQ(seen.value(), 0U);
  CloseHandle(thread);
}

// ---- threads ----

TEST_F(KernelConformance, AThreadGetsItsArgumentAndItsResultIsTheExitCode) {
  Guarded id;
  Guarded code;
  int argument = 41;
  HANDLE thread = CreateThread(
      nullptr, 0,
      [](void* number) -> DWORD { return static_cast<DWORD>(++*static_cast<int*>(number)); },
      &argument, 0, id.output());
  ASSERT_NE(thread, HANDLE{});
  EXPECT_EQ(WaitForSingleObject(thread, INFINITE), WAIT_OBJECT_0);
  EXPECT_NE(GetExitCodeThread(thread, code.output()), FALSE);
  EXPECT_EQ(code.value(), 42U);
  EXPECT_EQ(argument, 42);
  EXPECT_NE(id.value(), kPoison);
  EXPECT_NE(id.value(), GetCurrentThreadId());
  EXPECT_NE(CloseHandle(thread), FALSE);
  EXPECT_EQ(GetLastError(), kPoison) << "successful calls leave it alone";
}

TEST_F(KernelConformance, AThreadKnowsTheIdThatItsCreatorWasTold) {
  Guarded told;
  Guarded own;
  HANDLE thread = CreateThread(
      nullptr, 0,
      [](void* output) -> DWORD {
        *static_cast<DWORD*>(output) = GetCurrentThreadId();
        return 0;
      },
      own.output(), 0, told.output());
  Join(thread);
  EXPECT_EQ(told.value(), own.value());
}

TEST_F(KernelConformance, ARunningThreadsExitCodeIsStillActive) {
  HANDLE go = MakeEvent(true, false);
  HANDLE thread = Start([](void* event) { return WaitForSingleObject(event, INFINITE); }, go);
  Guarded code;
  EXPECT_NE(GetExitCodeThread(thread, code.output()), FALSE);
  EXPECT_EQ(code.value(), STILL_ACTIVE);
  EXPECT_EQ(WaitForSingleObject(thread, 0), WAIT_TIMEOUT);
  SetEvent(go);
  Join(thread);
  CloseHandle(go);
}

TEST_F(KernelConformance, AThreadLivesOnWhenItsHandleIsClosed) {
  HANDLE done = MakeEvent(true, false);
  CloseHandle(Start(
      [](void* event) -> DWORD {
        Sleep(2);
        SetEvent(event);
        return 0;
      },
      done));
  EXPECT_EQ(WaitForSingleObject(done, 60000), WAIT_OBJECT_0);
  CloseHandle(done);
}

TEST_F(KernelConformance, ASuspendedThreadRunsWhenItIsResumed) {
  Guarded output;
  HANDLE thread = CreateThread(
      nullptr, 0,
      [](void* to) -> DWORD {
        *static_cast<DWORD*>(to) = 1;
        return 0;
      },
      output.output(), CREATE_SUSPENDED, nullptr);
  EXPECT_EQ(WaitForSingleObject(thread, 5), WAIT_TIMEOUT);
  EXPECT_EQ(output.value(), kPoison);
  EXPECT_EQ(ResumeThread(thread), 1U) << "the suspend count before";
  Join(thread);
  EXPECT_EQ(output.value(), 1U);
}

TEST_F(KernelConformance, AThreadThatWaitsCanBeTerminated) {
  HANDLE never = MakeEvent(true, false);
  HANDLE thread = Start([](void* event) { return WaitForSingleObject(event, INFINITE); }, never);
  Sleep(5);
  EXPECT_NE(TerminateThread(thread, 99), FALSE);
  EXPECT_EQ(WaitForSingleObject(thread, 60000), WAIT_OBJECT_0);
  Guarded code;
  EXPECT_NE(GetExitCodeThread(thread, code.output()), FALSE);
  EXPECT_EQ(code.value(), 99U);
  CloseHandle(thread);
  CloseHandle(never);
}

TEST_F(KernelConformance, ThreadCallsRefuseOtherHandles) {
  HANDLE event = MakeEvent(true, false);
  for (HANDLE handle : {event, HandleOf(0), HandleOf(0x7FFFFFFC)}) {
    Guarded code;
    SetLastError(kPoison);
    EXPECT_EQ(GetExitCodeThread(handle, code.output()), FALSE);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
    EXPECT_EQ(code.value(), kPoison);
    SetLastError(kPoison);
    EXPECT_EQ(TerminateThread(handle, 1), FALSE);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
    SetLastError(kPoison);
    EXPECT_EQ(ResumeThread(handle), 0xFFFFFFFFU);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
  CloseHandle(event);
}

// ---- events ----

TEST_F(KernelConformance, AnAutoResetEventLetsOneWaitThrough) {
  HANDLE event = MakeEvent(false, true);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  EXPECT_NE(SetEvent(event), FALSE);
  EXPECT_NE(SetEvent(event), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  EXPECT_NE(CloseHandle(event), FALSE);
  EXPECT_EQ(GetLastError(), kPoison);
}

TEST_F(KernelConformance, AManualResetEventStaysSetUntilItIsReset) {
  HANDLE event = MakeEvent(true, false);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  EXPECT_NE(SetEvent(event), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(event, INFINITE), WAIT_OBJECT_0);
  EXPECT_NE(ResetEvent(event), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
  EXPECT_NE(CloseHandle(event), FALSE);
  EXPECT_EQ(GetLastError(), kPoison);
}

TEST_F(KernelConformance, PulseReleasesTheWaitingThreadAndLeavesTheEventUnset) {
  for (const bool manual : {true, false}) {
    HANDLE event = MakeEvent(manual, false);
    HANDLE thread =
        Start([](void* waited) { return WaitForSingleObject(waited, INFINITE); }, event);
    Sleep(200);  // where time is real a busy machine needs that to let the thread begin
    EXPECT_NE(PulseEvent(event), FALSE);
    EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_TIMEOUT);
    Join(thread);
    EXPECT_NE(CloseHandle(event), FALSE);
  }
}

TEST_F(KernelConformance, EventCallsRefuseOtherHandles) {
  HANDLE mutex = CreateMutexW(nullptr, FALSE, nullptr);
  for (HANDLE handle : {mutex, HandleOf(0), HandleOf(0x7FFFFFFC)}) {
    for (auto call : {SetEvent, ResetEvent, PulseEvent}) {
      SetLastError(kPoison);
      EXPECT_EQ(call(handle), FALSE);
      EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
    }
  }
  CloseHandle(mutex);
}

TEST_F(KernelConformance, ANamedEventIsOneObjectWithManyHandles) {
  HANDLE first = CreateEventW(nullptr, TRUE, FALSE, TEXT("ORVENIX_TEST_EVENT"));
  ASSERT_NE(first, HANDLE{});
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS) << "says that it is new";
  HANDLE second = CreateEventW(nullptr, FALSE, TRUE, TEXT("ORVENIX_TEST_EVENT"));
  EXPECT_EQ(GetLastError(), ERROR_ALREADY_EXISTS);
  EXPECT_NE(first, second);
  EXPECT_EQ(WaitForSingleObject(second, 0), WAIT_TIMEOUT) << "the first one's state counts";
  SetEvent(first);
  EXPECT_EQ(WaitForSingleObject(second, 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(second, 0), WAIT_OBJECT_0) << "and its kind, too";

  SetLastError(kPoison);
  HANDLE third = OpenEventW(EVENT_ALL_ACCESS, FALSE, TEXT("ORVENIX_TEST_EVENT"));
  EXPECT_NE(third, HANDLE{});
  EXPECT_EQ(GetLastError(), kPoison);
  CloseHandle(first);
  CloseHandle(second);
  EXPECT_EQ(WaitForSingleObject(third, 0), WAIT_OBJECT_0);
  CloseHandle(third);
}

TEST_F(KernelConformance, AnEventsNameGoesWithItsLastHandle) {
  HANDLE first = CreateEventW(nullptr, TRUE, TRUE, TEXT("ORVENIX_TEST_GONE"));
  CloseHandle(first);
  SetLastError(kPoison);
  EXPECT_EQ(OpenEventW(EVENT_ALL_ACCESS, FALSE, TEXT("ORVENIX_TEST_GONE")), HANDLE{});
  EXPECT_EQ(GetLastError(), ERROR_FILE_NOT_FOUND);
  HANDLE again = CreateEventW(nullptr, TRUE, FALSE, TEXT("ORVENIX_TEST_GONE"));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  EXPECT_EQ(WaitForSingleObject(again, 0), WAIT_TIMEOUT);
  CloseHandle(again);
}

// ---- mutexes ----

TEST_F(KernelConformance, AMutexIsItsOwnersAsOftenAsItWasTaken) {
  HANDLE mutex = CreateMutexW(nullptr, TRUE, nullptr);
  ASSERT_NE(mutex, HANDLE{});
  SetLastError(kPoison);
  EXPECT_EQ(WaitForSingleObject(mutex, 0), WAIT_OBJECT_0);
  EXPECT_NE(ReleaseMutex(mutex), FALSE);
  const auto try_it = [](void* handle) { return WaitForSingleObject(handle, 0); };
  Guarded code;
  HANDLE thread = Start(try_it, mutex);
  WaitForSingleObject(thread, INFINITE);
  GetExitCodeThread(thread, code.output());
  EXPECT_EQ(code.value(), WAIT_TIMEOUT) << "taken twice, released once";
  CloseHandle(thread);
  EXPECT_NE(ReleaseMutex(mutex), FALSE);
  EXPECT_EQ(GetLastError(), kPoison);
  EXPECT_EQ(ReleaseMutex(mutex), FALSE);
  EXPECT_EQ(GetLastError(), ERROR_NOT_OWNER);
  CloseHandle(mutex);
}

TEST_F(KernelConformance, AMutexWhoseOwnerEndedIsAbandonedOnce) {
  HANDLE mutex = CreateMutexW(nullptr, FALSE, nullptr);
  Join(Start([](void* handle) { return WaitForSingleObject(handle, INFINITE); }, mutex));
  EXPECT_EQ(WaitForSingleObject(mutex, 1000), WAIT_ABANDONED_0);
  EXPECT_NE(ReleaseMutex(mutex), FALSE);
  EXPECT_EQ(WaitForSingleObject(mutex, 1000), WAIT_OBJECT_0);
  EXPECT_NE(ReleaseMutex(mutex), FALSE);
  CloseHandle(mutex);
}

TEST_F(KernelConformance, AWaitingThreadGetsTheMutexWhenItIsReleased) {
  HANDLE mutex = CreateMutexW(nullptr, TRUE, nullptr);
  HANDLE thread = Start(
      [](void* handle) -> DWORD {
        const DWORD result = WaitForSingleObject(handle, INFINITE);
        ReleaseMutex(handle);
        return result;
      },
      mutex);
  Sleep(5);
  ReleaseMutex(mutex);
  EXPECT_EQ(WaitForSingleObject(thread, INFINITE), WAIT_OBJECT_0);
  Guarded code;
  GetExitCodeThread(thread, code.output());
  EXPECT_EQ(code.value(), WAIT_OBJECT_0);
  CloseHandle(thread);
  CloseHandle(mutex);
}

TEST_F(KernelConformance, ANamedMutexThatExistsIsNotTaken) {
  HANDLE first = CreateMutexW(nullptr, FALSE, TEXT("ORVENIX_TEST_MUTEX"));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  HANDLE second = CreateMutexW(nullptr, TRUE, TEXT("ORVENIX_TEST_MUTEX"));
  EXPECT_EQ(GetLastError(), ERROR_ALREADY_EXISTS);
  EXPECT_EQ(ReleaseMutex(second), FALSE);
  CloseHandle(first);
  CloseHandle(second);
}

// ---- semaphores ----

TEST_F(KernelConformance, ASemaphoreCountsDownToNothingAndUpToItsMaximum) {
  HANDLE semaphore = CreateSemaphoreW(nullptr, 2, 3, nullptr);
  ASSERT_NE(semaphore, HANDLE{});
  EXPECT_EQ(WaitForSingleObject(semaphore, 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(semaphore, 0), WAIT_OBJECT_0);
  EXPECT_EQ(WaitForSingleObject(semaphore, 0), WAIT_TIMEOUT);
  LONG previous = -1;
  EXPECT_NE(ReleaseSemaphore(semaphore, 3, &previous), FALSE);
  EXPECT_EQ(previous, 0);
  SetLastError(kPoison);
  previous = -1;
  EXPECT_EQ(ReleaseSemaphore(semaphore, 1, &previous), FALSE);
  EXPECT_EQ(GetLastError(), ERROR_TOO_MANY_POSTS);
  EXPECT_EQ(previous, -1);
  if (!Differs(Difference::kSemaphore)) {
    EXPECT_EQ(ReleaseSemaphore(semaphore, 0, nullptr), FALSE);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
  }
  for (int i = 0; i < 3; ++i) EXPECT_EQ(WaitForSingleObject(semaphore, 0), WAIT_OBJECT_0);
  CloseHandle(semaphore);
}

TEST_F(KernelConformance, ASemaphoreNeedsAPlausibleBeginning) {
  const LONG bad[][2] = {{-1, 1}, {0, 0}, {2, 1}, {0, -1}};
  for (const auto& [initial, maximum] : bad) {
    SetLastError(kPoison);
    EXPECT_EQ(CreateSemaphoreW(nullptr, initial, maximum, nullptr), HANDLE{});
    EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
  }
}

// ---- waits ----

TEST_F(KernelConformance, AWaitForAnyTellsTheLowestIndexThatIsSignalled) {
  HANDLE events[] = {MakeEvent(false, false), MakeEvent(false, true), MakeEvent(false, true)};
  EXPECT_EQ(WaitForMultipleObjects(3, events, FALSE, 0), WAIT_OBJECT_0 + 1);
  EXPECT_EQ(WaitForMultipleObjects(3, events, FALSE, 0), WAIT_OBJECT_0 + 2);
  EXPECT_EQ(WaitForMultipleObjects(3, events, FALSE, 0), WAIT_TIMEOUT);
  EXPECT_EQ(GetLastError(), kPoison);
  for (HANDLE event : events) CloseHandle(event);
}

TEST_F(KernelConformance, AWaitForAnyIsEndedByEachOfItsObjects) {
  for (DWORD set = 0; set < 3; ++set) {
    HANDLE events[] = {MakeEvent(false, false), MakeEvent(true, false), MakeEvent(false, false)};
    HANDLE setter = Start(
        [](void* event) -> DWORD {
          Sleep(3);
          SetEvent(event);
          return 0;
        },
        events[set]);
    EXPECT_EQ(WaitForMultipleObjects(3, events, FALSE, INFINITE), WAIT_OBJECT_0 + set);
    Join(setter);
    for (HANDLE event : events) CloseHandle(event);
  }
}

TEST_F(KernelConformance, AWaitForManyThreadsAndEventsWorks) {
  HANDLE objects[MAXIMUM_WAIT_OBJECTS];
  for (HANDLE& object : objects) object = MakeEvent(false, false);
  SetEvent(objects[63]);
  EXPECT_EQ(WaitForMultipleObjects(MAXIMUM_WAIT_OBJECTS, objects, FALSE, INFINITE),
            WAIT_OBJECT_0 + 63);
  for (HANDLE object : objects) CloseHandle(object);
}

TEST_F(KernelConformance, AWaitOnAnUnusableListFails) {
  HANDLE event = MakeEvent(true, true);
  HANDLE objects[65];
  for (HANDLE& object : objects) object = event;
  EXPECT_EQ(WaitForMultipleObjects(0, objects, FALSE, 0), WAIT_FAILED);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
  SetLastError(kPoison);
  EXPECT_EQ(WaitForMultipleObjects(65, objects, FALSE, 0), WAIT_FAILED);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
  objects[1] = HandleOf(0x7FFFFFFC);
  SetLastError(kPoison);
  EXPECT_EQ(WaitForMultipleObjects(2, objects, FALSE, 0), WAIT_FAILED);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  CloseHandle(event);
}

TEST_F(KernelConformance, AWaitOnAClosedHandleFails) {
  HANDLE event = MakeEvent(true, true);
  EXPECT_NE(CloseHandle(event), FALSE);
  EXPECT_EQ(WaitForSingleObject(event, 0), WAIT_FAILED);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  SetLastError(kPoison);
  EXPECT_EQ(CloseHandle(event), FALSE);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
}

TEST_F(KernelConformance, AWaitTakesItsTime) {
  HANDLE event = MakeEvent(true, false);
  const DWORD before = GetTickCount();
  EXPECT_EQ(WaitForSingleObject(event, 30), WAIT_TIMEOUT);
  EXPECT_GE(GetTickCount() - before, 15U) << "the coarsest clock ticks every 15 ms";
  EXPECT_EQ(GetLastError(), kPoison);
  CloseHandle(event);
}

// ---- critical sections ----

struct Counted {
  CRITICAL_SECTION section;
  int inside;
  int most_inside;
};

TEST_F(KernelConformance, ACriticalSectionLetsOneThreadIn) {
  Counted counted{};
  InitializeCriticalSection(&counted.section);
  const auto work = [](void* shared) -> DWORD {
    auto& at = *static_cast<Counted*>(shared);
    for (int i = 0; i < 5; ++i) {
      EnterCriticalSection(&at.section);
      ++at.inside;
      if (at.inside > at.most_inside) at.most_inside = at.inside;
      Sleep(1);
      --at.inside;
      LeaveCriticalSection(&at.section);
    }
    return 0;
  };
  HANDLE threads[] = {Start(work, &counted), Start(work, &counted), Start(work, &counted)};
  for (HANDLE thread : threads) Join(thread);
  EXPECT_EQ(counted.most_inside, 1);
  DeleteCriticalSection(&counted.section);
}

TEST_F(KernelConformance, ACriticalSectionIsLeftAsOftenAsItWasEntered) {
  CRITICAL_SECTION section;
  std::memset(&section, 0xA5, sizeof section);
  InitializeCriticalSection(&section);
  EnterCriticalSection(&section);
  EnterCriticalSection(&section);
  EXPECT_NE(TryEnterCriticalSection(&section), FALSE);
  const auto try_it = [](void* shared) -> DWORD {
    auto* at = static_cast<CRITICAL_SECTION*>(shared);
    if (TryEnterCriticalSection(at) == FALSE) return 0;
    LeaveCriticalSection(at);
    return 1;
  };
  for (int left = 0; left <= 3; ++left) {
    Guarded code;
    HANDLE thread = Start(try_it, &section);
    WaitForSingleObject(thread, INFINITE);
    GetExitCodeThread(thread, code.output());
    EXPECT_EQ(code.value(), left == 3 ? 1U : 0U);
    CloseHandle(thread);
    if (left < 3) LeaveCriticalSection(&section);
  }
  EXPECT_EQ(GetLastError(), kPoison);
  DeleteCriticalSection(&section);
}

// ---- debugger output ----

TEST_F(KernelConformance, DebuggerOutputLeavesTheLastErrorAlone) {
  OutputDebugStringW(TEXT("a line\r\n"));
  EXPECT_EQ(GetLastError() == kPoison, !Differs(Difference::kDebugError));
}

}  // namespace

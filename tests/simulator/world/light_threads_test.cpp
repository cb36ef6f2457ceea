// Threads that are no threads of the host.
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "ce/kernel.h"
#include "support/device_test.h"
#include "world/sim_thread.h"
#include "world/world.h"

namespace {

using std::chrono::milliseconds;

/// A device in a world of light threads, with the test's thread attached.
class LightThreadTest : public ::testing::Test {
 protected:
  LightThreadTest()
      : world_(sim::World::MakeVirtual(1, sim::ThreadKind::kLight)),
        device_(std::make_unique<sim::Device>(*world_, sim::Profile{}, folder_.path())),
        host_(std::in_place, *device_) {}
  ~LightThreadTest() override {
    host_.reset();
    device_.reset();
  }

  sim::SimThread& Spawn(std::function<std::uint32_t()> body, bool suspended = false) {
    const auto lock = world_->Acquire();
    return world_->Spawn(*device_, "light", std::move(body), suspended);
  }
  std::uint32_t Await(sim::SimThread& thread) {
    auto lock = world_->Acquire();
    world_->WaitUntil(lock, {&thread.finished}, std::nullopt,
                      [&] { return thread.state == sim::SimThread::State::kFinished; });
    return thread.exit_code;
  }

  test::TemporaryFolder folder_;
  std::unique_ptr<sim::World> world_;
  std::unique_ptr<sim::Device> device_;
  std::optional<sim::AttachedThread> host_;
};

TEST_F(LightThreadTest, TakeTurnsWithTheAttachedThread) {
  std::string order;
  Spawn([&] {
    for (int i = 0; i < 3; ++i) {
      order += 'b';
      Sleep(10);
    }
    return 0U;
  });
  for (int i = 0; i < 3; ++i) {
    order += 'a';
    Sleep(10);
  }
  EXPECT_EQ(order, "ababab");
}

TEST_F(LightThreadTest, ShareOneThreadOfTheHost) {
  std::vector<std::thread::id> ids(2);
  sim::SimThread& first = Spawn([&] {
    ids[0] = std::this_thread::get_id();
    Sleep(10);
    EXPECT_EQ(ids[0], std::this_thread::get_id());
    return 0U;
  });
  sim::SimThread& second = Spawn([&] {
    ids[1] = std::this_thread::get_id();
    return 0U;
  });
  Await(first);
  Await(second);
  EXPECT_EQ(ids[0], ids[1]);
  EXPECT_NE(ids[0], std::this_thread::get_id());
}

TEST_F(LightThreadTest, KnowWhoTheyAreBehindEveryWait) {
  for (int i = 0; i < 20; ++i) {
    Spawn([&] {
      const DWORD id = GetCurrentThreadId();
      for (DWORD step = 0; step < 20; ++step) {
        SetLastError(id + step);
        Sleep(step % 3);
        EXPECT_EQ(GetCurrentThreadId(), id);
        EXPECT_EQ(GetLastError(), id + step);
      }
      return 0U;
    });
  }
  Sleep(1000);
}

TEST_F(LightThreadTest, GiveTheirExitCodes) {
  std::vector<sim::SimThread*> threads;
  for (std::uint32_t i = 0; i < 2000; ++i) {
    threads.push_back(&Spawn([i] {
      Sleep(i % 7);
      return i;
    }));
  }
  for (std::uint32_t i = 0; i < 2000; ++i) EXPECT_EQ(Await(*threads[i]), i);
}

TEST_F(LightThreadTest, AreTerminatedInTheirWaits) {
  bool returned = false;
  sim::SimThread& thread = Spawn([&] {
    Sleep(INFINITE);
    returned = true;
    return 1U;
  });
  Sleep(10);
  {
    const auto lock = world_->Acquire();
    world_->Terminate(thread, 77);
  }
  EXPECT_EQ(Await(thread), 77U);
  EXPECT_FALSE(returned);
}

TEST_F(LightThreadTest, MayBeTerminatedBeforeTheirFirstStep) {
  sim::SimThread& thread = Spawn([] { return 1U; }, true);
  {
    const auto lock = world_->Acquire();
    world_->Terminate(thread, 5);
  }
  EXPECT_EQ(Await(thread), 5U);
}

TEST_F(LightThreadTest, KeepTheirExceptionsApart) {
  int caught = 0;
  for (int i = 0; i < 2; ++i) {
    Spawn([&caught, i] {
      try {
        throw i;
      } catch (int) {
        try {
          Sleep(10);
          throw std::runtime_error(std::to_string(i));
        } catch (const std::runtime_error& error) {
          Sleep(10);
          EXPECT_EQ(error.what(), std::to_string(i));
        }
        try {
          throw;
        } catch (int number) {
          EXPECT_EQ(number, i);
          ++caught;
        }
      }
      return 0U;
    });
  }
  Sleep(100);
  EXPECT_EQ(caught, 2);
}

TEST_F(LightThreadTest, CanPlayAnotherDevice) {
  const test::TemporaryFolder folder;
  sim::Device other(*world_, sim::Profile{}, folder.path());
  sim::SimThread& thread = Spawn([&] {
    Sleep(1);
    std::uint32_t result = 0;
    {
      const sim::AttachedThread part(other);
      Sleep(5);
      result = &sim::Device::Current("the test") == &other ? 3 : 4;
    }
    Sleep(1);
    return &sim::Device::Current("the test") == device_.get() ? result : 5;
  });
  EXPECT_EQ(Await(thread), 3U);
}

TEST_F(LightThreadTest, RunOnWhenNoHostThreadIsAttached) {
  Spawn([] {
    Sleep(1000);
    return 0U;
  });
  host_.reset();
  while (world_->now() < milliseconds(1000)) std::this_thread::yield();
  host_.emplace(*device_);
  Sleep(1);
}

TEST_F(LightThreadTest, EndWithTheirDevice) {
  for (int i = 0; i < 10; ++i) {
    Spawn([] {
      Sleep(INFINITE);
      return 0U;
    });
  }
  Sleep(1);
  host_.reset();
  device_.reset();
  EXPECT_EQ(world_->now(), milliseconds(1));
}

TEST_F(LightThreadTest, HaveRoomForDeepCalls) {
  struct Deep {
    static int Dive(int depth) {
      volatile char room[4096] = {};
      if (depth == 0) {
        Sleep(1);
        return room[0];
      }
      return Dive(depth - 1) + room[depth];
    }
  };
  sim::SimThread& thread = Spawn([] { return static_cast<std::uint32_t>(Deep::Dive(40)); });
  EXPECT_EQ(Await(thread), 0U);
}

}  // namespace

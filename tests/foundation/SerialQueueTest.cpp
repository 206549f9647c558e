#include <array>
#include <atomic>
#include <csignal>
#include <future>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <latch>
#include <memory>
#include <stdexcept>
#include <thread>
#include <vector>

#include "foundation/DispatchGroup.h"
#include "foundation/SerialQueue.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;
using ::testing::KilledBySignal;

TEST(SerialQueue, KeepsBlocksOfManyThreadsApartAndEachThreadsInOrder) {
  constexpr int perThread = 500;
  SerialQueue queue("contended");
  std::vector<std::pair<int, int>> seen;  // unguarded: the queue is its guard
  {
    std::vector<std::jthread> threads;
    for (int t = 0; t < 4; ++t) {
      threads.emplace_back([&, t] {
        for (int i = 0; i < perThread; ++i) {
          const auto block = [&seen, t, i] { seen.emplace_back(t, i); };
          if (i % 3 == 0) {
            queue.sync(block);
          } else {
            queue.async(block);
          }
        }
      });
    }
  }
  queue.sync([] {});
  std::array<int, 4> next{};
  for (const auto& [thread, number] : seen)
    EXPECT_EQ(number, next[thread]++);
  EXPECT_EQ(seen.size(), 4u * perThread);
}

TEST(SerialQueue, SyncRunsOnTheCallingThreadAndAnIdleQueueNeedsNoOther) {
  ThreadPool pool;
  SerialQueue queue("idle", pool);
  std::thread::id ranOn;
  queue.sync([&] { ranOn = std::this_thread::get_id(); });
  EXPECT_EQ(ranOn, std::this_thread::get_id());
  EXPECT_EQ(pool.threadCount(), 0u);
}

TEST(SerialQueue, WhatFollowsRunsOnTheCallingThreadInOrder) {
  ThreadPool pool;
  SerialQueue queue("following", pool);
  std::vector<int> order;
  const auto note = [&](int number) {
    EXPECT_TRUE(queue.isCurrent());
    order.push_back(number);
  };
  queue.syncWithWhatFollows([&] {
    queue.async([&] {
      note(2);
      queue.async([&] { note(4); });
    });
    queue.async([&] { note(3); });
    note(1);
  });
  EXPECT_EQ(order, (std::vector{1, 2, 3, 4}));
  EXPECT_EQ(pool.threadCount(), 0u);
  // The turn is free again, and one that others have is waited for.
  queue.async([&] { note(5); });
  queue.syncWithWhatFollows([&] { note(6); });
  EXPECT_EQ(order.back(), 6);
}

TEST(SerialQueueDeathTest, MisuseIsFatal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  SerialQueue queue("events");
  SerialQueue other("other");
  EXPECT_EXIT(queue.assertOnQueue(), KilledBySignal(SIGABRT), "not running on queue \"events\"");
  EXPECT_EXIT(queue.sync([&] { other.sync([&] { queue.sync([] {}); }); }), KilledBySignal(SIGABRT),
              "sync on queue \"events\" from one of its own blocks");
  EXPECT_EXIT(DispatchGroup().leave(), KilledBySignal(SIGABRT), "left more often than entered");
}

TEST(SerialQueue, GoesOnAfterASyncBlockThatThrows) {
  SerialQueue queue("throwing");
  EXPECT_THROW(queue.sync([] { throw std::runtime_error("no"); }), std::runtime_error);
  bool ran = false;
  queue.async([&] { ran = true; });
  queue.sync([] {});
  EXPECT_TRUE(ran);
}

TEST(SerialQueue, DestroysABlockBeforeTheNextAndRunsItWithoutAHandle) {
  std::promise<bool> wasReleased;
  {
    SerialQueue queue("dropped");
    auto held = std::make_shared<int>(1);
    const std::weak_ptr<int> watched = held;
    queue.async([held = std::move(held)] {});
    queue.async([&wasReleased, watched] { wasReleased.set_value(watched.expired()); });
  }
  EXPECT_TRUE(wasReleased.get_future().get());
}

TEST(ThreadPool, BlockedQueuesStarveNobody) {
  constexpr int queues = 24;
  ThreadPool pool(0ms);
  std::latch everybodyIsHere(queues);
  DispatchGroup done;
  for (int i = 0; i < queues; ++i) {
    done.enter();
    SerialQueue("blocked", pool).async([&] {
      everybodyIsHere.arrive_and_wait();
      done.leave();
    });
  }
  done.wait();
  // Threads without work end by themselves.
  while (pool.threadCount() > 0)
    std::this_thread::yield();
}

TEST(ThreadPool, EndsOnlyAfterItsWorkAndWhatThatSubmitted) {
  std::atomic<int> ran = 0;
  {
    ThreadPool pool;
    for (int i = 0; i < 20; ++i) {
      pool.submit([&] {
        ++ran;
        pool.submit([&] { ++ran; });
      });
    }
  }
  EXPECT_EQ(ran, 40);
}

TEST(DispatchGroup, NotifiesOnceWhenTheCountIsZero) {
  SerialQueue queue("notified");
  DispatchGroup group;
  int notified = 0;
  const auto count = [&] {
    int seen = 0;
    queue.sync([&] { seen = notified; });
    return seen;
  };
  const auto notify = [&] { group.notify(queue, [&] { queue.assertOnQueue(), ++notified; }); };
  notify();
  EXPECT_EQ(count(), 1) << "at once in an empty group";
  group.enter();
  group.enter();
  notify();
  notify();
  group.leave();
  EXPECT_EQ(count(), 1);
  group.leave();
  EXPECT_EQ(count(), 3);
  group.enter();
  group.leave();
  EXPECT_EQ(count(), 3);
}

}  // namespace
}  // namespace mirabel

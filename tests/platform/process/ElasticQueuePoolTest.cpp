#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <future>
#include <memory>
#include <set>
#include <thread>
#include <vector>

#include "platform/linux/process/ElasticQueuePool.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

TEST(ElasticQueuePoolTest, EachOfTenThousandQueuesKeepsItsOrderOnAFewThreads) {
  constexpr std::size_t kQueues = 10'000;
  constexpr int kTasks = 10;
  ElasticQueuePool pool({.most_threads = 3, .most_waiting = kQueues * kTasks});
  std::vector<std::shared_ptr<SerialQueue>> queues;
  std::vector<std::vector<int>> ran(kQueues);
  std::mutex mutex;
  std::set<std::thread::id> threads;
  for (std::size_t i = 0; i < kQueues; ++i) queues.push_back(pool.makeQueue("test"));
  for (int task = 0; task < kTasks; ++task) {
    for (std::size_t i = 0; i < kQueues; ++i) {
      queues[i]->post([&, i, task] {
        EXPECT_TRUE(queues[i]->isCurrent());
        EXPECT_FALSE(queues[(i + 1) % kQueues]->isCurrent());
        ran[i].push_back(task);
        const std::lock_guard lock(mutex);
        threads.insert(std::this_thread::get_id());
      });
    }
  }
  pool.stop();
  for (const auto& tasks : ran) {
    ASSERT_EQ(tasks.size(), static_cast<std::size_t>(kTasks));
    EXPECT_TRUE(std::is_sorted(tasks.begin(), tasks.end()));
  }
  EXPECT_EQ(pool.threadCount(), 0U);
}

TEST(ElasticQueuePoolTest, ATaskThatTakesLongHoldsUpNoOtherQueue) {
  ElasticQueuePool pool({.most_threads = 3, .most_waiting = 100});
  const auto slow = pool.makeQueue("slow");
  const auto slower = pool.makeQueue("slower");
  const auto quick = pool.makeQueue("quick");
  std::promise<void> go;
  const auto gone = go.get_future().share();
  std::atomic<int> done = 0;
  for (const auto& queue : {slow, slower}) {
    queue->post([gone, &done] {
      gone.wait();
      ++done;
    });
  }
  std::promise<void> ran;
  quick->post([&ran] { ran.set_value(); });
  ran.get_future().wait();
  EXPECT_EQ(done, 0);
  EXPECT_LE(pool.threadCount(), 3U);
  go.set_value();
  pool.stop();
  EXPECT_EQ(done, 2);
}

TEST(ElasticQueuePoolTest, TimersComeInTheOrderOfTheirTimesAndWakeASleepingPool) {
  ElasticQueuePool pool;
  const auto queue = pool.makeQueue("test");
  std::vector<int> ran;
  std::promise<void> last;
  queue->postAfter(20ms, [&] {
    ran.push_back(3);
    last.set_value();
  });
  queue->postAfter(10ms, [&ran] { ran.push_back(1); });
  queue->postAfter(10ms + 1ns, [&ran] { ran.push_back(2); });
  queue->postAfter(0ns, [&ran] { ran.push_back(0); });
  queue->postAfter(24h, [&ran] { ran.push_back(4); });
  last.get_future().wait();
  pool.stop();
  EXPECT_EQ(ran, (std::vector{0, 1, 2, 3}));
}

TEST(ElasticQueuePoolTest, AQueueThatEverybodyReleasedStillRunsWhatWasPosted) {
  ElasticQueuePool pool;
  std::promise<void> ran;
  auto queue = pool.makeQueue("test");
  queue->postAfter(1ms, [&ran] { ran.set_value(); });
  queue.reset();
  ran.get_future().wait();
  // A task may be the last to hold its queue, and then posts nowhere.
  std::promise<void> posted;
  queue = pool.makeQueue("test");
  SerialQueue& raw = *queue;
  raw.post([own = std::move(queue), &posted]() mutable {
    own->post([&posted] { posted.set_value(); });
    own.reset();
  });
  posted.get_future().wait();
}

TEST(ElasticQueuePoolTest, TellsWhenTooMuchWaitsAndWhenItIsRelieved) {
  ElasticQueuePool pool({.most_threads = 2, .most_waiting = 4});
  const auto queue = pool.makeQueue("test");
  std::promise<void> relieved;
  std::atomic<int> told_over = 0;
  pool.observeBackLog([&] {
    if (pool.overBound()) {
      ++told_over;
    } else {
      relieved.set_value();
    }
  });
  std::promise<void> go;
  std::promise<void> held;
  queue->post([&] {
    held.set_value();
    go.get_future().wait();
  });
  held.get_future().wait();
  for (int i = 0; i < 3; ++i) queue->post([] {});
  EXPECT_FALSE(pool.overBound());
  queue->post([] {});
  EXPECT_TRUE(pool.overBound());
  EXPECT_EQ(told_over, 1);
  go.set_value();
  relieved.get_future().wait();
  EXPECT_FALSE(pool.overBound());
  pool.observeBackLog({});
}

TEST(ElasticQueuePoolTest, WhatIsPostedAfterTheEndIsDestroyedUnrun) {
  ElasticQueuePool pool;
  const auto queue = pool.makeQueue("test");
  const auto held = std::make_shared<int>(1);
  queue->postAfter(1h, [held] { ADD_FAILURE(); });
  pool.stop();
  queue->post([held] { ADD_FAILURE(); });
  queue->postAfter(0ns, [held] { ADD_FAILURE(); });
  EXPECT_EQ(held.use_count(), 1);
}

}  // namespace
}  // namespace tal

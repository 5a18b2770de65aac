#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <future>
#include <memory>
#include <string>

#include "platform/linux/process/ReportingQueue.h"

namespace tal {
namespace {

using std::chrono_literals::operator""h;
using std::chrono_literals::operator""ms;
using std::chrono_literals::operator""ns;
using testing::ElementsAre;

constexpr std::string_view kLabel = "org.vantle.test.queue";

// Keeps the queue's thread in one task until it is let go.
class Held {
 public:
  explicit Held(SerialQueue& queue) {
    std::promise<void> reached;
    std::future<void> is_reached = reached.get_future();
    queue.post([&reached, go = released_.get_future().share()] {
      reached.set_value();
      go.wait();
    });
    is_reached.wait();
  }
  void release() { released_.set_value(); }

 private:
  std::promise<void> released_;
};

TEST(ReportingQueueTest, RunsTasksOfOneThreadInTheirOrder) {
  constexpr int kTasks = 10000;
  std::vector<int> ran;
  ReportingQueue queue(kLabel);
  for (int i = 0; i < kTasks; ++i) queue.post([&ran, i] { ran.push_back(i); });
  queue.stop();
  ASSERT_EQ(ran.size(), static_cast<std::size_t>(kTasks));
  EXPECT_TRUE(std::is_sorted(ran.begin(), ran.end()));
}

TEST(ReportingQueueTest, TakesTasksOfManyThreadsOneAtATime) {
  constexpr int kThreads = 4;
  constexpr int kTasksEach = 5000;
  int unguarded = 0;  // a second task at a time would lose counts
  ReportingQueue queue(kLabel);
  {
    std::array<std::jthread, kThreads> posters;
    for (std::jthread& poster : posters) {
      poster = std::jthread([&] {
        for (int i = 0; i < kTasksEach; ++i) queue.post([&unguarded] { ++unguarded; });
      });
    }
  }
  queue.stop();
  EXPECT_EQ(unguarded, kThreads * kTasksEach);
}

TEST(ReportingQueueTest, IsCurrentOnItsOwnThreadOnly) {
  ReportingQueue queue(kLabel);
  bool within = false;
  queue.post([&] { within = queue.isCurrent(); });
  queue.stop();
  EXPECT_TRUE(within);
  EXPECT_FALSE(queue.isCurrent());
}

TEST(ReportingQueueTest, ThreadBearsTheEndOfTheLabel) {
  std::string name(16, '\0');
  ReportingQueue queue(kLabel);
  queue.post([&] { pthread_getname_np(pthread_self(), name.data(), name.size()); });
  queue.stop();
  EXPECT_STREQ(name.c_str(), &"antle.test.queue"[1]);
}

TEST(ReportingQueueTest, TimersRunByDueTimeAndEqualOnesInTheirOrder) {
  std::vector<std::string> ran;
  std::promise<void> done;
  ReportingQueue queue(kLabel);
  queue.post([&] {
    queue.postAfter(30ms, [&] { done.set_value(); });
    queue.postAfter(20ms, [&] { ran.push_back("late"); });
    queue.postAfter(1ms, [&] { ran.push_back("early"); });
    queue.postAfter(0ns, [&] { ran.push_back("at once"); });
  });
  done.get_future().wait();
  EXPECT_THAT(ran, ElementsAre("at once", "early", "late"));
}

TEST(ReportingQueueTest, AnEarlierTimerOvertakesOneThatIsSleptOn) {
  std::promise<void> fired;
  ReportingQueue queue(kLabel);
  queue.postAfter(1h, [] { FAIL() << "an hour has not passed"; });
  queue.postAfter(std::chrono::nanoseconds::max(), [] { FAIL() << "nor an age"; });
  queue.postAfter(1ms, [&] { fired.set_value(); });
  fired.get_future().wait();
}

TEST(ReportingQueueTest, StopRunsWhatWasPostedBeforeAndNothingElse) {
  std::vector<std::string> ran;
  ReportingQueue queue(kLabel);
  Held held(queue);
  queue.post([&] {
    ran.push_back("posted before");
    queue.post([&] { ran.push_back("in turn"); });
  });
  queue.postAfter(1h, [&] { ran.push_back("not due"); });
  // Whether the nested post comes before or after `stop` is a race; both
  // answers are allowed, so it is not asserted.
  held.release();
  queue.stop();
  queue.post([&] { ran.push_back("posted after"); });
  ASSERT_FALSE(ran.empty());
  EXPECT_EQ(ran.front(), "posted before");
  EXPECT_THAT(ran, testing::Not(testing::Contains("not due")));
  EXPECT_THAT(ran, testing::Not(testing::Contains("posted after")));
}

TEST(ReportingQueueTest, DroppedTasksAreDestroyedUnrun) {
  const auto tracked = std::make_shared<int>(0);
  auto queue = std::make_unique<ReportingQueue>(kLabel);
  Held held(*queue);
  std::promise<void> ending;
  std::jthread ender([&] {
    ending.set_value();
    queue->stopDropping();
  });
  ending.get_future().wait();
  queue->postAfter(1h, [tracked] { FAIL(); });
  held.release();
  ender.join();
  queue->post([tracked] { FAIL(); });
  EXPECT_EQ(tracked.use_count(), 1);
}

TEST(ReportingQueueTest, ATaskIsDestroyedBeforeTheNextOneRuns) {
  auto tracked = std::make_shared<int>(0);
  const std::weak_ptr<int> watched = tracked;
  bool gone = false;
  ReportingQueue queue(kLabel);
  {
    Held held(queue);  // so that both tasks are of one batch
    queue.post([held = std::move(tracked)] {});
    queue.post([&] { gone = watched.expired(); });
    held.release();
  }
  queue.stop();
  EXPECT_TRUE(gone);
}

}  // namespace
}  // namespace tal

#include <gtest/gtest.h>

#include <future>
#include <vector>

#include "platform/linux/process/BackgroundWork.h"

namespace tal {
namespace {

TEST(BackgroundWork, RunsInOrderElsewhereAndAllOfItBeforeItEnds) {
  constexpr int kTasks = 100;
  std::vector<int> ran;
  std::promise<void> hold;
  {
    BackgroundWork work("test");
    EXPECT_TRUE(work.idle());
    ASSERT_TRUE(work.add([held = hold.get_future().share()] { held.wait(); }));
    for (int i = 0; i < kTasks; ++i) ASSERT_TRUE(work.add([&ran, i] { ran.push_back(i); }));
    EXPECT_FALSE(work.idle());
    hold.set_value();
  }
  ASSERT_EQ(ran.size(), kTasks);
  EXPECT_TRUE(std::is_sorted(ran.begin(), ran.end()));
}

TEST(BackgroundWork, StartsAnewAfterEveryLull) {
  BackgroundWork work("test");
  for (int i = 0; i < 50; ++i) {
    std::promise<std::thread::id> ran;
    ASSERT_TRUE(work.add([&ran] { ran.set_value(std::this_thread::get_id()); }));
    EXPECT_NE(ran.get_future().get(), std::this_thread::get_id());
  }
}

TEST(BackgroundWork, TurnsAwayWhatIsTooMuch) {
  std::promise<void> hold;
  BackgroundWork work("test");
  ASSERT_TRUE(work.add([held = hold.get_future().share()] { held.wait(); }));
  std::size_t taken = 1;
  while (work.add([] {})) ++taken;
  EXPECT_EQ(taken, BackgroundWork::kMostWaiting);
  hold.set_value();
}

}  // namespace
}  // namespace tal

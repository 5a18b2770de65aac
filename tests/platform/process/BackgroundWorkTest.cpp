#include <gtest/gtest.h>

#include <algorithm>
#include <future>
#include <vector>

#include "platform/linux/process/BackgroundWork.h"

namespace tal {
namespace {

TEST(BackgroundWork, RunsInOrderElsewhereAndStartsAnewAfterEveryLull) {
  constexpr int kTasks = 100;
  std::vector<int> ran;
  BackgroundWork work("test");
  for (int i = 0; i < kTasks; ++i) {
    std::promise<std::thread::id> told;
    ASSERT_TRUE(work.add([&ran, i] { ran.push_back(i); }));
    ASSERT_TRUE(work.add([&told] { told.set_value(std::this_thread::get_id()); }));
    ASSERT_NE(told.get_future().get(), std::this_thread::get_id());
  }
  EXPECT_EQ(ran.size(), kTasks);
  EXPECT_TRUE(std::is_sorted(ran.begin(), ran.end()));
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

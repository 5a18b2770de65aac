// What every implementation of notifications promises, the tests' own included,
// and what the files add to it.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <unistd.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/HostFakes.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/notify/LinuxNotifyCenter.h"
#include "platform/linux/notify/NotifyFiles.h"
#include "support/FakeNotifyCenter.h"
#include "support/WaitingQueue.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using Journal = std::vector<std::string>;

struct Host {
  test::TemporaryDirectory directory;
  test::RecordingLogSink lines;
  LogChannels log{&lines};
};

struct Implementation {
  std::string name;
  std::function<std::unique_ptr<NotifyCenter>(Host&)> make;
};

class NotifyCenters : public testing::TestWithParam<Implementation> {
 protected:
  NotifyCenter::Token watch(const std::string& name, const std::string& who) {
    const auto [status, token] = center->registerDispatch(name, queue, [this, who](NotifyCenter::Token told) {
      journal.push_back(who + ' ' + std::to_string(center->getState(told).value));
    });
    EXPECT_EQ(status, NotifyStatus::kOk);
    EXPECT_GE(token, 1);
    return token;
  }
  void post(const std::string& name, std::optional<std::uint64_t> state = std::nullopt) {
    EXPECT_EQ(center->post(name, state), NotifyStatus::kOk);
  }
  void runTasks(int count) {
    for (int i = 0; i < count; ++i) ASSERT_NO_FATAL_FAILURE(queue.runNext());
  }
  /// Everything posted so far has been told, as what comes last is told now.
  void expectNothingMore() {
    journal.clear();
    const auto last = watch("last", "last");
    post("last", 7);
    runTasks(1);
    EXPECT_THAT(journal, ElementsAre("last 7"));
    center->cancel(last);
  }

  Host host;
  Journal journal;
  test::WaitingQueue queue;
  std::unique_ptr<NotifyCenter> center = GetParam().make(host);
};

TEST_P(NotifyCenters, TellEveryWatcherOfEveryPostAndNobodyElse) {
  watch("a", "first");
  watch("a", "second");
  watch("b", "other");
  post("unwatched", 1);
  post("a", 5);
  runTasks(2);
  EXPECT_THAT(journal, ElementsAre("first 5", "second 5"));
  post("b", std::uint64_t{0} - 1);
  post("a");
  runTasks(3);
  EXPECT_THAT(journal,
              ElementsAre("first 5", "second 5", "other 18446744073709551615", "first 5", "second 5"));
  expectNothingMore();
}

TEST_P(NotifyCenters, MergeNoPostsHoweverFastTheyCome) {
  constexpr int kPosts = 200;
  watch("a", "told");
  for (int i = 0; i < kPosts; ++i) post("a", 3);
  runTasks(kPosts);
  EXPECT_THAT(journal, testing::SizeIs(kPosts));
  EXPECT_THAT(journal, testing::Each("told 3"));
  expectNothingMore();
}

TEST_P(NotifyCenters, StateIsZeroAtFirstAndStaysWithAPostThatHasNone) {
  const auto token = watch("a", "told");
  EXPECT_EQ(center->getState(token).status, NotifyStatus::kOk);
  EXPECT_EQ(center->getState(token).value, 0U);
  post("a");
  EXPECT_EQ(center->getState(token).value, 0U);
  post("a", 9);
  post("a");
  EXPECT_EQ(center->getState(token).value, 9U);
}

TEST_P(NotifyCenters, ACancelledRegistrationIsNotToldOfWhatAlreadyWaits) {
  const auto first = watch("a", "cancelled");
  watch("a", "remains");
  post("a");
  post("a");
  runTasks(2);  // both watchers once
  EXPECT_EQ(center->cancel(first), NotifyStatus::kOk);
  runTasks(2);
  EXPECT_THAT(journal, ElementsAre("cancelled 0", "remains 0", "remains 0"));
  EXPECT_EQ(center->cancel(first), NotifyStatus::kInvalidToken);
  EXPECT_EQ(center->getState(first).status, NotifyStatus::kInvalidToken);
  EXPECT_EQ(center->cancel(0), NotifyStatus::kInvalidToken);
  EXPECT_EQ(center->cancel(NotifyCenter::kNoToken), NotifyStatus::kInvalidToken);
}

TEST_P(NotifyCenters, AHandlerMayCancelItself) {
  center->registerDispatch("a", queue, [&](NotifyCenter::Token told) {
    journal.push_back("told once");
    center->cancel(told);
  });
  post("a");
  runTasks(1);
  EXPECT_THAT(journal, ElementsAre("told once"));
  post("a");
  expectNothingMore();
}

TEST_P(NotifyCenters, RefuseNamesThatNameNothing) {
  for (const std::string& name :
       {std::string(), std::string("a/b"), std::string("../a"), std::string(".a")}) {
    EXPECT_EQ(center->post(name, 1), NotifyStatus::kInvalidName) << name;
    EXPECT_EQ(center->registerDispatch(name, queue, [](NotifyCenter::Token) {}).status,
              NotifyStatus::kInvalidName)
        << name;
  }
}

INSTANTIATE_TEST_SUITE_P(
    Each, NotifyCenters,
    testing::Values(Implementation{"Fake", [](Host&) { return std::make_unique<test::FakeNotifyCenter>(); }},
                    Implementation{"Linux",
                                   [](Host& host) {
                                     return std::make_unique<LinuxNotifyCenter>(host.directory.path(),
                                                                                host.log.service);
                                   }}),
    [](const auto& each) { return each.param.name; });

class NotifyCenterOnLinux : public testing::Test {
 protected:
  std::filesystem::path folder() const { return host.directory.path() / "notify"; }
  void watch(const std::string& name) {
    center.registerDispatch(name, queue, [this](NotifyCenter::Token told) {
      const auto [status, value] = center.getState(told);
      journal.push_back(status == NotifyStatus::kOk ? std::to_string(value) : "unreadable");
    });
  }

  Host host;
  Journal journal;
  test::WaitingQueue queue;
  LinuxNotifyCenter center{host.directory.path(), host.log.service};
};

TEST_F(NotifyCenterOnLinux, HearsOtherProgramsAndIsHeardByThem) {
  LinuxNotifyCenter other(host.directory.path(), host.log.service);
  watch("a");
  EXPECT_EQ(other.post("a", 1), NotifyStatus::kOk);
  queue.runNext();
  test::writeFile(host.directory.path() / "elsewhere", "2\n");
  std::filesystem::rename(host.directory.path() / "elsewhere", folder() / "a");
  queue.runNext();
  EXPECT_THAT(journal, ElementsAre("1", "2"));
  other.registerDispatch("a", queue, [this](NotifyCenter::Token) { journal.push_back("other"); });
  EXPECT_EQ(center.post("a", 3), NotifyStatus::kOk);
  queue.runNext();
  queue.runNext();
  EXPECT_THAT(journal, testing::UnorderedElementsAre("1", "2", "3", "other"));
}

TEST_F(NotifyCenterOnLinux, AStateThatDoesNotReadIsAClearLineAndNothingElse) {
  watch("a");
  test::writeFile(folder() / "unfinished", "twelve");
  std::filesystem::rename(folder() / "unfinished", folder() / "a");
  queue.runNext();
  EXPECT_THAT(journal, ElementsAre("unreadable"));
  EXPECT_THAT(host.lines.lines(),
              ElementsAre(HasSubstr("the state of notification a was not read: holds no decimal number")));
  EXPECT_EQ(center.post("a", std::nullopt), NotifyStatus::kFailed);
  EXPECT_EQ(center.post("a", 4), NotifyStatus::kOk);
  queue.runNext();
  EXPECT_EQ(journal.back(), "4");
}

TEST_F(NotifyCenterOnLinux, GoesOnInADirectoryThatWasRemovedOrReplaced) {
  watch("a");
  std::filesystem::remove_all(folder());
  // The directory is back once the centre has seen this; posts need not wait for it.
  EXPECT_EQ(center.post("a", 1), NotifyStatus::kOk);
  queue.runNext();
  EXPECT_EQ(journal.back(), "1");
  std::filesystem::create_directory(host.directory.path() / "new");
  test::writeFile(host.directory.path() / "new" / "a", "2");
  std::filesystem::rename(folder(), host.directory.path() / "old");
  std::filesystem::rename(host.directory.path() / "new", folder());
  while (journal.back() != "2") ASSERT_NO_FATAL_FAILURE(queue.runNext());
  EXPECT_EQ(center.post("a", 3), NotifyStatus::kOk);
  while (journal.back() != "3") ASSERT_NO_FATAL_FAILURE(queue.runNext());
}

TEST_F(NotifyCenterOnLinux, PostsBehindWhoeverSitsOnTheLockAreMadeLaterAndInOrder) {
  watch("a");
  const int holder = ::open(folder().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  ASSERT_EQ(::flock(holder, LOCK_EX), 0);
  EXPECT_EQ(center.post("a", 1), NotifyStatus::kOk);
  EXPECT_FALSE(std::filesystem::exists(folder() / "a")) << "the poster did not wait";
  EXPECT_EQ(center.post("a", 2), NotifyStatus::kOk);
  ::close(holder);
  EXPECT_EQ(center.post("a", 3), NotifyStatus::kOk);
  for (int told = 0; told < 3; ++told) ASSERT_NO_FATAL_FAILURE(queue.runNext());
  EXPECT_EQ(journal.back(), "3");
}

TEST_F(NotifyCenterOnLinux, PostsThatWaitAreMadeBeforeItEnds) {
  {
    LinuxNotifyCenter ending(host.directory.path(), host.log.service);
    const int holder = ::open(folder().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    ASSERT_EQ(::flock(holder, LOCK_EX), 0);
    EXPECT_EQ(ending.post("a", 1), NotifyStatus::kOk);
    ::close(holder);
  }
  EXPECT_EQ(test::readFile(folder() / "a"), "1");
}

TEST(NotifyCenterWithoutADirectory, SaysSoOnceAndStillEndsInOrder) {
  Host host;
  test::writeFile(host.directory.path() / "notify", "a file where the directory should be");
  test::WaitingQueue queue;
  LinuxNotifyCenter center(host.directory.path(), host.log.service);
  center.registerDispatch("a", queue, [](NotifyCenter::Token) {});
  EXPECT_THAT(host.lines.lines(), ElementsAre(HasSubstr("notifications are not received")));
  EXPECT_EQ(center.post("a", 1), NotifyStatus::kFailed);
}

}  // namespace
}  // namespace tal

// Many threads send over one connection while the daemon comes and goes.
#include <atomic>
#include <map>
#include <thread>

#include "client/ConnectionFixture.h"

namespace tal::test {
namespace {

constexpr int kThreads = 4;
constexpr int kMessages = 3000;

using SendingThreads = ConnectionFixture;

/// Answers everything until `end` has come from every thread; after every `untilBreak` requests it breaks off
/// the connection, with what was answered last on its way. Returns the numbers by reporter, in the order of
/// their first arrival.
std::map<std::int64_t, std::vector<int>> serveAll(FakeDaemon& daemon, std::unique_ptr<FakePeer>& peer,
                                                  int untilBreak) {
  std::map<std::int64_t, std::vector<int>> arrived;
  int served = 0;
  for (int ended = 0; ended < kThreads;) {
    const std::string text = peer->serve(1)[0];
    const int number = std::stoi(text.substr(text.find(':') + 1));
    auto& numbers = arrived[std::stoll(text.substr(text.find('[') + 1))];
    const bool repeated = !numbers.empty() && number <= numbers.back();
    if (!repeated) numbers.push_back(number);
    if (!repeated && number == kMessages) ++ended;
    if (++served % untilBreak == 0) {
      peer->close();
      peer = daemon.welcome();
    }
  }
  return arrived;
}

TEST_F(SendingThreads, LoseNothingAndKeepTheirOrder) {
  openAndWelcome();
  std::vector<std::thread> threads;
  for (int thread = 1; thread <= kThreads; ++thread) {
    threads.emplace_back([this, thread] {
      client::Message message;
      for (int n = 1; n <= kMessages; ++n) {
        message.reset();
        message.add("n", n);
        while (connection_->send(message, 1, 0, {thread}) != TAL_OK) std::this_thread::yield();
      }
    });
  }
  const auto arrived = serveAll(daemon_, peer_, 2500);
  for (std::thread& thread : threads) thread.join();
  ASSERT_EQ(arrived.size(), static_cast<std::size_t>(kThreads));
  for (const auto& [reporter, numbers] : arrived) {
    ASSERT_EQ(numbers.size(), static_cast<std::size_t>(kMessages)) << "of thread " << reporter;
    for (int n = 1; n <= kMessages; ++n) ASSERT_EQ(numbers[static_cast<std::size_t>(n) - 1], n);
  }
}

TEST_F(SendingThreads, MayGoOnWhileTheConnectionIsClosed) {
  openAndWelcome();
  std::atomic<int> asked{0};
  std::atomic<int> told{0};
  std::atomic<std::uint64_t> accepted{0};
  std::vector<std::thread> threads;
  for (int thread = 1; thread <= kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      const client::Message message = numbered(thread);
      tal_status status = TAL_OK;
      while (status != TAL_CLOSED) {
        status = connection_->send(message, 1, 0, {thread});
        if (status == TAL_OK) ++accepted;
        tal_session_create(connection_->get(), thread);
        const auto tell = [](void* count, const tal_reply*) { ++*static_cast<std::atomic<int>*>(count); };
        if (tal_look_up_reporter(connection_->get(), thread, tell, &told) == TAL_OK) ++asked;
      }
    });
  }
  for (int i = 0; i < 100; ++i) peer_->next();
  EXPECT_EQ(connection_->close(std::chrono::milliseconds(0)), TAL_TIMED_OUT);
  for (std::thread& thread : threads) thread.join();
  const tal_statistics statistics = connection_->statistics();
  EXPECT_EQ(statistics.accepted, accepted);
  EXPECT_EQ(statistics.dropped_unanswered, accepted);
  EXPECT_GT(asked, 0);
  EXPECT_EQ(told, asked);
}

}  // namespace
}  // namespace tal::test

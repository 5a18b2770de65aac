// The service against helpers that say what a test wants: shell scripts.

#include <gtest/gtest.h>

#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "platform/HostFakes.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/diagnostic_log/LinuxDiagnosticLog.h"
#include "platform/linux/tracing/LinuxPerftrailService.h"

namespace tal {
namespace {

namespace fs = std::filesystem;

/// Writes down what it is told, and waits for it.
class Listener final : public PerftrailDelegate {
 public:
  void perftrailDidStart(const Error& error) override { note("start", error); }
  void perftrailDidStop(const Error& error) override { note("stop", error); }
  void perftrailDidComplete(const std::string& url, std::string_view, const Error& error) override {
    note("complete " + url, error);
  }
  std::string next() {
    constexpr auto kLongEnough = std::chrono::seconds(60);
    std::unique_lock lock(mutex_);
    if (!told_.wait_for(lock, kLongEnough, [this] { return next_ < lines_.size(); })) return "nothing";
    return lines_[next_++];
  }

 private:
  void note(std::string line, const Error& error) {
    if (error) line += " error: " + *error;
    const std::lock_guard lock(mutex_);
    lines_.push_back(std::move(line));
    told_.notify_one();
  }
  std::mutex mutex_;
  std::condition_variable told_;
  std::vector<std::string> lines_;
  std::size_t next_ = 0;
};

class PerftrailServiceTest : public ::testing::Test {
 protected:
  std::shared_ptr<PerftrailSession> startWith(const std::string& script) {
    const fs::path helper = directory.path() / "helper.sh";
    test::writeFile(helper, "#!/bin/sh\n" + script);
    fs::permissions(helper, fs::perms(0755));
    service = std::make_unique<LinuxPerftrailService>(LinuxPerftrailService::Options{
        .helper = helper, .home = directory.path() / "home", .diagnostic_log = log, .clock = clock});
    const auto configuration = service->makeConfiguration(PerftrailConfiguration::Template::kProfiling);
    auto session = service->makeSession(*configuration);
    session->setDelegate(listener);
    session->start();
    return session;
  }

  test::TemporaryDirectory directory;
  LinuxDiagnosticLog log{directory.path()};
  test::StandingClock clock;
  std::shared_ptr<Listener> listener = std::make_shared<Listener>();
  std::unique_ptr<LinuxPerftrailService> service;
};

TEST_F(PerftrailServiceTest, TellsHowARecordingGoes) {
  const auto session = startWith(
      "test -d \"$2\" || exit 1; echo started; read word; echo stopped\n"
      "echo complete \"$1 $word $3\"");
  EXPECT_EQ(listener->next(), "start");
  EXPECT_TRUE(session->isValid());
  session->stop();
  EXPECT_EQ(listener->next(), "stop");
  EXPECT_EQ(listener->next(), "complete 3 stop " + (directory.path() / "home").string());
  EXPECT_FALSE(session->isValid());
}

TEST_F(PerftrailServiceTest, EveryWayToFailIsToldOnce) {
  struct Row {
    const char* script;
    std::vector<std::string> told;
  };
  const Row rows[] = {
      {"echo start-failed no session daemon", {"start error: no session daemon"}},
      {"exit 1", {"start error: the tracer's helper program ended early"}},
      {"echo started; echo failed disk full", {"start", "complete  error: disk full"}},
      {"echo started; exit 0", {"start", "complete  error: the tracer's helper program ended early"}},
      {"echo nonsense; printf 'no line end'", {"start error: the tracer's helper program ended early"}},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.script);
    const auto session = startWith(row.script);
    for (const std::string& line : row.told) EXPECT_EQ(listener->next(), line);
    EXPECT_FALSE(session->isValid());
  }
}

TEST_F(PerftrailServiceTest, AMissingHelperIsAFailedStart) {
  service = std::make_unique<LinuxPerftrailService>(LinuxPerftrailService::Options{
      .helper = directory.path() / "none", .home = "", .diagnostic_log = log, .clock = clock});
  const auto session =
      service->makeSession(*service->makeConfiguration(PerftrailConfiguration::Template::kDefault));
  session->setDelegate(listener);
  session->start();
  const std::string told = listener->next();
  EXPECT_EQ(told.find("start error: " + (directory.path() / "none").string()), 0U) << told;
}

TEST_F(PerftrailServiceTest, ADroppedRecordingIsGivenUpAndWaitedFor) {
  auto session = startWith("echo started; read word || echo given-up > \"$3\"");
  EXPECT_EQ(listener->next(), "start");
  session.reset();
  service.reset();
  EXPECT_EQ(test::readFile(directory.path() / "home"), "given-up\n");
}

}  // namespace
}  // namespace tal

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <barrier>
#include <string>

#include "drivers/TalReportingSessionMemoryLogWorker.h"
#include "support/SessionFixture.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

class MemoryLogWorker : public test::SessionFixture {
 protected:
  MemoryLogWorker() {
    host.platform.internal_build = true;
    host.command_shell.outputs = {{"zones", "kmalloc-8 7\n"}, {"processes", "RESOURCE a (1)\nother\n"}};
  }
  void make() {
    Classes classes;
    classes.push_back(
        std::make_unique<TalReportingSessionMemoryLogWorkerClass>(MemoryLogCommands{"processes", "zones"}));
    makeSession(std::move(classes));
  }
  void send(std::uint16_t type = 19, std::uint32_t category = 1) {
    session().sendMessage(TalReportingSessionMessage::initWithMessage(
        {}, static_cast<AudioEventCategory>(category), static_cast<AudioEventType>(type)));
  }
  std::size_t captures() const { return host.command_shell.ran.size() / 2; }
};

TEST_F(MemoryLogWorker, RunsBothToolsAtOnceAndLogsTheZonesFirst) {
  std::barrier both(2);
  host.command_shell.while_running = [&both] { both.arrive_and_wait(); };
  make();
  send();
  std::vector<std::string> blocks;
  for (const auto& line : host.log.lines) {
    if (line.text.starts_with("WIRED LOG BLOCK")) blocks.push_back(line.text);
    const bool of_capture = line.text.find("wiredlog:") != std::string::npos;
    EXPECT_TRUE(!of_capture || line.level == LogLevel::kError) << line.text;
  }
  EXPECT_THAT(blocks, testing::ElementsAre("WIRED LOG BLOCK 1\nwiredlog: kmalloc-8 7\n",
                                           "WIRED LOG BLOCK 1\nwiredlog: RESOURCE a (1)\n"));
  for (const auto* tool : {"zones", "processes"}) {
    EXPECT_EQ(host.log.count(std::string("wiredlog: requesting '") + tool + "'"), 1U);
    EXPECT_EQ(host.log.count(std::string("wiredlog: request ") + tool + " captured"), 1U);
  }
}

TEST_F(MemoryLogWorker, ActsOnItsTypeInEveryCategoryAndOnRepetitions) {
  make();
  send(18);
  EXPECT_EQ(captures(), 0U);
  send(19, 14);
  EXPECT_EQ(captures(), 1U);
  host.clock.advance(6s);
  send(19, 14);
  EXPECT_EQ(session().messages().size(), 2U) << "the repetition was redundant";
  EXPECT_EQ(captures(), 2U);
}

TEST_F(MemoryLogWorker, OneCaptureInMoreThanFiveSecondsWhoeverAsks) {
  Classes classes;
  for (int i = 0; i < 2; ++i) {
    classes.push_back(
        std::make_unique<TalReportingSessionMemoryLogWorkerClass>(MemoryLogCommands{"processes", "zones"}));
  }
  auto& shared = *classes.front();
  makeSession(std::move(classes));
  const auto first = shared.initWithSession(session());
  const auto second = shared.initWithSession(session());
  const auto message = TalReportingSessionMessage::initWithMessage({}, AudioEventCategory::kGeneric,
                                                                   AudioEventType::kMemoryLog);
  first->asConsumer()->handleMessage(message);
  EXPECT_EQ(captures(), 1U) << "the first is served";
  const auto lines = host.log.lines.size();
  host.clock.advance(3s);
  second->asConsumer()->handleMessage(message);
  host.clock.advance(2s);
  second->asConsumer()->handleMessage(message);
  EXPECT_EQ(captures(), 1U) << "five seconds after it";
  EXPECT_EQ(host.log.lines.size(), lines) << "without a word";
  host.clock.advance(1ns);
  second->asConsumer()->handleMessage(message);
  EXPECT_EQ(captures(), 2U);
}

TEST_F(MemoryLogWorker, AToolThatCannotBeRunLeavesTheOtherAlone) {
  host.command_shell.outputs.erase("zones");
  make();
  send();
  EXPECT_EQ(host.log.count("wiredlog: unable to execute 'zones'"), 1U);
  EXPECT_EQ(host.log.count("wiredlog: request zones captured"), 0U);
  EXPECT_EQ(host.log.count("WIRED LOG BLOCK 1\nwiredlog: RESOURCE a (1)\n"), 1U);
}

TEST_F(MemoryLogWorker, ExistsOnInternalBuildsAndInTestSessionsFromTheirStart) {
  make();
  EXPECT_EQ(session().workerInstanceCount(), 1U) << "before any start";
  host.platform.internal_build = false;
  make();
  session().start();
  EXPECT_EQ(session().workerInstanceCount(), 0U);
  make();
  session().setServiceType(AudioServiceType::kTest);
  session().start();
  EXPECT_EQ(session().workerInstanceCount(), 1U);
}

}  // namespace
}  // namespace tal

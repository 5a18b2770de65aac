#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "drivers/TalReportingSessionDriverSnapshotWorker.h"
#include "support/TestPlatform.h"
#include "workers/sinks/TalReportingSessionTallyWorker.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/// Sessions with the snapshot worker and one that turns messages into events, and
/// two drivers with one counter each.
class DriverSnapshotWorker : public testing::Test {
 protected:
  DriverSnapshotWorker() {
    for (const char* group : {"Rx", "Tx"}) {
      counter(group) = {.description = {.group = group, .channel_name = "n"}, .integer_value = 100};
    }
    std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes;
    classes.push_back(std::make_unique<TalReportingSessionTallyWorkerClass>(host.analytics));
    auto snapshots = std::make_unique<TalReportingSessionDriverSnapshotWorkerClass>(host.platform);
    worker_class = snapshots.get();
    classes.push_back(std::move(snapshots));
    roster = std::make_unique<WorkerRoster>(std::move(classes), host.channels.session);
  }
  std::unique_ptr<TalReportingSession> makeSession() {
    return std::make_unique<TalReportingSession>(
        TalReportingSession::Options{.reporter_id = 7, .process_identifiers = {42}}, host.platform, *roster,
        kept_bytes);
  }
  DriverStatsChannel& counter(const std::string& group) {
    auto& channels = host.driver_stats.drivers[group + "-*"].channels;
    channels.resize(1);
    return channels[0];
  }
  void count(std::int64_t more) { counter("Tx").integer_value += more; }
  /// What the counters of these keys are reported with, in the order of the events.
  std::vector<std::string> reported() const {
    std::vector<std::string> texts;
    for (const auto& [name, payload] : host.analytics.events) {
      if (name != "org.vantle.talsys.Drvstats.Simple") continue;
      std::string text;
      for (const auto& [key, value] : payload) {
        if (key.find("Simple") != std::string_view::npos) text += std::string(key) + '=' + value.text() + ' ';
      }
      texts.push_back(text);
    }
    return texts;
  }

  test::TestPlatform host;
  TalReportingSessionDriverSnapshotWorkerClass* worker_class = nullptr;
  std::unique_ptr<WorkerRoster> roster;
  std::size_t kept_bytes = 0;
};

TEST_F(DriverSnapshotWorker, OverlappingSessionsReportEachItsOwnDifferenceAndShareOneUtility) {
  const auto first = makeSession();
  const auto second = makeSession();
  EXPECT_EQ(worker_class->sharedUtilityIfMade(), nullptr) << "no session has started";
  first->start();
  count(1);
  second->start();
  count(10);
  first->stop();
  count(100);
  second->stop();
  EXPECT_THAT(reported(), ElementsAre("Tx_Simple_n=11 ", "Tx_Simple_n=110 "));
  EXPECT_EQ(host.log.count("creating drvstats driver utility"), 1U);
  EXPECT_EQ(host.driver_stats.asked.size(), 9U) << "subscribed to once";
}

TEST_F(DriverSnapshotWorker, ASessionThatStartsAgainIsMeasuredAnew) {
  const auto session = makeSession();
  session->start();
  count(1);
  session->stop();
  count(10);
  session->start();
  count(100);
  session->stop();
  session->stop();
  EXPECT_THAT(reported(), ElementsAre("Tx_Simple_n=1 ", "Tx_Simple_n=100 "));
}

TEST_F(DriverSnapshotWorker, AStopWithoutAStartReportsNothing) {
  const auto session = makeSession();
  TalReportingSessionDriverSnapshotWorker worker(*session, *worker_class);
  worker.stop();
  EXPECT_EQ(worker_class->sharedUtilityIfMade(), nullptr);
  session->start();
  count(5);
  worker.stop();
  EXPECT_THAT(reported(), IsEmpty());
  worker.start();
  count(7);
  worker.stop();
  count(1);
  worker.stop();
  EXPECT_THAT(reported(), ElementsAre("Tx_Simple_n=7 ")) << "the snapshot is gone";
}

TEST_F(DriverSnapshotWorker, ADriverThatFailsAtTheStartIsLoggedAtTheStopAndTheOthersAreReported) {
  const auto session = makeSession();
  host.driver_stats.drivers["Rx-*"].samples_error = 9;
  session->start();
  host.driver_stats.drivers["Rx-*"].samples_error.reset();
  counter("Rx").integer_value += 1;
  count(2);
  session->stop();
  EXPECT_THAT(reported(), ElementsAre("Tx_Simple_n=2 "));
  EXPECT_EQ(host.log.count("DrvstatCreateSamples error " +
                           std::to_string(test::FakeDriverStatsFeed::kNoSamplesError)),
            1U);
}

}  // namespace
}  // namespace tal

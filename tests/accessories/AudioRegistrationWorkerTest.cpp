#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "accessories/TalReportingSessionAudioRegistrationWorker.h"
#include "support/SessionFixture.h"

namespace tal {
namespace {

using std::chrono_literals::operator""h;
using std::chrono_literals::operator""min;
using std::chrono_literals::operator""ns;
using std::chrono_literals::operator""s;

const std::string kPublishedAt = "org.vantle.talsys.talreporting/audio_registration_published_at";

class AudioRegistrationWorker : public test::SessionFixture {
 protected:
  void SetUp() override {
    BluetoothDevices::Device speaker;
    speaker.name = "Speaker";
    speaker.class_of_device = 0x240414;
    host.bluetooth.listing.devices = {speaker};
    host.callstat.backends = std::vector<std::string>{"store"};
    restart();
  }
  /// As by a daemon that is started anew.
  void restart() {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionAudioRegistrationWorkerClass>(host.platform));
    makeSession(std::move(classes));
  }
  void startSession() {
    session().stop();
    session().start();
  }
  /// What the attempt has posted, on both queues.
  void settle() {
    host.queue_pool.runUntilIdle();
    host.queue.runUntilIdle();
  }
  void startAndSettle() {
    startSession();
    settle();
  }
  std::size_t published() const {
    std::size_t count = 0;
    for (const auto& record : host.callstat.records) count += record->sent.size();
    return count;
  }
  void sendRouteChange(int number) {
    session().sendMessage(test::messageAt(host.clock.secondsSince1970(), {{"n", number}},
                                          AudioEventCategory::kRouteChange, AudioEventType::kStart));
  }
};

TEST_F(AudioRegistrationWorker, PublishesTheInventoryInOneMessageAtTheStartOfASession) {
  startSession();
  EXPECT_EQ(host.bluetooth.times_asked, 0) << "the reporting queue does not ask";
  settle();
  ASSERT_EQ(host.callstat.records.size(), 1U);
  const auto& record = *host.callstat.records[0];
  ASSERT_EQ(record.sent.size(), 1U);
  EXPECT_EQ(record.sent[0].category, 8);
  EXPECT_EQ(record.sent[0].type, 5);
  EXPECT_EQ(record.sent[0].payload.text(),
            "{accessory_count=1, accessories=[{address_hash=, connected=0, name=Speaker}]}");
  EXPECT_EQ(record.session_info.find("batch_events")->toBool(), false);
  EXPECT_EQ(record.session_info.find("contains_real_time_events")->toBool(), true);
  EXPECT_EQ(record.session_info.find("session_identifier")->toInt64(), 7);
  EXPECT_EQ(record.user_info.find("service_name")->text(), "audioregistration");
  EXPECT_EQ(record.flushes, 1);
  EXPECT_FALSE(record.open);
}

TEST_F(AudioRegistrationWorker, OnceIn24HoursWhateverHappensMeanwhile) {
  startAndSettle();
  host.queue.advance(24h - 1s);
  startAndSettle();
  sendRouteChange(1);
  settle();
  restart();
  startAndSettle();
  EXPECT_EQ(published(), 1U);
  host.queue.advance(1s);
  sendRouteChange(2);
  sendRouteChange(3);
  settle();
  EXPECT_EQ(published(), 2U);
  EXPECT_EQ(host.settings.values.at(kPublishedAt).toDouble(), host.clock.secondsSince1970());
}

TEST_F(AudioRegistrationWorker, ATimeThatLiesAheadDoesNotHoldTheInventoryBack) {
  host.settings.values[kPublishedAt] = host.clock.secondsSince1970() + 1;
  startAndSettle();
  EXPECT_EQ(published(), 1U);
}

TEST_F(AudioRegistrationWorker, WithoutABackEndTheHostIsNotAskedAndItIsTriedAgainLater) {
  host.callstat.backends = std::vector<std::string>{};
  startAndSettle();
  host.callstat.backends = std::vector<std::string>{"store"};
  host.queue.advance(10min - 1s);
  startAndSettle();
  EXPECT_EQ(host.bluetooth.times_asked, 0);
  host.queue.advance(1s);
  startAndSettle();
  EXPECT_EQ(published(), 1U);
}

TEST_F(AudioRegistrationWorker, MissingBluetoothIsOneInfoLineUntilItHasBeenThere) {
  host.bluetooth.listing.unavailable = "no system bus";
  const std::string line = "accessories are not registered: no system bus";
  for (int attempt = 0; attempt < 3; ++attempt) {
    startAndSettle();
    host.queue.advance(10min);
  }
  EXPECT_EQ(host.bluetooth.times_asked, 3);
  EXPECT_EQ(host.log.count(line), 1U);
  EXPECT_EQ(published(), 0U);
  EXPECT_FALSE(host.settings.values.contains(kPublishedAt));
}

TEST_F(AudioRegistrationWorker, ABackEndThatDoesNotAnswerIsGivenUpAfterNineSeconds) {
  host.callstat.backends = std::nullopt;
  startAndSettle();
  auto& queue = *host.queue_pool.queues.at(0);
  const auto& record = *host.callstat.records[0];
  queue.advance(9s - 1ns);
  EXPECT_TRUE(record.open);
  startAndSettle();
  EXPECT_EQ(host.callstat.records.size(), 1U) << "one attempt at a time";
  queue.advance(1ns);
  EXPECT_FALSE(record.open);
  record.handler({"too late"});
  settle();
  EXPECT_EQ(published(), 0U);
  EXPECT_EQ(host.log.count("accessories are not registered: the back-end does not answer"), 1U);
}

TEST_F(AudioRegistrationWorker, AnswersThatComeLaterAreWaitedFor) {
  host.callstat.backends = std::nullopt;
  startAndSettle();
  host.queue_pool.queues.at(0)->advance(8s);
  host.callstat.records[0]->handler({"broker"});
  settle();
  EXPECT_EQ(published(), 1U);
}

TEST_F(AudioRegistrationWorker, AnErrorOfTheBackEndIsLoggedAndTriedAgain) {
  host.callstat.send_error = "disk full";
  startAndSettle();
  EXPECT_EQ(host.log.count("accessories are not registered: disk full"), 1U);
  host.callstat.send_error.reset();
  host.queue.advance(10min);
  host.callstat.refuse_tokens = true;
  startAndSettle();
  EXPECT_TRUE(host.log.holds("the back-end gives no token"));
  host.callstat.refuse_tokens = false;
  host.queue.advance(10min);
  startAndSettle();
  EXPECT_EQ(published(), 1U);
}

TEST_F(AudioRegistrationWorker, WhatIsUnderWayMayOutliveTheClass) {
  startSession();
  host.queue_pool.runUntilIdle();
  restart();
  host.queue.runUntilIdle();
  EXPECT_EQ(published(), 1U);
}

}  // namespace
}  // namespace tal

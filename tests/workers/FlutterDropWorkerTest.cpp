#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/sinks/TalReportingSessionDPWorker.h"

namespace tal {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;

constexpr auto kIo = AudioEventCategory::kIO;
constexpr auto kError = AudioEventType::kError;

class FlutterDropWorker : public test::SessionFixture {
 protected:
  FlutterDropWorker() {
    host.platform.internal_build = true;
    set("enable_flutter", true);
    host.notify_center.registerDispatch("org.vantle.talsys.dropped-flutter", host.queue,
                                        [this](NotifyCenter::Token) { ++announced; });
  }
  void set(const std::string& key, const MessageValue& value) {
    host.settings.values["org.vantle.talsys.talreporting/" + key] = value;
  }
  void make() {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionDPWorkerClass>(host.platform));
    makeSession(std::move(classes));
    session().start();
  }
  void overload(MessageDict dict, AudioEventCategory category = kIo, AudioEventType type = kError) {
    session().sendMessage(test::messageAt(host.clock.secondsSince1970(), std::move(dict), category, type));
    host.queue.runUntilIdle();
  }
  /// How many captures a message causes in a new session.
  std::size_t capturesFor(MessageDict dict, AudioEventCategory category = kIo, AudioEventType type = kError) {
    make();
    host.flutter_requests.requests.clear();
    overload(std::move(dict), category, type);
    return host.flutter_requests.requests.size();
  }

  int announced = 0;
};

TEST_F(FlutterDropWorker, ExistsOnInternalBuildsWhereTheSettingAsksForIt) {
  struct Row {
    bool internal;
    std::optional<MessageValue> enabled;
    std::size_t workers;
  };
  for (const Row& row : {Row{true, true, 1}, Row{true, 1, 1}, Row{true, false, 0}, Row{true, std::nullopt, 0},
                         Row{false, true, 0}}) {
    host.platform.internal_build = row.internal;
    host.settings.values.clear();
    if (row.enabled) set("enable_flutter", *row.enabled);
    make();
    EXPECT_EQ(session().workerInstanceCount(), row.workers);
  }
}

TEST_F(FlutterDropWorker, AsksForACaptureAndAnnouncesIt) {
  make();
  session().updateConfigurationWithContentsOfConfiguration(
      MessageDict{{"HostApplicationDisplayID", "org.example.player"}});
  MessageDict nested{{"inner", 1}};
  overload({{"smallest_buffer_frame_size", 512}, {"nested", nested}});
  ASSERT_EQ(host.flutter_requests.requests.size(), 1U);
  const FlutterRequest& request = host.flutter_requests.requests.front();
  EXPECT_EQ(request.domain, "org.vantle.talsys");
  EXPECT_EQ(request.type, "AudioOverloads");
  EXPECT_EQ(request.description, "org.example.player");
  EXPECT_EQ(request.flags, (std::array{true, true, false, false, false}));
  EXPECT_EQ(announced, 1);
  const MessageDict& kept = session().messages().back()->message();
  EXPECT_EQ(request.payload, kept);
  EXPECT_NE(request.payload.find("nested")->dict(), kept.find("nested")->dict()) << "a deep copy";
}

TEST_F(FlutterDropWorker, OnlyAnOverloadOfEnoughFramesAndCyclesIsWorthATrace) {
  set("io_buffer_size", 256);
  set("io_cycle", 3);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 256}, {"io_cycle", 3}}), 1U);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 257}, {"io_cycle", 4}}), 1U);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", "300"}, {"io_cycle", 3.9}}), 1U);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 255}, {"io_cycle", 3}}), 0U);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 256}, {"io_cycle", 2}}), 0U);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 256}}), 0U);
  EXPECT_EQ(capturesFor({{"io_cycle", 3}}), 0U);
  const MessageDict good{{"smallest_buffer_frame_size", 256}, {"io_cycle", 3}};
  EXPECT_EQ(capturesFor(good, kIo, AudioEventType::kGeneric), 0U);
  EXPECT_EQ(capturesFor(good, AudioEventCategory::kError), 0U);
  EXPECT_EQ(capturesFor(good, static_cast<AudioEventCategory>(kAudioEventDomainHAL | 7U)), 0U) << "no family";
}

TEST_F(FlutterDropWorker, ThresholdsOfZeroAreTheDefaults) {
  set("io_buffer_size", 0);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 511}}), 0U);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", 512}}), 1U);
  set("io_buffer_size", std::int64_t{1} << 40);
  EXPECT_EQ(capturesFor({{"smallest_buffer_frame_size", std::numeric_limits<std::int32_t>::max()}}), 1U)
      << "held within 32 bits";
}

TEST_F(FlutterDropWorker, TheLatestReadingHoldsForAllWorkers) {
  Classes classes;
  auto worker_class = std::make_unique<TalReportingSessionDPWorkerClass>(host.platform);
  auto& shared = *worker_class;
  classes.push_back(std::move(worker_class));
  auto& earlier = makeSession(std::move(classes));
  earlier.start();
  set("io_buffer_size", 64);
  const auto later = shared.initWithSession(earlier);
  overload({{"smallest_buffer_frame_size", 64}});
  EXPECT_EQ(host.flutter_requests.requests.size(), 1U);
}

TEST_F(FlutterDropWorker, CapturesAreMoreThanTenSecondsApart) {
  make();
  const MessageDict dict{{"smallest_buffer_frame_size", 512}};
  const auto capturesAfter = [&](std::chrono::milliseconds pause) {
    host.clock.advance(pause);
    overload(dict);
    return host.flutter_requests.requests.size();
  };
  EXPECT_EQ(capturesAfter(0ms), 1U);
  EXPECT_EQ(capturesAfter(5000ms), 1U);
  EXPECT_EQ(capturesAfter(5000ms), 1U) << "ten seconds after the capture";
  EXPECT_EQ(capturesAfter(1ms), 2U);
  EXPECT_EQ(capturesAfter(9999ms), 2U);
  make();
  EXPECT_EQ(capturesAfter(0ms), 3U) << "counted for each session";
}

TEST_F(FlutterDropWorker, SleepsBeforeTheCaptureAsLongAsASettingSays) {
  struct Row {
    double wait_time;
    std::chrono::microseconds slept;
  };
  for (const Row& row : {Row{2500.75, 2500us}, Row{0, 0us}, Row{-5, 0us}, Row{std::nan(""), 0us},
                         Row{1e300, 4'294'967'295us}}) {
    set("wait_time", row.wait_time);
    make();
    const auto before = host.clock.monotonic();
    overload({{"smallest_buffer_frame_size", 1}});
    EXPECT_EQ(host.clock.monotonic(), before) << "only for a capture";
    overload({{"smallest_buffer_frame_size", 512}});
    EXPECT_EQ(host.clock.monotonic() - before, row.slept) << row.wait_time;
  }
}

}  // namespace
}  // namespace tal

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <limits>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/capture/CaptureService.h"
#include "support/TestPlatform.h"

namespace tal {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

constexpr double kNotANumber = std::numeric_limits<double>::quiet_NaN();

/// The service with both its queues driven by hand, over a real directory.
class CaptureServiceTest : public ::testing::Test {
 protected:
  CaptureServiceTest() { restart(); }

  void restart() {
    service.reset();
    auto writer = std::make_shared<const CaptureWriter>(
        CaptureWriter::Dependencies{.log_directory = directory.path() / "log",
                                    .state_directory = directory.path(),
                                    .clock = host.clock,
                                    .settings = host.settings,
                                    .log_ring = ring,
                                    .log = host.channels.hound});
    service = std::make_unique<CaptureService>(
        CaptureService::Dependencies{.reporting_queue = host.queue,
                                     .work_queue = work,
                                     .clock = host.clock,
                                     .settings = host.settings,
                                     .processes = host.processes,
                                     .log = host.channels.hound,
                                     .writer = std::move(writer),
                                     .client_processes = [] { return std::vector{::getpid()}; }});
    work.runUntilIdle();
  }

  struct Asking {
    const char* type = "haptics";
    double seconds = 0;
    bool timed = false;
    std::optional<MessageDict> payload = std::nullopt;
    const char* process = "Unknown";
  };
  /// Answers what was accepted; the reply is filed once it comes.
  bool ask(const Asking& asking) {
    auto client =
        service->makeClient({.session = "reporterID=7",
                             .last_messages = {{AudioEventCategory::kError, AudioEventType::kIssueDetector,
                                                MessageDict{{"n", 1}}}}});
    SymptomReporterService::Request request{
        .signature = client->signatureWithDomain({.domain = "Sonarium",
                                                  .type = asking.type,
                                                  .sub_type = "Playback",
                                                  .subtype_context = "Energylog",
                                                  .detected_process = asking.process}),
        .duration_seconds = asking.seconds,
        .payload = asking.payload,
        .reply = [this](const std::optional<MessageDict>& response) { replies.push_back(response->text()); }};
    return asking.timed ? client->startSessionWithSignature(std::move(request))
                        : client->snapshotWithSignature(std::move(request));
  }
  void settle() {
    for (int i = 0; i < 3; ++i) {
      host.queue.runUntilIdle();
      work.runUntilIdle();
    }
  }
  std::vector<std::string> captures() const {
    std::vector<std::string> names;
    std::error_code none;
    for (const auto& entry : fs::directory_iterator(places(), none)) names.push_back(entry.path().filename());
    return names;
  }
  fs::path places() const { return directory.path() / "log/Audio/Captures"; }
  std::string file(const std::string& name) const {
    return test::readFile(places() / captures().at(0) / name);
  }

  test::TemporaryDirectory directory;
  test::TestPlatform host;
  test::HandQueue work{host.clock};
  LogRing ring{host.log, LogLevel::kDebug};
  std::unique_ptr<CaptureService> service;
  std::vector<std::string> replies;

 private:
  const bool made_ = fs::create_directory(directory.path() / "log");
};

TEST_F(CaptureServiceTest, SnapshotIsAnsweredWhenItIsWritten) {
  ring.write("talrb", LogLevel::kDebug, "a line\nof two");
  const MessageDict processes{{kProcessIDs, MessageArray{::getpid(), 1 << 30}}};
  ASSERT_TRUE(ask({.payload = MessageDict{{kHoundDiagKeyPayloadPKParameters,
                                           MessageDict{{kPKSysLogFilterProcess, processes}}}}}));
  host.queue.runUntilIdle();
  EXPECT_THAT(replies, IsEmpty());
  EXPECT_THAT(captures(), IsEmpty());
  settle();
  EXPECT_THAT(replies, ElementsAre("{Success=1, SessionID=20270115T080000Z-haptics-Energylog}"));
  EXPECT_THAT(captures(), ElementsAre("20270115T080000Z-haptics-Energylog"));
  EXPECT_THAT(file("signature.json"), HasSubstr(R"("signature":{"domain":"Sonarium","type":"haptics")"));
  EXPECT_THAT(file("signature.json"), HasSubstr(R"("kind":"snapshot")"));
  EXPECT_THAT(file("payload.json"), HasSubstr(R"("processIDs":[)" + std::to_string(::getpid())));
  EXPECT_THAT(file("processes.txt"), HasSubstr("process " + std::to_string(::getpid())));
  EXPECT_THAT(file("log.txt"), HasSubstr("talrb debug   a line\\nof two\n"));
  EXPECT_EQ(file("messages.jsonl"),
            "{\"category\":\"Error\",\"type\":\"IssueDetector\",\"message\":{\"n\":1}}\n");
  EXPECT_THAT(file("system.txt"), HasSubstr("== /proc/loadavg\n"));
}

TEST_F(CaptureServiceTest, TimedCaptureIsWrittenAtItsEndUnlessCancelled) {
  ask({.type = "alarms", .seconds = 60, .timed = true, .process = "../clock/\n"});
  EXPECT_THAT(replies, ElementsAre("{Success=1, SessionID=20270115T080000Z-alarms-Energylog-.._clock__}"));
  host.queue.advance(std::chrono::milliseconds(59999));
  settle();
  EXPECT_THAT(captures(), IsEmpty());
  host.queue.advance(std::chrono::milliseconds(1));
  settle();
  EXPECT_EQ(captures().size(), 1U);
  EXPECT_THAT(file("signature.json"), HasSubstr(R"("kind":"timed")"));
  EXPECT_THAT(file("processes.txt"), HasSubstr("process " + std::to_string(::getpid())))
      << "the clients, where no payload names processes";

  ask({.type = "telephony", .seconds = 60, .timed = true});
  settle();
  const auto client = service->makeClient({});
  client->cancelSession("NONE_RETURNED");
  client->cancelSession("20270115T080100Z-telephony-Energylog");
  client->cancelSession("20270115T080100Z-telephony-Energylog");
  EXPECT_TRUE(host.log.holds("no open capture is called NONE_RETURNED"));
  ask({.type = "telephony", .seconds = 60, .timed = true});
  settle();
  EXPECT_THAT(replies.back(), HasSubstr("Success=1")) << "a cancelled one uses up no limit";
  client->cancelSession("20270115T080100Z-telephony-Energylog-2");
  host.queue.advance(std::chrono::minutes(2));
  settle();
  EXPECT_EQ(captures().size(), 1U);
}

TEST_F(CaptureServiceTest, RefusalsHaveTheirReasons) {
  const auto reason = [](HoundDiagError error) {
    return "{Success=0, Reason=" + std::to_string(error) + "}";
  };
  EXPECT_FALSE(ask({.type = ""}));
  EXPECT_FALSE(ask({.seconds = -1}));
  EXPECT_FALSE(ask({.seconds = kNotANumber}));
  EXPECT_FALSE(ask({.seconds = 0, .timed = true}));
  settle();
  ASSERT_EQ(replies, std::vector<std::string>(4, reason(kHoundDiagErrorInvalidParameters)));

  host.settings.values["org.vantle.talsys.captures/daily_limit"] = 5;
  for (const char* type : {"a", "b", "c", "d"}) EXPECT_TRUE(ask({.type = type}));
  EXPECT_TRUE(ask({.type = "e"}));
  host.queue.runUntilIdle();
  EXPECT_EQ(replies.back(), reason(kHoundDiagErrorServiceNotReady)) << "while four are being written";
  settle();
  EXPECT_TRUE(ask({.type = "a"}));
  settle();
  EXPECT_EQ(replies.back(), reason(kHoundDiagErrorRequestThrottled));
  ask({.type = "f"});
  settle();
  restart();
  ask({.type = "g"});
  settle();
  EXPECT_EQ(replies.back(), reason(kHoundDiagErrorDailyLimitExceeded)) << "over a restart";

  host.clock.advance(std::chrono::hours(25));
  fs::rename(directory.path() / "log", directory.path() / "elsewhere");
  ask({.type = "h"});
  settle();
  EXPECT_EQ(replies.back(), reason(kHoundDiagErrorServiceUnavailable));
  EXPECT_TRUE(host.log.holds("could not be written and is left out"));
}

TEST_F(CaptureServiceTest, OverloadIsCapturedWithTheScheduler) {
  const FlutterRequest overload{
      .domain = "org.vantle.talsys",
      .type = "AudioOverloads",
      .description = "a/player",
      .payload = {{"io_cycle", 9},
                  {kHoundDiagKeyPayloadPKParameters,
                   MessageDict{{kPKSysLogFilterProcess, MessageDict{{kProcessIDs, MessageArray{1}}}}}}},
      .flags = {true, true, false, false, false}};
  service->requestFlutter(overload);
  service->requestFlutter(overload);
  settle();
  EXPECT_THAT(captures(), ElementsAre("20270115T080000Z-AudioOverloads-a_player"));
  EXPECT_TRUE(host.log.holds("no capture of kind AudioOverloads. reason=kHoundDiagErrorRequestThrottled"));
  EXPECT_THAT(file("signature.json"), HasSubstr(R"("kind":"AudioOverloads")"));
  EXPECT_THAT(file("signature.json"), HasSubstr(R"("flags":[true,true,false,false,false])"));
  EXPECT_THAT(file("payload.json"), HasSubstr(R"("io_cycle":9)"));
  EXPECT_THAT(file("scheduler.txt"), HasSubstr("== /proc/stat\n"));
  EXPECT_THAT(file("processes.txt"), HasSubstr("process " + std::to_string(::getpid())))
      << "a client does not choose what is looked at";
}

TEST_F(CaptureServiceTest, CapturesOfOneSecondHaveNamesOfTheirOwn) {
  ask({.type = "x", .process = "p"});
  ask({.type = "x", .process = "Unknown"});
  ask({.type = "x", .process = ""});
  settle();
  EXPECT_THAT(captures(), ::testing::UnorderedElementsAre("20270115T080000Z-x-Energylog-p",
                                                          "20270115T080000Z-x-Energylog",
                                                          "20270115T080000Z-x-Energylog-2"));
}

}  // namespace
}  // namespace tal

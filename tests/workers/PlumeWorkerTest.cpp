#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "support/SessionFixture.h"
#include "wire/Hex.h"
#include "workers/sinks/AudioIssueDetected.h"
#include "workers/sinks/TalReportingSessionPlumeWorker.h"

namespace tal {
namespace {

using plumemetrics::AudioIssueDetected;

/// A session that has not been started: the worker runs all the same.
class PlumeWorker : public test::SessionFixture {
 protected:
  void SetUp() override {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionPlumeWorkerClass>());
    makeSession(std::move(classes));
  }
  void send(MessageDict dict, AudioEventType type = AudioEventType::kIssueDetector) {
    session().sendMessage(
        test::messageAt(host.clock.secondsSince1970(), std::move(dict), AudioEventCategory::kPlayback, type));
  }
  AudioIssueDetected lastPosted() {
    AudioIssueDetected record;
    ProtobufReader reader(host.plume_metrics.posted.back().second);
    EXPECT_TRUE(record.readFrom(reader));
    return record;
  }
};

TEST_F(PlumeWorker, PostsARecordForEachIssueMessage) {
  send({{"issue_type", "overload"},
        {"rtaid_client", 17.5},
        {"node", std::string("mixer\0rest", 10)},
        {"any_channel_silence_seconds", 3.9}});
  ASSERT_EQ(host.plume_metrics.posted.size(), 1U);
  EXPECT_EQ(host.plume_metrics.posted[0].first, 5963779U);
  AudioIssueDetected expected;
  expected.issuetype = "overload";
  expected.rtaidclient = "17.5";
  expected.node = "mixer";
  expected.duration = 3;
  EXPECT_TRUE(lastPosted() == expected);
  send({{"any_channel_silence_seconds", -1}});
  EXPECT_EQ(lastPosted().duration, -1);
  send({{"any_channel_silence_seconds", 0x7'0000'0005}});
  EXPECT_EQ(lastPosted().duration, 5);
}

TEST_F(PlumeWorker, AMissingKeyIsLoggedAndTheRecordCountsAllTheSame) {
  send({{"node", "mixer"}});
  EXPECT_EQ(lastPosted().node, "mixer");
  const auto complaints = [&] {
    std::vector<std::string> texts;
    for (const auto& line : host.log.lines) {
      if (line.channel == "talra" && line.level == LogLevel::kError) texts.push_back(line.text);
    }
    return texts;
  };
  EXPECT_THAT(complaints(),
              testing::ElementsAre("Failed to get issue_type for AudioIssueDetected",
                                   "Failed to get rtaid_client for AudioIssueDetected",
                                   "Failed to get any_channel_silence_seconds for AudioIssueDetected"));
  host.log.lines.clear();
  send({{"unrelated", 1}});
  EXPECT_EQ(complaints().size(), 4U);
  EXPECT_EQ(toHex(host.plume_metrics.posted.back().second), "10 00 1A 00 22 00 2A 00");
}

TEST_F(PlumeWorker, OtherMessagesPostNothing) {
  send({{"issue_type", "overload"}}, AudioEventType::kError);
  send({{"issue_type", "overload"}}, AudioEventType::kUnknown);
  EXPECT_TRUE(host.plume_metrics.posted.empty());
}

}  // namespace
}  // namespace tal

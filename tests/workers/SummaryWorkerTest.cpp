#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/SessionFixture.h"
#include "workers/sinks/TalReportingSessionSummaryWorker.h"

namespace tal {
namespace {

using test::messageAt;

class SummaryWorker : public test::SessionFixture {
 protected:
  void SetUp() override {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionSummaryWorkerClass>());
    makeSession(std::move(classes));
    session().start();
  }
  void send(MessageDict dict) {
    session().sendMessage(messageAt(host.clock.secondsSince1970(), std::move(dict)));
  }

  /// What the summary of the session says, as text by key.
  std::string figure(const char* key) {
    const MessageValue* value = session().previousValues().find(key);
    return value ? value->text() : "(none)";
  }
};

TEST_F(SummaryWorker, CountsActivePeriodsAndOverloads) {
  send({{"session_duration", 1.5}});
  send({{"session_duration", "no number"}, {"issue_type", "overload"}});
  send({{"session_duration", 4.5}});
  send({{"issue_type", "overload"}, {"n", 1}});
  send({{"issue_type", "Overload"}});
  send({{"issue_type", MessageArray{"overload"}}});
  send({{"issue_type", "overload"}, {"n", 2}});
  session().stop();
  EXPECT_EQ(figure("total_active_time"), "6");
  EXPECT_EQ(figure("active_count"), "3");
  EXPECT_EQ(figure("average_active_time"), "2");
  EXPECT_EQ(figure("overload_count"), "2");
  EXPECT_EQ(figure("audiotag"), "Session_GenericSummary");
}

TEST_F(SummaryWorker, SummaryHoldsItsKeysInOrder) {
  session().setServiceType(AudioServiceType::kAlarms);
  session().setClientProcessName("clock");
  session().updateConfigurationWithContentsOfConfiguration(
      MessageDict{{"HostApplicationDisplayID", "alarm.app"}});
  host.system_state.thermal_state = 2;
  host.system_state.low_power = true;
  session().stop();
  const std::string text = session().previousValues().text();
  EXPECT_EQ(text.substr(0, text.find(", invalid_timestamp")),
            "{total_active_time=0, active_count=0, overload_count=0, average_active_time=0, num_messages=0, "
            "num_unique_messages=2, num_redundant_messages=18446744073709551614, singleMessageSession=0, "
            "summaryServiceName=alarms, HostApplicationDisplayID=alarm.app, clientProcessName=clock, "
            "thermal_state=Serious, low_power_enabled=1, vmInfo_phys_footprint_MiB=5, load_avg_1_min=0.5, "
            "load_avg_5_min=0.25, load_avg_15_min=0.125");
}

TEST_F(SummaryWorker, WithoutFootprintSaysSoAndSendsTheRest) {
  host.system_state.footprint = {.bytes = std::nullopt, .error = "no such process"};
  host.system_state.thermal_state = 9;
  session().stop();
  EXPECT_EQ(figure("vmInfo_phys_footprint_MiB"), "(none)");
  EXPECT_EQ(figure("thermal_state"), "Unknown");
  EXPECT_EQ(figure("clientProcessName"), "(none)");
  EXPECT_EQ(figure("load_avg_15_min"), "0.125");
  EXPECT_EQ(host.log.count("Error with task_info(): no such process"), 1U);
}

TEST_F(SummaryWorker, CountersLiveOnOverAStop) {
  send({{"session_duration", 1}});
  session().stop();
  session().start();
  send({{"session_duration", 1}});
  session().stop();
  EXPECT_EQ(figure("active_count"), "2");
  EXPECT_EQ(figure("num_messages"), "1");
}

}  // namespace
}  // namespace tal

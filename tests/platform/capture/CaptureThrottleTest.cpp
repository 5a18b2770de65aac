#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/linux/capture/CaptureThrottle.h"

namespace tal {
namespace {

// Steps: "a@10" asks for signature a at second 10, "-a" takes its last one back,
// "restart" goes on from the text. What each asking got: '.', T(hrottled), D(aily limit).
std::string play(const std::vector<std::string>& steps, std::size_t daily_limit) {
  std::string outcome;
  CaptureThrottle throttle;
  for (const std::string& step : steps) {
    if (step == "restart") {
      throttle = CaptureThrottle(throttle.text() + "no line of ours\n");
    } else if (step.front() == '-') {
      throttle.takeBack(step.substr(1));
    } else {
      const std::string signature = step.substr(0, 1);
      const double now = 1.8e9 + std::stod(step.substr(2));
      const auto refusal = throttle.refusal(signature, now, daily_limit);
      if (!refusal) throttle.record(signature, now);
      outcome += !refusal ? '.' : *refusal == kHoundDiagErrorRequestThrottled ? 'T' : 'D';
    }
  }
  return outcome;
}

TEST(CaptureThrottle, LimitsBySignatureAndByDay) {
  struct Row {
    const char* name;
    std::vector<std::string> steps;
    std::size_t daily_limit;
    const char* outcome;
  };
  const std::vector<Row> rows{
      {"a minute for each signature", {"a@0", "a@59.9", "b@59.9", "a@60", "a@100"}, 20, ".T..T"},
      {"a refusal does not renew the minute", {"a@0", "a@40", "a@61"}, 20, ".T."},
      {"so many in 24 hours", {"a@0", "b@0", "c@86399", "c@86400", "d@86400", "a@86400"}, 2, "..D..D"},
      {"the daily limit comes first", {"a@0", "a@1"}, 1, ".D"},
      {"none at all", {"a@0"}, 0, "D"},
      {"over a restart", {"a@0", "b@1", "restart", "a@59", "c@60", "d@60"}, 3, "..T.D"},
      {"what is taken back is free", {"a@0", "-a", "a@1", "-b", "a@2"}, 20, "..T"},
      {"a clock set back", {"a@1000", "a@0", "a@59"}, 20, "..T"},
  };
  for (const Row& row : rows) EXPECT_EQ(play(row.steps, row.daily_limit), row.outcome) << row.name;
}

}  // namespace
}  // namespace tal

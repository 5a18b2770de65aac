#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/ReplayScript.h"

namespace tal::talctl {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

TEST(ReplayScript, SkipsBlankLinesAndComments) {
  for (const char* text : {"", "  \t", "\r", "# a comment", "  # {\"op\": \"kill\"}"}) {
    EXPECT_FALSE(parseReplayLine(text)) << text;
  }
}

TEST(ReplayScript, KnowsEveryOperation) {
  const struct {
    const char* text;
    tal_operation operation;
    std::int64_t reporter;
  } rows[] = {
      {R"({"op": "create", "reporter": 7})", TAL_CREATE_SESSION, 7},
      {R"({"op": "set_service", "reporter": -1, "service": "longformaudio"})", TAL_SET_SERVICE_TYPE, -1},
      {R"({"op": "get_service", "reporter": 7})", TAL_LOOK_UP_SERVICE_TYPE, 7},
      {R"({"op": "configure", "reporter": 7, "configuration": {"a": 1}})", TAL_SET_CONFIGURATION, 7},
      {R"({"op": "start", "reporter": 9223372036854775807})", TAL_START_SESSION, INT64_MAX},
      {R"({"op": "send", "category": 4, "type": 1, "message": {}})", TAL_SEND_MESSAGE, 0},
      {R"({"op": "stop", "reporter": 7})", TAL_STOP_SESSION, 7},
      {R"({"op": "destroy", "reporter": 7})", TAL_DESTROY_SESSION, 7},
      {R"({"op": "validate", "reporter": 7})", TAL_LOOK_UP_REPORTER, 7},
      {R"({"op": "list"})", TAL_LOOK_UP_ALL_REPORTERS, 0},
      {R"({"op": "kill"})", TAL_KILL_SERVICE, 0},
  };
  for (const auto& row : rows) {
    const auto step = parseReplayLine(row.text);
    ASSERT_TRUE(step) << row.text;
    EXPECT_EQ(step->operation, row.operation) << row.text;
    EXPECT_EQ(step->reporter, row.reporter) << row.text;
    EXPECT_THAT(row.text, HasSubstr('"' + std::string(replayOperationName(row.operation)) + '"'));
  }
}

TEST(ReplayScript, ReadsNamesAndNumbersAlike) {
  const auto named = parseReplayLine(
      R"({"op":"send","category":"DSP_Playback","type":"Stop","reporters":[3,-4],"message":{"a":1},"after_ms":250})");
  const auto numbered =
      parseReplayLine(R"({"op":"send","category":268435460,"type":2,"reporters":null,"message":{}})");
  ASSERT_TRUE(named && numbered);
  EXPECT_EQ(named->category, 0x10000004U);
  EXPECT_EQ(numbered->category, 0x10000004U);
  EXPECT_EQ(named->type, 2);
  EXPECT_EQ(numbered->type, 2);
  EXPECT_THAT(named->reporters, ElementsAre(3, -4));
  EXPECT_THAT(numbered->reporters, ElementsAre());
  EXPECT_EQ(named->pause_before, std::chrono::milliseconds(250));
  EXPECT_EQ(parseReplayLine(R"({"op":"set_service","reporter":1,"service":65535})")->service_type, 65535);
  EXPECT_FALSE(parseReplayLine(R"({"op":"configure","reporter":1,"configuration":null})")->message);
}

TEST(ReplayScript, TakesEveryKindOfValue) {
  EXPECT_TRUE(parseReplayLine(
      R"({"op":"send","category":1,"type":0,"message":{"i":-1,"u":18446744073709551615,"d":0.5,"b":true,"s":"t",)"
      R"("when":{"$date":1769870702.5},"bytes":{"$data":"AP8Q"},"list":[1,[],{}],"map":{"a":{"$data":""}}}})"));
}

TEST(ReplayScript, SaysWhatIsWrongWithALine) {
  const std::string send = R"({"op":"send","category":1,"type":0,"message":)";
  const std::string deep = std::string(40, '[') + std::string(40, ']');
  const struct {
    std::string text;
    const char* expected;
  } rows[] = {
      {"nonsense", "not well-formed JSON"},
      {"[1]", "not a JSON object"},
      {"{}", "\"op\" is missing"},
      {R"({"op": "fly"})", "\"op\" names no operation"},
      {R"({"op": 1})", "\"op\" names no operation"},
      {R"({"op": "create"})", "\"reporter\" is missing"},
      {R"({"op": "create", "reporter": "7"})", "\"reporter\" wants"},
      {R"({"op": "create", "reporter": 1.0})", "\"reporter\" wants"},
      {R"({"op": "create", "reporter": 9223372036854775808})", "\"reporter\" wants"},
      {R"({"op": "create", "reporter": 1, "service": 7})", "\"service\" has no meaning for \"create\""},
      {R"({"op": "create", "reporter": 1, "": 7})", "\"\" has no meaning"},
      {R"({"op": "list", "reporter": 1})", "\"reporter\" has no meaning"},
      {R"({"op": "list", "after_ms": -1})", "\"after_ms\" wants"},
      {R"({"op": "set_service", "reporter": 1, "service": "music"})", "'music' is no service"},
      {R"({"op": "configure", "reporter": 1})", "\"configuration\" is missing"},
      {R"({"op":"send","category":1,"type":70000,"message":{}})", "'70000' is no type"},
      {R"({"op":"send","category":-1,"type":0,"message":{}})", "\"category\" wants"},
      {R"({"op":"send","category":1,"type":0,"message":{},"reporters":7})", "\"reporters\" wants"},
      {send + "[]}", "a message is a JSON object"},
      {send + "null}", "a message is a JSON object"},
      {send + R"({"a":null}})", "null is no value"},
      {send + R"({"a":[null]}})", "null is no value"},
      {send + R"({"a":)" + deep + "}}", "nested so deep"},
      {send + R"({"a":{"$date":"today"}}})", "\"$date\" wants"},
      {send + R"({"a":{"$date":1e300}}})", "\"$date\" is out of range"},
      {send + R"({"a":{"$data":"A"}}})", "not base64"},
      {send + R"({"a":{"$data":"A==="}}})", "not base64"},
      {send + R"({"a":{"$data":"AA!="}}})", "not base64"},
      {send + R"({"a":{"$data":1}}})", "\"$data\" wants"},
  };
  for (const auto& row : rows) {
    try {
      parseReplayLine(row.text);
      ADD_FAILURE() << "taken: " << row.text;
    } catch (const UsageError& error) {
      EXPECT_THAT(error.what(), HasSubstr(row.expected)) << row.text;
    }
  }
}

}  // namespace
}  // namespace tal::talctl

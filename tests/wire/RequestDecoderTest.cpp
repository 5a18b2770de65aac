#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>
#include <string>

#include "wire/Hex.h"
#include "wire/RequestDecoder.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

Request decoded(std::string_view frame) {
  RequestDecoder decoder;
  Request request;
  const auto error = decoder.decode(hex(frame), request);
  EXPECT_FALSE(error) << frame << ": " << (error ? error->message : "");
  return request;
}

TEST(RequestDecoder, ReadsEveryOperation) {
  const struct {
    const char* frame;
    Operation operation;
    ReporterID reporter_id;
  } rows[] = {
      {"83 01 18 64 05", Operation::kCreateReportingSession, 5},
      {"83 03 18 64 20", Operation::kGetServiceNameForReporterID, -1},
      {"83 05 18 64 1B 7FFFFFFFFFFFFFFF", Operation::kStartReportingSessionForID,
       std::numeric_limits<std::int64_t>::max()},
      {"83 07 18 64 3B 7FFFFFFFFFFFFFFF", Operation::kStopReportingSessionForID,
       std::numeric_limits<std::int64_t>::min()},
      {"83 08 18 64 00", Operation::kDestroyReportingSession, 0},
      {"9F 09 18 64 05 FF", Operation::kValidateReporterID, 5},
      {"82 0A 18 64", Operation::kGetAllReporters, 0},
      {"82 0B 18 64", Operation::kKillService, 0},
  };
  for (const auto& row : rows) {
    const Request request = decoded(row.frame);
    EXPECT_EQ(request.operation, row.operation) << row.frame;
    EXPECT_EQ(request.call, 100U) << row.frame;
    EXPECT_EQ(request.reporter_id, row.reporter_id) << row.frame;
  }
}

TEST(RequestDecoder, ReadsArgumentsInTheirOrder) {
  const Request type = decoded("84 02 01 19 FFFF 07");
  EXPECT_EQ(type.service_type, AudioServiceType::kUnknown);
  EXPECT_EQ(type.reporter_id, 7);

  const Request configuration = decoded("84 04 01 A1 61 'k' 61 'v' 07");
  ASSERT_TRUE(configuration.configuration);
  EXPECT_EQ(configuration.configuration->text(), "{k=v}");
  EXPECT_EQ(configuration.reporter_id, 7);
  EXPECT_FALSE(decoded("84 04 01 F6 07").configuration);

  const Request message = decoded("86 06 01 A1 61 'k' 61 'v' 1A FFFFFFFF 19 FFFF 82 07 20");
  EXPECT_EQ(message.message.text(), "{k=v}");
  EXPECT_EQ(message.category, AudioEventCategory::kUnknown);
  EXPECT_EQ(message.type, AudioEventType::kUnknown);
  EXPECT_THAT(message.reporter_ids, ElementsAre(7, -1));
  EXPECT_THAT(decoded("86 06 01 A0 04 01 F6").reporter_ids, IsEmpty());
  EXPECT_THAT(decoded("86 06 01 A0 04 01 80").reporter_ids, IsEmpty());
  EXPECT_THAT(decoded("86 06 01 BF FF 04 01 9F 01 FF").reporter_ids, ElementsAre(1));
}

TEST(RequestDecoder, ForgetsTheLastRequest) {
  RequestDecoder decoder;
  Request request;
  ASSERT_FALSE(decoder.decode(hex("84 04 01 A0 07"), request));
  ASSERT_FALSE(decoder.decode(hex("86 06 01 A0 04 01 81 07"), request));
  ASSERT_FALSE(decoder.decode(hex("84 00 01 01 A1 6B 'acknowledge' 67 'durable'"), request));
  ASSERT_FALSE(decoder.decode(hex("84 04 01 F6 07"), request));
  EXPECT_FALSE(request.configuration);
  ASSERT_FALSE(decoder.decode(hex("86 06 01 A0 04 01 F6"), request));
  EXPECT_THAT(request.reporter_ids, IsEmpty());
  ASSERT_FALSE(decoder.decode(hex("83 00 01 01"), request));
  EXPECT_FALSE(request.durable);
}

TEST(RequestDecoder, UnderstandsOneOptionAndIgnoresTheRest) {
  const struct {
    const char* options;
    bool durable;
  } rows[] = {
      {"A0", false},
      {"A1 6B 'acknowledge' 67 'durable'", true},
      {"BF 7F 6B 'acknowledge' FF 7F 63 'dur' 64 'able' FF FF", true},
      {"A1 6B 'acknowledge' 67 'Durable'", false},
      {"A1 6B 'acknowledge' F5", false},
      {"A1 6B 'acknowledge' 81 67 'durable'", false},
      {"A2 6B 'acknowledge' 67 'durable' 6B 'acknowledge' 60", false},
      {"A3 63 'new' F6 6B 'acknowledge' 67 'durable' 65 'other' C2 41 01", true},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(decoded(std::string("84 00 01 01 ") + row.options).durable, row.durable) << row.options;
  }
}

struct Refusal {
  const char* name;
  const char* frame;
  std::uint64_t call;
  WireErrorCode code = WireErrorCode::kBadRequest;
};

class RequestDecoderRefuses : public testing::TestWithParam<Refusal> {};

TEST_P(RequestDecoderRefuses, WithTheCallWhereItCouldBeRead) {
  RequestDecoder decoder;
  Request request;
  const auto error = decoder.decode(hex(GetParam().frame), request);
  ASSERT_TRUE(error);
  EXPECT_EQ(error->code, GetParam().code);
  EXPECT_EQ(error->call, GetParam().call);
  EXPECT_TRUE(error->wants_reply);
  EXPECT_STRNE(error->message, "");
  // The next request is not affected.
  EXPECT_FALSE(decoder.decode(hex("86 06 01 A0 04 01 F6"), request));
}

INSTANTIATE_TEST_SUITE_P(
    , RequestDecoderRefuses,
    testing::Values(
        Refusal{"NotAnArray", "A0", 0}, Refusal{"ANumber", "05", 0}, Refusal{"ABreak", "FF", 0},
        Refusal{"EmptyArray", "80", 0}, Refusal{"NoCall", "81 0A", 0},
        Refusal{"NoCallIndefinite", "9F 0A FF", 0}, Refusal{"EmptyIndefinite", "9F FF", 0},
        Refusal{"CallNegative", "82 0A 20", 0}, Refusal{"CallText", "82 0A 61 'a'", 0},
        Refusal{"CallMissingBytes", "82 0A 19 01", 0}, Refusal{"HugeArray", "9B FFFFFFFFFFFFFFFF 0A 07", 0},
        Refusal{"OperationText", "82 61 'a' 07", 7}, Refusal{"OperationNegative", "82 20 07", 7},
        Refusal{"OperationArray", "82 81 81 0A 07", 7}, Refusal{"OperationMalformed", "82 61 FF 07", 0},
        Refusal{"TrailingBytes", "82 0A 07 00", 7}, Refusal{"TrailingAfterIndefinite", "9F 0A 07 FF 00", 7},
        Refusal{"NeverEnding", "9F 0A 07", 7}, Refusal{"TooManyForGetAll", "83 0A 07 00", 7},
        Refusal{"TooManyForGetAllIndefinite", "9F 0A 07 00 FF", 7},
        Refusal{"TooManyForKill", "83 0B 07 F6", 7}, Refusal{"TooFewForCreate", "82 01 07", 7},
        Refusal{"TooFewForCreateIndefinite", "9F 01 07 FF", 7},
        Refusal{"TooManyForCreate", "84 01 07 01 01", 7}, Refusal{"TooFewForMessage", "85 06 07 A0 04 01", 7},
        Refusal{"TooManyForMessage", "87 06 07 A0 04 01 F6 F6", 7}, Refusal{"TooFewForHello", "82 00 07", 7},
        Refusal{"TooManyForHello", "85 00 07 01 A0 A0", 7},
        Refusal{"ReporterIDTooLarge", "83 01 07 1B 8000000000000000", 7},
        Refusal{"ReporterIDTooSmall", "83 01 07 3B 8000000000000000", 7},
        Refusal{"ReporterIDFloat", "83 01 07 F9 3C00", 7}, Refusal{"ReporterIDNull", "83 01 07 F6", 7},
        Refusal{"ServiceTypeTooLarge", "84 02 07 1A 00010000 01", 7},
        Refusal{"ServiceTypeNegative", "84 02 07 20 01", 7},
        Refusal{"CategoryTooLarge", "86 06 07 A0 1B 0000000100000000 01 F6", 7},
        Refusal{"TypeTooLarge", "86 06 07 A0 04 1A 00010000 F6", 7},
        Refusal{"CategoryBoolean", "86 06 07 A0 F5 01 F6", 7},
        Refusal{"MessageNull", "86 06 07 F6 04 01 F6", 7}, Refusal{"MessageArray", "86 06 07 80 04 01 F6", 7},
        Refusal{"MessageHoldsNull", "86 06 07 A1 61 'a' F6 04 01 F6", 7},
        Refusal{"MessageKeyNoText", "86 06 07 A1 01 01 04 01 F6", 7},
        Refusal{"ReceiversUndefined", "86 06 07 A0 04 01 F7", 7},
        Refusal{"ReceiversMap", "86 06 07 A0 04 01 A0", 7},
        Refusal{"ReceiversNumber", "86 06 07 A0 04 01 07", 7},
        Refusal{"ReceiverText", "86 06 07 A0 04 01 81 61 'a'", 7},
        Refusal{"ReceiverTooLarge", "86 06 07 A0 04 01 82 01 1B FFFFFFFFFFFFFFFF", 7},
        Refusal{"ReceiversHuge", "86 06 07 A0 04 01 9A 10000000 01", 7},
        Refusal{"ConfigurationArray", "84 04 07 80 01", 7},
        Refusal{"ConfigurationUndefined", "84 04 07 F7 01", 7},
        Refusal{"ConfigurationHoldsTag", "84 04 07 A1 61 'a' C0 60 01", 7},
        Refusal{"VersionText", "83 00 07 61 '1'", 7}, Refusal{"OptionsNull", "84 00 07 01 F6", 7},
        Refusal{"OptionNameNumber", "84 00 07 01 A1 01 01", 7},
        Refusal{"OptionMalformed", "84 00 07 01 A1 61 'a' 61 FF", 7},
        Refusal{"UnknownOperation", "82 0C 07", 7, WireErrorCode::kUnknownOperation},
        Refusal{"UnknownOperationLarge", "9F 1B FFFFFFFFFFFFFFFF 07 F6 C2 41 01 FF", 7,
                WireErrorCode::kUnknownOperation},
        Refusal{"UnknownOperationMalformed", "83 0C 07 61 FF", 7},
        Refusal{"UnknownOperationTrailing", "82 0C 07 00", 7},
        Refusal{"Version0", "83 00 07 00", 7, WireErrorCode::kUnsupportedVersion},
        Refusal{"Version2", "84 00 07 02 A0", 7, WireErrorCode::kUnsupportedVersion},
        Refusal{"Version2ButMalformed", "84 00 07 02 A1 61 'a'", 7}),
    [](const auto& row) { return row.param.name; });

TEST(RequestDecoder, StaysSilentWhereNoReplyIsWanted) {
  RequestDecoder decoder;
  Request request;
  for (const char* frame : {"83 01 00 F6", "82 0C 00", "83 00 00 02"}) {
    const auto error = decoder.decode(hex(frame), request);
    ASSERT_TRUE(error) << frame;
    EXPECT_FALSE(error->wants_reply) << frame;
  }
}

TEST(RequestDecoder, CountsTheRequestItselfAsNesting) {
  RequestDecoder decoder;
  Request request;
  const auto message = [](std::size_t depth) {
    std::string frame = hex("86 06 07");
    for (std::size_t i = 0; i < depth; ++i) frame += hex("A1 61 'k'");
    return frame + hex("01 04 01 F6");
  };
  const auto unknown = [](std::size_t depth) {
    return hex("83 0C 07") + std::string(depth, '\xC2') + hex("41 01");
  };
  constexpr std::size_t kMost = MessageDecoder::kMostNested - 1;
  EXPECT_FALSE(decoder.decode(message(kMost), request));
  EXPECT_EQ(decoder.decode(message(kMost + 1), request)->code, WireErrorCode::kBadRequest);
  EXPECT_EQ(decoder.decode(unknown(kMost), request)->code, WireErrorCode::kUnknownOperation);
  EXPECT_EQ(decoder.decode(unknown(kMost + 1), request)->code, WireErrorCode::kBadRequest);
  EXPECT_EQ(decoder.decode(unknown(1'000'000), request)->code, WireErrorCode::kBadRequest);
}

}  // namespace
}  // namespace tal

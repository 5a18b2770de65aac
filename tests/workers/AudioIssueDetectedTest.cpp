#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <utility>

#include "wire/Hex.h"
#include "workers/sinks/AudioIssueDetected.h"

namespace tal {
namespace {

using plumemetrics::AudioIssueDetected;

std::string encoded(const AudioIssueDetected& record) {
  std::string bytes;
  ProtobufWriter writer(bytes);
  record.writeTo(writer);
  return bytes;
}

bool decode(AudioIssueDetected& record, std::string_view bytes) {
  ProtobufReader reader(bytes);
  return record.readFrom(reader);
}

AudioIssueDetected full() {
  AudioIssueDetected record;
  record.timestamp = 1;
  record.duration = -1;
  record.issuetype = "overload";
  record.node = "mixer \"A\"";
  record.rtaidclient = std::string("\0\xFF", 2);
  return record;
}

TEST(AudioIssueDetected, EncodesItsFieldsInOrderAndAllButTheTimeAlways) {
  EXPECT_EQ(toHex(encoded({})), "10 00 1A 00 22 00 2A 00");
  EXPECT_EQ(encoded(full()), hex("08 01  10 FFFFFFFFFFFFFFFFFF01  1A 08 'overload'  22 09 'mixer \"A\"'  "
                                 "2A 02 00FF"));
  AudioIssueDetected edge;
  edge.timestamp = std::numeric_limits<std::uint64_t>::max();
  edge.duration = std::numeric_limits<std::int32_t>::min();
  edge.node = std::string(300, 'n');
  EXPECT_EQ(encoded(edge), hex("08 FFFFFFFFFFFFFFFFFF01  10 80808080F8FFFFFFFF01  1A 00  22 AC02 ") +
                               edge.node + hex("2A 00"));
}

TEST(AudioIssueDetected, TextFormHasItsMembersInOrderAndTheTimeWhenThereIsOne) {
  std::string text;
  AudioIssueDetected().formatText(text);
  EXPECT_EQ(text, R"({"duration":0,"issuetype":"","node":"","rtaidclient":""})");
  text.clear();
  AudioIssueDetected record = full();
  record.rtaidclient = "c";
  record.formatText(text);
  EXPECT_EQ(text,
            R"({"duration":-1,"issuetype":"overload","node":"mixer \"A\"","rtaidclient":"c","timestamp":1})");
}

TEST(AudioIssueDetected, EveryFieldCountsInComparisonsAndTheHash) {
  const AudioIssueDetected record = full();
  const auto expectDiffers = [&](auto change) {
    AudioIssueDetected other = record;
    EXPECT_TRUE(other == record);
    EXPECT_EQ(other.hash(), record.hash());
    change(other);
    EXPECT_FALSE(other == record);
    EXPECT_NE(other.hash(), record.hash());
  };
  expectDiffers([](AudioIssueDetected& r) { r.timestamp = 2; });
  expectDiffers([](AudioIssueDetected& r) { r.timestamp.reset(); });
  expectDiffers([](AudioIssueDetected& r) { r.duration = 0; });
  expectDiffers([](AudioIssueDetected& r) { r.issuetype += 'x'; });
  expectDiffers([](AudioIssueDetected& r) { r.node.clear(); });
  expectDiffers([](AudioIssueDetected& r) { std::swap(r.node, r.rtaidclient); });
  AudioIssueDetected at_zero;
  at_zero.timestamp = 0;
  EXPECT_FALSE(at_zero == AudioIssueDetected()) << "no time is not the time 0";
  EXPECT_EQ(at_zero.hash(), AudioIssueDetected().hash());
}

TEST(AudioIssueDetected, SwapExchangesEverything) {
  AudioIssueDetected one = full();
  AudioIssueDetected other;
  swap(one, other);
  EXPECT_TRUE(one == AudioIssueDetected());
  EXPECT_TRUE(other == full());
}

struct Input {
  const char* name;
  std::string bytes;
  bool accepted;
  int duration;  // read before the end or the error
};

std::string nested(std::size_t depth) { return std::string(depth, '\x33') + std::string(depth, '\x34'); }

class AudioIssueDetectedInput : public testing::TestWithParam<Input> {};

TEST_P(AudioIssueDetectedInput, IsReadAsFarAsItMakesSense) {
  AudioIssueDetected record;
  EXPECT_EQ(decode(record, GetParam().bytes), GetParam().accepted);
  EXPECT_EQ(record.duration, GetParam().duration);
  EXPECT_EQ(record.timestamp, std::nullopt);
  EXPECT_LE(record.issuetype.capacity(), std::max(std::string().capacity(), GetParam().bytes.size()));
}

INSTANTIATE_TEST_SUITE_P(
    , AudioIssueDetectedInput,
    testing::Values(
        Input{"Empty", "", true, 0}, Input{"TheLastOfAFieldCounts", hex("1005 1007"), true, 7},
        Input{"WiderThan32BitsIsCut", hex("10 85808080F0FF01"), true, 5},
        Input{"UnknownOfEveryType",
              hex("30 9601  31 1122334455667788  3A 02 0810  3B 0801 13 14 3C  35 10101010  10 05"), true, 5},
        Input{"KnownOfAnotherType", hex("0A 01 05  0D 01020304  15 01020304  1805  33 1009 34  10 05"), true,
              5},
        Input{"EndOfAGroupEnds", hex("10 05 0C 10 07 FF"), true, 5},
        Input{"LengthBeyondTheEnd", hex("10 05 1A 05 'four'"), false, 5},
        Input{"HugeLength", hex("10 05 1A FFFFFFFFFFFFFFFFFF01 'x'"), false, 5},
        Input{"HugeLengthOfUnknown", hex("10 05 3A FFFFFFFF7F 'x'"), false, 5},
        Input{"EndlessVarint", hex("10 05 10 FFFFFFFFFFFFFFFFFFFFFFFF01"), false, 5},
        Input{"EndlessKey", hex("10 05 FFFFFFFFFFFFFFFFFFFFFFFF01"), false, 5},
        Input{"CutKey", hex("10 05 B0"), false, 5}, Input{"CutVarint", hex("10 05 10 80"), false, 5},
        Input{"CutFixed64", hex("10 05 31 01020304050607"), false, 5},
        Input{"CutFixed32", hex("10 05 35 010203"), false, 5},
        Input{"NoFieldZero", hex("10 05 00 00"), false, 5},
        Input{"KeyOver32Bits", hex("10 05 8880808010 01"), false, 5},
        Input{"NoSuchType", hex("10 05 36 00"), false, 5},
        Input{"GroupWithoutEnd", hex("10 05 33 10 09"), false, 5},
        Input{"GroupWithAnothersEnd", hex("10 05 33 3C"), false, 5},
        Input{"GroupsAsDeepAsOthersAllow", nested(100) + hex("10 05"), true, 5},
        Input{"GroupsDeeper", hex("10 05") + nested(101), false, 5},
        Input{"GroupsAThousandDeep", hex("10 05") + nested(1000), false, 5}),
    [](const auto& row) { return row.param.name; });

TEST(AudioIssueDetected, FieldsThatTheInputLacksStay) {
  AudioIssueDetected record = full();
  ASSERT_TRUE(decode(record, hex("22 01 'n'")));
  AudioIssueDetected expected = full();
  expected.node = "n";
  EXPECT_TRUE(record == expected);
}

}  // namespace
}  // namespace tal

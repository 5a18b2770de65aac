#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>
#include <string>

#include "wire/CborWriter.h"
#include "wire/Hex.h"
#include "wire/MessageDecoder.h"

namespace tal {
namespace {

// The message in the frame, or nothing when it was refused.
std::optional<MessageDict> decode(MessageDecoder& decoder, std::string_view frame) {
  decoder.begin(frame);
  MessageDict dict;
  if (!decoder.next() || !decoder.dict(0, dict) || !decoder.reader().rest().empty()) return std::nullopt;
  return dict;
}

std::optional<MessageDict> decode(std::string_view frame) {
  MessageDecoder decoder;
  return decode(decoder, frame);
}

// The one value in a map that holds it under "v".
std::optional<MessageValue> decodeValue(const char* encoded) {
  const std::string frame = hex("A1 61 'v'") + hex(encoded);
  const auto dict = decode(frame);
  if (!dict) return std::nullopt;
  EXPECT_EQ(dict->size(), 1U);
  return *dict->find("v");
}

// Equal, and of the same kind: numbers of any kind compare equal otherwise.
bool same(const MessageValue& a, const MessageValue& b) {
  if (a.kind() == MessageValue::Kind::kDouble && std::isnan(a.toDouble())) {
    return b.kind() == a.kind() && std::isnan(b.toDouble());
  }
  return a.kind() == b.kind() && a == b;
}

TEST(MessageDecoder, GivesEveryFormItsKind) {
  const struct {
    const char* encoded;
    MessageValue value;
  } rows[] = {
      {"00", 0U},
      {"18 05", 5U},  // not the shortest form, but well-formed
      {"1B FF FF FF FF FF FF FF FF", std::numeric_limits<std::uint64_t>::max()},
      {"20", -1},
      {"38 18", -25},
      {"39 01 F3", -500},
      {"3A 00 01 86 9F", -100000},
      {"3B 7F FF FF FF FF FF FF FF", std::numeric_limits<std::int64_t>::min()},
      {"F9 3E 00", 1.5},
      {"FA 47 C3 50 00", 100000.0},
      {"FB C0 10 66 66 66 66 66 66", -4.1},
      {"F9 7C 00", std::numeric_limits<double>::infinity()},
      {"FA 7F C0 00 00", std::numeric_limits<double>::quiet_NaN()},
      {"F4", false},
      {"F5", true},
      {"60", ""},
      {"62 C3 BC", "\u00fc"},
      {"78 03 'abc'", "abc"},
      {"7F 62 'ab' 60 63 'cde' FF", "abcde"},
      {"7F FF", ""},
      {"40", MessageData{}},
      {"42 00 FF", MessageData{hex("00 FF")}},
      {"5F 41 01 42 02 03 FF", MessageData{hex("01 02 03")}},
      {"C1 1A 51 4B 67 B0", MessageDate{1363896240}},
      {"C1 20", MessageDate{-1}},
      {"C1 FB 41 D4 52 D9 EC 20 00 00", MessageDate{1363896240.5}},
      {"80", MessageArray{}},
      {"83 01 61 'x' 81 F5", MessageArray{1U, "x", MessageArray{true}}},
      {"9F 01 9F FF FF", MessageArray{1U, MessageArray{}}},
      {"A0", MessageDict{}},
      {"BF FF", MessageDict{}},
      {"BF 61 'b' 01 7F 61 'a' FF 02 FF", MessageDict{{"b", 1U}, {"a", 2U}}},
  };
  for (const auto& row : rows) {
    const auto value = decodeValue(row.encoded);
    ASSERT_TRUE(value) << row.encoded;
    EXPECT_TRUE(same(*value, row.value)) << row.encoded << " became " << value->text();
  }
}

TEST(MessageDecoder, RefusesWhatNoMessageMayHold) {
  const char* const rows[] = {
      "F6",
      "F7",
      "E0",
      "F3",
      "F8 20",
      "F8 FF",  // null, undefined, simple values
      "C0 60",
      "C2 41 01",
      "D8 20 60",
      "C1 60",
      "C1 F6",
      "C1 C1 00",
      "C1",
      "C1 F9 7E 00",
      "C1 F9 7C 00",                    // no point in time
      "C1 3B 80 00 00 00 00 00 00 00",  // below the signed range
      "3B 80 00 00 00 00 00 00 00",
      "3B FF FF FF FF FF FF FF FF",
      "61 FF",
      "62 C0 80",
      "63 ED A0 80",
      "64 F4 90 80 80",     // not UTF-8
      "7F 61 C3 61 BC FF",  // a character split between chunks
      "7F 41 01 FF",
      "5F 61 'a' FF",
      "7F 7F FF FF",
      "7F 61 'a'",
      "1C",
      "1F",
      "3C",
      "5C",
      "7D",
      "9E",
      "BF",
      "DF",
      "FC",
      "FE",
      "FF",
      "18",
      "1B 00",
      "61",
      "81",
      "9F 01",
      "82 01",
      "A1 61 'a'",
      "BF 61 'a' FF",
      "BF 61 'a' 01",
      "9B FF FF FF FF FF FF FF FF",
      "BB FF FF FF FF FF FF FF FF",
      "7B FF FF FF FF FF FF FF FF",
      "9B 00 00 00 01 00 00 00 00",
      "BA 40 00 00 00",
      "A1 01 01",
      "A1 41 'a' 01",
      "A1 F6 01",
      "BF 01 01 FF",
      "A1 FF 01",
      "A1 7F 61 'a' 01",
      "00 00",  // something behind the map
  };
  for (const char* const row : rows) EXPECT_FALSE(decodeValue(row)) << row;
}

TEST(MessageDecoder, BoundsNesting) {
  const auto nested = [](std::size_t depth, char open, std::string_view key, std::string_view inner) {
    std::string frame = hex("A1 61 'v'");
    for (std::size_t i = 1; i < depth; ++i) (frame += open) += key;
    return frame + std::string(inner);
  };
  constexpr std::size_t kMost = MessageDecoder::kMostNested;
  EXPECT_TRUE(decode(nested(kMost, '\x81', "", "\x01")));
  EXPECT_FALSE(decode(nested(kMost + 1, '\x81', "", "\x01")));
  EXPECT_TRUE(decode(nested(kMost, '\xA1', "\x61k", "\x01")));
  EXPECT_FALSE(decode(nested(kMost + 1, '\xA1', "\x61k", "\x01")));
  EXPECT_FALSE(decode(nested(100'000, '\x81', "", "\x01")));
  EXPECT_FALSE(decode(nested(100'000, '\x9F', "", "\x01")));
}

TEST(MessageDecoder, LetsTheLastOfEqualKeysWin) {
  MessageDecoder decoder;
  const std::string twice = hex("A4 61 'a' 01 61 'b' 02 61 'a' 03 61 'c' 04");
  // The second time nothing may have been learnt that is wrong.
  for (int round = 0; round < 2; ++round) {
    const auto dict = decode(decoder, twice);
    ASSERT_TRUE(dict);
    EXPECT_EQ(dict->text(), "{a=3, b=2, c=4}");
  }
  EXPECT_EQ(decode(decoder, hex("BF 61 'a' 01 61 'a' 02 FF"))->text(), "{a=2}");
}

TEST(MessageDecoder, KnowsTheShapesOfEarlierMessages) {
  MessageDecoder decoder;
  const struct {
    const char* frame;
    const char* text;
  } rows[] = {
      {"A2 61 'a' 01 61 'b' 02", "{a=1, b=2}"},
      {"A2 61 'a' 61 'x' 61 'b' 80", "{a=x, b=[]}"},
      {"A2 61 'a' 01 61 'c' 02", "{a=1, c=2}"},     // parts from a known one
      {"A2 61 'a' 01 61 'b' 02", "{a=1, b=2}"},     // and back
      {"A2 78 01 'a' 01 61 'c' 02", "{a=1, c=2}"},  // a key in a longer form
      {"BF 61 'a' 01 61 'b' 02 FF", "{a=1, b=2}"},  // indefinite
      {"A2 61 'a' A1 61 'n' 01 61 'b' 02", "{a={n=1}, b=2}"},
      {"A2 61 'a' A2 61 'a' 01 61 'b' A0 61 'b' 02", "{a={a=1, b={}}, b=2}"},
      {"A1 61 'a' 01", "{a=1}"},
      {"A0", "{}"},
      {"A3 61 'a' 01 61 'b' 02 61 'c' 03", "{a=1, b=2, c=3}"},
  };
  for (int round = 0; round < 3; ++round) {
    for (const auto& row : rows) {
      const auto dict = decode(decoder, hex(row.frame));
      ASSERT_TRUE(dict) << row.frame;
      EXPECT_EQ(dict->text(), row.text) << row.frame << " round " << round;
    }
    EXPECT_FALSE(decode(decoder, hex("A2 61 'a' 01 61 'b' F6")));
    EXPECT_FALSE(decode(decoder, hex("A2 61 'a' 01 61 'b'")));
  }
  const MessageDict first = *decode(decoder, hex("A2 61 'a' 01 61 'b' 02"));
  const MessageDict second = *decode(decoder, hex("A2 61 'a' 03 61 'b' 04"));
  EXPECT_EQ(first.keyAt(0).text.data(), second.keyAt(0).text.data()) << "both share one shape";
}

TEST(MessageDecoder, TakesMapsOfAnySize) {
  constexpr std::size_t kKeys = 100'000;
  std::string frame;
  CborWriter writer(frame);
  writer.map(kKeys + 1);
  for (std::size_t i = 0; i < kKeys; ++i) {
    writer.text("key" + std::to_string(i));
    writer.unsignedInteger(i);
  }
  writer.text("key7");
  writer.text("last");
  const auto dict = decode(frame);
  ASSERT_TRUE(dict);
  EXPECT_EQ(dict->size(), kKeys);
  EXPECT_EQ(dict->find("key99999")->toInt64(), 99'999);
  EXPECT_EQ(dict->find("key7")->string(), "last");
}

// Values of every kind, nested at random, come back as they went.
class RandomValues {
 public:
  explicit RandomValues(std::uint64_t seed) : random_(seed) {}

  MessageValue value(unsigned depth) {
    switch (below(depth == 0 ? 8 : 10)) {
      case 0:
        return text();
      case 1:
        return static_cast<std::int64_t>(bits()) >> below(64);
      case 2:
        return bits() >> below(64);
      case 3:
        return std::bit_cast<double>(bits());
      case 4:
        return static_cast<double>(std::bit_cast<float>(static_cast<std::uint32_t>(bits())));
      case 5:
        return below(2) == 1;
      case 6:
        return MessageDate{static_cast<double>(below(1'000'000'000)) / 4};
      case 7:
        return MessageData{std::string(below(40), static_cast<char>(below(256)))};
      case 8: {
        MessageArray items;
        for (std::size_t i = below(5); i != 0; --i) items.push_back(value(depth - 1));
        return items;
      }
      default:
        return dict(depth - 1);
    }
  }

  MessageDict dict(unsigned depth) {
    MessageDict entries;
    for (std::size_t i = below(8); i != 0; --i) entries.set(std::string_view(text()), value(depth));
    return entries;
  }

 private:
  std::uint64_t bits() { return random_(); }
  std::size_t below(std::size_t bound) { return random_() % bound; }
  std::string text() {
    static constexpr const char* kPieces[] = {"a", "key", "\u00fc", "\u20ac", "\U0001F3B5", "longer piece"};
    std::string whole;
    for (std::size_t i = below(4); i != 0; --i) whole += kPieces[below(std::size(kPieces))];
    return whole;
  }

  std::mt19937_64 random_;
};

void expectSame(const MessageValue& a, const MessageValue& b) {
  ASSERT_EQ(a.kind(), b.kind());
  if (a.array() && b.array()) {
    ASSERT_EQ(a.array()->size(), b.array()->size());
    for (std::size_t i = 0; i < a.array()->size(); ++i) expectSame((*a.array())[i], (*b.array())[i]);
  } else if (a.dict() && b.dict()) {
    ASSERT_EQ(a.dict()->size(), b.dict()->size());
    for (std::size_t i = 0; i < a.dict()->size(); ++i) {
      ASSERT_EQ(a.dict()->keyAt(i), b.dict()->keyAt(i));
      expectSame(a.dict()->valueAt(i), b.dict()->valueAt(i));
    }
  } else if (a.kind() == MessageValue::Kind::kSigned && a.toInt64() >= 0) {
    ASSERT_EQ(a, b);
  } else {
    ASSERT_TRUE(same(a, b)) << a.text() << " became " << b.text();
  }
}

// CBOR has one form for a number that is not negative, whatever its kind was.
MessageValue asSent(const MessageValue& value) {
  if (value.kind() == MessageValue::Kind::kSigned && value.toInt64() >= 0) return value.toUInt64();
  if (const MessageArray* items = value.array()) {
    MessageArray sent;
    for (const MessageValue& item : *items) sent.push_back(asSent(item));
    return sent;
  }
  if (const MessageDict* entries = value.dict()) {
    MessageDict sent;
    for (const auto& [key, entry] : *entries) sent.set(key, asSent(entry));
    return sent;
  }
  return value;
}

TEST(MessageDecoder, ReadsBackWhatWasWritten) {
  MessageDecoder decoder;
  for (std::uint64_t seed = 0; seed < 2000; ++seed) {
    SCOPED_TRACE(seed);
    const MessageDict sent = RandomValues(seed % 700).dict(4);
    std::string frame;
    CborWriter(frame).dict(sent);
    const auto received = decode(decoder, frame);
    ASSERT_TRUE(received);
    expectSame(asSent(sent), *received);
    if (HasFatalFailure()) return;
    // Cut anywhere, it is refused.
    for (std::size_t end = 0; end < frame.size(); end += 1 + frame.size() / 16) {
      ASSERT_FALSE(decode(decoder, std::string_view(frame).substr(0, end)));
    }
  }
}

}  // namespace
}  // namespace tal

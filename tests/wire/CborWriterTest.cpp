#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>

#include "core/MessageDict.h"
#include "wire/CborWriter.h"
#include "wire/Hex.h"

namespace tal {
namespace {

std::string written(const MessageValue& value) {
  std::string out;
  CborWriter(out).value(value);
  return toHex(out);
}

// Values and encodings of RFC 8949, appendix A, and the edges between the forms.
TEST(CborWriter, WritesTheShortestForm) {
  const struct {
    MessageValue value;
    const char* encoded;
  } rows[] = {
      {0U, "00"},
      {23U, "17"},
      {24U, "18 18"},
      {255U, "18 FF"},
      {256U, "19 01 00"},
      {65536U, "1A 00 01 00 00"},
      {4294967296U, "1B 00 00 00 01 00 00 00 00"},
      {std::numeric_limits<std::uint64_t>::max(), "1B FF FF FF FF FF FF FF FF"},
      {-1, "20"},
      {-24, "37"},
      {-25, "38 18"},
      {-1000, "39 03 E7"},
      {std::numeric_limits<std::int64_t>::min(), "3B 7F FF FF FF FF FF FF FF"},
      {0.0, "F9 00 00"},
      {-0.0, "F9 80 00"},
      {1.5, "F9 3E 00"},
      {65504.0, "F9 7B FF"},
      {65536.0, "FA 47 80 00 00"},
      {100000.0, "FA 47 C3 50 00"},
      {3.4028234663852886e+38, "FA 7F 7F FF FF"},
      {1.0e+300, "FB 7E 37 E4 3C 88 00 75 9C"},
      {5.960464477539063e-8, "F9 00 01"},
      {0.00006103515625, "F9 04 00"},
      {1.1920928955078125e-7, "F9 00 02"},
      {2.98023223876953125e-8, "FA 33 00 00 00"},
      {-4.0, "F9 C4 00"},
      {-4.1, "FB C0 10 66 66 66 66 66 66"},
      {std::numeric_limits<double>::infinity(), "F9 7C 00"},
      {-std::numeric_limits<double>::infinity(), "F9 FC 00"},
      {std::numeric_limits<double>::quiet_NaN(), "F9 7E 00"},
      {true, "F5"},
      {false, "F4"},
      {"", "60"},
      {"IETF", "64 49 45 54 46"},
      {MessageData{hex("01 02 03 04")}, "44 01 02 03 04"},
      {MessageDate{1363896240}, "C1 1A 51 4B 67 B0"},
      {MessageDate{1363896240.5}, "C1 FB 41 D4 52 D9 EC 20 00 00"},
      {MessageArray{1U, MessageArray{2U, 3U}}, "82 01 82 02 03"},
      {MessageDict{{"a", 1U}, {"b", MessageArray{}}}, "A2 61 61 01 61 62 80"},
  };
  for (const auto& row : rows) EXPECT_EQ(written(row.value), row.encoded) << row.value.text();
}

}  // namespace
}  // namespace tal

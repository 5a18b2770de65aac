#include "core/MessageJson.h"

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>

#include "core/Base64.h"
#include "core/DateText.h"
#include "core/Utf8.h"

namespace tal {

namespace {

constexpr std::size_t kWordBytes = sizeof(std::uint64_t);
constexpr std::uint64_t kEachByte = 0x0101010101010101ULL;
constexpr std::uint64_t kHighBits = 0x80 * kEachByte;

// How many bytes of the word, in the order of the text, surely stand for
// themselves: no control character, quote, backslash or part of a longer
// sequence among them.
std::size_t plainPrefix(std::uint64_t word) {
  const auto zeroBytes = [](std::uint64_t x) { return (x - kEachByte) & ~x; };
  const std::uint64_t control = (word - 0x20 * kEachByte) & ~word;
  const std::uint64_t special =
      (control | zeroBytes(word ^ ('"' * kEachByte)) | zeroBytes(word ^ ('\\' * kEachByte)) | word) &
      kHighBits;
  const int zeros =
      std::endian::native == std::endian::little ? std::countr_zero(special) : std::countl_zero(special);
  return static_cast<std::size_t>(zeros) / 8;
}

// Per byte: 0 stands for itself, 'u' for "\u00XX", other letters for "\letter".
constexpr std::array<char, 128> kEscapes = [] {
  std::array<char, 128> escapes{};
  for (std::size_t i = 0; i < ' '; ++i) escapes[i] = 'u';
  escapes['\b'] = 'b';
  escapes['\f'] = 'f';
  escapes['\n'] = 'n';
  escapes['\r'] = 'r';
  escapes['\t'] = 't';
  escapes['"'] = '"';
  escapes['\\'] = '\\';
  return escapes;
}();

// Collects the text in a block on the stack: appending to the string piece by
// piece would cost more than making the pieces.
class JsonWriter {
 public:
  JsonWriter(std::string& out, JsonNonFinite non_finite) : out_(out), non_finite_(non_finite) {}

  bool write(const MessageValue& value);
  bool write(const MessageDict& dict);
  void flush() {
    out_.append(block_.data(), used_);
    used_ = 0;
  }

 private:
  static constexpr std::size_t kBlockBytes = 1024;
  // No single piece below is longer: a number, an escape.
  static constexpr std::size_t kLongestPiece = 32;
  static constexpr std::size_t kLongestRun = 256;

  char* room(std::size_t bytes = kLongestPiece) {
    if (kBlockBytes - used_ < bytes) flush();
    return block_.data() + used_;
  }
  void put(char character) {
    *room(1) = character;
    ++used_;
  }
  void putPiece(std::string_view piece) {
    std::memcpy(room(piece.size()), piece.data(), piece.size());
    used_ += piece.size();
  }
  template <typename Integer>
  void putInteger(Integer value) {
    char* const begin = room();
    used_ += static_cast<std::size_t>(std::to_chars(begin, begin + kLongestPiece, value).ptr - begin);
  }
  // For the rare kinds that others can already write.
  template <typename Append>
  void putQuoted(Append append) {
    put('"');
    flush();
    append(out_);
    put('"');
  }

  bool writeDouble(double value);
  void writeUnsigned(const MessageValue& value);
  bool writeArray(const MessageArray& array);
  void writeString(std::string_view text);
  std::size_t writePlain(std::string_view text);
  std::size_t writeSpecial(std::string_view text);

  std::string& out_;
  JsonNonFinite non_finite_;
  std::size_t used_ = 0;
  std::array<char, kBlockBytes> block_;
};

bool JsonWriter::write(const MessageValue& value) {
  switch (value.kind()) {
    case MessageValue::Kind::kString:
      writeString(value.string());
      return true;
    case MessageValue::Kind::kSigned:
      putInteger(value.toInt64());
      return true;
    case MessageValue::Kind::kUnsigned:
      writeUnsigned(value);
      return true;
    case MessageValue::Kind::kDouble:
      return writeDouble(value.toDouble());
    case MessageValue::Kind::kBoolean:
      putPiece(value.toBool() ? "true" : "false");
      return true;
    case MessageValue::Kind::kDate:
      putQuoted([&](std::string& out) { appendRfc3339(out, value.date()->seconds_since_1970); });
      return true;
    case MessageValue::Kind::kData:
      putQuoted([&](std::string& out) { appendBase64(out, value.data()); });
      return true;
    case MessageValue::Kind::kArray:
      return writeArray(*value.array());
    case MessageValue::Kind::kDict:
      return write(*value.dict());
  }
  return false;
}

bool JsonWriter::write(const MessageDict& dict) {
  put('{');
  for (std::size_t i = 0; i < dict.size(); ++i) {
    if (i != 0) put(',');
    writeString(dict.keyAt(i).text);
    put(':');
    if (!write(dict.valueAt(i))) return false;
  }
  put('}');
  return true;
}

bool JsonWriter::writeArray(const MessageArray& array) {
  put('[');
  bool first = true;
  for (const MessageValue& item : array) {
    if (!first) put(',');
    first = false;
    if (!write(item)) return false;
  }
  put(']');
  return true;
}

void JsonWriter::writeUnsigned(const MessageValue& value) {
  // `toInt64` holds larger numbers at its end of the range.
  const std::int64_t number = value.toInt64();
  if (number < std::numeric_limits<std::int64_t>::max()) {
    putInteger(number);
  } else {
    putPiece(value.text());
  }
}

bool JsonWriter::writeDouble(double value) {
  // Whole numbers up to here are integers in their shortest form too, and those
  // are quicker to write.
  constexpr double kMostQuickWhole = 1e15;
  if (std::fabs(value) < kMostQuickWhole && !(value == 0 && std::signbit(value))) {
    const auto whole = static_cast<std::int64_t>(value);
    if (static_cast<double>(whole) == value) {
      putInteger(whole);
      putPiece(".0");
      return true;
    }
  }
  if (!std::isfinite(value)) {
    if (non_finite_ == JsonNonFinite::kFail) return false;
    putPiece("null");
    return true;
  }
  char* const begin = room();
  char* const end = std::to_chars(begin, begin + kLongestPiece, value).ptr;
  used_ += static_cast<std::size_t>(end - begin);
  const bool looks_whole = std::all_of(begin, end, [](char c) { return (c >= '0' && c <= '9') || c == '-'; });
  if (looks_whole) putPiece(".0");
  return true;
}

void JsonWriter::writeString(std::string_view text) {
  put('"');
  while (!text.empty()) {
    const std::size_t plain = writePlain(text.substr(0, kLongestRun));
    text.remove_prefix(plain);
    if (plain < kLongestRun && !text.empty()) text.remove_prefix(writeSpecial(text));
  }
  put('"');
}

// Writes what stands for itself at the beginning of the text, which is at most
// a run long; the result is its size.
std::size_t JsonWriter::writePlain(std::string_view text) {
  // Locals, since the compiler must assume that text written through the
  // pointer changes members.
  char* const begin = room(text.size());
  std::size_t done = 0;
  for (; text.size() - done >= kWordBytes; done += kWordBytes) {
    std::uint64_t word = 0;
    std::memcpy(&word, text.data() + done, kWordBytes);
    std::memcpy(begin + done, &word, kWordBytes);
    const std::size_t plain = plainPrefix(word);
    if (plain < kWordBytes) {
      used_ += done + plain;
      return done + plain;
    }
  }
  for (; done < text.size(); ++done) {
    const auto byte = static_cast<unsigned char>(text[done]);
    if (byte >= kEscapes.size() || kEscapes[byte] != 0) break;
    begin[done] = text[done];
  }
  used_ += done;
  return done;
}

// Writes the character that the text begins with; the result is its size in bytes.
std::size_t JsonWriter::writeSpecial(std::string_view text) {
  constexpr std::string_view kReplacementCharacter = "\xEF\xBF\xBD";
  constexpr std::string_view kHex = "0123456789abcdef";
  const auto byte = static_cast<unsigned char>(text.front());
  if (byte >= kEscapes.size()) {
    const std::size_t length = utf8SequenceLength(text);
    putPiece(length == 0 ? kReplacementCharacter : text.substr(0, length));
    return std::max<std::size_t>(length, 1);
  }
  const char escape = kEscapes[byte];
  if (escape == 0) {
    put(text.front());
  } else if (escape == 'u') {
    putPiece("\\u00");
    put(kHex[byte >> 4]);
    put(kHex[byte & 15]);
  } else {
    put('\\');
    put(escape);
  }
  return 1;
}

template <typename Content>
bool append(std::string& out, const Content& content, JsonNonFinite non_finite) {
  const std::size_t size_before = out.size();
  JsonWriter writer(out, non_finite);
  const bool complete = writer.write(content);
  if (complete) {
    writer.flush();
  } else {
    out.resize(size_before);
  }
  return complete;
}

}  // namespace

bool appendJson(std::string& out, const MessageValue& value, JsonNonFinite non_finite) {
  return append(out, value, non_finite);
}

bool appendJson(std::string& out, const MessageDict& dict, JsonNonFinite non_finite) {
  return append(out, dict, non_finite);
}

}  // namespace tal

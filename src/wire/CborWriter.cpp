#include "wire/CborWriter.h"

#include <bit>
#include <cmath>
#include <limits>
#include <optional>

#include "core/MessageDict.h"
#include "wire/FrameSplitter.h"

namespace tal {

namespace {

constexpr std::uint64_t kLargestEmbedded = 23;
constexpr std::uint8_t kOneByteFollows = 24;
constexpr std::uint8_t kTwoBytesFollow = 25;
constexpr std::uint8_t kFourBytesFollow = 26;
constexpr std::uint8_t kEightBytesFollow = 27;
constexpr std::uint64_t kEpochTag = 1;

constexpr std::uint16_t kHalfNaN = 0x7E00;
constexpr std::uint32_t kHalfInfinity = 0x7C00;
constexpr std::uint32_t kHalfExponentBias = 15;
constexpr std::uint32_t kSingleExponentBias = 127;

// The half-precision bits of a value that half precision holds exactly.
std::optional<std::uint16_t> exactHalf(float value) {
  if (std::isnan(value)) return kHalfNaN;
  const auto bits = std::bit_cast<std::uint32_t>(value);
  const std::uint32_t sign = (bits >> 16U) & 0x8000U;
  const std::uint32_t exponent = (bits >> 23U) & 0xFFU;
  const std::uint32_t mantissa = bits & 0x7FFFFFU;
  const auto signedBits = [sign](std::uint32_t rest) { return static_cast<std::uint16_t>(sign | rest); };

  if (exponent == 0xFF) return signedBits(kHalfInfinity);
  if (exponent == 0) return mantissa == 0 ? std::optional(signedBits(0)) : std::nullopt;
  constexpr std::uint32_t kOffset = kSingleExponentBias - kHalfExponentBias;
  if (exponent > kOffset) {  // a normal half
    if (exponent >= kOffset + 0x1FU || (mantissa & 0x1FFFU) != 0) return std::nullopt;
    return signedBits(((exponent - kOffset) << 10U) | (mantissa >> 13U));
  }
  // A subnormal half: the implied one becomes a bit of the mantissa.
  const std::uint32_t shift = 14U + (kOffset - exponent);
  if (shift > 23U) return std::nullopt;
  const std::uint32_t whole = mantissa | 0x800000U;
  if ((whole & ((1U << shift) - 1U)) != 0) return std::nullopt;
  return signedBits(whole >> shift);
}

// A double beyond the range of the narrower type has no defined conversion.
bool fitsSingle(double value) {
  if (std::isnan(value) || std::isinf(value)) return true;
  return std::abs(value) <= static_cast<double>(std::numeric_limits<float>::max()) &&
         static_cast<double>(static_cast<float>(value)) == value;
}

}  // namespace

void CborWriter::bigEndian(std::uint64_t value, unsigned byte_count) {
  for (unsigned shift = 8 * byte_count; shift != 0;) {
    shift -= 8;
    out_ += static_cast<char>((value >> shift) & 0xFFU);
  }
}

void CborWriter::head(Major major, std::uint64_t argument) {
  const auto initial = [major](std::uint64_t info) { return static_cast<char>(major | info); };
  if (argument <= kLargestEmbedded) {
    out_ += initial(argument);
  } else if (argument <= std::numeric_limits<std::uint8_t>::max()) {
    out_ += initial(kOneByteFollows);
    bigEndian(argument, 1);
  } else if (argument <= std::numeric_limits<std::uint16_t>::max()) {
    out_ += initial(kTwoBytesFollow);
    bigEndian(argument, 2);
  } else if (argument <= std::numeric_limits<std::uint32_t>::max()) {
    out_ += initial(kFourBytesFollow);
    bigEndian(argument, 4);
  } else {
    out_ += initial(kEightBytesFollow);
    bigEndian(argument, 8);
  }
}

void CborWriter::signedInteger(std::int64_t value) {
  if (value >= 0) {
    head(kUnsigned, static_cast<std::uint64_t>(value));
  } else {
    head(kNegative, ~static_cast<std::uint64_t>(value));
  }
}

void CborWriter::bytes(std::string_view value) {
  head(kBytes, value.size());
  out_ += value;
}

void CborWriter::text(std::string_view value) {
  head(kText, value.size());
  out_ += value;
}

void CborWriter::real(double value) {
  if (!fitsSingle(value)) {
    out_ += static_cast<char>(kSimple | kEightBytesFollow);
    bigEndian(std::bit_cast<std::uint64_t>(value), 8);
    return;
  }
  const auto single = static_cast<float>(value);
  if (const std::optional<std::uint16_t> half = exactHalf(single)) {
    out_ += static_cast<char>(kSimple | kTwoBytesFollow);
    bigEndian(*half, 2);
  } else {
    out_ += static_cast<char>(kSimple | kFourBytesFollow);
    bigEndian(std::bit_cast<std::uint32_t>(single), 4);
  }
}

void CborWriter::date(MessageDate value) {
  head(kTag, kEpochTag);
  const double seconds = value.seconds_since_1970;
  // Beyond this a double no longer holds every integer.
  constexpr double kLargestExact = 9007199254740992.0;
  if (std::trunc(seconds) == seconds && std::abs(seconds) <= kLargestExact) {
    signedInteger(static_cast<std::int64_t>(seconds));
  } else {
    real(seconds);
  }
}

void CborWriter::value(const MessageValue& value) {
  switch (value.kind()) {
    case MessageValue::Kind::kString:
      return text(value.string());
    case MessageValue::Kind::kSigned:
      return signedInteger(value.toInt64());
    case MessageValue::Kind::kUnsigned:
      return unsignedInteger(value.toUInt64());
    case MessageValue::Kind::kDouble:
      return real(value.toDouble());
    case MessageValue::Kind::kBoolean:
      return boolean(value.toBool());
    case MessageValue::Kind::kDate:
      return date(value.date().value_or(MessageDate{}));
    case MessageValue::Kind::kData:
      return bytes(value.data());
    case MessageValue::Kind::kArray: {
      const MessageArray& items = *value.array();
      array(items.size());
      for (const MessageValue& item : items) this->value(item);
      return;
    }
    case MessageValue::Kind::kDict:
      return dict(*value.dict());
  }
}

void CborWriter::dict(const MessageDict& value) {
  map(value.size());
  for (const auto& [key, entry] : value) {
    text(key);
    this->value(entry);
  }
}

std::size_t CborWriter::beginFrame() {
  const std::size_t begin = out_.size();
  out_.append(kFrameHeaderBytes, '\0');
  return begin;
}

void CborWriter::endFrame(std::size_t begin) {
  const std::size_t length = out_.size() - begin - kFrameHeaderBytes;
  for (std::size_t i = 0; i < kFrameHeaderBytes; ++i) {
    out_[begin + i] = static_cast<char>((length >> (8 * i)) & 0xFFU);
  }
}

}  // namespace tal

#include "core/ProtobufReader.h"

#include <array>

namespace tal {

namespace {

constexpr unsigned kBitsPerByte = 7;
constexpr unsigned kMostVarintBits = 64;
constexpr unsigned kKeyTypeBits = 3;
constexpr std::uint64_t kKeyTypeMask = 7;
// As other decoders have it, so that what one accepts the others accept too.
constexpr std::size_t kDeepestGroups = 100;
constexpr std::uint64_t kLargestKey = 0xFFFFFFFF;

}  // namespace

void ProtobufReader::fail() {
  has_error_ = true;
  rest_ = {};
}

void ProtobufReader::advance(std::uint64_t bytes) {
  if (bytes > rest_.size()) return fail();
  rest_.remove_prefix(static_cast<std::size_t>(bytes));
}

std::uint64_t ProtobufReader::readVarint() {
  std::uint64_t value = 0;
  std::size_t at = 0;
  for (unsigned shift = 0; shift < kMostVarintBits && at < rest_.size(); shift += kBitsPerByte) {
    const auto byte = static_cast<unsigned char>(rest_[at++]);
    // Of the tenth byte only one bit has a place; the others are dropped.
    value |= std::uint64_t{byte & 0x7FU} << shift;
    if (byte < 0x80) {
      rest_.remove_prefix(at);
      return value;
    }
  }
  fail();
  return 0;
}

ProtobufReader::Key ProtobufReader::readKey() {
  const std::uint64_t key = readVarint();
  const std::uint64_t field = key >> kKeyTypeBits;
  const std::uint64_t type = key & kKeyTypeMask;
  if (field == 0 || key > kLargestKey || type > static_cast<std::uint64_t>(ProtobufWireType::kFixed32)) {
    fail();
    return {};
  }
  return {static_cast<std::uint32_t>(field), static_cast<ProtobufWireType>(type)};
}

std::string_view ProtobufReader::readBytes() {
  const std::uint64_t size = readVarint();
  const std::string_view bytes = rest_.substr(0, static_cast<std::size_t>(size));
  advance(size);
  return has_error_ ? std::string_view() : bytes;
}

void ProtobufReader::skip(Key key) {
  switch (key.type) {
    case ProtobufWireType::kVarint:
      readVarint();
      return;
    case ProtobufWireType::kFixed64:
      return advance(sizeof(std::uint64_t));
    case ProtobufWireType::kLengthDelimited:
      readBytes();
      return;
    case ProtobufWireType::kStartGroup:
      return skipGroup(key.field);
    case ProtobufWireType::kEndGroup:
      return fail();
    case ProtobufWireType::kFixed32:
      return advance(sizeof(std::uint32_t));
  }
}

// Without recursion, since the depth is the sender's choice.
void ProtobufReader::skipGroup(std::uint32_t field) {
  std::array<std::uint32_t, kDeepestGroups> open{field};
  std::size_t depth = 1;
  while (depth > 0) {
    const Key key = readKey();
    if (has_error_) return;
    if (key.type == ProtobufWireType::kStartGroup) {
      if (depth == open.size()) return fail();
      open[depth++] = key.field;
    } else if (key.type == ProtobufWireType::kEndGroup) {
      if (open[--depth] != key.field) return fail();
    } else {
      skip(key);
    }
  }
}

}  // namespace tal

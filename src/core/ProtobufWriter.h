#pragma once

// The protocol-buffers binary encoding, written.

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tal {

/// How a field's value is laid out: the low three bits of its key.
enum class ProtobufWireType : std::uint8_t {
  kVarint = 0,
  kFixed64 = 1,
  kLengthDelimited = 2,
  kStartGroup = 3,
  kEndGroup = 4,
  kFixed32 = 5,
};

/// Appends fields to a string, which outlives the writer.
class ProtobufWriter {
 public:
  explicit ProtobufWriter(std::string& out) : out_(out) {}

  void writeUInt64(std::uint32_t field, std::uint64_t value) {
    Piece piece;
    piece.addKey(field, ProtobufWireType::kVarint);
    piece.addVarint(value);
    piece.appendTo(out_);
  }
  /// A negative value takes ten bytes: it is widened to 64 bits first.
  void writeInt32(std::uint32_t field, std::int32_t value) {
    writeUInt64(field, static_cast<std::uint64_t>(std::int64_t{value}));
  }
  void writeBytes(std::uint32_t field, std::string_view bytes) {
    Piece piece;
    piece.addKey(field, ProtobufWireType::kLengthDelimited);
    piece.addVarint(bytes.size());
    piece.appendTo(out_);
    out_ += bytes;
  }

 private:
  // A key and a number, put together here since the string checks its capacity
  // at each append.
  class Piece {
   public:
    void addKey(std::uint32_t field, ProtobufWireType type) {
      addVarint(std::uint64_t{field} << 3 | static_cast<std::uint64_t>(type));
    }
    void addVarint(std::uint64_t value) {
      constexpr std::uint64_t kMore = 0x80;
      for (; value >= kMore; value >>= 7) bytes_[size_++] = static_cast<char>(value | kMore);
      bytes_[size_++] = static_cast<char>(value);
    }
    void appendTo(std::string& out) const { out.append(bytes_.data(), size_); }

   private:
    static constexpr std::size_t kLongestVarint = 10;
    std::array<char, 2 * kLongestVarint> bytes_;
    std::size_t size_ = 0;
  };

  std::string& out_;
};

}  // namespace tal

#include "wire/CborReader.h"

#include <cbor.h>

namespace tal {

// Each call of libcbor's decoder calls exactly one of these back.
struct CborReader::Callbacks {
  using Kind = CborItem::Kind;

  static CborItem& item(void* reader) { return static_cast<CborReader*>(reader)->item_; }

  template <Kind kind, typename Number>
  static void number(void* reader, Number value) {
    item(reader).kind = kind;
    item(reader).number = value;
  }
  template <Kind kind>
  static void bytes(void* reader, cbor_data data, std::size_t size) {
    item(reader).kind = kind;
    item(reader).bytes = {reinterpret_cast<const char*>(data), size};
  }
  template <Kind kind>
  static void plain(void* reader) {
    item(reader).kind = kind;
  }
  template <typename Float>
  static void real(void* reader, Float value) {
    item(reader).kind = Kind::kFloat;
    item(reader).real = static_cast<double>(value);
  }

  static constexpr cbor_callbacks kTable = {
      .uint8 = number<Kind::kUnsigned, std::uint8_t>,
      .uint16 = number<Kind::kUnsigned, std::uint16_t>,
      .uint32 = number<Kind::kUnsigned, std::uint32_t>,
      .uint64 = number<Kind::kUnsigned, std::uint64_t>,
      .negint64 = number<Kind::kNegative, std::uint64_t>,
      .negint32 = number<Kind::kNegative, std::uint32_t>,
      .negint16 = number<Kind::kNegative, std::uint16_t>,
      .negint8 = number<Kind::kNegative, std::uint8_t>,
      .byte_string_start = plain<Kind::kBytesStart>,
      .byte_string = bytes<Kind::kBytes>,
      .string = bytes<Kind::kText>,
      .string_start = plain<Kind::kTextStart>,
      .indef_array_start = plain<Kind::kArrayStart>,
      .array_start = number<Kind::kArray, std::size_t>,
      .indef_map_start = plain<Kind::kMapStart>,
      .map_start = number<Kind::kMap, std::size_t>,
      .tag = number<Kind::kTag, std::uint64_t>,
      .float2 = real<float>,
      .float4 = real<float>,
      .float8 = real<double>,
      .undefined = plain<Kind::kUndefined>,
      .null = plain<Kind::kNull>,
      .boolean = number<Kind::kBoolean, bool>,
      .indef_break = plain<Kind::kBreak>,
  };
};

bool CborReader::next() {
  const auto* data = reinterpret_cast<cbor_data>(rest_.data());
  const cbor_decoder_result result = cbor_stream_decode(data, rest_.size(), &Callbacks::kTable, this);
  if (result.status != CBOR_DECODER_FINISHED) return false;
  rest_.remove_prefix(result.read);
  return true;
}

}  // namespace tal

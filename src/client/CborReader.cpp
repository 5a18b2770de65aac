// Reads CBOR item by item, on libcbor's streaming decoder.
#include "client/CborReader.h"

#include <cbor.h>

#include <vector>

namespace tal::clientlib {

namespace {

using Kind = CborToken::Kind;

template <Kind kind, typename Number>
void takeNumber(void* context, Number value) {
  auto& token = *static_cast<CborToken*>(context);
  token.kind = kind;
  token.number = static_cast<std::uint64_t>(value);
}

template <Kind kind>
void takePlain(void* context) {
  static_cast<CborToken*>(context)->kind = kind;
}

template <Kind kind>
void takeString(void* context, cbor_data data, std::size_t size) {
  auto& token = *static_cast<CborToken*>(context);
  token.kind = kind;
  token.text = {reinterpret_cast<const char*>(data), size};
}

template <typename Float>
void takeFloat(void* context, Float) {
  static_cast<CborToken*>(context)->kind = Kind::Float;
}

constexpr cbor_callbacks makeCallbacks() {
  cbor_callbacks to{};
  to.uint8 = takeNumber<Kind::Unsigned>;
  to.uint16 = takeNumber<Kind::Unsigned>;
  to.uint32 = takeNumber<Kind::Unsigned>;
  to.uint64 = takeNumber<Kind::Unsigned>;
  to.negint8 = takeNumber<Kind::Negative>;
  to.negint16 = takeNumber<Kind::Negative>;
  to.negint32 = takeNumber<Kind::Negative>;
  to.negint64 = takeNumber<Kind::Negative>;
  to.byte_string = takeString<Kind::Bytes>;
  to.byte_string_start = takePlain<Kind::ChunkedString>;
  to.string = takeString<Kind::Text>;
  to.string_start = takePlain<Kind::ChunkedString>;
  to.array_start = takeNumber<Kind::Array>;
  to.indef_array_start = takePlain<Kind::OpenArray>;
  to.map_start = takeNumber<Kind::Map>;
  to.indef_map_start = takePlain<Kind::OpenMap>;
  to.tag = takeNumber<Kind::Tag>;
  to.float2 = takeFloat<float>;
  to.float4 = takeFloat<float>;
  to.float8 = takeFloat<double>;
  to.boolean = takeNumber<Kind::Bool>;
  to.null = takePlain<Kind::Null>;
  to.undefined = takePlain<Kind::Undefined>;
  to.indef_break = takePlain<Kind::Break>;
  return to;
}

constexpr cbor_callbacks kCallbacks = makeCallbacks();

/// Stands for "until the break" among the numbers of items that are still to come.
constexpr std::uint64_t kOpen = UINT64_MAX;

}  // namespace

bool CborReader::next(CborToken& token) {
  if (atEnd()) return false;
  const cbor_decoder_result result =
      cbor_stream_decode(bytes_.data() + position_, bytes_.size() - position_, &kCallbacks, &token);
  if (result.status != CBOR_DECODER_FINISHED) return false;
  position_ += result.read;
  return true;
}

bool CborReader::skip() {
  // One number for each container that is open: how many items it still wants.
  std::vector<std::uint64_t> wanted{1};
  while (!wanted.empty()) {
    CborToken token;
    if (!next(token)) return false;
    if (token.kind == Kind::Break) {
      if (wanted.back() != kOpen) return false;
      wanted.pop_back();
    } else if (wanted.back() != kOpen) {
      --wanted.back();
    }
    switch (token.kind) {
      case Kind::Tag:
        wanted.push_back(1);
        break;
      case Kind::Array:
      case Kind::Map:
        // More items than there are bytes cannot come, and twice such a number would overflow.
        if (token.number > bytes_.size()) return false;
        wanted.push_back(token.kind == Kind::Map ? 2 * token.number : token.number);
        break;
      case Kind::OpenArray:
      case Kind::OpenMap:
      case Kind::ChunkedString:
        wanted.push_back(kOpen);
        break;
      default:
        break;
    }
    while (!wanted.empty() && wanted.back() == 0) wanted.pop_back();
  }
  return true;
}

}  // namespace tal::clientlib

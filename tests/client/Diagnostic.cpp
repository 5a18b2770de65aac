// CBOR as readable text, decoded by libcbor's own tree builder, so that the library under test cannot vouch
// for itself.
#include "client/Diagnostic.h"

#include <cbor.h>

#include <sstream>

namespace tal::test {

namespace {

void print(std::ostream& out, const cbor_item_t* item);

void printString(std::ostream& out, const cbor_item_t* item) {
  out << '"'
      << std::string_view(reinterpret_cast<const char*>(cbor_string_handle(item)), cbor_string_length(item))
      << '"';
}

void printBytes(std::ostream& out, const cbor_item_t* item) {
  constexpr char kHex[] = "0123456789abcdef";
  out << "h'";
  for (std::size_t i = 0; i < cbor_bytestring_length(item); ++i) {
    const unsigned char byte = cbor_bytestring_handle(item)[i];
    out << kHex[byte >> 4] << kHex[byte & 15];
  }
  out << "'";
}

void printControl(std::ostream& out, const cbor_item_t* item) {
  if (cbor_is_float(item)) {
    out << cbor_float_get_float(item);
  } else if (cbor_is_bool(item)) {
    out << (cbor_get_bool(item) ? "true" : "false");
  } else {
    out << (cbor_is_null(item) ? "null" : "undefined");
  }
}

void print(std::ostream& out, const cbor_item_t* item) {
  switch (cbor_typeof(item)) {
    case CBOR_TYPE_UINT:
      out << cbor_get_int(item);
      break;
    case CBOR_TYPE_NEGINT:
      out << static_cast<std::int64_t>(~cbor_get_int(item));
      break;
    case CBOR_TYPE_BYTESTRING:
      printBytes(out, item);
      break;
    case CBOR_TYPE_STRING:
      printString(out, item);
      break;
    case CBOR_TYPE_ARRAY:
      out << '[';
      for (std::size_t i = 0; i < cbor_array_size(item); ++i) {
        if (i > 0) out << ", ";
        print(out, cbor_array_handle(item)[i]);
      }
      out << ']';
      break;
    case CBOR_TYPE_MAP:
      out << '{';
      for (std::size_t i = 0; i < cbor_map_size(item); ++i) {
        if (i > 0) out << ", ";
        print(out, cbor_map_handle(item)[i].key);
        out << ": ";
        print(out, cbor_map_handle(item)[i].value);
      }
      out << '}';
      break;
    case CBOR_TYPE_TAG: {
      cbor_item_t* tagged = cbor_tag_item(item);
      out << cbor_tag_value(item) << '(';
      print(out, tagged);
      out << ')';
      cbor_decref(&tagged);
      break;
    }
    case CBOR_TYPE_FLOAT_CTRL:
      printControl(out, item);
      break;
  }
}

}  // namespace

std::string diagnostic(std::span<const unsigned char> bytes) {
  cbor_load_result result{};
  cbor_item_t* item = cbor_load(bytes.data(), bytes.size(), &result);
  if (!item) return "malformed";
  std::ostringstream out;
  out.precision(17);
  print(out, item);
  cbor_decref(&item);
  return result.read == bytes.size() ? out.str() : "malformed";
}

std::string cborText(const std::string& text) {
  std::string bytes;
  if (text.size() < 24) {
    bytes += static_cast<char>(0x60 + text.size());
  } else {
    bytes += {'\x78', static_cast<char>(text.size())};
  }
  return bytes + text;
}

std::string cborUint16(std::uint16_t number) {
  return {'\x19', static_cast<char>(number >> 8), static_cast<char>(number & 0xFF)};
}

}  // namespace tal::test

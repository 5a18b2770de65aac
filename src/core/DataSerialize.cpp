#include "core/DataSerialize.h"

#include <charconv>
#include <cmath>

#include "core/Base64.h"
#include "core/DateText.h"
#include "core/MessageDict.h"
#include "core/Utf8.h"

namespace tal {

namespace {

constexpr std::string_view kHead =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
    "<plist version=\"1.0\">\n";
constexpr std::string_view kTail = "</plist>\n";

/// Writes one property list; `failed` tells that a value had no place in it.
class PropertyListWriter {
 public:
  std::optional<std::string> write(const MessageValue& value) {
    out_ = kHead;
    writeValue(value, 0);
    out_ += kTail;
    if (failed_) return std::nullopt;
    return std::move(out_);
  }

 private:
  void writeValue(const MessageValue& value, std::size_t depth) {
    using Kind = MessageValue::Kind;
    switch (value.kind()) {
      case Kind::kString:
        return writeElement("string", value.string(), depth);
      case Kind::kSigned:
      case Kind::kUnsigned:
        return writeElement("integer", value.text(), depth);
      case Kind::kDouble:
        return writeElement("real", realText(value.toDouble()), depth);
      case Kind::kBoolean:
        return writeLine(value.toBool() ? "<true/>" : "<false/>", depth);
      case Kind::kDate:
        return writeElement("date", dateText(value.date()->seconds_since_1970), depth);
      case Kind::kData: {
        std::string text;
        appendBase64(text, value.data());
        return writeElement("data", text, depth);
      }
      case Kind::kArray:
        return writeArray(*value.array(), depth);
      case Kind::kDict:
        return writeDict(*value.dict(), depth);
    }
  }

  void writeArray(const MessageArray& array, std::size_t depth) {
    if (array.empty()) return writeLine("<array/>", depth);
    writeLine("<array>", depth);
    for (const MessageValue& item : array) writeValue(item, depth + 1);
    writeLine("</array>", depth);
  }

  void writeDict(const MessageDict& dict, std::size_t depth) {
    if (dict.empty()) return writeLine("<dict/>", depth);
    writeLine("<dict>", depth);
    for (const auto& [key, value] : dict) {
      writeElement("key", key, depth + 1);
      writeValue(value, depth + 1);
    }
    writeLine("</dict>", depth);
  }

  void writeLine(std::string_view text, std::size_t depth) {
    out_.append(depth, '\t');
    out_ += text;
    out_ += '\n';
  }

  void writeElement(std::string_view name, std::string_view text, std::size_t depth) {
    out_.append(depth, '\t');
    out_ += '<';
    out_ += name;
    out_ += '>';
    escape(text);
    out_ += "</";
    out_ += name;
    out_ += ">\n";
  }

  void escape(std::string_view text) {
    if (!isUtf8(text) || text.find("\xEF\xBF\xBE") != std::string_view::npos ||
        text.find("\xEF\xBF\xBF") != std::string_view::npos) {
      failed_ = true;
    }
    for (const char character : text) {
      switch (character) {
        case '&':
          out_ += "&amp;";
          break;
        case '<':
          out_ += "&lt;";
          break;
        case '>':
          out_ += "&gt;";
          break;
        case '\r':
          out_ += "&#13;";  // written plainly, it would be read as a line feed
          break;
        default:
          // XML 1.0 knows no way to write the other control characters.
          if (static_cast<unsigned char>(character) < ' ' && character != '\t' && character != '\n')
            failed_ = true;
          out_ += character;
      }
    }
  }

  // Property lists spell these three in words.
  static std::string realText(double number) {
    if (std::isnan(number)) return "nan";
    if (std::isinf(number)) return number > 0 ? "+infinity" : "-infinity";
    char digits[32];
    return {digits, std::to_chars(digits, digits + sizeof digits, number).ptr};
  }

  // Property lists know whole seconds only.
  static std::string dateText(double seconds) {
    constexpr std::size_t kWithoutFraction = sizeof("2026-01-31T14:45:02") - 1;
    std::string text;
    appendRfc3339(text, std::floor(seconds));
    text.resize(kWithoutFraction);
    return text + 'Z';
  }

  std::string out_;
  bool failed_ = false;
};

bool isAscii(std::string_view text) {
  for (const char character : text) {
    if (static_cast<unsigned char>(character) > 0x7F) return false;
  }
  return true;
}

}  // namespace

std::optional<MessageData> DataSerialize::getPlistBlob(const MessageValue& value) {
  std::optional<std::string> xml = PropertyListWriter().write(value);
  if (!xml) return std::nullopt;
  return MessageData{std::move(*xml)};
}

std::optional<std::string> DataSerialize::getXMLInfo(const MessageValue& value) {
  std::optional<std::string> xml = getDataXMLInfo(value);
  if (xml && !isAscii(*xml)) return std::nullopt;
  return xml;
}

std::optional<std::string> DataSerialize::getDataXMLInfo(const MessageValue& value) {
  std::optional<MessageData> blob = getPlistBlob(value);
  if (!blob) return std::nullopt;
  return std::move(blob->bytes);
}

std::optional<std::string> DataSerialize::getBase64XMLBlob(const MessageValue& value) {
  const std::optional<MessageData> blob = getPlistBlob(value);
  if (!blob) return std::nullopt;
  std::string text;
  appendBase64(text, blob->bytes);
  return text;
}

}  // namespace tal

#include "platform/linux/logging/LogLine.h"

#include <cstddef>

#include "core/DateText.h"
#include "core/Utf8.h"

namespace tal {

namespace {

void appendEscapedByte(std::string& out, char byte) {
  constexpr std::string_view kHex = "0123456789abcdef";
  switch (byte) {
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      break;
  }
  const auto value = static_cast<unsigned char>(byte);
  out += "\\x";
  out += kHex[value >> 4];
  out += kHex[value & 15];
}

bool isPlain(char byte) { return byte >= ' ' && byte < '\x7f'; }

}  // namespace

void appendEscaped(std::string& out, std::string_view text) {
  while (!text.empty()) {
    std::size_t plain = 0;
    while (plain < text.size() && isPlain(text[plain])) ++plain;
    out += text.substr(0, plain);
    text.remove_prefix(plain);
    if (text.empty()) return;
    const std::size_t length = utf8SequenceLength(text);
    const std::string_view sequence = text.substr(0, length);
    if (length > 1 && !isC1Control(sequence)) {
      out += sequence;
      text.remove_prefix(length);
    } else {
      appendEscapedByte(out, text.front());
      text.remove_prefix(1);
    }
  }
}

void appendLogLine(std::string& out, double seconds_since_1970, std::string_view channel, LogLevel level,
                   std::string_view line) {
  constexpr std::size_t kLevelColumns = 7;
  appendRfc3339(out, seconds_since_1970);
  out += ' ';
  out += channel;
  out += ' ';
  const std::string_view name = logLevelName(level);
  out += name;
  out.append(kLevelColumns - name.size() + 1, ' ');
  appendEscaped(out, line);
  out += '\n';
}

}  // namespace tal

#include "tools/talctl/EventText.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <string_view>
#include <vector>

#include "tools/talctl/ArgumentValue.h"

namespace tal::talctl {
namespace {

constexpr std::size_t kIndent = 4;
// Below this a line holds nothing useful: such a terminal is treated as this wide.
constexpr std::size_t kNarrowest = 20;

std::string localTime(double seconds_since_1970) {
  const double whole = std::floor(seconds_since_1970);
  const auto seconds = static_cast<std::time_t>(whole);
  std::tm parts{};
  if (!localtime_r(&seconds, &parts)) return "?";
  std::array<char, 64> text{};
  const std::size_t size = std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M:%S", &parts);
  std::snprintf(text.data() + size, text.size() - size, ".%03d",
                static_cast<int>((seconds_since_1970 - whole) * 1000));
  return text.data();
}

/// Escaped, so that only what JSON means by it is left.
std::string dump(const Json& value) {
  return escapeControls(value.dump(-1, ' ', false, Json::error_handler_t::replace));
}

/// The payload, or its text as a string where it is not JSON.
Json payloadOf(const StoredEvent& event) {
  Json payload = Json::parse(event.payload, nullptr, false);
  if (payload.is_discarded()) return event.payload;
  return payload;
}

bool isPlainKey(std::string_view key) {
  return !key.empty() && std::all_of(key.begin(), key.end(), [](unsigned char c) {
    return c > ' ' && c != '=' && c != '"' && c != 0x7F;
  });
}

std::vector<std::string> payloadWords(const Json& payload) {
  std::vector<std::string> words;
  if (!payload.is_object()) return {dump(payload)};
  for (const auto& [key, value] : payload.items()) {
    words.push_back((isPlainKey(key) ? escapeControls(key) : dump(key)) + '=' + dump(value));
  }
  return words;
}

}  // namespace

std::string eventText(const StoredEvent& event, const Terminal& terminal) {
  const std::string time = localTime(event.recorded_at);
  const std::string name = escapeControls(event.name);
  const std::vector<std::string> words = payloadWords(payloadOf(event));
  const Width width = terminal.width();
  if (!width) {
    std::string line = time + "  " + name + " ";
    for (const std::string& word : words) line += ' ' + word;
    return line + '\n';
  }

  const std::size_t columns = std::max(*width, kNarrowest);
  std::string text;
  if (time.size() + 2 + displayWidth(name) <= columns) {
    text = terminal.styled(Style::kDim, time) + "  " + terminal.styled(Style::kBold, name) + '\n';
  } else {
    text = terminal.styled(Style::kDim, cutToWidth(time, columns)) + '\n';
    for (const std::string& line : wrapWords({name}, columns))
      text += terminal.styled(Style::kBold, line) + '\n';
  }
  for (const std::string& line : wrapWords(words, columns - kIndent)) {
    text += std::string(kIndent, ' ') + line + '\n';
  }
  return text;
}

std::string eventJson(const StoredEvent& event) {
  const Json object = {{"id", event.id},
                       {"recorded_at", event.recorded_at},
                       {"name", event.name},
                       {"payload", payloadOf(event)}};
  return dump(object) + '\n';
}

}  // namespace tal::talctl

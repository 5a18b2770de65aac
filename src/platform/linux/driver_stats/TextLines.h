#pragma once

#include <charconv>
#include <optional>
#include <string_view>
#include <vector>

namespace tal {

/// Cuts the next line off the text; it comes without its end.
inline std::string_view takeLine(std::string_view& text) {
  const auto end = text.find('\n');
  const std::string_view line = text.substr(0, end);
  text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  return line;
}

/// Cuts the next word off the text: empty at its end.
inline std::string_view takeWord(std::string_view& text) {
  constexpr std::string_view kBlanks = " \t\r";
  const auto begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) {
    text = {};
    return {};
  }
  text.remove_prefix(begin);
  const auto end = text.find_first_of(kBlanks);
  const std::string_view word = text.substr(0, end);
  text.remove_prefix(word.size());
  return word;
}

inline std::vector<std::string_view> wordsOf(std::string_view line) {
  std::vector<std::string_view> words;
  for (auto word = takeWord(line); !word.empty(); word = takeWord(line)) words.push_back(word);
  return words;
}

/// The whole word as a decimal number, or nothing.
template <typename Integer>
std::optional<Integer> numberOf(std::string_view word) {
  Integer number = 0;
  const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
  if (error != std::errc() || end != word.data() + word.size()) return std::nullopt;
  return number;
}

}  // namespace tal

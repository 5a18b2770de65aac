#pragma once

// Looks into stored payloads without building anything: a report reads millions of them, and of each only
// a few members.

#include <array>
#include <cstddef>
#include <string>
#include <string_view>

namespace tal::talctl {

/// The members of one JSON object, one after another, each as it is spelled. Nested values are passed over
/// as a whole and not looked into.
class JsonMembers {
 public:
  explicit JsonMembers(std::string_view object);

  /// Goes to the next one. False at the end, and where the text is not JSON.
  bool next();
  /// Whether the end was that of an object.
  bool isComplete() const { return complete_; }

  std::string_view key() const { return key_; }      ///< Between its quotes; escapes as they are.
  std::string_view value() const { return value_; }  ///< A string with its quotes.

 private:
  bool take(char expected);
  bool takeString(std::string_view& inside);
  bool takeValue();
  bool takeNested();
  void skipBlanks();

  std::string_view rest_;
  std::string_view key_;
  std::string_view value_;
  bool first_ = true;
  bool complete_ = false;
};

/// The values under `keys`, each empty where it is missing. False where the payload is no JSON object.
template <std::size_t kCount>
bool pickMembers(std::string_view payload, const std::array<std::string_view, kCount>& keys,
                 std::array<std::string_view, kCount>& values) {
  JsonMembers members(payload);
  while (members.next()) {
    for (std::size_t i = 0; i < kCount; ++i) {
      if (keys[i] == members.key()) values[i] = members.value();
    }
  }
  return members.isComplete();
}

/// The number that a value spells; 0 for anything else, and for none.
double numberOf(std::string_view value);

/// The text of a value, short enough for a report: a string without its quotes and escapes, the elements of
/// an array with commas between them, anything else as JSON. "unknown" for none, null and "". The result may
/// lie in `buffer`.
std::string_view textOf(std::string_view value, std::string& buffer);

}  // namespace tal::talctl

#include "platform/linux/driver_stats/SoundCards.h"

#include "platform/linux/driver_stats/TextLines.h"

namespace tal {

namespace {

std::string_view trimmedEnd(std::string_view text) {
  const auto last = text.find_last_not_of(' ');
  return last == std::string_view::npos ? std::string_view() : text.substr(0, last + 1);
}

}  // namespace

std::vector<SoundCard> parseSoundCards(std::string_view text) {
  std::vector<SoundCard> cards;
  while (!text.empty()) {
    std::string_view line = takeLine(text);
    const auto number = numberOf<int>(takeWord(line));
    const auto open = line.find('[');
    const auto close = line.find("]: ");
    const auto dash = line.find(" - ");
    // The second line of a card, and "--- no soundcards ---", have no such form.
    if (!number || open == std::string_view::npos || close == std::string_view::npos || close < open ||
        dash == std::string_view::npos || dash < close + 3) {
      continue;
    }
    cards.push_back({*number, std::string(trimmedEnd(line.substr(open + 1, close - open - 1))),
                     std::string(line.substr(close + 3, dash - close - 3))});
  }
  return cards;
}

}  // namespace tal

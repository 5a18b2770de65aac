#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tal {

/// A sound card, as /proc/asound/cards names it.
struct SoundCard {
  int number = 0;
  std::string identifier;  ///< unique among the cards, such as "PCH"
  std::string driver;      ///< such as "HDA-Intel"

  friend bool operator==(const SoundCard&, const SoundCard&) = default;
};

/// The cards that /proc/asound/cards lists: " 0 [PCH            ]: HDA-Intel - HDA Intel PCH",
/// each followed by a line of its long name.
std::vector<SoundCard> parseSoundCards(std::string_view text);

}  // namespace tal

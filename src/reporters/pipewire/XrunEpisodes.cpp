#include "reporters/pipewire/XrunEpisodes.h"

namespace tal {

bool XrunEpisodes::addXrun(TimePoint when, std::chrono::duration<double> starved) {
  const bool begins = !last_ || when - *last_ >= kEpisodeGap;
  last_ = when;
  starved_ += starved;
  if (begins) ++episodes_;
  return begins;
}

}  // namespace tal

#include "platform/linux/callstat/SummaryLimit.h"

#include <string_view>

namespace tal {

namespace {

// Values are joined by commas; what follows the last one that fits goes with it.
std::string_view cut(std::string_view text) {
  if (text[kMostSummaryValueBytes] == ',') return text.substr(0, kMostSummaryValueBytes);
  std::string_view kept = text.substr(0, kMostSummaryValueBytes);
  if (const auto comma = kept.rfind(','); comma != std::string_view::npos) return kept.substr(0, comma);
  constexpr unsigned char kTopBits = 0xC0;
  constexpr unsigned char kContinuation = 0x80;
  std::size_t end = kept.size();
  while (end > 0 && (static_cast<unsigned char>(text[end]) & kTopBits) == kContinuation) --end;
  return kept.substr(0, end);
}

}  // namespace

LimitedSummary limitSummary(const MessageDict& summary) {
  LimitedSummary result{.summary = summary, .cut_keys = 0};
  MessageDict left_out;
  for (const auto& [key, value] : summary) {
    const std::string_view text = value.string();
    if (text.size() <= kMostSummaryValueBytes) continue;
    const std::string_view kept = cut(text);
    left_out.set(key, static_cast<std::uint64_t>(text.size() - kept.size()));
    result.summary.set(key, kept);
    ++result.cut_keys;
  }
  if (result.cut_keys > 0) result.summary.set("TAL_Session_Summary_LeftOut", std::move(left_out));
  return result;
}

}  // namespace tal

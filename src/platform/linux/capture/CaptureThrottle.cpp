#include "platform/linux/capture/CaptureThrottle.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <sstream>

namespace tal {

namespace {

constexpr double kSecondsPerSignature = 60;
constexpr double kSecondsPerDay = 24 * 60 * 60;

// FNV-1a: the same in every process.
std::string hashOf(std::string_view signature) {
  std::uint64_t hash = 0xcbf29ce484222325ULL;
  for (const char byte : signature) {
    hash = (hash ^ static_cast<unsigned char>(byte)) * 0x100000001b3ULL;
  }
  std::array<char, 17> text{};
  std::snprintf(text.data(), text.size(), "%016llx", static_cast<unsigned long long>(hash));
  return text.data();
}

}  // namespace

CaptureThrottle::CaptureThrottle(std::string_view text) {
  std::istringstream lines{std::string(text)};
  for (std::string line; std::getline(lines, line);) {
    std::istringstream words(line);
    Taken taken{};
    if (words >> taken.at >> taken.signature) taken_.push_back(std::move(taken));
  }
}

std::optional<HoundDiagError> CaptureThrottle::refusal(std::string_view signature, double now,
                                                       std::size_t daily_limit) {
  std::erase_if(taken_,
                [now](const Taken& taken) { return taken.at > now || now - taken.at >= kSecondsPerDay; });
  if (taken_.size() >= daily_limit) return kHoundDiagErrorDailyLimitExceeded;
  const std::string hash = hashOf(signature);
  const bool lately = std::any_of(taken_.begin(), taken_.end(), [&](const Taken& taken) {
    return taken.signature == hash && now - taken.at < kSecondsPerSignature;
  });
  if (lately) return kHoundDiagErrorRequestThrottled;
  return std::nullopt;
}

void CaptureThrottle::record(std::string_view signature, double now) {
  taken_.push_back({now, hashOf(signature)});
}

void CaptureThrottle::takeBack(std::string_view signature) {
  const std::string hash = hashOf(signature);
  const auto last = std::find_if(taken_.rbegin(), taken_.rend(),
                                 [&](const Taken& taken) { return taken.signature == hash; });
  if (last != taken_.rend()) taken_.erase(std::next(last).base());
}

std::string CaptureThrottle::text() const {
  std::string text;
  for (const Taken& taken : taken_) text += std::to_string(taken.at) + ' ' + taken.signature + '\n';
  return text;
}

}  // namespace tal

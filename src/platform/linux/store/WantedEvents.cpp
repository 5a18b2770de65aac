#include "platform/linux/store/WantedEvents.h"

#include <fnmatch.h>

#include <algorithm>

namespace tal {

namespace {

using std::chrono_literals::operator""ms;

// Together with what the settings themselves take, a change shows within a second.
constexpr Clock::Instant kLookAgainAfter = 400ms;
// Names come from fixed tables, some hundreds of them; this is for the day when
// they do not.
constexpr std::size_t kMostAnswers = 4096;

// The globs, or nothing where the value is no list of texts.
std::optional<std::vector<std::string>> globsOf(const MessageValue& value) {
  const MessageArray* items = value.array();
  if (!items) return std::nullopt;
  std::vector<std::string> globs;
  for (const MessageValue& item : *items) {
    if (!item.isString()) return std::nullopt;
    globs.emplace_back(item.string());
  }
  return globs;
}

}  // namespace

bool WantedEvents::contains(std::string_view name) {
  const Clock::Instant now = dependencies_.coarse_now();
  if (!looked_at_ || now - *looked_at_ >= kLookAgainAfter) {
    looked_at_ = now;
    lookAtSetting();
  }
  if (!globs_) return true;
  if (const auto known = answers_.find(name); known != answers_.end()) return known->second;
  if (answers_.size() >= kMostAnswers) answers_.clear();
  std::string key(name);
  const bool wanted = matches(key);
  answers_.emplace(std::move(key), wanted);
  return wanted;
}

void WantedEvents::lookAtSetting() {
  std::optional<MessageValue> setting = dependencies_.settings.value("org.vantle.talsys.analytics", "wanted");
  if (setting == setting_) return;
  setting_ = std::move(setting);
  answers_.clear();
  globs_ = setting_ ? globsOf(*setting_) : std::nullopt;
  if (setting_ && !globs_) {
    TAL_LOG_ERROR(dependencies_.log, "the setting wanted is no list of event names; every event is taken");
  }
}

bool WantedEvents::matches(const std::string& name) const {
  return std::any_of(globs_->begin(), globs_->end(),
                     [&](const std::string& glob) { return ::fnmatch(glob.c_str(), name.c_str(), 0) == 0; });
}

}  // namespace tal

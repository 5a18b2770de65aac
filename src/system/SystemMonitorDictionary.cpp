#include "system/SystemMonitorDictionary.h"

#include <utility>

namespace tal {

SystemMonitorDictionary::Observation::Observation(SystemMonitorDictionary& dictionary, std::string feature,
                                                  std::uint64_t number)
    : dictionary_(&dictionary), feature_(std::move(feature)), number_(number) {}

SystemMonitorDictionary::Observation::Observation(Observation&& other) noexcept
    : dictionary_(std::exchange(other.dictionary_, nullptr)),
      feature_(std::move(other.feature_)),
      number_(other.number_) {}

SystemMonitorDictionary::Observation::~Observation() {
  if (dictionary_) dictionary_->endObservation(feature_, number_);
}

SystemMonitorDictionary::Entry& SystemMonitorDictionary::entryOf(std::string_view feature) {
  const auto found = entries_.find(feature);
  return found != entries_.end() ? found->second : entries_[std::string(feature)];
}

std::optional<MessageDict> SystemMonitorDictionary::stateOf(std::string_view feature) const {
  const Lock held = lock();
  const auto found = entries_.find(feature);
  return found != entries_.end() ? found->second.state : std::nullopt;
}

void SystemMonitorDictionary::file(std::string_view feature, MessageDict state) {
  const Lock held = lock();
  Entry& entry = entryOf(feature);
  entry.state = std::move(state);
  const std::uint64_t newest = last_number_;
  // Each look-up begins anew: the one before may have ended any of them.
  auto next = entry.observers.begin();
  while (next != entry.observers.end() && next->first <= newest) {
    const std::uint64_t number = next->first;
    const Observer observer = next->second;  // may end its own observation
    const MessageDict now = *entry.state;    // may file the next one
    observer(now);
    next = entry.observers.upper_bound(number);
  }
}

SystemMonitorDictionary::Observation SystemMonitorDictionary::observe(std::string_view feature,
                                                                      Observer observer) {
  const Lock held = lock();
  entryOf(feature).observers.emplace(++last_number_, std::move(observer));
  return {*this, std::string(feature), last_number_};
}

void SystemMonitorDictionary::endObservation(const std::string& feature, std::uint64_t number) {
  const Lock held = lock();
  entryOf(feature).observers.erase(number);
}

}  // namespace tal

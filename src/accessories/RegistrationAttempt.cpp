#include "accessories/RegistrationAttempt.h"

#include <chrono>
#include <string_view>
#include <utility>

#include "session/CallstatInfo.h"

namespace tal {

namespace {

constexpr std::chrono::seconds kLongestWaitForBackEnds{9};
constexpr std::string_view kServiceName = "audioregistration";
// A message has its bounds, and nobody pairs more.
constexpr std::size_t kMostUnits = 64;

MessageDict inventoryOf(const std::vector<BaseUnit>& units) {
  MessageArray registrations;
  for (const BaseUnit& unit : units) {
    if (registrations.size() == kMostUnits) break;
    registrations.emplace_back(unit.registration());
  }
  return {{"accessory_count", units.size()}, {"accessories", std::move(registrations)}};
}

}  // namespace

void RegistrationAttempt::begin() {
  dependencies_.queue->post([self = shared_from_this()] { self->open(); });
}

void RegistrationAttempt::open() {
  const auto token = dependencies_.backend.newHierarchyTokenFromParentToken(nullptr);
  if (!token) return end(Outcome::kFailed, "the back-end gives no token");
  constexpr bool kBatched = false;
  session_ = dependencies_.backend.initWithSessionInfo(callstatSessionInfo(reporter_id_, *token, kBatched),
                                                       callstatUserInfo(reporter_id_, kServiceName), {});
  session_->startConfigurationWithCompletionHandler(
      [weak = weak_from_this(), queue = dependencies_.queue](const std::vector<std::string>& backends) {
        queue->post([weak, any = !backends.empty()] {
          if (const auto self = weak.lock()) self->backEndsFound(any);
        });
        if (const auto self = weak.lock()) self->answered_ = true;
      });
  // Either way the task keeps the attempt alive, as nobody else does. An answer that is there already stands
  // before it and needs no timer.
  if (answered_) {
    dependencies_.queue->post([self = shared_from_this()] {});
  } else {
    dependencies_.queue->postAfter(kLongestWaitForBackEnds, [self = shared_from_this()] {
      self->end(Outcome::kFailed, "the back-end does not answer");
    });
  }
}

void RegistrationAttempt::backEndsFound(bool any) {
  if (!done_) return;  // too late
  if (!any) return end(Outcome::kNoBackEnd, "there is no back-end");
  publish();
}

void RegistrationAttempt::publish() {
  const BTAccess::Accessories accessories = BTAccess(dependencies_.devices).pairedAccessories();
  if (accessories.unavailable) return end(Outcome::kNoBluetooth, *accessories.unavailable);
  const auto error = session_->sendMessage(static_cast<std::uint16_t>(AudioEventCategory::kSetup),
                                           static_cast<std::uint16_t>(AudioEventType::kSetup),
                                           inventoryOf(accessories.units));
  if (error) return end(Outcome::kFailed, *error);
  session_->flushMessages();
  TAL_LOG_INFO(dependencies_.log, "registered ", accessories.units.size(), " accessories");
  end(Outcome::kPublished, {});
}

void RegistrationAttempt::end(Outcome outcome, const std::string& reason) {
  session_.reset();
  if (const Done done = std::exchange(done_, nullptr)) done(outcome, reason);
}

}  // namespace tal

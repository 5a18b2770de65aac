// What the RTC worker does on its private queue. Named so that its log lines
// bear the name of the worker.

#include "workers/sinks/TalReportingSessionRtcWorker.h"

#include <chrono>
#include <deque>
#include <string_view>
#include <unordered_map>
#include <utility>

#include "core/MessageKeys.h"
#include "session/CallstatInfo.h"
#include "workers/sinks/CallstatTraffic.h"

namespace tal {

namespace {

constexpr std::chrono::seconds kLongestWaitForBackends{9};

MessageDict sessionInfo(const CallstatTraffic::Opening& opening, const CallstatToken& token) {
  const bool batched = shouldBatchCallstatEventsForServiceType(opening.service_type);
  MessageDict info = callstatSessionInfo(opening.reporter_id, token, batched);
  if (const MessageValue* name = opening.configuration.find(TalReportingApplicationName)) {
    info.set(kCallstatClientBundleIdentifier, *name);
  }
  return info;
}

MessageDict userInfo(const CallstatTraffic::Opening& opening, bool internal_build) {
  MessageDict info = callstatUserInfo(opening.reporter_id, opening.service_name);
  if (internal_build) info.set(kCallstatSessionIdentifier, opening.reporter_id);
  info.merge(opening.configuration);
  return info;
}

// "[first, second]".
std::string listText(const std::vector<std::string>& names) {
  MessageArray list;
  for (const std::string& name : names) list.emplace_back(name);
  return MessageValue(std::move(list)).text();
}

// All values of each key, in the order in which they came, joined by commas.
class SummaryJoins {
 public:
  void add(std::string_view key, const MessageValue& value) {
    auto found = places_.find(key);
    if (found == places_.end()) {
      joins_.emplace_back(std::string(key), std::string());
      // The list never moves its entries.
      found = places_.emplace(joins_.back().first, &joins_.back().second).first;
    } else {
      *found->second += ',';
    }
    value.appendText(*found->second);
  }
  MessageDict take() {
    MessageDict summary;
    for (auto& [key, text] : joins_) {
      summary.set(key, text);
      std::string().swap(text);  // there may be much of it
    }
    return summary;
  }

 private:
  std::deque<std::pair<std::string, std::string>> joins_;
  std::unordered_map<std::string_view, std::string*> places_;
};

}  // namespace

// While a wait goes on, what comes is held behind it.
template <typename Work>
void CallstatTraffic::post(Work work) {
  dependencies_.queue->post([self = shared_from_this(), work = std::move(work)]() mutable {
    if (self->wait_ != Wait::kNone) {
      self->held_.emplace_back(std::move(work));
    } else {
      work();
    }
  });
}

void CallstatTraffic::start(Opening opening) {
  const std::uint64_t attempt = ++starts_;
  post([this, attempt, opening = std::move(opening)] { startUp(attempt, opening); });
}

void CallstatTraffic::deliver(TalReportingSessionMessage::Pointer message) {
  post([this, message = std::move(message)] { handleMessage(message); });
}

void CallstatTraffic::stop(Closing closing) {
  // Shared: a std::function copies what it holds.
  post([this, closing = std::make_shared<const Closing>(std::move(closing))] { shutDown(*closing); });
}

void CallstatTraffic::abandon() {
  post([this] { close(); });
}

void CallstatTraffic::startUp(std::uint64_t attempt, const Opening& opening) {
  const LogChannel& log = dependencies_.log;
  attempt_ = attempt;
  TAL_LOG_INFO(log, "entering callstat ", __func__);
  callstat_agent_token_ = dependencies_.backend.newHierarchyTokenFromParentToken(nullptr);
  if (!callstat_agent_token_) {
    TAL_LOG_ERROR(log, "newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. ",
                  __func__);
    failed_start_ = attempt_;
    return;
  }
  callstat_session_ = dependencies_.backend.initWithSessionInfo(
      sessionInfo(opening, *callstat_agent_token_), userInfo(opening, dependencies_.internal_build), {});
  wait_ = Wait::kAsking;
  callstat_session_->startConfigurationWithCompletionHandler(
      [self = weak_from_this(), attempt](const std::vector<std::string>& backends) {
        const auto traffic = self.lock();
        if (!traffic) return;
        if (traffic->dependencies_.queue->isCurrent()) {
          traffic->backendsFound(attempt, backends);
        } else {
          traffic->dependencies_.queue->post(
              [traffic, attempt, backends] { traffic->backendsFound(attempt, backends); });
        }
      });
  TAL_LOG(log, "waiting to find backends");
  if (wait_ == Wait::kAnswered) {
    endWait();
  } else {
    wait_ = Wait::kWaiting;
    dependencies_.queue->postAfter(kLongestWaitForBackends,
                                   [self = shared_from_this(), attempt] { self->waitTimedOut(attempt); });
  }
}

void CallstatTraffic::backendsFound(std::uint64_t attempt, const std::vector<std::string>& backends) {
  const bool is_awaited = wait_ == Wait::kAsking || wait_ == Wait::kWaiting;
  if (!is_awaited || attempt != attempt_) return;  // that start has come to nothing
  const LogChannel& log = dependencies_.log;
  if (!backends.empty()) {
    TAL_LOG(log, "list of backends ", listText(backends));
  } else {
    TAL_LOG_ERROR(log, "no backends found, this session won't get sent to the server");
  }
  callstat_session_started_ = !backends.empty();
  const bool answered_at_once = wait_ == Wait::kAsking;
  wait_ = Wait::kAnswered;
  if (!answered_at_once) endWait();
}

void CallstatTraffic::waitTimedOut(std::uint64_t attempt) {
  if (wait_ == Wait::kWaiting && attempt == attempt_) endWait();
}

void CallstatTraffic::endWait() {
  const LogChannel& log = dependencies_.log;
  if (callstat_session_started_) {
    TAL_LOG(log, "continuing with backends!");
  } else {
    TAL_LOG(log, wait_ == Wait::kAnswered ? "failed to find backend" : "timed out waiting for backends");
    callstat_session_.reset();
    callstat_agent_token_.reset();
    failed_start_ = attempt_;
  }
  wait_ = Wait::kNone;
  // Another start may be among what was held, and begin another wait.
  while (wait_ == Wait::kNone && !held_.empty()) {
    const std::function<void()> work = std::move(held_.front());
    held_.pop_front();
    work();
  }
}

void CallstatTraffic::handleMessage(const TalReportingSessionMessage::Pointer& message) {
  if (!callstat_session_started_) {
    TAL_LOG(dependencies_.log, "Session never started. ", __func__);
    return;
  }
  sendMessage(*message);
}

void CallstatTraffic::sendMessage(TalReportingSessionMessage& message) {
  const LogChannel& log = dependencies_.log;
  TAL_LOG_INFO(log, "entering callstat ", __func__);
  const std::uint16_t category = retrieveCallstatCategoryFromCategory(message.category());
  const auto type = static_cast<std::uint16_t>(message.type());
  if (!dependencies_.internal_build) message.mutableMessage().erase(TalReportingMessageKeyTalTimestamp);
  if (const auto error = callstat_session_->sendMessage(category, type, message.message())) {
    TAL_LOG_ERROR(log, "error sending message ", *error);
    return;
  }
  TAL_LOG_INFO(log, "CallstatAgent ", callstat_session_->description(), " : message ",
               message.message().text(), " : category ", category, " : type ", type);
}

void CallstatTraffic::shutDown(const Closing& closing) {
  const LogChannel& log = dependencies_.log;
  if (!callstat_session_started_) {
    TAL_LOG(log, "Session never started. ", __func__);
    return;
  }
  if (closing.has_messages) sendSummary(closing);
  TAL_LOG_INFO(log, "entering callstat ", __func__);
  if (callstat_session_) callstat_session_->flushMessages();
  close();
  TAL_LOG_INFO(log, "stopping and setting session to nil");
}

void CallstatTraffic::sendSummary(const Closing& closing) {
  SummaryJoins joins;
  joins.add(TalReportingRtcSummaryEvent.text, static_cast<std::uint16_t>(closing.service_type));
  for (const MessageDict& message : closing.summarised) {
    for (const auto& [key, value] : message) joins.add(key, value);
  }
  const auto summary = TalReportingSessionMessage::initWithMessage(joins.take(), AudioEventCategory::kUnknown,
                                                                   AudioEventType::kUnknown);
  const LogChannel& log = dependencies_.log;
  TAL_LOG(log, "sending rtc summary event. reporterID=", closing.reporter_id);
  for (const auto& [key, value] : summary->message()) {
    TAL_LOG_DEBUG(log, "sending rtc summary event. reporterID=", closing.reporter_id, ' ', key, "=\"",
                  value.string(), '"');
  }
  sendMessage(*summary);
}

void CallstatTraffic::close() {
  callstat_session_started_ = false;
  callstat_session_.reset();
  callstat_agent_token_.reset();
}

}  // namespace tal

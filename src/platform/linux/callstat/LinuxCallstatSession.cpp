#include "platform/linux/callstat/LinuxCallstatSession.h"

#include <utility>
#include <vector>

#include "core/MessageJson.h"
#include "platform/linux/callstat/SummaryLimit.h"

namespace tal {

namespace {

constexpr std::string_view kStoreBackendName = "store";
// One unusually large payload does not keep its memory.
constexpr std::size_t kMostPayloadKept = std::size_t{64} * 1024;

}  // namespace

LinuxCallstatSession::LinuxCallstatSession(Dependencies dependencies, std::int64_t row,
                                           MessageDict session_info, MessageDict user_info)
    : dependencies_(dependencies),
      row_(row),
      session_info_(std::move(session_info)),
      user_info_(std::move(user_info)) {
  const MessageValue* const realtime = session_info_.find(kCallstatContainsRealTimeEvents);
  is_realtime_ = realtime && realtime->toBool();
}

LinuxCallstatSession::~LinuxCallstatSession() {
  if (announced_) {
    dependencies_.store.append({.table = StoreTable::kRtcSessionEnds, .number = row_, .detail = row_});
  }
}

void LinuxCallstatSession::startConfigurationWithCompletionHandler(CompletionHandler handler) {
  const CallstatSettings settings = dependencies_.settings.read();
  to_store_ = settings.store;
  std::vector<std::string> backends;
  if (to_store_) backends.emplace_back(kStoreBackendName);
  const std::vector<std::string> brokers = dependencies_.publishers.serve(settings.brokers);
  to_brokers_ = !brokers.empty();
  backends.insert(backends.end(), brokers.begin(), brokers.end());
  handler(backends);
}

CallstatSession::Error LinuxCallstatSession::sendMessage(std::uint16_t category, std::uint16_t type,
                                                         const MessageDict& payload) {
  if (!announced_) announce();
  payload_.clear();
  appendPayload(payload);
  if (to_store_) append(StoreTable::kRtcMessages, category, type);
  if (to_brokers_) {
    append(StoreTable::kRtcOutbox, category, type);
    // A real-time message is not to wait for others to be committed with.
    if (is_realtime_) dependencies_.store.requestCommit(dependencies_.store.sequence());
    dependencies_.publishers.messageWaits();
  }
  if (payload_.capacity() > kMostPayloadKept) std::string().swap(payload_);
  return std::nullopt;
}

void LinuxCallstatSession::announce() {
  std::string session_info;
  std::string user_info;
  appendJson(session_info, session_info_);
  appendJson(user_info, user_info_);
  const MessageValue* identifier = session_info_.find(kCallstatSessionIdentifier);
  dependencies_.store.append({.table = StoreTable::kRtcSessions,
                              .recorded_at = dependencies_.clock.secondsSince1970(),
                              .number = row_,
                              .detail = identifier ? identifier->toInt64() : 0,
                              .name = session_info,
                              .payload = user_info});
  announced_ = true;
}

void LinuxCallstatSession::appendPayload(const MessageDict& payload) {
  if (!payload.contains(TalReportingRtcSummaryEvent)) {
    appendJson(payload_, payload);
    return;
  }
  const LimitedSummary limited = limitSummary(payload);
  if (limited.cut_keys > 0) {
    TAL_LOG(dependencies_.log, "the summary of ", description(), " is cut to ", kMostSummaryValueBytes / 1024,
            " KiB under ", limited.cut_keys, " keys");
  }
  appendJson(payload_, limited.summary);
}

void LinuxCallstatSession::append(StoreTable table, std::uint16_t category, std::uint16_t type) {
  dependencies_.store.append({.table = table,
                              .recorded_at = dependencies_.clock.secondsSince1970(),
                              .number = row_,
                              .detail = rtcKind(category, type),
                              .name = {},
                              .payload = payload_});
}

void LinuxCallstatSession::flushMessages() {
  if (to_brokers_) dependencies_.publishers.flush(row_);
}

std::string LinuxCallstatSession::description() const {
  const MessageValue* identifier = session_info_.find(kCallstatSessionIdentifier);
  return "session " + std::to_string(row_) + " of reporter " + (identifier ? identifier->text() : "0");
}

}  // namespace tal

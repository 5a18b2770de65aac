#include "platform/linux/callstat/OutboxReader.h"

namespace tal {

namespace {
// What a session tells of itself does not change; there may be many sessions.
constexpr std::size_t kMostSessionsKept = 256;
constexpr std::size_t kMostBytesAtOnce = std::size_t{1024} * 1024;
}  // namespace

OutboxReader::OutboxReader(const std::filesystem::path& store)
    : store_(store, SqliteConnection::Access::kReadOnly),
      brokers_(store_, "SELECT broker FROM rtc_brokers"),
      confirmed_(store_, "SELECT confirmed FROM rtc_brokers WHERE broker = ?1"),
      messages_(store_,
                "SELECT id, session, recorded_at, category, type, payload FROM rtc_outbox WHERE id > ?1"
                " ORDER BY id LIMIT ?2"),
      session_(
          store_,
          "SELECT session_identifier, realtime, session_info, user_info FROM rtc_sessions WHERE id = ?1") {}

std::vector<std::string> OutboxReader::brokers() {
  std::vector<std::string> result;
  while (brokers_.step()) result.emplace_back(brokers_.textAt(0));
  return result;
}

std::int64_t OutboxReader::confirmedBy(const std::string& broker) {
  confirmed_.bindText(1, broker);
  const std::int64_t number = confirmed_.step() ? confirmed_.integerAt(0) : 0;
  confirmed_.reset();
  return number;
}

std::vector<OutboxMessage> OutboxReader::readAfter(std::int64_t number, std::int64_t most) {
  std::vector<OutboxMessage> result;
  messages_.bind(1, number);
  messages_.bind(2, most);
  std::size_t bytes = 0;
  while (bytes < kMostBytesAtOnce && messages_.step()) {
    result.push_back({.number = messages_.integerAt(0),
                      .session = messages_.integerAt(1),
                      .recorded_at = messages_.doubleAt(2),
                      .category = messages_.integerAt(3),
                      .type = messages_.integerAt(4),
                      .payload = std::string(messages_.textAt(5))});
    bytes += result.back().payload.size();
  }
  messages_.reset();
  return result;
}

const OutboxSession& OutboxReader::sessionOf(std::int64_t row) {
  if (const auto known = sessions_.find(row); known != sessions_.end()) return known->second;
  if (sessions_.size() >= kMostSessionsKept) sessions_.clear();
  OutboxSession session;
  session_.bind(1, row);
  if (session_.step()) {
    session = {.identifier = session_.integerAt(0),
               .realtime = session_.integerAt(1) != 0,
               .session_info = std::string(session_.textAt(2)),
               .user_info = std::string(session_.textAt(3))};
  }
  session_.reset();
  return sessions_.emplace(row, std::move(session)).first->second;
}

}  // namespace tal

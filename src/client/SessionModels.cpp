// The sessions of a connection as they have to be set up again after it broke.
#include "client/SessionModels.h"

#include <algorithm>
#include <string_view>

#include "client/CborReader.h"
#include "client/Requests.h"

namespace tal::clientlib {

namespace {

using Kind = CborToken::Kind;

/// The daemon stores the value of the first key under the second as well, before it merges the other entries.
constexpr std::string_view kAliasKey = "RvHostApplicationDisplayID";
constexpr std::string_view kAliasedKey = "HostApplicationDisplayID";

void append(std::vector<unsigned char>& target, std::span<const unsigned char> bytes) {
  target.insert(target.end(), bytes.begin(), bytes.end());
}

}  // namespace

void SessionModels::apply(tal_operation operation, std::int64_t reporter, std::uint64_t number,
                          std::span<const unsigned char> arguments) {
  if (operation == TAL_CREATE_SESSION) {
    Session fresh;
    fresh.number = created_++;
    sessions_.insert_or_assign(reporter, std::move(fresh));
    return;
  }
  const auto found = sessions_.find(reporter);
  if (found == sessions_.end()) return;
  Session& session = found->second;
  switch (operation) {
    case TAL_SET_SERVICE_TYPE:
      // Another type makes the daemon put a new session, which is not started, in its place.
      if (session.serviceType.value_or(TAL_SERVICE_UNKNOWN) != number) session.started = false;
      session.serviceType = number;
      break;
    case TAL_SET_CONFIGURATION:
      configure(session, arguments);
      break;
    case TAL_START_SESSION:
      session.started = true;
      break;
    case TAL_STOP_SESSION:
      session.started = false;
      break;
    case TAL_DESTROY_SESSION:
      sessions_.erase(found);
      break;
    default:
      break;
  }
}

void SessionModels::configure(Session& session, std::span<const unsigned char> arguments) {
  CborReader reader(arguments);
  CborToken head;
  if (!reader.next(head) || head.kind != Kind::Map) return;
  decltype(Session::configuration) given;
  for (std::uint64_t i = 0; i < head.number; ++i) {
    CborToken key;
    if (!reader.next(key) || key.kind != Kind::Text) return;
    const std::size_t from = reader.position();
    if (!reader.skip()) return;
    const auto value = arguments.subspan(from, reader.position() - from);
    given[std::string(key.text)].assign(value.begin(), value.end());
  }
  if (const auto alias = given.find(kAliasKey); alias != given.end()) {
    session.configuration[std::string(kAliasedKey)] = alias->second;
  }
  for (auto& [key, value] : given) session.configuration[key] = std::move(value);
}

void SessionModels::setUp(const Request& request) const {
  for (const auto* entry : inOrder()) {
    const auto& [reporter, session] = *entry;
    SmallCbor<16> id;
    id.integer(reporter);
    request(TAL_CREATE_SESSION, reporter, id.bytes());
    if (session.serviceType) {
      SmallCbor<24> type;
      request(TAL_SET_SERVICE_TYPE, reporter, type.number(*session.serviceType).integer(reporter).bytes());
    }
    if (!session.configuration.empty()) {
      std::vector<unsigned char> arguments;
      SmallCbor<16> head;
      append(arguments, head.map(session.configuration.size()).bytes());
      for (const auto& [key, value] : session.configuration) {
        std::vector<unsigned char> text(kRequestHeadBytes + key.size());
        CborWriter writer(text.data());
        append(arguments, writer.text(key).bytes());
        append(arguments, value);
      }
      append(arguments, id.bytes());
      request(TAL_SET_CONFIGURATION, reporter, arguments);
    }
    if (session.started) request(TAL_START_SESSION, reporter, id.bytes());
  }
}

std::optional<std::int64_t> SessionModels::firstStarted() const {
  const std::pair<const std::int64_t, Session>* first = nullptr;
  for (const auto& entry : sessions_) {
    if (entry.second.started && (!first || entry.second.number < first->second.number)) first = &entry;
  }
  return first ? std::optional(first->first) : std::nullopt;
}

std::vector<const std::pair<const std::int64_t, SessionModels::Session>*> SessionModels::inOrder() const {
  std::vector<const std::pair<const std::int64_t, Session>*> order;
  order.reserve(sessions_.size());
  for (const auto& entry : sessions_) order.push_back(&entry);
  std::sort(order.begin(), order.end(),
            [](const auto* a, const auto* b) { return a->second.number < b->second.number; });
  return order;
}

}  // namespace tal::clientlib

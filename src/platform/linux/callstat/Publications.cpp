#include "platform/linux/callstat/Publications.h"

#include <algorithm>
#include <utility>

#include "core/MessageJson.h"

namespace tal {

namespace {

std::string objectOf(const OutboxMessage& message, const OutboxSession& session) {
  std::string text;
  text.reserve(message.payload.size() + session.session_info.size() + session.user_info.size() + 128);
  text += R"({"number":)" + std::to_string(message.number) + R"(,"recorded_at":)";
  appendJson(text, MessageValue(message.recorded_at));
  text += R"(,"category":)" + std::to_string(message.category);
  text += R"(,"type":)" + std::to_string(message.type);
  text += R"(,"session_info":)" + session.session_info;
  text += R"(,"user_info":)" + session.user_info;
  text += R"(,"payload":)" + message.payload + '}';
  return text;
}

}  // namespace

void Publications::add(const OutboxMessage& message, const OutboxSession& session, Instant now,
                       std::chrono::duration<double> age) {
  std::string topic = prefix_ + '/' + std::to_string(session.identifier);
  std::string object = objectOf(message, session);
  if (session.realtime) {
    topic += '/' + std::to_string(message.category) + '/' + std::to_string(message.type);
    ready_.push_back({std::move(topic), std::move(object), {message.number}});
    return;
  }
  auto found = batches_.find(message.session);
  if (found != batches_.end() && found->second.publication.payload.size() + object.size() > kMostBytes) {
    finish(std::move(found->second));
    batches_.erase(found);
    found = batches_.end();
  }
  if (found == batches_.end()) {
    const auto waited = std::clamp<std::chrono::duration<double>>(age, std::chrono::seconds(0), kLongestWait);
    const Instant due =
        now + kLongestWait - std::chrono::duration_cast<std::chrono::steady_clock::duration>(waited);
    found = batches_.emplace(message.session, Batch{{std::move(topic), "[", {}}, due}).first;
  }
  Publication& publication = found->second.publication;
  if (!publication.numbers.empty()) publication.payload += ',';
  publication.payload += object;
  publication.numbers.push_back(message.number);
  if (publication.numbers.size() == kMostMessages) flush(message.session);
}

void Publications::finish(Batch batch) {
  batch.publication.payload += ']';
  ready_.push_back(std::move(batch.publication));
}

void Publications::flush(std::int64_t session) {
  const auto found = batches_.find(session);
  if (found == batches_.end()) return;
  finish(std::move(found->second));
  batches_.erase(found);
}

void Publications::flushAll() {
  for (auto& [session, batch] : batches_) finish(std::move(batch));
  batches_.clear();
}

std::optional<Publication> Publications::takeDue(Instant now) {
  if (ready_.empty()) {
    const auto next = nextDue();
    if (next && *next <= now) {
      for (auto it = batches_.begin(); it != batches_.end();) {
        if (it->second.due <= now) {
          finish(std::move(it->second));
          it = batches_.erase(it);
        } else {
          ++it;
        }
      }
    }
  }
  if (ready_.empty()) return std::nullopt;
  std::optional<Publication> publication = std::move(ready_.front());
  ready_.pop_front();
  return publication;
}

std::optional<Publications::Instant> Publications::nextDue() const {
  std::optional<Instant> next;
  for (const auto& [session, batch] : batches_) {
    if (!next || batch.due < *next) next = batch.due;
  }
  return next;
}

}  // namespace tal

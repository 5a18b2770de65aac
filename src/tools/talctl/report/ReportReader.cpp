#include "tools/talctl/report/ReportReader.h"

#include <algorithm>
#include <array>
#include <future>
#include <thread>
#include <utility>
#include <vector>

#include "tools/talctl/EventStore.h"

namespace tal::talctl {
namespace {

// Beyond these the disk, or memory, is what there is to wait for.
constexpr unsigned kMostThreads = 4;
// Less is read by one thread before a second one has started.
constexpr std::int64_t kLeastEventsPerThread = 20000;

using KindFlags = std::array<bool, kReportKindCount>;

/// Which of the two names of a message to read.
struct NameChoice {
  KindFlags of_services{};
  KindFlags general{};
};

/// What one thread finds in its part of the store.
struct Part {
  StoreReading reading;
  NameChoice seen;
};

/// The events that one thread reads.
struct Span {
  std::int64_t after_id;
  std::int64_t up_to_id;
  std::optional<double> recorded_since;
};

Part readPart(const std::filesystem::path& path, const Span& span, const NameChoice& choice) {
  Part part;
  EventQuery query;
  query.after_id = span.after_id;
  query.up_to_id = span.up_to_id;
  query.recorded_since = span.recorded_since;
  StoreReading& reading = part.reading;
  EventStore store(path);
  store.forEach(query, [&](const StoredEvent& event) {
    ++reading.events;
    if (!reading.first_at || event.recorded_at < *reading.first_at) reading.first_at = event.recorded_at;
    if (!reading.last_at || event.recorded_at > *reading.last_at) reading.last_at = event.recorded_at;
    const auto name = parseReportedName(event.name);
    if (!name) return;
    const auto kind = static_cast<std::size_t>(name->kind);
    (name->service.empty() ? part.seen.general : part.seen.of_services)[kind] = true;
    const KindFlags& wanted = name->service.empty() ? choice.general : choice.of_services;
    if (wanted[kind]) reading.tally.add(*name, event.recorded_at, event.payload);
  });
  reading.tally.finish();
  return part;
}

void add(Part& sum, const Part& part) {
  sum.reading.tally.merge(part.reading.tally);
  sum.reading.events += part.reading.events;
  if (const auto first = part.reading.first_at) {
    sum.reading.first_at = std::min(*first, sum.reading.first_at.value_or(*first));
    sum.reading.last_at =
        std::max(*part.reading.last_at, sum.reading.last_at.value_or(*part.reading.last_at));
  }
  for (std::size_t kind = 0; kind < kReportKindCount; ++kind) {
    sum.seen.of_services[kind] |= part.seen.of_services[kind];
    sum.seen.general[kind] |= part.seen.general[kind];
  }
}

class Reader {
 public:
  Reader(const std::filesystem::path& path, std::optional<double> since) : path_(path), since_(since) {
    EventStore store(path);
    after_ = std::max<std::int64_t>(store.oldestId() - 1, 0);
    newest_ = store.newestId();
  }

  Part read(const NameChoice& choice) const {
    const std::int64_t events = std::max<std::int64_t>(newest_ - after_, 0);
    const std::int64_t threads = std::clamp<std::int64_t>(
        events / kLeastEventsPerThread, 1, std::clamp(std::thread::hardware_concurrency(), 1U, kMostThreads));
    std::vector<std::future<Part>> parts;
    for (std::int64_t i = 0; i < threads; ++i) {
      const Span span{.after_id = after_ + events / threads * i,
                      .up_to_id = i + 1 == threads ? newest_ : after_ + events / threads * (i + 1),
                      .recorded_since = since_};
      parts.push_back(std::async(std::launch::async, readPart, path_, span, choice));
    }
    Part sum;
    for (auto& part : parts) add(sum, part.get());
    return sum;
  }

 private:
  const std::filesystem::path& path_;
  std::optional<double> since_;
  std::int64_t after_ = 0;
  std::int64_t newest_ = 0;
};

}  // namespace

StoreReading readStore(const std::filesystem::path& path, std::optional<double> since) {
  const Reader reader(path, since);
  NameChoice choice;
  choice.of_services.fill(true);
  choice.general[static_cast<std::size_t>(ReportKind::kRowsGivenUp)] = true;
  Part first = reader.read(choice);

  // The daemon may be set to store one of the two names alone.
  NameChoice rest;
  for (std::size_t kind = 0; kind < kReportKindCount; ++kind) {
    rest.general[kind] = first.seen.general[kind] && !first.seen.of_services[kind] && !choice.general[kind];
  }
  if (rest.general == KindFlags{}) return std::move(first.reading);
  const Part second = reader.read(rest);
  first.reading.tally.merge(second.reading.tally);
  return std::move(first.reading);
}

}  // namespace tal::talctl

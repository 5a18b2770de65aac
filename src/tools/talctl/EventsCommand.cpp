#include "tools/talctl/EventsCommand.h"

#include <unistd.h>

#include <chrono>
#include <exception>
#include <utility>

#include "tools/talctl/CommandFailure.h"
#include "tools/talctl/Duration.h"
#include "tools/talctl/EventStore.h"
#include "tools/talctl/EventText.h"
#include "tools/talctl/StoreWatch.h"

namespace tal::talctl {
namespace {

// What is listed where nothing says how much: a store can hold millions.
constexpr std::uint64_t kCustomaryCount = 20;
// Enough to make a write of many events cheap.
constexpr std::size_t kOutputBytes = 65536;

EventQuery firstQuery(const EventsOptions& options) {
  EventQuery query;
  if (!options.name_glob.empty()) query.name_glob = options.name_glob;
  if (!options.since.empty()) {
    const auto since = std::chrono::system_clock::now() - parseDuration(options.since);
    query.recorded_since = std::chrono::duration<double>(since.time_since_epoch()).count();
  }
  query.newest = options.count;
  if (!query.newest && !query.recorded_since) query.newest = kCustomaryCount;
  return query;
}

void print(EventStore& store, const EventQuery& query, bool json, const Terminal& terminal) {
  std::string output;
  store.forEach(query, [&](const StoredEvent& event) {
    output += json ? eventJson(event) : eventText(event, terminal);
    if (output.size() < kOutputBytes) return;
    terminal.write(output);
    output.clear();
  });
  terminal.write(output);
}

/// Prints what each look into the store finds new.
class Follower {
 public:
  Follower(std::filesystem::path path, const EventsOptions& options, const Terminal& terminal)
      : path_(std::move(path)), terminal_(terminal), json_(options.json), query_(firstQuery(options)) {}

  void look() {
    if (store_ && !store_->isCurrent()) {
      store_.reset();
      query_.after_id = 0;
    }
    std::error_code ignored;
    if (!store_ && !std::filesystem::exists(path_, ignored)) {
      onlyNewOnesFromNowOn();
      return;
    }
    if (!store_) store_.emplace(path_);

    const std::int64_t newest = store_->newestId();
    // IDs begin anew where all events had grown too old and were removed.
    if (newest < query_.after_id) query_.after_id = 0;
    if (newest == query_.after_id && !first_) return;
    query_.up_to_id = newest;
    print(*store_, query_, json_, terminal_);
    query_.after_id = newest;
    has_read_ = true;
    onlyNewOnesFromNowOn();
  }

  /// Whether a look has found a store and read it.
  bool hasRead() const { return has_read_; }
  /// Opens the store anew at the next look, and goes on where it was.
  void reopen() { store_.reset(); }

 private:
  /// What the command line asks of the past is settled.
  void onlyNewOnesFromNowOn() {
    first_ = false;
    query_.newest.reset();
    query_.recorded_since.reset();
  }

  std::filesystem::path path_;
  const Terminal& terminal_;
  bool json_;
  EventQuery query_;
  bool first_ = true;
  bool has_read_ = false;
  std::optional<EventStore> store_;
};

}  // namespace

void runEvents(const DaemonLocation& daemon, const EventsOptions& options, const Terminal& terminal) {
  const std::filesystem::path path = daemon.storePath();
  if (!options.follow) {
    EventStore store(path);
    print(store, firstQuery(options), options.json, terminal);
    return;
  }
  // The watch first: nothing that is committed after the look goes unnoticed.
  StoreWatch watch(path);
  Follower follower(path, options, terminal);
  RecheckSchedule recheck;
  std::exception_ptr trouble;
  while (true) {
    try {
      follower.look();
      trouble = nullptr;
    } catch (const CommandFailure&) {
      // A daemon that is restarting can be in the middle of putting its store in order: that passes.
      if (!follower.hasRead()) throw;
      follower.reopen();
      if (!trouble) recheck.restart();
      trouble = std::current_exception();
    }
    const auto pause = recheck.take();
    if (trouble && !pause) std::rethrow_exception(trouble);
    switch (watch.wait(pause, STDOUT_FILENO)) {
      case StoreWatch::Woken::kWritten:
        recheck.restart();
        break;
      case StoreWatch::Woken::kTimedOut:
        break;
      case StoreWatch::Woken::kHungUp:
        return;
    }
  }
}

}  // namespace tal::talctl

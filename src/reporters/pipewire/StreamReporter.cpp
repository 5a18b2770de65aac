#include "reporters/pipewire/StreamReporter.h"

namespace tal {

StreamReporter::StreamReporter(ReportingChannel& channel) : channel_(channel) {}

void StreamReporter::settle(Instant now) {
  for (const ObjectID stream : graph_.describedStreams()) {
    sessionOf(stream, now).update(graph_.factsOf(stream), now);
  }
  // Xruns that were counted while nobody listened are not news when the profiler is next listened to.
  if (!anythingRuns()) driverXruns_.clear();
}

StreamSession& StreamReporter::sessionOf(ObjectID stream, Instant now) {
  auto& session = sessions_[stream];
  if (!session) {
    session =
        std::make_unique<StreamSession>(graph_.directionOf(stream), graph_.identityOf(stream), now, channel_);
  }
  return *session;
}

void StreamReporter::removeObject(ObjectID id, Instant now) {
  // What it did last may not have settled yet, and a very short sound is worth a report all the
  // same. That it no longer runs is part of its going, which close() tells.
  if (graph_.isDescribedStream(id)) {
    StreamSession& session = sessionOf(id, now);
    StreamFacts facts = graph_.factsOf(id);
    facts.running = facts.running || session.running();
    session.update(facts, now);
  }
  if (const auto session = sessions_.find(id); session != sessions_.end()) {
    session->second->close(now);
    sessions_.erase(session);
  }
  driverXruns_.erase(id);
  graph_.removeObject(id);
}

void StreamReporter::closeAll(Instant now) {
  for (const auto& [id, session] : sessions_) session->close(now);
  sessions_.clear();
  driverXruns_.clear();
  graph_.clear();
}

void StreamReporter::addCycle(const GraphCycle& cycle, Instant now) {
  const bool driverXrun = driverHadXrun(cycle);
  const std::chrono::duration<double> length(
      cycle.rate == 0 ? 0.0 : static_cast<double>(cycle.frames) / static_cast<double>(cycle.rate));
  for (const NodeCycle& follower : cycle.followers) {
    const auto session = sessions_.find(follower.node);
    if (session == sessions_.end()) continue;
    session->second->addCycle({cycle.when, cycle.frames, length, driverXrun || follower.late}, now);
  }
}

bool StreamReporter::driverHadXrun(const GraphCycle& cycle) {
  const auto [known, isNew] = driverXruns_.try_emplace(cycle.driver, cycle.driverXruns);
  const bool more = !isNew && known->second != cycle.driverXruns;
  known->second = cycle.driverXruns;
  return more;
}

void StreamReporter::repeatStarts() {
  for (const auto& [id, session] : sessions_) session->repeatStart();
}

bool StreamReporter::anythingRuns() const {
  for (const auto& [id, session] : sessions_) {
    if (session->running()) return true;
  }
  return false;
}

}  // namespace tal

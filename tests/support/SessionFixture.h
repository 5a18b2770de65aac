#pragma once

// A session on a platform of fakes, and messages with a few words.

#include <gtest/gtest.h>

#include <memory>
#include <utility>
#include <vector>

#include "session/TalReportingSession.h"
#include "session/WorkerRoster.h"
#include "support/TestPlatform.h"

namespace tal::test {

/// A message of the given time, seconds since 1970.
inline TalReportingSessionMessage::Pointer messageAt(
    double time, MessageDict dict, AudioEventCategory category = AudioEventCategory::kPlayback,
    AudioEventType type = AudioEventType::kGeneric) {
  dict.set("talreporting_timestamp", time);
  return TalReportingSessionMessage::initWithMessage(std::move(dict), category, type);
}

/// Reporter 7 of process 42, with a roster of the test's own choosing.
class SessionFixture : public ::testing::Test {
 protected:
  using Classes = std::vector<std::unique_ptr<TalReportingSessionWorkerClass>>;

  TalReportingSession& makeSession(Classes classes = {}) {
    session_.reset();
    roster_ = std::make_unique<WorkerRoster>(std::move(classes), host.channels.session);
    session_ = std::make_unique<TalReportingSession>(
        TalReportingSession::Options{.reporter_id = 7, .process_identifiers = {42}}, host.platform, *roster_,
        kept_bytes_);
    return *session_;
  }
  TalReportingSession& session() { return *session_; }

  TestPlatform host;

 private:
  std::unique_ptr<WorkerRoster> roster_;
  std::size_t kept_bytes_ = 0;
  std::unique_ptr<TalReportingSession> session_;
};

}  // namespace tal::test

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "support/SessionFixture.h"
#include "workers/diagnostics/TalReportingSessionTapToKiteWorker.h"

namespace tal {
namespace {

using namespace std::chrono_literals;

constexpr auto kLastRun = "org.vantle.talsys.talreporting/ParleyInvalidXyTTKlastRun";

class TapToKiteWorker : public test::SessionFixture {
 protected:
  TapToKiteWorker() {
    host.platform.internal_build = true;
    setBackOff(3600);
  }
  void setBackOff(double seconds) {
    host.settings.values["org.vantle.talsys.talreporting/ParleyInvalidXyBackOffSeconds"] = seconds;
  }
  void make() {
    Classes classes;
    classes.push_back(std::make_unique<TalReportingSessionTapToKiteWorkerClass>());
    makeSession(std::move(classes)).setClientProcessName("parleyd");
    session().start();
  }
  /// Sends a message stamped with the present time; what no other message holds
  /// keeps it from being redundant.
  void send(const char* key) {
    session().sendMessage(
        test::messageAt(host.clock.secondsSince1970(), {{key, 1}, {"n", ++sent_}}, AudioEventCategory::kIO));
  }
  void sendInvalid() { send("vmox_invalid_x"); }
  /// A session that has been watching for long enough.
  void makeWatching() {
    make();
    send("ordinary");
    host.clock.advance(6s);
  }
  std::size_t drafts() const { return host.tap_to_kite.drafts.size(); }

 private:
  int sent_ = 0;
};

TEST_F(TapToKiteWorker, ExistsOnInternalBuildsWithABackOffTime) {
  make();
  EXPECT_EQ(session().workerInstanceCount(), 1U);
  host.platform.internal_build = false;
  make();
  EXPECT_EQ(session().workerInstanceCount(), 0U);
  host.platform.internal_build = true;
  host.settings.values.clear();
  make();
  EXPECT_EQ(session().workerInstanceCount(), 0U);
  EXPECT_EQ(host.log.count("ParleyInvalidXyBackOffSeconds default not set. Skipping worker. reporterID=7"),
            1U);
}

TEST_F(TapToKiteWorker, PromptsWithTheDraftThatTheTrackerKnows) {
  makeWatching();
  sendInvalid();
  ASSERT_EQ(drafts(), 1U);
  const auto& [draft, process_name, reason] = host.tap_to_kite.drafts.front();
  EXPECT_EQ(draft.title, "Invalid x/y coordinates during a Parley call (TTK)");
  EXPECT_EQ(draft.component.identifier, 1084682);
  EXPECT_EQ(process_name, "parleyd");
  EXPECT_EQ(reason, "a Parley spatial positioning error occurred");
  EXPECT_EQ(host.log.count("Successfully created draft"), 1U);
}

TEST_F(TapToKiteWorker, TheFirstMessageArmsAndFiveSecondsAreIgnored) {
  make();
  sendInvalid();
  host.clock.advance(5s);
  sendInvalid();
  EXPECT_EQ(drafts(), 0U) << "five seconds after the first message is not after them";
  EXPECT_FALSE(host.settings.values.contains(kLastRun)) << "what is ignored uses nothing up";
  host.clock.advance(1ms);
  send("ordinary");
  EXPECT_EQ(drafts(), 0U);
  sendInvalid();
  EXPECT_EQ(drafts(), 1U);
}

TEST_F(TapToKiteWorker, SessionsWithinTheBackOffTimePromptOnceInAll) {
  makeWatching();
  sendInvalid();
  makeWatching();
  host.clock.advance(3593999ms);
  sendInvalid();
  EXPECT_EQ(drafts(), 1U) << "a millisecond before the end";
  host.clock.advance(1ms);
  sendInvalid();
  EXPECT_EQ(drafts(), 2U) << "at the end";
}

TEST_F(TapToKiteWorker, ASessionPromptsOnceBetweenStopsAndYetUsesUpTheBackOffTime) {
  setBackOff(10);
  makeWatching();
  sendInvalid();
  host.clock.advance(11s);
  sendInvalid();
  EXPECT_EQ(drafts(), 1U);
  EXPECT_EQ(host.log.count("Tap to kite has already run for ParleyXYerrorMessage reporterID=7"), 1U);
  EXPECT_EQ(host.settings.values[kLastRun].toDouble(), host.clock.secondsSince1970());
  session().stop();
  EXPECT_EQ(host.log.count("Resetting hasRun to false. reporterID=7"), 1U);
  session().start();
  sendInvalid();
  EXPECT_EQ(drafts(), 1U) << "within the back-off time that the second message used up";
  host.clock.advance(11s);
  sendInvalid();
  EXPECT_EQ(drafts(), 2U) << "still armed";
}

TEST_F(TapToKiteWorker, AFailedDraftIsALineAndUsesUpTheBackOffTime) {
  host.tap_to_kite.error = "disk full";
  makeWatching();
  sendInvalid();
  makeWatching();
  sendInvalid();
  EXPECT_EQ(drafts(), 1U);
  EXPECT_EQ(host.log.count("Error creating draft - disk full"), 1U);
}

}  // namespace
}  // namespace tal

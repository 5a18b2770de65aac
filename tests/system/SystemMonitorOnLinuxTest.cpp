// The monitor and its worker over real settings files and real notifications.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/notify/LinuxNotifyCenter.h"
#include "platform/linux/notify/NotifyFiles.h"
#include "platform/linux/settings/TomlSettings.h"
#include "support/TestPlatform.h"
#include "support/WaitingQueue.h"
#include "system/TalReportingSessionSystemMonitorWorker.h"

namespace tal {
namespace {

TEST(SystemMonitorOnLinux, ANewDeviceNameReachesEveryRunningSessionAtItsNotification) {
  const test::TemporaryDirectory directory;
  const auto write_name = [&](const std::string& name) {
    test::writeFile(directory.path() / "config/settings/org.vantle.talsys.toml",
                    "device_name = '" + name + "'");
  };
  test::TestPlatform host;
  test::WaitingQueue queue;
  const LogChannels silent{nullptr};
  // The clock stands still: no time makes the settings look at their files again.
  TomlSettings settings({.config_directory = directory.path() / "config",
                         .state_directory = directory.path() / "state",
                         .clock = host.clock,
                         .log = silent.service});
  LinuxNotifyCenter notify_center(directory.path(), silent.service);
  const Platform platform{.reporting_queue = queue,
                          .clock = host.clock,
                          .log = host.channels,
                          .trace_points = host.trace_points,
                          .device_properties = host.device_properties,
                          .settings = settings,
                          .notify_center = notify_center,
                          .processes = host.processes,
                          .analytics = host.analytics,
                          .plume_metrics = host.plume_metrics,
                          .energylog = host.energylog,
                          .system_state = host.system_state,
                          .diagnostic_log = host.diagnostic_log,
                          .driver_stats = host.driver_stats,
                          .queue_pool = host.queue_pool,
                          .callstat = host.callstat,
                          .bluetooth = host.bluetooth,
                          .flutter_requests = host.flutter_requests,
                          .tap_to_kite = host.tap_to_kite,
                          .command_shell = host.command_shell};
  write_name("one");
  TalReportingSystemMonitor monitor(platform);
  monitor.initializeWithQueue(queue);
  std::vector<std::unique_ptr<TalReportingSessionWorkerClass>> classes;
  classes.push_back(std::make_unique<TalReportingSessionSystemMonitorWorkerClass>(monitor));
  const WorkerRoster roster(std::move(classes), silent.session);
  std::size_t kept_bytes = 0;
  TalReportingSession first({.reporter_id = 1, .process_identifiers = {42}}, platform, roster, kept_bytes);
  TalReportingSession second({.reporter_id = 2, .process_identifiers = {42}}, platform, roster, kept_bytes);
  first.start();
  second.start();
  const auto name_in = [](const TalReportingSession& session) {
    return session.previousValues().find("device_name")->text();
  };
  EXPECT_EQ(name_in(first), "one");
  for (const std::string name : {"two", "six", "ten"}) {
    host.clock.advance(std::chrono::milliseconds(1));
    write_name(name);
    ASSERT_FALSE(postNotification(directory.path() / kNotifyFolder, "org.vantle.talsys.reporting", {}));
    queue.runNext();
    EXPECT_EQ(name_in(first), name);
    EXPECT_EQ(name_in(second), name);
  }
}

}  // namespace
}  // namespace tal

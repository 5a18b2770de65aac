#pragma once

// One recording fake for each platform interface, and the bundle of them.

#include <algorithm>
#include <array>
#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "core/Log.h"
#include "platform/Platform.h"
#include "support/FakeBluetoothDevices.h"
#include "support/FakeCallstatBackend.h"
#include "support/FakeCommandShell.h"
#include "support/FakeDriverStatsFeed.h"
#include "support/FakeFlutterRequestService.h"
#include "support/FakeNotifyCenter.h"
#include "support/FakeTapToKiteService.h"
#include "support/HandDriven.h"
#include "support/RecordingEnergylog.h"
#include "support/RecordingPlumeMetrics.h"

namespace tal::test {

/// Keeps every line, without its source prefix. Lines may come on any thread; they
/// are read when no other thread logs.
class RecordingLogSink final : public LogSink {
 public:
  struct Line {
    std::string channel;
    LogLevel level;
    std::string text;
  };

  void write(std::string_view channel, LogLevel level, std::string_view line) override {
    constexpr std::size_t kNumberColumns = 7;  // what follows the file name in "%25s:%-5d "
    const std::lock_guard lock(mutex_);
    lines.push_back({std::string(channel), level, std::string(line.substr(line.find(':') + kNumberColumns))});
  }

  std::size_t count(std::string_view text) const {
    return static_cast<std::size_t>(
        std::count_if(lines.begin(), lines.end(), [text](const Line& line) { return line.text == text; }));
  }
  bool holds(std::string_view part) const {
    return std::any_of(lines.begin(), lines.end(),
                       [part](const Line& line) { return line.text.find(part) != std::string::npos; });
  }

  std::vector<Line> lines;

 private:
  std::mutex mutex_;
};

/// Wants every event unless told which.
class RecordingAnalyticsSink final : public AnalyticsSink {
 public:
  bool eventIsWanted(std::string_view name) override {
    asked.emplace_back(name);
    return !wanted || wanted->contains(std::string(name));
  }
  void sendEventWithPayloadProvider(std::string_view name, const PayloadProvider& provider) override {
    events.emplace_back(name, provider());
  }

  std::optional<std::set<std::string>> wanted;
  std::vector<std::string> asked;
  std::vector<std::pair<std::string, MessageDict>> events;
};

class RecordingTracePoints final : public TracePoints {
 public:
  void emit(TraceCode code) override { codes.push_back(code); }
  std::vector<TraceCode> codes;
};

class FakeDeviceProperties final : public DeviceProperties {
 public:
  std::optional<bool> booleanProperty(std::string_view name) const override {
    const auto found = properties.find(name);
    return found == properties.end() ? std::nullopt : std::optional(found->second);
  }
  std::map<std::string, bool, std::less<>> properties;
};

class FakeSettings final : public SettingsStore {
 public:
  std::optional<MessageValue> value(std::string_view domain, std::string_view key) const override {
    const auto found = values.find(pathOf(domain, key));
    return found == values.end() ? std::nullopt : std::optional(found->second);
  }
  void refresh(std::string_view domain) override { refreshed.emplace_back(domain); }
  bool setValue(std::string_view domain, std::string_view key, const MessageValue& value) override {
    values[pathOf(domain, key)] = value;
    return true;
  }
  static std::string pathOf(std::string_view domain, std::string_view key) {
    return std::string(domain) + '/' + std::string(key);
  }
  std::map<std::string, MessageValue> values;
  std::vector<std::string> refreshed;
};

class FakeProcessTable final : public ProcessTable {
 public:
  std::optional<std::string> processName(std::int32_t process_identifier) const override {
    const auto found = names.find(process_identifier);
    return found == names.end() ? std::nullopt : std::optional(found->second);
  }
  std::int32_t ownProcessIdentifier() const override { return 999; }
  std::map<std::int32_t, std::string> names;
};

class FakeSystemState final : public SystemState {
 public:
  int thermalState() const override { return thermal_state; }
  bool lowPowerModeIsOn() const override { return low_power; }
  Footprint physicalFootprint() const override { return footprint; }
  std::array<double, 3> loadAverages() const override { return load_averages; }

  int thermal_state = 0;
  bool low_power = false;
  Footprint footprint{.bytes = 5 << 20, .error = ""};
  std::array<double, 3> load_averages{0.5, 0.25, 0.125};
};

/// Keeps files in memory, and fails where it is told to.
class FakeDiagnosticLog final : public DiagnosticLog {
 public:
  std::string pathOf(std::string_view place) const override { return "/log/" + std::string(place); }
  DiagnosticFile::Error makeDirectory(std::string_view place) override {
    directories.emplace_back(place);
    return directory_error;
  }
  Opened createFile(std::string_view place, std::string_view name) override {
    if (open_error) return {nullptr, *open_error};
    std::string& content = files[pathOf(place) + '/' + std::string(name)];
    return {std::make_unique<File>(*this, content), ""};
  }
  DiagnosticFile::Error putFile(std::string_view place, std::string_view name,
                                std::string_view text) override {
    for (const auto& error : {open_error, write_error, close_error}) {
      if (error) return error;
    }
    files[pathOf(place) + '/' + std::string(name)] = text;
    return std::nullopt;
  }
  void keepLast(std::string_view place, std::size_t most) override {
    const std::string prefix = pathOf(place) + '/';
    const auto first = files.lower_bound(prefix);
    const auto is_there = [&prefix](const auto& file) { return file.first.starts_with(prefix); };
    for (auto left = std::count_if(first, files.end(), is_there); left > static_cast<std::ptrdiff_t>(most);
         --left) {
      files.erase(files.lower_bound(prefix));
    }
  }

  std::vector<std::string> directories;
  std::map<std::string, std::string> files;
  DiagnosticFile::Error directory_error;
  DiagnosticFile::Error open_error;
  DiagnosticFile::Error write_error;
  DiagnosticFile::Error close_error;

 private:
  class File final : public DiagnosticFile {
   public:
    File(FakeDiagnosticLog& log, std::string& content) : log_(log), content_(content) {}
    Error write(std::string_view bytes) override {
      if (!log_.write_error) content_ += bytes;
      return log_.write_error;
    }
    Error close() override { return log_.close_error; }

   private:
    FakeDiagnosticLog& log_;
    std::string& content_;
  };
};

/// Everything that a system under test needs of its host.
struct TestPlatform {
  HandClock clock;
  HandQueue queue{clock};
  RecordingLogSink log;
  LogChannels channels{&log, LogLevel::kDebug};
  RecordingTracePoints trace_points;
  FakeDeviceProperties device_properties;
  FakeSettings settings;
  FakeNotifyCenter notify_center;
  FakeProcessTable processes;
  RecordingAnalyticsSink analytics;
  RecordingPlumeMetrics plume_metrics;
  RecordingEnergylog energylog;
  FakeSystemState system_state;
  FakeDiagnosticLog diagnostic_log;
  FakeDriverStatsFeed driver_stats;
  FakeFlutterRequestService flutter_requests;
  FakeTapToKiteService tap_to_kite;
  FakeCommandShell command_shell;
  HandQueuePool queue_pool{clock};
  FakeCallstatBackend callstat;
  FakeBluetoothDevices bluetooth;
  Platform platform{.reporting_queue = queue,
                    .clock = clock,
                    .log = channels,
                    .trace_points = trace_points,
                    .device_properties = device_properties,
                    .settings = settings,
                    .notify_center = notify_center,
                    .processes = processes,
                    .analytics = analytics,
                    .plume_metrics = plume_metrics,
                    .energylog = energylog,
                    .system_state = system_state,
                    .diagnostic_log = diagnostic_log,
                    .driver_stats = driver_stats,
                    .queue_pool = queue_pool,
                    .callstat = callstat,
                    .bluetooth = bluetooth,
                    .flutter_requests = flutter_requests,
                    .tap_to_kite = tap_to_kite,
                    .command_shell = command_shell};
};

}  // namespace tal::test

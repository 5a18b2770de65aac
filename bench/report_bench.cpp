// What `talctl report` takes over a store of five million events, which is made first and not measured.
// Writes 2.3 GB to the working directory's file system, and reads them from the page cache where there is
// room for them.

#include <benchmark/benchmark.h>
#include <sqlite3.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>

#include "tools/talctl/report/AudioReport.h"
#include "tools/talctl/report/ReportHtml.h"
#include "tools/talctl/report/ReportText.h"

namespace tal::talctl {
namespace {

constexpr int kEvents = 5'000'000;
constexpr double kUntil = 1795262400;
constexpr double kWeek = 7 * 86400;
constexpr int kApplications = 40;

constexpr std::string_view kStarted =
    R"("RvSessionVolume":0.4,"active_devices":"Built-in Audio Analog Stereo","session_selected_format":)"
    R"("S16LE 44100 Hz","mFormatID":"raw","mChannelsPerFrame":2,)";
constexpr std::string_view kStretch =
    R"("session_selected_format":"S16LE 44100 Hz","mFormatID":"raw","active_devices":)"
    R"("Built-in Audio Analog Stereo","RvSessionVolume":0.4,"RvSessionVolumeBucketed":"0.375",)"
    R"("play_seconds":181.5003764629364,"spatial-audio-accessory-feature":false,"spatializationEnabled":false,)"
    R"("ringerstate":false,"mChannelsPerFrame":2,"play_secondsBucketed":"180",)";

/// What the daemon stores of one session, each message under two names; of them two in seven count in a
/// report.
struct Message {
  std::string_view event;
  std::string payload;
};
const std::array<Message, 7>& session() {
  static const std::array<Message, 7> messages{{
      {"Playback.Start", R"("session_output_running":true,"stretch_index":1,)" + std::string(kStarted)},
      {"Volume.Generic", R"("RvSessionVolume":0.8,)"},
      {"IO.Error", R"("issue_type":"overload","io_cycle":40,"smallest_buffer_frame_size":1024,)"},
      {"Playback.Stop", R"("session_output_running":false,"stretch_index":1,)" + std::string(kStarted) +
                            R"("session_duration":363.0001,"xrun_episodes":1,"xrun_starved_seconds":0.02,)"},
      {"Volume.Summary", std::string(kStretch) + R"("msgidx":1,"msgcnt":2,)"},
      {"Volume.Summary", std::string(kStretch) + R"("msgidx":2,"msgcnt":2,)"},
      {"Session_Generic.Summary",
       R"("total_active_time":363.0001,"active_count":1,"overload_count":1,"average_active_time":363.0001,)"
       R"("num_messages":6,"num_unique_messages":8,"num_redundant_messages":2,"singleMessageSession":false,)"
       R"("summaryServiceName":"longformaudio","thermal_state":"Nominal","low_power_enabled":0,)"
       R"("vmInfo_phys_footprint_MiB":5,"load_avg_1_min":0.57,"load_avg_5_min":1.31,"load_avg_15_min":0.75,)"},
  }};
  return messages;
}

void check(bool done) {
  if (!done) std::abort();
}

/// A store in a directory of its own, gone with the object.
class BigStore {
 public:
  BigStore() {
    std::string name = "report-bench-XXXXXX";
    check(::mkdtemp(name.data()) != nullptr);
    directory_ = name;
    sqlite3* database = nullptr;
    check(sqlite3_open(path().c_str(), &database) == SQLITE_OK);
    fill(database);
    sqlite3_close(database);
  }
  BigStore(const BigStore&) = delete;
  BigStore& operator=(const BigStore&) = delete;
  ~BigStore() { std::filesystem::remove_all(directory_); }

  std::filesystem::path path() const { return directory_ / "store.db"; }

 private:
  static void fill(sqlite3* database) {
    const auto execute = [&](const char* sql) {
      check(sqlite3_exec(database, sql, nullptr, nullptr, nullptr) == SQLITE_OK);
    };
    execute(
        "PRAGMA page_size=8192; PRAGMA journal_mode=OFF; PRAGMA synchronous=OFF;"
        "CREATE TABLE events(id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, name TEXT NOT NULL,"
        " payload TEXT NOT NULL); BEGIN");
    sqlite3_stmt* insert = nullptr;
    check(sqlite3_prepare_v2(database, "INSERT INTO events(recorded_at, name, payload) VALUES (?, ?, ?)", -1,
                             &insert, nullptr) == SQLITE_OK);
    constexpr int kPerSession = 2 * static_cast<int>(std::tuple_size_v<std::array<Message, 7>>);
    for (int i = 0; i < kEvents; ++i) {
      const Message& message = session()[static_cast<std::size_t>(i % kPerSession / 2)];
      const std::string application = "org.example.player" + std::to_string(i / kPerSession % kApplications);
      const std::string name =
          (i % 2 == 0 ? "org.vantle.talsys." : "org.vantle.longformaudio.") + std::string(message.event);
      const std::string payload =
          "{" + message.payload +
          R"("invalid_timestamp":"nil","talreporting_timestamp":1795260277.2915692,"audiotag":")" +
          std::string(message.event) + R"(","HostApplicationDisplayID":")" + application + "\"}";
      sqlite3_bind_double(insert, 1, kUntil - kWeek + kWeek * i / kEvents);
      sqlite3_bind_text(insert, 2, name.data(), static_cast<int>(name.size()), SQLITE_STATIC);
      sqlite3_bind_text(insert, 3, payload.data(), static_cast<int>(payload.size()), SQLITE_STATIC);
      check(sqlite3_step(insert) == SQLITE_DONE);
      sqlite3_reset(insert);
    }
    sqlite3_finalize(insert);
    execute("COMMIT; PRAGMA journal_mode=WAL");
  }

  std::filesystem::path directory_;
};

const BigStore& bigStore() {
  static const BigStore store;
  return store;
}

template <typename Show>
void report(benchmark::State& state, Show show) {
  const std::filesystem::path path = bigStore().path();
  for (auto _ : state) {
    const StoreReading reading = readStore(path, {});
    const AudioReport found = makeReport(reading, {}, kUntil, {});
    if (found.events != kEvents || found.total.stretches == 0) state.SkipWithError("events are missing");
    benchmark::DoNotOptimize(show(found));
  }
  state.SetItemsProcessed(state.iterations() * kEvents);
}

void reportAsText(benchmark::State& state) {
  report(state, [](const AudioReport& found) { return reportText(found, Terminal(false, false)); });
}
void reportAsPage(benchmark::State& state) { report(state, reportHtml); }
BENCHMARK(reportAsText)->UseRealTime()->MeasureProcessCPUTime()->Iterations(3)->Unit(benchmark::kMillisecond);
BENCHMARK(reportAsPage)->UseRealTime()->MeasureProcessCPUTime()->Iterations(3)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace tal::talctl

BENCHMARK_MAIN();

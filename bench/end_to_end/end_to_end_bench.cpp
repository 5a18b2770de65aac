// What a client gets out of the whole daemon, over its socket: throughput,
// round trip, and what the daemon costs while nothing happens. Prints one table.

#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <functional>
#include <iostream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "end_to_end/DaemonUnderTest.h"
#include "end_to_end/WireLoad.h"

namespace tal::bench {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::int64_t kReporter = 7;
// One event per message: the one that is the same for all services.
const std::string kOneEvent = "[\"org.vantle.talsys.*\"]";
const std::string kEventName = "org.vantle.talsys.Playback.Start";

double secondsSince(Clock::time_point begin) {
  return std::chrono::duration<double>(Clock::now() - begin).count();
}

double median(std::vector<double> values) {
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

class Table {
 public:
  enum class Better { kMore, kLess };

  Table() { std::printf("%-62s %14s %14s\n", "end to end", "measured", "target"); }

  void row(const char* name, double measured, Better better, double target, const char* unit,
           const char* note = "") {
    const bool reached = better == Better::kMore ? measured >= target : measured <= target;
    std::printf("%-62s %11.1f %-2s %s%11.1f %-2s %s%s\n", name, measured, unit,
                better == Better::kMore ? ">=" : "<=", target, unit, reached ? "reached" : "NOT REACHED",
                note);
    std::fflush(stdout);
  }
};

void startSession(Connection& connection, bool durable) {
  Requests requests;
  requests.session(Operation::kCreateReportingSession, 0, kReporter);
  requests.setServiceType(kReporter);
  requests.session(Operation::kStartReportingSessionForID, 0, kReporter);
  requests.hello(durable);
  connection.send(requests.between(0, requests.size()));
  connection.receive();
}

Requests messages(int first, int count) {
  Requests requests;
  for (int i = 0; i < count; ++i) requests.sendMessage(first + i, kReporter);
  return requests;
}

struct Throughput {
  double per_millisecond = 0;
  std::string note;  // what the daemon spent
};

// Measures what `exchange` makes of the connection.
Throughput throughputOf(const DaemonUnderTest& daemon, int messages, const std::function<void()>& exchange) {
  const auto processor_before = daemon.processorTime();
  const auto begin = Clock::now();
  exchange();
  const double seconds = secondsSince(begin);
  const std::chrono::duration<double, std::micro> spent = daemon.processorTime() - processor_before;
  char note[64];
  std::snprintf(note, sizeof note, " (%.2f us of the daemon's processor time each)",
                spent.count() / messages);
  return {messages / seconds / 1e3, note};
}

Throughput unstored() {
  constexpr int kMessages = 1'500'000;
  constexpr std::size_t kInFlight = 64;
  const Requests warm_up = messages(0, 20'000);
  const Requests requests = messages(20'000, kMessages);
  DaemonUnderTest daemon({});
  Connection connection(daemon.socketPath());
  startSession(connection, false);
  connection.exchange(warm_up, kInFlight);
  return throughputOf(daemon, kMessages, [&] { connection.exchange(requests, kInFlight); });
}

// Until the last event is on the disk; all of them are counted there.
Throughput stored(bool durable, std::size_t in_flight) {
  constexpr int kMessages = 1'000'000;
  const Requests requests = messages(0, kMessages);
  Requests last;
  last.hello(true);
  last.sendMessage(kMessages, kReporter);
  DaemonUnderTest daemon({.wanted = kOneEvent});
  Throughput throughput;
  {
    Connection connection(daemon.socketPath());
    startSession(connection, durable);
    throughput = throughputOf(daemon, kMessages, [&] {
      connection.exchange(requests, in_flight);
      connection.exchange(last, 1);
    });
  }
  const std::uint64_t found = daemon.endAndCountEvents(kEventName);
  if (found != kMessages + 1) {
    throw std::runtime_error(std::to_string(kMessages + 1 - found) + " events are missing in the store");
  }
  return throughput;
}

// Both events of each message, and the message itself as a real-time one.
Throughput storedThrice() {
  constexpr int kMessages = 500'000;
  constexpr std::size_t kInFlight = 64;
  constexpr int kPlayback = 4;
  const Requests requests = messages(0, kMessages);
  Requests last;
  last.hello(true);
  last.sendMessage(kMessages, kReporter);
  DaemonUnderTest daemon({.wanted = "['*']", .rtc_store = true});
  Throughput throughput;
  {
    Connection connection(daemon.socketPath());
    startSession(connection, false);
    throughput = throughputOf(daemon, kMessages, [&] {
      connection.exchange(requests, kInFlight);
      connection.exchange(last, 1);
    });
  }
  const std::uint64_t found = daemon.endAndCountRtcMessages(kPlayback);
  if (found != kMessages + 1) {
    throw std::runtime_error(std::to_string(kMessages + 1 - found) + " messages are missing in the store");
  }
  return throughput;
}

double roundTripMicroseconds(const std::function<void()>& once) {
  constexpr int kWarmUp = 2'000;
  constexpr int kRounds = 20'000;
  std::vector<double> times;
  for (int i = 0; i < kWarmUp + kRounds; ++i) {
    const auto begin = Clock::now();
    once();
    if (i >= kWarmUp) times.push_back(secondsSince(begin) * 1e6);
  }
  return median(std::move(times));
}

double requestRoundTrip() {
  DaemonUnderTest daemon({});
  Connection connection(daemon.socketPath());
  startSession(connection, false);
  const Requests requests = messages(0, 25'000);
  std::size_t next = 0;
  return roundTripMicroseconds([&] {
    connection.send(requests.between(next, next + 1));
    connection.receive();
    ++next;
  });
}

// Two processes, as many bytes each way, and nothing done with them.
double bareRoundTrip() {
  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_STREAM, 0, ends) != 0) throw std::runtime_error("socketpair");
  const std::size_t request_bytes = messages(0, 1).between(0, 1).size();
  constexpr std::size_t kReplyBytes = 8;
  char buffer[4096] = {};
  const pid_t child = ::fork();
  if (child == 0) {
    ::close(ends[0]);
    while (::recv(ends[1], buffer, sizeof buffer, 0) > 0) {
      if (::send(ends[1], buffer, kReplyBytes, 0) < 0) break;
    }
    ::_exit(0);
  }
  ::close(ends[1]);
  const double microseconds = roundTripMicroseconds([&] {
    if (::send(ends[0], buffer, request_bytes, 0) < 0 || ::recv(ends[0], buffer, sizeof buffer, 0) <= 0) {
      throw std::runtime_error("ping-pong");
    }
  });
  ::close(ends[0]);
  ::waitpid(child, nullptr, 0);
  return microseconds;
}

double sessionMicroseconds(const std::string& log_level) {
  constexpr int kSessions = 20'000;
  constexpr std::size_t kInFlight = 16;
  Requests requests;
  for (int i = 1; i <= kSessions; ++i) {
    requests.session(Operation::kCreateReportingSession, 1, i);
    requests.session(Operation::kStartReportingSessionForID, 1, i);  // answered by the stop
    requests.session(Operation::kStopReportingSessionForID, 1, i);
    requests.session(Operation::kDestroyReportingSession, 1, i);
  }
  DaemonUnderTest daemon({.log_level = log_level});
  Connection connection(daemon.socketPath());
  const auto begin = Clock::now();
  connection.exchange(requests, 4 * kInFlight);
  return secondsSince(begin) / kSessions * 1e6;
}

double kibibytesPerSession() {
  constexpr int kSessions = 10'000;
  Requests requests;
  for (int i = 1; i <= kSessions; ++i) {
    requests.session(Operation::kCreateReportingSession, 0, i);
    requests.setServiceType(i);
    requests.session(Operation::kStartReportingSessionForID, 0, i);
  }
  requests.hello(false);
  DaemonUnderTest daemon({.log_level = "error"});
  Connection connection(daemon.socketPath());
  const auto before = static_cast<double>(daemon.residentBytes());
  connection.send(requests.between(0, requests.size()));
  connection.receive();
  return (static_cast<double>(daemon.residentBytes()) - before) / kSessions / 1024;
}

void idle(Table& table) {
  constexpr std::chrono::seconds kSettling{1};
  constexpr std::chrono::seconds kIdle{5};
  DaemonUnderTest daemon({});
  Connection connection(daemon.socketPath());
  startSession(connection, false);
  std::this_thread::sleep_for(kSettling);
  const std::uint64_t before = daemon.voluntarySwitches();
  std::this_thread::sleep_for(kIdle);
  table.row("idle with one started session, 5 s: wake-ups",
            static_cast<double>(daemon.voluntarySwitches() - before), Table::Better::kLess, 0, "");
  table.row("the same: resident memory", static_cast<double>(daemon.residentBytes()) / (1 << 20),
            Table::Better::kLess, 12, "Mi");
}

double startMilliseconds() {
  constexpr int kStarts = 11;
  std::vector<double> times;
  for (int i = 0; i < kStarts; ++i) {
    const DaemonUnderTest daemon({});
    times.push_back(std::chrono::duration<double, std::milli>(daemon.startTime()).count());
  }
  return median(std::move(times));
}

void run(std::string_view only) {
  using Better = Table::Better;
  const auto chosen = [only](std::string_view name) { return only.empty() || only == name; };
  Table table;
  const auto throughput = [&table](const char* name, const Throughput& measured, double target) {
    table.row(name, measured.per_millisecond, Better::kMore, target, "", measured.note.c_str());
  };
  if (chosen("unstored")) {
    throughput("12-key messages, 64 in flight, no event wanted, per ms", unstored(), 700);
  }
  if (chosen("stored")) throughput("the same, one event stored each, per ms", stored(false, 64), 190);
  if (chosen("rtc")) {
    throughput("the same, both events and the real-time message stored, per ms", storedThrice(), 100);
  }
  if (chosen("durable")) {
    throughput("the same, durable acknowledgement, 1024 in flight, per ms", stored(true, 1024), 150);
  }
  if (chosen("roundtrip")) {
    const std::string bare =
        " (bare socket ping-pong: " + std::to_string(bareRoundTrip()).substr(0, 4) + " us)";
    table.row("one message at a time, median round trip", requestRoundTrip(), Better::kLess, 21, "us",
              bare.c_str());
  }
  if (chosen("session")) {
    table.row("create, start, stop, destroy of a session", sessionMicroseconds("default"), Better::kLess, 30,
              "us");
    table.row("the same without its log lines", sessionMicroseconds("error"), Better::kLess, 30, "us");
  }
  if (chosen("sessions")) {
    table.row("10,000 started sessions: memory of each", kibibytesPerSession(), Better::kLess, 20, "Ki");
  }
  if (chosen("idle")) idle(table);
  if (chosen("start")) table.row("start to ready, median", startMilliseconds(), Better::kLess, 30, "ms");
}

}  // namespace
}  // namespace tal::bench

int main(int argument_count, char** arguments) {
  try {
    tal::bench::run(argument_count > 1 ? arguments[1] : "");
    return 0;
  } catch (const std::exception& error) {
    std::cerr << "tal-end-to-end-bench: " << error.what() << '\n';
    return 1;
  }
}

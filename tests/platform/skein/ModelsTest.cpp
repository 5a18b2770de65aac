// Pairs and probes on events made by hand.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "platform/linux/skein/Probes.h"
#include "platform/linux/skein/SignpostPairs.h"

namespace tal {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Kind = TraceEvent::Kind;

constexpr std::int64_t kMillisecond = 1'000'000;

struct Made {
  Kind kind;
  std::int64_t milliseconds;
  std::string name;
  std::int32_t process = 1;
  std::int32_t thread = 1;
  std::string subsystem = "org.vantle.audio";
};

void fill(TraceContent& trace, const std::vector<Made>& events) {
  for (const Made& made : events) {
    const bool signpost = made.kind != Kind::kOther;
    const char* trace_point =
        made.kind == Kind::kSignpostBegin ? "talreporting:signpost_begin" : "talreporting:signpost_end";
    trace.add({.nanoseconds = made.milliseconds * kMillisecond,
               .kind = made.kind,
               .event = trace.textId(signpost ? trace_point : made.name),
               .name = signpost ? trace.textId(made.name) : trace.textId(""),
               .subsystem = trace.textId(signpost ? made.subsystem : ""),
               .process = trace.textId("process" + std::to_string(made.process)),
               .process_identifier = made.process,
               .thread_identifier = made.thread});
  }
}

TEST(SignpostPairs, BelongToThreadSubsystemAndNameAndNest) {
  constexpr auto kB = Kind::kSignpostBegin;
  constexpr auto kE = Kind::kSignpostEnd;
  TraceContent trace;
  fill(trace, {{kB, 0, "a"},
               {kB, 1, "a", 1, 2},                       // another thread
               {kB, 2, "a"},                             // nested
               {kB, 3, "a", 1, 1, "org.vantle.talsys"},  // another subsystem
               {kE, 4, "a"},                             // 4 - 2
               {kE, 5, "b"},                             // never begun
               {kE, 9, "a", 1, 1, "org.vantle.talsys"},  // 9 - 3
               {kE, 10, "a"},                            // 10 - 0
               {kE, 11, "a", 1, 2},                      // 11 - 1
               {kE, 12, "a"},                            // begun once only
               {kB, 13, "a"}});                          // never ended
  const SignpostPairs pairs(trace);
  std::vector<double> times;
  for (const SkeinSignpost& pair : pairs.signposts()) times.push_back(pair.milliseconds);
  EXPECT_THAT(times, ElementsAre(2, 6, 10, 10));
  EXPECT_EQ(pairs.signposts()[1].subsystem, "org.vantle.talsys");
  EXPECT_EQ(pairs.unpairedCount(), 3U);
}

TEST(Probes, IntervalsPairTheOldestBeginOfAProcess) {
  TraceContent trace;
  fill(trace, {{Kind::kOther, 0, "app:ask"},
               {Kind::kOther, 1, "app:ask"},
               {Kind::kOther, 2, "app:ask", 2},
               {Kind::kOther, 5, "app:answer", 1, 9},
               {Kind::kOther, 7, "app:answer"},
               {Kind::kOther, 8, "app:answer"},
               {Kind::kOther, 12, "app:answer", 2},
               {Kind::kSignpostBegin, 20, "mix"},
               {Kind::kOther, 23, "app:answer", 1}});
  struct Row {
    const char* begin;
    const char* end;
    std::vector<std::string> processes;
    std::vector<double> times;
  };
  const Row rows[] = {
      {"app:ask", "app:answer", {}, {5, 6, 10}}, {"app:ask", "app:answer", {"process2"}, {10}},
      {"app:ask", "app:answer", {"nobody"}, {}}, {"begin:mix", "app:answer", {}, {3}},
      {"app:ask", "app:ask", {"process1"}, {1}}, {"app:unknown", "app:answer", {}, {}}};
  for (const Row& row : rows) {
    const auto probe =
        makeProbe({.name = "gap", .begin = row.begin, .end = row.end, .processes = row.processes}, trace);
    ASSERT_EQ(probe->series().size(), 1U);
    EXPECT_EQ(probe->series()[0].milliseconds, row.times) << row.begin << ' ' << row.end;
  }
}

TEST(Probes, CountsAreByEvent) {
  TraceContent trace;
  fill(trace, {{Kind::kOther, 0, "app:tick"},
               {Kind::kOther, 1, "app:tick"},
               {Kind::kSignpostBegin, 2, "mix"},
               {Kind::kSignpostEnd, 3, "mix"}});
  const auto probe = makeProbe({.name = "n",
                                .kind = SkeinProbeDescription::Kind::kCount,
                                .events = {"app:tick", "end:mix", "talreporting:signpost_begin", "mix"}},
                               trace);
  std::vector<std::string> counts;
  for (const auto& series : probe->series())
    counts.push_back(series.name + "=" + std::to_string(series.count));
  EXPECT_THAT(counts,
              ElementsAre("n app:tick=2", "n end:mix=1", "n talreporting:signpost_begin=1", "n mix=0"));
}

TEST(Probes, ProcessorTimeIsBetweenSwitchesOfOneProcessor) {
  TraceContent trace;
  const auto add_switch = [&](std::int64_t time, const char* from, const char* to, std::uint32_t processor) {
    trace.add({.nanoseconds = time * kMillisecond,
               .kind = Kind::kSwitch,
               .event = trace.textId("sched_switch"),
               .name = trace.textId(to),
               .process = trace.textId(from),
               .processor = processor});
  };
  const SkeinProbeDescription description{
      .name = "load", .kind = SkeinProbeDescription::Kind::kCpu, .processes = {"mixer", "decoder"}};
  EXPECT_EQ(makeProbe(description, trace)->shortcoming(), "the trace has no scheduler events");
  add_switch(0, "mixer", "idle", 0);  // since when it ran is not known
  add_switch(1, "idle", "mixer", 1);
  add_switch(2, "idle", "mixer", 0);
  add_switch(5, "mixer", "decoder", 0);
  add_switch(6, "mixer", "idle", 1);
  add_switch(9, "decoder", "idle", 0);
  const auto probe = makeProbe(description, trace);
  EXPECT_THAT(probe->shortcoming(), IsEmpty());
  EXPECT_THAT(probe->series()[0].milliseconds, ElementsAre(3, 5));
  EXPECT_THAT(probe->series()[1].milliseconds, ElementsAre(4));
}

}  // namespace
}  // namespace tal

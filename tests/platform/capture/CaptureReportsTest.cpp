#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <string>

#include "platform/TemporaryDirectory.h"
#include "platform/linux/capture/PipeWireNodes.h"
#include "platform/linux/capture/ProcStat.h"
#include "platform/linux/capture/ProcessReport.h"
#include "platform/linux/capture/ToolOutput.h"

namespace tal {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;

// A process with a nasty name, as /proc tells of it.
std::string statLine(const std::string& name, char state, const std::string& realtime_and_policy = "0 0") {
  return "10 (" + name + ") " + state +
         " 1 10 10 0 -1 0 0 0 0 0 150 50 0 0 20 5 3 0 99 1000 7 0 0 0 0 0 0 0 0 0 0 0 0 0 17 1 " +
         realtime_and_policy + " 0 0\n";
}

TEST(ProcStat, ReadsAroundBracketsInTheName) {
  const auto stat = parseProcStat(statLine("a) R (b", 'S', "9 1"));
  ASSERT_TRUE(stat);
  EXPECT_EQ(stat->name, "a) R (b");
  EXPECT_EQ(stat->state, 'S');
  EXPECT_EQ(stat->cpu_seconds * static_cast<double>(::sysconf(_SC_CLK_TCK)), 200.0);
  EXPECT_EQ(stat->nice, 5);
  EXPECT_EQ(stat->threads, 3);
  EXPECT_EQ(stat->resident_bytes, 7U * static_cast<std::uint64_t>(::sysconf(_SC_PAGESIZE)));
  EXPECT_EQ(stat->last_processor, 1);
  EXPECT_EQ(stat->realtime_priority, 9);
  EXPECT_EQ(schedulingPolicyName(stat->policy), "fifo");
  for (const char* gone : {"", "10", "10 (name", "10 (name)"}) EXPECT_FALSE(parseProcStat(gone)) << gone;
}

TEST(ProcessReport, TellsOfThoseThatAreThere) {
  const test::TemporaryDirectory proc;
  const auto process = proc.path() / "10";
  test::writeFile(process / "stat", statLine("play\x1b[2J", 'S'));
  test::writeFile(process / "cmdline", std::string("play\0--loud\0a\nb\0", 16));
  test::writeFile(process / "status", "Name:\tplay\nVmRSS:\t  1234 kB\nVmRSSExtra:\t1 kB\n");
  test::writeFile(process / "task/10/stat", statLine("play", 'D', "50 2"));
  test::writeFile(process / "task/10/wchan", "snd_pcm_wait");
  test::writeFile(process / "task/10/stack", "[<0>] snd_pcm_wait\n[<0>] do_syscall\n");
  test::writeFile(process / "fd/0", "");
  test::writeFile(process / "fd/1", "");
  test::writeFile(proc.path() / "11/stat", "");  // has ended meanwhile
  const std::string report = processReport({9, 10, 11}, proc.path());
  EXPECT_THAT(report, HasSubstr("process 10  play\\x1b[2J\n"));
  EXPECT_THAT(report, HasSubstr("command  play --loud a\\nb\n"));
  EXPECT_THAT(report, HasSubstr("open files 2"));
  EXPECT_THAT(report, HasSubstr("resident 1234 kB"));
  EXPECT_THAT(report, HasSubstr("snd_pcm_wait  play\n            [<0>] snd_pcm_wait\n"));
  EXPECT_THAT(report, Not(HasSubstr("process 9")));
  EXPECT_THAT(report, Not(HasSubstr("process 11")));
  EXPECT_THAT(processTable(proc.path()), HasSubstr("play\\x1b[2J\n"));
  EXPECT_THAT(busyThreads(proc.path()), HasSubstr("rr             50"));
}

TEST(ProcessReport, ReadsThisVeryProcess) {
  const std::string report = processReport({::getpid()});
  EXPECT_THAT(report, HasSubstr("process " + std::to_string(::getpid())));
  EXPECT_THAT(report, HasSubstr("  threads\n"));
}

TEST(PipeWireNodes, ListsNodesOfADump) {
  EXPECT_EQ(pipeWireNodes(R"([{"id":4,"type":"PipeWire:Interface:Node","info":{"state":"running","props":
              {"media.class":"Stream/Output/Audio","node.name":"pw\ncat"}}},
              {"id":5,"type":"PipeWire:Interface:Client"}, 7,
              {"id":6,"type":"PipeWire:Interface:Node","info":null}])"),
            "id  state  class  name  application\n"
            "4  running  Stream/Output/Audio  pw\\ncat  -\n"
            "6  -  -  -  -\n");
  EXPECT_EQ(pipeWireNodes("[{"), "not readable\n");
}

TEST(ToolOutput, IsWholeOrNothing) {
  constexpr std::chrono::milliseconds kLong{60'000};
  constexpr std::chrono::milliseconds kShort{50};
  EXPECT_EQ(toolOutput({"sh", "-c", "printf 'a\\nb'"}, kLong), "a\nb");
  EXPECT_EQ(toolOutput({"sh", "-c", "echo a; exit 3"}, kLong), std::nullopt);
  EXPECT_EQ(toolOutput({"no-such-tool-anywhere"}, kLong), std::nullopt);
  EXPECT_EQ(toolOutput({"tail", "-f", "/dev/null"}, kShort), std::nullopt);
  EXPECT_EQ(toolOutput({"sh", "-c", "exec tail -f /dev/null >&-"}, kShort), std::nullopt);
}

}  // namespace
}  // namespace tal

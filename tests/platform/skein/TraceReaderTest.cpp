// The library that is loaded by name, on traces written here byte by byte.

#include <gtest/gtest.h>

#include <bit>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "core/Log.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/skein/TraceReader.h"
#include "platform/linux/tracing/SkeinLibraryLoader.h"

#ifdef __SANITIZE_ADDRESS__
#include <sanitizer/lsan_interface.h>
#endif

namespace tal {
namespace {

// The reading library's parser forgets a few bytes of a description that it cannot make sense of.
#ifdef __SANITIZE_ADDRESS__
using ReadingLibraryLeaks = __lsan::ScopedDisabler;
#else
struct ReadingLibraryLeaks {};
#endif

namespace fs = std::filesystem;
using test::writeFile;

static_assert(std::endian::native == std::endian::little, "traces are written as numbers lie in memory");

constexpr char kMetadata[] = R"(/* CTF 1.8 */
typealias integer { size = 32; align = 8; signed = false; } := u32;
typealias integer { size = 32; align = 8; signed = true; } := s32;
typealias integer { size = 64; align = 8; signed = false; } := u64;
trace { major = 1; minor = 8; byte_order = le; };
clock { name = mono; freq = 1000000000; offset_s = 0; };
typealias integer { size = 64; align = 8; signed = false; map = clock.mono.value; } := stamp;
stream {
  packet.context := struct { u64 content_size; u64 packet_size; stamp timestamp_begin; stamp timestamp_end;
                             u64 events_discarded; };
  event.header := struct { u32 id; stamp timestamp; };
  event.context := struct { s32 vpid; s32 vtid; string procname; };
};
event { name = "talreporting:signpost_begin"; id = 0; fields := struct { string subsystem; string name; }; };
event { name = "talreporting:signpost_end"; id = 1; fields := struct { string subsystem; string name; }; };
event { name = "sched_switch"; id = 2; fields := struct { string prev_comm; string next_comm; }; };
event { name = "app:tick"; id = 3; fields := struct { u32 beat; }; };
)";

template <typename Number>
void put(std::string& out, Number number) {
  out.append(reinterpret_cast<const char*>(&number), sizeof number);
}
void putText(std::string& out, const std::string& text) { out.append(text.c_str(), text.size() + 1); }

std::string event(std::uint32_t id, std::uint64_t time, const std::string& first, const std::string& second) {
  std::string bytes;
  put(bytes, id);
  put(bytes, time);
  put(bytes, std::int32_t{100});
  put(bytes, std::int32_t{101});
  putText(bytes, "mixer");
  if (id == 3) {
    put(bytes, std::uint32_t{7});
    return bytes;
  }
  putText(bytes, first);
  putText(bytes, second);
  return bytes;
}

std::string packet(std::uint64_t begin, std::uint64_t end, std::uint64_t discarded,
                   const std::string& events) {
  constexpr std::uint64_t kBits = 8;
  const std::uint64_t bits = (5 * sizeof(std::uint64_t) + events.size()) * kBits;
  std::string bytes;
  for (const std::uint64_t number : {bits, bits, begin, end, discarded}) put(bytes, number);
  return bytes + events;
}

class TraceReader : public ::testing::Test {
 protected:
  void writeTrace(const std::string& stream, const std::string& metadata = kMetadata) {
    writeFile(place() / "metadata", metadata);
    writeFile(place() / "channel_0", stream);
  }
  fs::path place() const { return directory.path() / "ust/uid/0/64-bit"; }

  test::TemporaryDirectory directory;
  const std::string good = packet(1'000, 5'000'000, 0,
                                  event(0, 2'000, "org.vantle.audio", "decode") +
                                      event(1, 3'002'000, "org.vantle.audio", "decode") +
                                      event(3, 4'000'000, "", "") + event(2, 4'500'000, "mixer", "idle"));
};

TEST_F(TraceReader, ReadsTheFieldsOfEveryKindOfEvent) {
  writeTrace(good);
  writeFile(place().parent_path() / "32-bit/metadata", kMetadata);
  writeFile(place().parent_path() / "32-bit/channel_0", packet(0, 10, 0, event(3, 5, "", "")));
  const auto result = readTrace(directory.path().string());
  ASSERT_TRUE(result.model) << result.error;
  const TraceContent& trace = *result.model;
  ASSERT_EQ(trace.events().size(), 5U);
  EXPECT_EQ(trace.events()[0].nanoseconds, 5) << "two traces, one order";
  const TraceEvent& begin = trace.events()[1];
  EXPECT_EQ(begin.kind, TraceEvent::Kind::kSignpostBegin);
  EXPECT_EQ(begin.nanoseconds, 2'000);
  EXPECT_EQ(trace.text(begin.name), "decode");
  EXPECT_EQ(trace.text(begin.subsystem), "org.vantle.audio");
  EXPECT_EQ(trace.text(begin.process), "mixer");
  EXPECT_EQ(begin.process_identifier, 100);
  EXPECT_EQ(begin.thread_identifier, 101);
  EXPECT_EQ(trace.text(trace.events()[3].event), "app:tick");
  EXPECT_EQ(trace.text(trace.events()[4].name), "idle");
  EXPECT_EQ(trace.text(trace.events()[4].process), "mixer");
}

TEST_F(TraceReader, CountsWhatTheTracerDiscarded) {
  writeTrace(packet(0, 10, 0, event(3, 5, "", "")) + packet(20, 30, 12, event(3, 25, "", "")));
  const auto result = readTrace(directory.path().string());
  ASSERT_TRUE(result.model) << result.error;
  EXPECT_EQ(result.model->discardedEventCount(), 12U);
}

TEST_F(TraceReader, RefusesWhatIsDamaged) {
  struct Row {
    const char* name;
    std::string stream;
    std::string metadata;
  };
  std::string flipped = good;
  flipped[0] = '\x7f';  // the size of the content, now beyond the packet
  std::string unknown = good;
  unknown[40] = 99;  // the first event's number
  const Row rows[] = {{"cut within the packet", good.substr(0, good.size() / 2), kMetadata},
                      {"cut within the head", good.substr(0, 10), kMetadata},
                      {"size flipped", flipped, kMetadata},
                      {"unknown event", unknown, kMetadata},
                      {"no description", good, ""}};
  for (const Row& row : rows) {
    writeTrace(row.stream, row.metadata);
    const auto result = readTrace(directory.path().string());
    EXPECT_FALSE(result.model) << row.name;
    EXPECT_FALSE(result.error.empty()) << row.name;
    EXPECT_EQ(result.error.find('\n'), std::string::npos) << row.name << ": one line";
  }
  fs::remove_all(place());
  EXPECT_EQ(readTrace(directory.path().string()).error, "no trace lies in " + directory.path().string());
}

TEST_F(TraceReader, RefusesADamagedDescription) {
  [[maybe_unused]] const ReadingLibraryLeaks allowed{};
  writeTrace(good, std::string(kMetadata).substr(0, 700));
  const auto result = readTrace(directory.path().string());
  EXPECT_FALSE(result.model);
  EXPECT_FALSE(result.error.empty());
}

TEST_F(TraceReader, TheLibraryIsReachedByNameAndWantsToBeAcknowledged) {
  writeTrace(good);
  const LogChannel silent("talrt", nullptr, LogLevel::kError);
  SkeinLibraryLoader absent("/nowhere", silent);
  EXPECT_EQ(absent.traceModelClass(), nullptr);
  EXPECT_EQ(absent.probeFactoryClass(), nullptr);

  SkeinLibraryLoader library(TAL_SKEIN_DIRECTORY, silent);
  SkeinTraceModelClass* model_class = library.traceModelClass();
  ASSERT_NE(model_class, nullptr);
  ::unsetenv("TALREPORTING_SKEIN_ACKNOWLEDGED");
  EXPECT_EQ(model_class->modelWithTrace(directory.path().string()).error,
            "TALREPORTING_SKEIN_ACKNOWLEDGED is not set to 1");
  library.acknowledge();
  const auto trace = model_class->modelWithTrace(directory.path().string());
  ASSERT_TRUE(trace.model) << trace.error;
  const auto signposts = library.signpostModelClass()->modelWithTraceModel(*trace.model);
  ASSERT_EQ(signposts.model->signposts().size(), 1U);
  EXPECT_EQ(signposts.model->signposts()[0].milliseconds, 3);
  const auto probes = library.probeFactoryClass()->probesWithDescriptions(
      {{.name = "n", .kind = SkeinProbeDescription::Kind::kCount, .events = {"app:tick"}}}, *trace.model);
  EXPECT_EQ(probes.at(0)->series().at(0).count, 1U);
}

}  // namespace
}  // namespace tal

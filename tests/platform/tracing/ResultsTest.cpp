// What goes in and out as text: probe lists and performance data.

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <string>

#include "core/DataSerialize.h"
#include "core/MessageDict.h"
#include "platform/TemporaryDirectory.h"
#include "platform/linux/tracing/JsonPerfDataWriter.h"
#include "platform/linux/tracing/LinuxClientFiles.h"
#include "platform/linux/tracing/TraceDirectories.h"
#include "platform/linux/tracing/XmlPropertyLists.h"

namespace tal {
namespace {

namespace fs = std::filesystem;

#ifdef TAL_HAVE_PLIST
TEST(PropertyLists, ReadsWhatTheSystemWritesItself) {
  const MessageValue value = MessageDict{{"text", "a & b"},
                                         {"number", 42},
                                         {"part", 0.25},
                                         {"yes", true},
                                         {"when", MessageDate{1'700'000'000}},
                                         {"bytes", MessageData{std::string("\0\1", 2)}},
                                         {"list", MessageArray{"x", MessageDict{{"deep", "y"}}}}};
  const auto xml = DataSerialize::getXMLInfo(value);
  ASSERT_TRUE(xml);
  const auto read = XmlPropertyLists().valueFromXml(*xml);
  ASSERT_TRUE(read.value) << read.error;
  EXPECT_EQ(*read.value, value) << read.value->text();
}

std::string repeated(int times, const std::string& text) {
  std::string all;
  for (int i = 0; i < times; ++i) all += text;
  return all;
}

TEST(PropertyLists, ReadsWideAndDeepOnes) {
  for (const std::string& list : {"<array>" + repeated(500, "<array/>") + "</array>",
                                  repeated(2000, "<array>") + repeated(2000, "</array>")}) {
    const auto read = XmlPropertyLists().valueFromXml("<plist>" + list + "</plist>");
    EXPECT_TRUE(read.value) << read.error;
  }
}

TEST(PropertyLists, RefusesWhatIsNone) {
  const std::string head = "<?xml version=\"1.0\"?><plist version=\"1.0\">";
  const std::string bad[] = {
      "",
      "not XML",
      "{\"json\": 1}",
      std::string("bplist00\xd0\x08\0\0", 12),
      head,
      head + "<dict><key>a</key></dict",
      head + "<dict><string>no key</string></dict></plist>",
      head + "<nonsense/></plist>",
      head + repeated(100'000, "<array>"),
      head + repeated(30'000, "<array><!--</array>-->") + repeated(30'000, "</array>") + "</plist>"};
  for (const std::string& xml : bad) {
    const auto read = XmlPropertyLists().valueFromXml(xml);
    EXPECT_FALSE(read.value) << xml.substr(0, 80) << " -> " << read.value->text();
    EXPECT_FALSE(read.error.empty());
  }
}
#endif

TEST(PerfData, IsJsonWithVersionNamesHostAndMetrics) {
  const test::TemporaryDirectory directory;
  LinuxClientFiles files(directory.path());
  fs::create_directory(directory.path() / "traces");
  const auto opened = files.openDiagnosticDirectory("traces");
  ASSERT_TRUE(opened.directory) << opened.error;
  const auto writer = JsonPerfDataWriters().makeWriter(*opened.directory, "data.pdj", 4, "name");
  writer->addKeyVariables({{"test_name", "nightly \"1\""}, {"start_time", MessageDate{1'700'000'000}}});
  writer->addMetric({.name = "decode Total",
                     .unit = "ms",
                     .value = 6,
                     .samples = {.count = 2, .minimum = 2, .maximum = 4, .percentile_50 = 2}});
  writer->addMetric({.name = "ring", .unit = "events", .value = 3, .samples = {}});
  writer->setTotalTime(6, {"decode Total"});
  ASSERT_EQ(writer->write(), std::nullopt);

  const auto json = nlohmann::json::parse(test::readFile(directory.path() / "traces/data.pdj"));
  EXPECT_EQ(json["version"], 4);
  EXPECT_EQ(json["name"], "name");
  EXPECT_EQ(json["test_name"], "nightly \"1\"");
  EXPECT_EQ(json["start_time"], "2023-11-14T22:13:20.000000Z");
  for (const char* fact : {"host", "kernel", "cpu_model"})
    EXPECT_FALSE(json[fact].get<std::string>().empty());
  EXPECT_EQ(json["total_time"]["value"], 6);
  ASSERT_EQ(json["metrics"].size(), 2U);
  EXPECT_EQ(json["metrics"][0]["percentile_50"], 2);
  EXPECT_EQ(json["metrics"][1]["value"], 3);
  EXPECT_FALSE(json["metrics"][1].contains("count"));
}

TEST(TraceDirectories, AreNewAndTheNewestAreKept) {
  const test::TemporaryDirectory parent;
  test::writeFile(parent.path() / "results.pdj", "");
  fs::path last;
  for (int i = 0; i < 12; ++i) {
    const auto made = makeTraceDirectory(parent.path(), "20260131-144502+0000");
    ASSERT_FALSE(made.path.empty()) << made.error;
    EXPECT_TRUE(fs::is_directory(made.path));
    last = made.path;
  }
  std::size_t kept = 0;
  for (const auto& entry : fs::directory_iterator(parent.path())) kept += entry.is_directory() ? 1 : 0;
  EXPECT_EQ(kept, 8U);
  EXPECT_TRUE(fs::exists(last));
  EXPECT_TRUE(fs::exists(parent.path() / "results.pdj"));
  EXPECT_FALSE(makeTraceDirectory(parent.path() / "missing", "now").error.empty());
}

}  // namespace
}  // namespace tal

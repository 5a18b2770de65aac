#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spa/param/audio/format.h>
#include <spa/param/audio/iec958.h>
#include <spa/param/profiler.h>
#include <spa/param/props.h>
#include <spa/pod/builder.h>

#include <array>
#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "reporters/pipewire/PipeWirePods.h"

namespace tal {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/// Builds one pod in memory of its own.
class Pod {
 public:
  Pod() { spa_pod_builder_init(&builder, memory_.data(), static_cast<std::uint32_t>(memory_.size())); }
  Pod(const Pod&) = delete;
  Pod& operator=(const Pod&) = delete;

  const spa_pod* get() const { return reinterpret_cast<const spa_pod*>(memory_.data()); }

  spa_pod_builder builder{};

 private:
  alignas(8) std::array<std::uint8_t, 4096> memory_{};
};

class Object {
 public:
  Object(Pod& pod, std::uint32_t type, std::uint32_t id) : pod_(pod) {
    spa_pod_builder_push_object(&pod.builder, &frame_, type, id);
  }
  ~Object() { spa_pod_builder_pop(&pod_.builder, &frame_); }
  Object(const Object&) = delete;
  Object& operator=(const Object&) = delete;

  spa_pod_builder* property(std::uint32_t key) {
    spa_pod_builder_prop(&pod_.builder, key, 0);
    return &pod_.builder;
  }

 private:
  Pod& pod_;
  spa_pod_frame frame_{};
};

TEST(VolumeFromProps, ReadsWhatIsThereAndKeepsTheRest) {
  Pod full;
  {
    Object props(full, SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
    const std::array<float, 2> volumes{0.25F, 0.75F};
    spa_pod_builder_float(props.property(SPA_PROP_volume), 0.5F);
    spa_pod_builder_bool(props.property(SPA_PROP_mute), true);
    spa_pod_builder_array(props.property(SPA_PROP_channelVolumes), sizeof(float), SPA_TYPE_Float, 2,
                          volumes.data());
  }
  const NodeVolume expected{0.5, {0.25, 0.75}, true};
  EXPECT_EQ(volumeFromProps(full.get(), {}), expected);

  Pod partial;
  {
    Object props(partial, SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
    spa_pod_builder_bool(props.property(SPA_PROP_mute), false);
    spa_pod_builder_string(props.property(SPA_PROP_volume), "loud");  // not a number: not a volume
  }
  EXPECT_EQ(volumeFromProps(partial.get(), expected), (NodeVolume{0.5, {0.25, 0.75}, false}));
}

TEST(VolumeFromProps, RefusesOtherPods) {
  Pod number;
  spa_pod_builder_int(&number.builder, 5);
  EXPECT_EQ(volumeFromProps(number.get(), {}), std::nullopt);
  EXPECT_EQ(volumeFromProps(nullptr, {}), std::nullopt);
}

void buildFormat(Pod& pod, std::uint32_t mediaType, std::uint32_t subtype, std::uint32_t sampleFormat,
                 int rate, int channels) {
  Object format(pod, SPA_TYPE_OBJECT_Format, SPA_PARAM_Format);
  spa_pod_builder_id(format.property(SPA_FORMAT_mediaType), mediaType);
  spa_pod_builder_id(format.property(SPA_FORMAT_mediaSubtype), subtype);
  if (sampleFormat != 0) spa_pod_builder_id(format.property(SPA_FORMAT_AUDIO_format), sampleFormat);
  if (rate != 0) spa_pod_builder_int(format.property(SPA_FORMAT_AUDIO_rate), rate);
  if (channels != 0) spa_pod_builder_int(format.property(SPA_FORMAT_AUDIO_channels), channels);
}

TEST(AudioFormatFromPod, NamesEncodingSampleFormatRateAndChannels) {
  struct Row {
    std::uint32_t subtype;
    std::uint32_t sampleFormat;
    int rate;
    int channels;
    AudioFormat expected;
  };
  const std::vector<Row> rows{
      {SPA_MEDIA_SUBTYPE_raw, SPA_AUDIO_FORMAT_S16_LE, 44100, 2, {"raw", "S16LE", 44100, 2}},
      {SPA_MEDIA_SUBTYPE_raw, SPA_AUDIO_FORMAT_F32P, 48000, 6, {"raw", "F32P", 48000, 6}},
      {SPA_MEDIA_SUBTYPE_iec958, 0, 48000, 0, {"iec958", "", 48000, 0}},
      {SPA_MEDIA_SUBTYPE_dsp, 0, 0, 0, {"dsp", "", 0, 0}},
  };
  for (const Row& row : rows) {
    Pod pod;
    buildFormat(pod, SPA_MEDIA_TYPE_audio, row.subtype, row.sampleFormat, row.rate, row.channels);
    EXPECT_EQ(audioFormatFromPod(pod.get()), row.expected) << row.expected.encoding;
  }
  Pod video;
  buildFormat(video, SPA_MEDIA_TYPE_video, SPA_MEDIA_SUBTYPE_raw, 0, 0, 0);
  EXPECT_EQ(audioFormatFromPod(video.get()), std::nullopt);
  EXPECT_EQ(audioFormatFromPod(nullptr), std::nullopt);
}

void addNodeBlock(Object& cycle, std::uint32_t key, int id, int status) {
  const spa_fraction latency{1024, 48000};
  spa_pod_builder_add_struct(cycle.property(key), SPA_POD_Int(id), SPA_POD_String("name"), SPA_POD_Long(1),
                             SPA_POD_Long(2), SPA_POD_Long(3), SPA_POD_Long(4), SPA_POD_Int(status),
                             SPA_POD_Fraction(&latency));
}

void addClock(Object& cycle, std::int64_t nsec, std::uint32_t rate, std::int64_t frames) {
  const spa_fraction frame{1, rate};
  spa_pod_builder_add_struct(cycle.property(SPA_PROFILER_clock), SPA_POD_Int(0), SPA_POD_Int(1),
                             SPA_POD_String("clock"), SPA_POD_Long(nsec), SPA_POD_Fraction(&frame),
                             SPA_POD_Long(99), SPA_POD_Long(frames), SPA_POD_Long(0), SPA_POD_Double(1.0),
                             SPA_POD_Long(0));
}

void addInfo(Object& cycle, int xruns) {
  spa_pod_builder_add_struct(cycle.property(SPA_PROFILER_info), SPA_POD_Long(5), SPA_POD_Float(0.1F),
                             SPA_POD_Float(0.1F), SPA_POD_Float(0.1F), SPA_POD_Int(xruns));
}

TEST(CyclesFromProfile, ReadsEveryTurnAndSkipsWhatDoesNotParse) {
  Pod pod;
  spa_pod_frame frame{};
  spa_pod_builder_push_struct(&pod.builder, &frame);
  {
    Object cycle(pod, SPA_TYPE_OBJECT_Profiler, 0);
    addInfo(cycle, 3);
    addClock(cycle, 1'500'000'000, 48000, 1024);
    addNodeBlock(cycle, SPA_PROFILER_driverBlock, 36, 3);
    for (int status = 0; status <= 3; ++status) {
      addNodeBlock(cycle, SPA_PROFILER_followerBlock, 40 + status, status);
    }
  }
  spa_pod_builder_int(&pod.builder, 5);
  {
    Object cycle(pod, SPA_TYPE_OBJECT_Profiler, 0);  // no clock
    addInfo(cycle, 3);
    addNodeBlock(cycle, SPA_PROFILER_driverBlock, 36, 3);
  }
  {
    Object cycle(pod, SPA_TYPE_OBJECT_Profiler, 0);
    addInfo(cycle, 4);
    addClock(cycle, 2'000'000'000, 44100, 256);
    addNodeBlock(cycle, SPA_PROFILER_driverBlock, 37, 3);
  }
  spa_pod_builder_pop(&pod.builder, &frame);

  const std::vector<GraphCycle> cycles = cyclesFromProfile(pod.get());
  ASSERT_EQ(cycles.size(), 2U);
  EXPECT_EQ(cycles[0].driver, 36U);
  EXPECT_EQ(cycles[0].when.time_since_epoch(), std::chrono::milliseconds(1500));
  EXPECT_EQ(cycles[0].frames, 1024U);
  EXPECT_EQ(cycles[0].rate, 48000U);
  EXPECT_EQ(cycles[0].driverXruns, 3U);
  std::vector<bool> late;
  for (const NodeCycle& follower : cycles[0].followers) late.push_back(follower.late);
  EXPECT_THAT(late, ElementsAre(false, true, true, false)) << "not triggered, triggered, awake, finished";
  EXPECT_EQ(cycles[1].driver, 37U);
  EXPECT_EQ(cycles[1].driverXruns, 4U);
  EXPECT_THAT(cycles[1].followers, IsEmpty());
}

TEST(CyclesFromProfile, OtherPodsHoldNone) {
  Pod number;
  spa_pod_builder_int(&number.builder, 5);
  EXPECT_THAT(cyclesFromProfile(number.get()), IsEmpty());
  EXPECT_THAT(cyclesFromProfile(nullptr), IsEmpty());
}

}  // namespace
}  // namespace tal

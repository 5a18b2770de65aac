#include "reporters/pipewire/PipeWirePods.h"

#include <spa/debug/types.h>
#include <spa/param/audio/type-info.h>
#include <spa/param/format-types.h>
#include <spa/param/format-utils.h>
#include <spa/param/profiler.h>
#include <spa/param/props.h>
#include <spa/pod/iter.h>
#include <spa/pod/parser.h>

#include <array>
#include <string>

namespace tal {

namespace {

/// The states of a node within one turn of the graph, as the profiler numbers them.
constexpr std::int32_t kStatusTriggered = 1;
constexpr std::int32_t kStatusAwake = 2;

/// "S16LE" of "Spa:Enum:AudioFormat:S16LE"; empty for a value without a name.
std::string shortTypeName(const spa_type_info* types, std::uint32_t value) {
  const char* name = spa_debug_type_find_short_name(types, value);
  return name ? name : "";
}

bool readClock(const spa_pod* pod, GraphCycle& cycle) {
  std::int32_t flags = 0;
  std::int32_t id = 0;
  const char* name = nullptr;
  std::int64_t nsec = 0;
  spa_fraction rate{};
  std::int64_t position = 0;
  std::int64_t duration = 0;
  const int parsed = spa_pod_parse_struct(pod, SPA_POD_Int(&flags), SPA_POD_Int(&id), SPA_POD_String(&name),
                                          SPA_POD_Long(&nsec), SPA_POD_Fraction(&rate),
                                          SPA_POD_Long(&position), SPA_POD_Long(&duration));
  if (parsed < 0 || duration < 0) return false;
  cycle.when = std::chrono::steady_clock::time_point(std::chrono::nanoseconds(nsec));
  cycle.frames = static_cast<std::uint64_t>(duration);
  // The clock counts in units of `num` / `denom` seconds; for audio that is one frame.
  cycle.rate = rate.num == 1 ? rate.denom : 0;
  return true;
}

bool readXrunCount(const spa_pod* pod, GraphCycle& cycle) {
  std::int64_t counter = 0;
  float fastLoad = 0.0F;
  float mediumLoad = 0.0F;
  float slowLoad = 0.0F;
  std::int32_t xruns = 0;
  if (spa_pod_parse_struct(pod, SPA_POD_Long(&counter), SPA_POD_Float(&fastLoad), SPA_POD_Float(&mediumLoad),
                           SPA_POD_Float(&slowLoad), SPA_POD_Int(&xruns)) < 0) {
    return false;
  }
  cycle.driverXruns = static_cast<std::uint32_t>(xruns);
  return true;
}

struct NodeBlock {
  std::int32_t id = 0;
  std::int32_t status = 0;
};

std::optional<NodeBlock> readNodeBlock(const spa_pod* pod) {
  NodeBlock block;
  const char* name = nullptr;
  std::int64_t previousSignal = 0;
  std::int64_t signal = 0;
  std::int64_t awake = 0;
  std::int64_t finish = 0;
  if (spa_pod_parse_struct(pod, SPA_POD_Int(&block.id), SPA_POD_String(&name), SPA_POD_Long(&previousSignal),
                           SPA_POD_Long(&signal), SPA_POD_Long(&awake), SPA_POD_Long(&finish),
                           SPA_POD_Int(&block.status)) < 0) {
    return std::nullopt;
  }
  return block;
}

std::optional<GraphCycle> readCycle(const spa_pod_object* object) {
  GraphCycle cycle;
  bool hasInfo = false;
  bool hasClock = false;
  bool hasDriver = false;
  const spa_pod_prop* property = nullptr;
  SPA_POD_OBJECT_FOREACH(object, property) {
    switch (property->key) {
      case SPA_PROFILER_info:
        hasInfo = readXrunCount(&property->value, cycle);
        break;
      case SPA_PROFILER_clock:
        hasClock = readClock(&property->value, cycle);
        break;
      case SPA_PROFILER_driverBlock:
        if (const auto block = readNodeBlock(&property->value)) {
          cycle.driver = static_cast<ObjectID>(block->id);
          hasDriver = true;
        }
        break;
      case SPA_PROFILER_followerBlock:
        if (const auto block = readNodeBlock(&property->value)) {
          // A node that was not even triggered waits for another one, which is the late one.
          const bool late = block->status == kStatusTriggered || block->status == kStatusAwake;
          cycle.followers.push_back({static_cast<ObjectID>(block->id), late});
        }
        break;
      default:
        break;
    }
  }
  if (!hasInfo || !hasClock || !hasDriver) return std::nullopt;
  return cycle;
}

}  // namespace

std::optional<NodeVolume> volumeFromProps(const spa_pod* props, const NodeVolume& known) {
  if (!props || !spa_pod_is_object_type(props, SPA_TYPE_OBJECT_Props)) return std::nullopt;
  NodeVolume volume = known;
  const auto* object = reinterpret_cast<const spa_pod_object*>(props);
  const spa_pod_prop* property = nullptr;
  SPA_POD_OBJECT_FOREACH(object, property) {
    float factor = 0.0F;
    bool mute = false;
    std::array<float, SPA_AUDIO_MAX_CHANNELS> factors{};
    switch (property->key) {
      case SPA_PROP_volume:
        if (spa_pod_get_float(&property->value, &factor) >= 0) volume.volume = static_cast<double>(factor);
        break;
      case SPA_PROP_mute:
        if (spa_pod_get_bool(&property->value, &mute) >= 0) volume.mute = mute;
        break;
      case SPA_PROP_channelVolumes: {
        const std::uint32_t count =
            spa_pod_copy_array(&property->value, SPA_TYPE_Float, factors.data(), SPA_AUDIO_MAX_CHANNELS);
        volume.channelVolumes.assign(factors.begin(), factors.begin() + count);
        break;
      }
      default:
        break;
    }
  }
  return volume;
}

std::optional<AudioFormat> audioFormatFromPod(const spa_pod* pod) {
  std::uint32_t mediaType = 0;
  std::uint32_t mediaSubtype = 0;
  if (!pod || spa_format_parse(pod, &mediaType, &mediaSubtype) < 0) return std::nullopt;
  if (mediaType != SPA_MEDIA_TYPE_audio) return std::nullopt;
  AudioFormat format;
  format.encoding = shortTypeName(spa_type_media_subtype, mediaSubtype);
  std::uint32_t sampleFormat = SPA_AUDIO_FORMAT_UNKNOWN;
  std::int32_t rate = 0;
  std::int32_t channels = 0;
  if (spa_pod_parse_object(pod, SPA_TYPE_OBJECT_Format, nullptr,                                      //
                           SPA_FORMAT_AUDIO_format, SPA_POD_OPT_Id(&sampleFormat),                    //
                           SPA_FORMAT_AUDIO_rate, SPA_POD_OPT_Int(&rate), SPA_FORMAT_AUDIO_channels,  //
                           SPA_POD_OPT_Int(&channels)) < 0) {
    return std::nullopt;
  }
  if (sampleFormat != SPA_AUDIO_FORMAT_UNKNOWN) {
    format.sampleFormat = shortTypeName(spa_type_audio_format, sampleFormat);
  }
  format.rate = rate > 0 ? static_cast<std::uint32_t>(rate) : 0;
  format.channels = channels > 0 ? static_cast<std::uint32_t>(channels) : 0;
  return format;
}

std::vector<GraphCycle> cyclesFromProfile(const spa_pod* profile) {
  std::vector<GraphCycle> cycles;
  if (!profile || !spa_pod_is_struct(profile)) return cycles;
  const void* body = SPA_POD_BODY_CONST(profile);
  for (const auto* entry = static_cast<const spa_pod*>(body);
       spa_pod_is_inside(body, SPA_POD_BODY_SIZE(profile), entry);
       entry = static_cast<const spa_pod*>(spa_pod_next(entry))) {
    if (!spa_pod_is_object_type(entry, SPA_TYPE_OBJECT_Profiler)) continue;
    if (auto cycle = readCycle(reinterpret_cast<const spa_pod_object*>(entry))) {
      cycles.push_back(std::move(*cycle));
    }
  }
  return cycles;
}

}  // namespace tal

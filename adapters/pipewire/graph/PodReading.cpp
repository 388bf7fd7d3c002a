// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/graph/PodReading.h"

#include <pipewire/keys.h>
#include <spa/debug/types.h>
#include <spa/param/audio/raw.h>
#include <spa/param/audio/type-info.h>
#include <spa/param/format.h>
#include <spa/param/profiler.h>
#include <spa/param/props.h>
#include <spa/param/route.h>
#include <spa/param/type-info.h>
#include <spa/pod/iter.h>
#include <spa/utils/type.h>

#include <array>
#include <string_view>

namespace tarn::streams {

namespace {

constexpr std::uint32_t kMostChannels = SPA_AUDIO_MAX_CHANNELS;
// PipeWire's node is done with its cycle (PW_NODE_ACTIVATION_FINISHED).
constexpr std::int32_t kFinished = 3;

using Fields = std::vector<const spa_pod*>;

// The value; of a choice, which a format may be made of even where nothing is left to choose, its first.
const spa_pod* property(const spa_pod* object, std::uint32_t key) {
  const spa_pod_prop* const found = spa_pod_find_prop(object, nullptr, key);
  if (found == nullptr || spa_pod_is_choice(&found->value) == 0) return found == nullptr ? nullptr : &found->value;
  const spa_pod* const first = SPA_POD_CHOICE_CHILD(&found->value);
  const std::size_t around = sizeof(spa_pod_choice_body);
  return found->value.size >= around && found->value.size - around >= first->size ? first : nullptr;
}

// The members of a struct; none of anything else.
Fields fieldsOf(const spa_pod* pod) {
  Fields fields;
  if (pod == nullptr || spa_pod_is_struct(pod) == 0) return fields;
  const spa_pod* field = nullptr;
  SPA_POD_FOREACH(static_cast<const spa_pod*>(SPA_POD_BODY_CONST(pod)), SPA_POD_BODY_SIZE(pod), field) {
    fields.push_back(field);
  }
  return fields;
}

const spa_pod* at(const Fields& fields, std::size_t index) {
  return index < fields.size() ? fields[index] : nullptr;
}

std::int32_t wholeOf(const spa_pod* pod) {
  std::int32_t value = 0;
  return pod != nullptr && spa_pod_get_int(pod, &value) == 0 ? value : 0;
}

std::int64_t longOf(const spa_pod* pod) {
  std::int64_t value = 0;
  return pod != nullptr && spa_pod_get_long(pod, &value) == 0 ? value : 0;
}

std::uint32_t idOf(const spa_pod* pod) {
  std::uint32_t value = 0;
  return pod != nullptr && spa_pod_get_id(pod, &value) == 0 ? value : 0;
}

bool flagOf(const spa_pod* pod) {
  bool value = false;
  return pod != nullptr && spa_pod_get_bool(pod, &value) == 0 && value;
}

std::string textOf(const spa_pod* pod) {
  const char* value = nullptr;
  return pod != nullptr && spa_pod_get_string(pod, &value) == 0 && value != nullptr ? value : "";
}

spa_fraction fractionOf(const spa_pod* pod) {
  spa_fraction value{0, 1};
  if (pod == nullptr || spa_pod_get_fraction(pod, &value) != 0) return {0, 1};
  return value;
}

std::vector<float> factorsOf(const spa_pod* pod) {
  std::array<float, kMostChannels> room{};
  const std::uint32_t count = pod == nullptr ? 0 : spa_pod_copy_array(pod, SPA_TYPE_Float, room.data(), kMostChannels);
  return {room.begin(), room.begin() + count};
}

std::string nameIn(const spa_type_info* table, std::uint32_t id) {
  const char* const name = spa_debug_type_find_short_name(table, id);
  return name == nullptr ? "unknown" : name;
}

CycleFacts::Follower followerOf(const spa_pod* block, std::uint32_t rate) {
  const Fields fields = fieldsOf(block);
  const spa_fraction latency = fractionOf(at(fields, 7));
  CycleFacts::Follower follower;
  follower.node = static_cast<ObjectId>(wholeOf(at(fields, 0)));
  follower.finished = wholeOf(at(fields, 6)) == kFinished;
  // As frames of the graph, whatever rate it was asked for in.
  follower.latencyFrames =
      latency.denom == 0 ? 0 : static_cast<std::uint32_t>(std::uint64_t{latency.num} * rate / latency.denom);
  return follower;
}

CycleFacts cycleOf(const spa_pod_object* object, Moment since) {
  CycleFacts cycle;
  const spa_pod_prop* block = nullptr;
  std::vector<const spa_pod*> followers;
  SPA_POD_OBJECT_FOREACH(object, block) {
    const Fields fields = fieldsOf(&block->value);
    if (block->key == SPA_PROFILER_info) {
      cycle.counter = longOf(at(fields, 0));
      cycle.xruns = wholeOf(at(fields, 4));
    } else if (block->key == SPA_PROFILER_clock) {
      cycle.at = since + longOf(at(fields, 3));
      cycle.rate = fractionOf(at(fields, 4)).denom;
      cycle.frames = longOf(at(fields, 6));
    } else if (block->key == SPA_PROFILER_driverBlock) {
      cycle.driver = static_cast<ObjectId>(wholeOf(at(fields, 0)));
    } else if (block->key == SPA_PROFILER_followerBlock) {
      followers.push_back(&block->value);
    }
  }
  for (const spa_pod* const follower : followers) {
    cycle.followers.push_back(followerOf(follower, cycle.rate));
  }
  return cycle;
}

}  // namespace

std::optional<VolumeFacts> volumesOf(const spa_pod* props) {
  if (props == nullptr || spa_pod_is_object_type(props, SPA_TYPE_OBJECT_Props) == 0) return std::nullopt;
  const spa_pod* const volume = property(props, SPA_PROP_volume);
  const spa_pod* const channels = property(props, SPA_PROP_channelVolumes);
  const spa_pod* const softChannels = property(props, SPA_PROP_softVolumes);
  // A node may have several, and not each is about volumes.
  if (volume == nullptr && channels == nullptr && softChannels == nullptr) return std::nullopt;
  VolumeFacts facts;
  if (volume != nullptr) {
    spa_pod_get_float(volume, &facts.volume);
  }
  facts.muted = flagOf(property(props, SPA_PROP_mute));
  facts.softMuted = flagOf(property(props, SPA_PROP_softMute));
  facts.channelVolumes = factorsOf(channels);
  facts.softVolumes = factorsOf(softChannels);
  return facts;
}

std::optional<FormatFacts> formatOf(const spa_pod* format) {
  if (format == nullptr || spa_pod_is_object_type(format, SPA_TYPE_OBJECT_Format) == 0) return std::nullopt;
  if (idOf(property(format, SPA_FORMAT_mediaType)) != SPA_MEDIA_TYPE_audio) return std::nullopt;
  const std::uint32_t subtype = idOf(property(format, SPA_FORMAT_mediaSubtype));
  FormatFacts facts;
  facts.name = subtype == SPA_MEDIA_SUBTYPE_raw
                   ? nameIn(spa_type_audio_format, idOf(property(format, SPA_FORMAT_AUDIO_format)))
                   : nameIn(spa_type_media_subtype, subtype);
  facts.rate = static_cast<std::uint32_t>(wholeOf(property(format, SPA_FORMAT_AUDIO_rate)));
  facts.channels = static_cast<std::uint32_t>(wholeOf(property(format, SPA_FORMAT_AUDIO_channels)));
  return facts;
}

std::optional<RouteFacts> routeOf(const spa_pod* route) {
  if (route == nullptr || spa_pod_is_object_type(route, SPA_TYPE_OBJECT_ParamRoute) == 0) return std::nullopt;
  RouteFacts facts;
  facts.isOutput = idOf(property(route, SPA_PARAM_ROUTE_direction)) == SPA_DIRECTION_OUTPUT;
  facts.device = wholeOf(property(route, SPA_PARAM_ROUTE_device));
  facts.port.name = textOf(property(route, SPA_PARAM_ROUTE_name));
  const Fields words = fieldsOf(property(route, SPA_PARAM_ROUTE_info));
  for (std::size_t i = 1; i + 1 < words.size(); i += 2) {
    if (textOf(words[i]) == "port.type") {
      facts.port.type = textOf(words[i + 1]);
    }
  }
  return facts;
}

std::vector<CycleFacts> cyclesOf(const spa_pod* profile, Moment since) {
  std::vector<CycleFacts> cycles;
  for (const spa_pod* const object : fieldsOf(profile)) {
    if (spa_pod_is_object_type(object, SPA_TYPE_OBJECT_Profiler) == 0) continue;
    cycles.push_back(cycleOf(SPA_PTROFF(object, 0, const spa_pod_object), since));
  }
  return cycles;
}

}  // namespace tarn::streams

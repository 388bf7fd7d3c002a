// SPDX-License-Identifier: Apache-2.0
// A program with many streams that come and go.
//
//   churner SECONDS               as fast as they can, each once sound has flowed in it: as fast as they are linked
//   churner SECONDS bare RATE     so many a second, which nobody links: each is seen and gone
//   churner SECONDS link RATE     so many a second, which link themselves to the sink, faster than a session manager
//   does churner SECONDS pause RATE    streams that stay, of which one starts and one stops so many times a second
//
// It prints how many there were, and of those that link themselves in how many sound flowed; of those that stay, how
// many times one started.
#include <pipewire/filter.h>
#include <pipewire/pipewire.h>
#include <spa/param/audio/format-utils.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

namespace {

constexpr std::size_t kAtOnce = 16;

enum class Way { Linked, Bare, Link, Pause };

struct Churner;

struct Slot {
  Churner* churner = nullptr;
  pw_stream* stream = nullptr;
  // Of those that link themselves: a filter has its port without a session manager.
  pw_filter* filter = nullptr;
  pw_proxy* link = nullptr;
  spa_hook hook{};
  bool isOver = false;
  bool isPaused = false;
};

struct Churner {
  pw_main_loop* loop = nullptr;
  pw_core* core = nullptr;
  spa_source* turn = nullptr;
  std::array<Slot, kAtOnce> slots;
  Way way = Way::Linked;
  std::string sink;
  std::string sinkPort;
  std::size_t next = 0;
  unsigned long started = 0;
  unsigned long over = 0;
  unsigned long heard = 0;
};

void stateChanged(void* data, pw_stream_state, pw_stream_state state, const char*) {
  auto& slot = *static_cast<Slot*>(data);
  if (state != PW_STREAM_STATE_STREAMING || slot.isOver) return;
  slot.isOver = true;
  if (slot.churner->way != Way::Linked) return;
  pw_loop_signal_event(pw_main_loop_get_loop(slot.churner->loop), slot.churner->turn);
}

void begin(Churner& churner, Slot& slot) {
  static constexpr pw_stream_events kEvents{.version = PW_VERSION_STREAM_EVENTS, .state_changed = &stateChanged};
  std::array<std::uint8_t, 1024> room{};
  spa_pod_builder builder{};
  spa_pod_builder_init(&builder, room.data(), static_cast<std::uint32_t>(room.size()));
  spa_audio_info_raw format{};
  format.format = SPA_AUDIO_FORMAT_F32;
  format.rate = 48000;
  format.channels = 1;
  format.position[0] = SPA_AUDIO_CHANNEL_MONO;
  const spa_pod* params[] = {spa_format_audio_raw_build(&builder, SPA_PARAM_EnumFormat, &format)};
  const std::string name = "churn" + std::to_string(churner.started++);
  slot.isOver = false;
  slot.stream = pw_stream_new(churner.core, name.c_str(),
                              pw_properties_new(PW_KEY_MEDIA_TYPE, "Audio", PW_KEY_MEDIA_CATEGORY, "Playback",
                                                PW_KEY_MEDIA_ROLE, "Game", PW_KEY_APP_ID, "org.test.churn", nullptr));
  pw_stream_add_listener(slot.stream, &slot.hook, &kEvents, &slot);
  const auto linked = churner.way == Way::Bare ? PW_STREAM_FLAG_NONE : PW_STREAM_FLAG_AUTOCONNECT;
  pw_stream_connect(slot.stream, PW_DIRECTION_OUTPUT, PW_ID_ANY,
                    static_cast<pw_stream_flags>(linked | PW_STREAM_FLAG_MAP_BUFFERS), params, 1);
}

// A beat after it began at the earliest: the server knows its node before its port.
void linkOnce(Slot& slot) {
  if (slot.link != nullptr || pw_filter_get_node_id(slot.filter) == SPA_ID_INVALID) return;
  const std::string node = std::to_string(pw_filter_get_node_id(slot.filter));
  pw_properties* const ends =
      pw_properties_new(PW_KEY_LINK_OUTPUT_NODE, node.c_str(), PW_KEY_LINK_INPUT_NODE, slot.churner->sink.c_str(),
                        PW_KEY_LINK_INPUT_PORT, slot.churner->sinkPort.c_str(), nullptr);
  slot.link = static_cast<pw_proxy*>(pw_core_create_object(slot.churner->core, "link-factory", PW_TYPE_INTERFACE_Link,
                                                           PW_VERSION_LINK, &ends->dict, 0));
  pw_properties_free(ends);
}

void filterChanged(void* data, pw_filter_state, pw_filter_state state, const char*) {
  auto& slot = *static_cast<Slot*>(data);
  if (state != PW_FILTER_STATE_STREAMING || slot.isOver) return;
  slot.isOver = true;
  ++slot.churner->heard;
}

void beginFilter(Churner& churner, Slot& slot) {
  static constexpr pw_filter_events kEvents{.version = PW_VERSION_FILTER_EVENTS, .state_changed = &filterChanged};
  const std::string name = "churn" + std::to_string(churner.started++);
  slot.isOver = false;
  slot.filter = pw_filter_new(churner.core, name.c_str(),
                              pw_properties_new(PW_KEY_MEDIA_CLASS, "Stream/Output/Audio", PW_KEY_MEDIA_TYPE, "Audio",
                                                PW_KEY_MEDIA_ROLE, "Game", PW_KEY_APP_ID, "org.test.churn", nullptr));
  pw_filter_add_listener(slot.filter, &slot.hook, &kEvents, &slot);
  pw_filter_add_port(
      slot.filter, PW_DIRECTION_OUTPUT, PW_FILTER_PORT_FLAG_MAP_BUFFERS, 0,
      pw_properties_new(PW_KEY_FORMAT_DSP, "32 bit float mono audio", PW_KEY_PORT_NAME, "output", nullptr), nullptr, 0);
  pw_filter_connect(slot.filter, PW_FILTER_FLAG_NONE, nullptr, 0);
}

void endFilter(Slot& slot) {
  if (slot.link != nullptr) {
    pw_core_destroy(slot.churner->core, slot.link);
  }
  slot.link = nullptr;
  pw_filter_destroy(slot.filter);
}

// One of those that come and go by the clock.
void beatOnce(Churner& churner) {
  Slot& slot = churner.slots[churner.next++ % kAtOnce];
  if (churner.way == Way::Link) {
    for (Slot& begun : churner.slots) {
      linkOnce(begun);
    }
    endFilter(slot);
    ++churner.over;
    beginFilter(churner, slot);
    return;
  }
  if (churner.way == Way::Bare) {
    pw_stream_destroy(slot.stream);
    ++churner.over;
    begin(churner, slot);
    return;
  }
  if (!slot.isOver) return;  // it isn't linked yet
  slot.isPaused = !slot.isPaused;
  pw_stream_set_active(slot.stream, !slot.isPaused);
  churner.over += slot.isPaused ? 0 : 1;
}

// As many as it is late.
void beat(void* data, std::uint64_t beats) {
  for (; beats > 0; --beats) {
    beatOnce(*static_cast<Churner*>(data));
  }
}

void startBeat(Churner& churner, double rate) {
  pw_loop* const loop = pw_main_loop_get_loop(churner.loop);
  // Half of them are stops.
  const long pause = static_cast<long>(1e9 / (churner.way == Way::Pause ? 2 * rate : rate));
  timespec each{0, pause};
  pw_loop_update_timer(loop, pw_loop_add_timer(loop, &beat, &churner), &each, &each, false);
}

void turn(void* data, std::uint64_t) {
  auto& churner = *static_cast<Churner*>(data);
  for (Slot& slot : churner.slots) {
    if (!slot.isOver) continue;
    pw_stream_destroy(slot.stream);
    ++churner.over;
    begin(churner, slot);
  }
}

void end(void* data, std::uint64_t) {
  pw_main_loop_quit(static_cast<Churner*>(data)->loop);
}

std::string_view word(const spa_dict* words, const char* key) {
  const char* const text = words == nullptr ? nullptr : spa_dict_lookup(words, key);
  return text == nullptr ? std::string_view() : text;
}

// The first sink there is, and the first port into it, which is told after it.
void seen(void* data, std::uint32_t id, std::uint32_t, const char*, std::uint32_t, const spa_dict* words) {
  auto& churner = *static_cast<Churner*>(data);
  if (churner.sink.empty() && word(words, PW_KEY_MEDIA_CLASS) == "Audio/Sink") {
    churner.sink = std::to_string(id);
  }
  if (churner.sink.empty() || word(words, PW_KEY_NODE_ID) != churner.sink) return;
  if (word(words, PW_KEY_PORT_DIRECTION) != "in" || !churner.sinkPort.empty()) return;
  churner.sinkPort = std::to_string(id);
  pw_main_loop_quit(churner.loop);
}

void findSink(Churner& churner) {
  static constexpr pw_registry_events kEvents{.version = PW_VERSION_REGISTRY_EVENTS, .global = &seen};
  pw_registry* const registry = pw_core_get_registry(churner.core, PW_VERSION_REGISTRY, 0);
  spa_hook hook{};
  pw_registry_add_listener(registry, &hook, &kEvents, &churner);
  pw_main_loop_run(churner.loop);
  spa_hook_remove(&hook);
  pw_proxy_destroy(reinterpret_cast<pw_proxy*>(registry));
}

Way wayOf(std::string_view word) {
  if (word == "bare") return Way::Bare;
  return word == "link" ? Way::Link : Way::Pause;
}

}  // namespace

int main(int count, char** words) {
  if (count != 2 && count != 4) return 64;
  pw_init(nullptr, nullptr);
  Churner churner;
  churner.loop = pw_main_loop_new(nullptr);
  pw_loop* const loop = pw_main_loop_get_loop(churner.loop);
  pw_context* const context = pw_context_new(loop, nullptr, 0);
  churner.core = pw_context_connect(context, nullptr, 0);
  if (churner.core == nullptr) return 1;
  if (count == 4) {
    churner.way = wayOf(words[2]);
  }
  if (churner.way == Way::Link) {
    findSink(churner);
  }
  churner.turn = pw_loop_add_event(loop, &turn, &churner);
  for (Slot& slot : churner.slots) {
    slot.churner = &churner;
    churner.way == Way::Link ? beginFilter(churner, slot) : begin(churner, slot);
  }
  if (churner.way != Way::Linked) {
    startBeat(churner, std::stod(words[3]));
  }
  spa_source* const timer = pw_loop_add_timer(loop, &end, &churner);
  timespec due{std::stol(words[1]), 0};
  pw_loop_update_timer(loop, timer, &due, nullptr, false);
  pw_main_loop_run(churner.loop);
  std::printf("%lu", churner.over);
  if (churner.way == Way::Link) {
    std::printf(" %lu", churner.heard);
  }
  std::printf("\n");
  pw_context_destroy(context);
  pw_main_loop_destroy(churner.loop);
  pw_deinit();
  return 0;
}

// SPDX-License-Identifier: Apache-2.0
// A program that plays silence or records, as the tests ask for it: it pauses, and it dawdles in a cycle.
//
//   streamer NAME SECONDS [record] [pause=AT,FOR] [dawdle=MILLISECONDS]
//
// AT and FOR are seconds from when sound first flowed; it dawdles in the next cycle after SIGUSR1. It tells what it saw
// of itself, a line each with the time in seconds since 1970: "flows TIME", "paused TIME" and "resumed TIME" when it
// asks for that, "dawdled SECONDS" after as many, and "ends TIME" after SECONDS. NAME is its node's and, with org.test.
// before it, its application's.
#include <pipewire/pipewire.h>
#include <spa/param/audio/format-utils.h>

#include <atomic>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>
#include <thread>

namespace {

constexpr std::uint32_t kChannels = 2;

struct Streamer {
  pw_main_loop* loop = nullptr;
  pw_stream* stream = nullptr;
  double seconds = 1;
  double pauseAt = -1, pauseFor = 0;
  double dawdleMilliseconds = 0;
  std::atomic<bool> shallDawdle{false};
  bool flows = false;
};

double secondsOf(std::string_view text) {
  double seconds = 0;
  std::from_chars(text.data(), text.data() + text.size(), seconds);
  return seconds;
}

void say(const char* word, double number) {
  std::printf("%s %.9f\n", word, number);
  std::fflush(stdout);
}

// By the clock that messages are stamped with.
void sayNow(const char* word) {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  say(word, std::chrono::duration<double>(now).count());
}

void after(Streamer& streamer, double seconds, void (*call)(void*, std::uint64_t)) {
  pw_loop* const loop = pw_main_loop_get_loop(streamer.loop);
  spa_source* const timer = pw_loop_add_timer(loop, call, &streamer);
  const auto nanoseconds = static_cast<long long>(seconds * 1e9) + 1;
  timespec due{nanoseconds / SPA_NSEC_PER_SEC, nanoseconds % SPA_NSEC_PER_SEC};
  pw_loop_update_timer(loop, timer, &due, nullptr, false);
}

// In the data thread.
void process(void* data) {
  auto& streamer = *static_cast<Streamer*>(data);
  pw_buffer* const buffer = pw_stream_dequeue_buffer(streamer.stream);
  if (buffer == nullptr) return;
  spa_data& plane = buffer->buffer->datas[0];
  constexpr std::uint32_t kStride = sizeof(float) * kChannels;
  if (plane.data != nullptr) {
    std::uint32_t frames = plane.maxsize / kStride;
    if (buffer->requested != 0 && buffer->requested < frames) {
      frames = static_cast<std::uint32_t>(buffer->requested);
    }
    std::memset(plane.data, 0, std::size_t{frames} * kStride);
    plane.chunk->offset = 0;
    plane.chunk->stride = kStride;
    plane.chunk->size = frames * kStride;
  }
  if (streamer.shallDawdle.exchange(false)) {
    const auto begun = std::chrono::steady_clock::now();
    std::this_thread::sleep_for(std::chrono::duration<double, std::milli>(streamer.dawdleMilliseconds));
    say("dawdled", std::chrono::duration<double>(std::chrono::steady_clock::now() - begun).count());
  }
  pw_stream_queue_buffer(streamer.stream, buffer);
}

void dawdle(void* data, int) {
  static_cast<Streamer*>(data)->shallDawdle = true;
}

void end(void* data, std::uint64_t) {
  sayNow("ends");
  pw_main_loop_quit(static_cast<Streamer*>(data)->loop);
}

void resume(void* data, std::uint64_t) {
  sayNow("resumed");
  pw_stream_set_active(static_cast<Streamer*>(data)->stream, true);
}

void pause(void* data, std::uint64_t) {
  auto& streamer = *static_cast<Streamer*>(data);
  sayNow("paused");
  pw_stream_set_active(streamer.stream, false);
  after(streamer, streamer.pauseFor, &resume);
}

void stateChanged(void* data, pw_stream_state, pw_stream_state state, const char*) {
  auto& streamer = *static_cast<Streamer*>(data);
  if (state == PW_STREAM_STATE_ERROR) {
    pw_main_loop_quit(streamer.loop);
  }
  if (state != PW_STREAM_STATE_STREAMING || streamer.flows) return;
  streamer.flows = true;
  sayNow("flows");
  after(streamer, streamer.seconds, &end);
  if (streamer.pauseAt >= 0) {
    after(streamer, streamer.pauseAt, &pause);
  }
}

void connect(Streamer& streamer, bool records) {
  std::uint8_t room[1024];
  spa_pod_builder builder{};
  spa_pod_builder_init(&builder, room, sizeof room);
  spa_audio_info_raw format{};
  format.format = SPA_AUDIO_FORMAT_F32;
  format.rate = 48000;
  format.channels = kChannels;
  format.position[0] = SPA_AUDIO_CHANNEL_FL;
  format.position[1] = SPA_AUDIO_CHANNEL_FR;
  const spa_pod* params[] = {spa_format_audio_raw_build(&builder, SPA_PARAM_EnumFormat, &format)};
  pw_stream_connect(
      streamer.stream, records ? PW_DIRECTION_INPUT : PW_DIRECTION_OUTPUT, PW_ID_ANY,
      static_cast<pw_stream_flags>(PW_STREAM_FLAG_AUTOCONNECT | PW_STREAM_FLAG_MAP_BUFFERS | PW_STREAM_FLAG_RT_PROCESS),
      params, 1);
}

}  // namespace

int main(int count, char** words) {
  if (count < 3) return 64;
  Streamer streamer;
  bool records = false;
  streamer.seconds = secondsOf(words[2]);
  for (int i = 3; i < count; ++i) {
    const std::string_view word = words[i];
    const std::string_view two = word.substr(word.find('=') + 1);
    const std::size_t comma = two.find(',');
    records = records || word == "record";
    if (word.substr(0, 6) == "pause=") {
      streamer.pauseAt = secondsOf(two.substr(0, comma));
      streamer.pauseFor = secondsOf(two.substr(comma + 1));
    } else if (word.substr(0, 7) == "dawdle=") {
      streamer.dawdleMilliseconds = secondsOf(two);
    }
  }
  pw_init(nullptr, nullptr);
  streamer.loop = pw_main_loop_new(nullptr);
  pw_loop_add_signal(pw_main_loop_get_loop(streamer.loop), SIGUSR1, &dawdle, &streamer);
  const std::string application = std::string("org.test.") + words[1];
  static constexpr pw_stream_events kEvents{
      .version = PW_VERSION_STREAM_EVENTS, .state_changed = &stateChanged, .process = &process};
  streamer.stream = pw_stream_new_simple(
      pw_main_loop_get_loop(streamer.loop), words[1],
      pw_properties_new(PW_KEY_MEDIA_TYPE, "Audio", PW_KEY_MEDIA_CATEGORY, records ? "Capture" : "Playback",
                        PW_KEY_MEDIA_ROLE, "Production", PW_KEY_NODE_NAME, words[1], PW_KEY_APP_ID, application.c_str(),
                        PW_KEY_NODE_LATENCY, "1024/48000", nullptr),
      &kEvents, &streamer);
  connect(streamer, records);
  pw_main_loop_run(streamer.loop);
  pw_stream_destroy(streamer.stream);
  pw_main_loop_destroy(streamer.loop);
  pw_deinit();
  return 0;
}

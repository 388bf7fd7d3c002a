// SPDX-License-Identifier: Apache-2.0
#include "bench/Poster.h"

#include <unistd.h>

#include <cstring>

#include "bench/Processes.h"

namespace tarn::bench {

namespace {

void check(int result) {
  if (result != TARNREPORTING_OK) {
    fail(std::string("the posting library says: ") + tarnreporting_result_text(result));
  }
}

tarnreporting_value text(const char* value) {
  return tarnreporting_text(value, static_cast<std::uint32_t>(std::strlen(value)));
}

}  // namespace

Poster::Poster(const std::string& socketPath, std::uint32_t closeMs) : closeMs_(closeMs) {
  tarnreporting_client_options options = {};
  options.size = sizeof options;
  options.socket_path = socketPath.c_str();
  check(tarnreporting_client_open(&options, &client_));
  tarnreporting_session* session = nullptr;
  check(tarnreporting_session_begin(client_, nullptr, &session));
  const std::array<tarnreporting_key, 12> keys{{{"systemuptime_sec", TARNREPORTING_DOUBLE},
                                                {"processuptime_ms", TARNREPORTING_INTEGER},
                                                {"client_application", TARNREPORTING_TEXT_VALUE},
                                                {"audio_route", TARNREPORTING_TEXT_VALUE},
                                                {"stream_sample_rate_hz", TARNREPORTING_DOUBLE},
                                                {"buffer_frame_count", TARNREPORTING_INTEGER},
                                                {"voice_processing", TARNREPORTING_BOOLEAN},
                                                {"volume_scalar_value", TARNREPORTING_DOUBLE},
                                                {"underrun_count", TARNREPORTING_INTEGER},
                                                {"codec_name", TARNREPORTING_TEXT_VALUE},
                                                {"session_token", TARNREPORTING_TEXT_VALUE},
                                                {"muted", TARNREPORTING_BOOLEAN}}};
  const tarnreporting_shape_options shape = {sizeof shape, 4, 1, keys.data(), keys.size()};
  check(tarnreporting_shape_declare(session, &shape, &shape_));
  values_ = {tarnreporting_double(86400.5),
             tarnreporting_integer(20000),
             text("sys.oxbow.music.player"),
             text("BuiltInSpeaker"),
             tarnreporting_double(48000),
             tarnreporting_integer(512),
             tarnreporting_boolean(0),
             tarnreporting_double(0.5),
             tarnreporting_integer(70000),
             text("lossless"),
             text("9f2c1d7e"),
             tarnreporting_boolean(0)};
  openWriter(kRingBytes);
}

Poster::~Poster() {
  tarnreporting_client_close(client_, closeMs_, nullptr);
}

void Poster::openWriter(std::uint32_t ringBytes) {
  const tarnreporting_writer_options writer = {sizeof writer, ringBytes, 0};
  check(tarnreporting_writer_open(client_, &writer, &writer_));
}

void Poster::waitUntilTaken() {
  check(tarnreporting_client_flush(client_, kTimeoutMs));
}

void Poster::waitUntilCommitted() {
  waitUntilTaken();
  tarnreporting_state state = {};
  state.size = sizeof state;
  for (std::uint32_t waitedMs = 0; waitedMs < kTimeoutMs; ++waitedMs) {
    check(tarnreporting_client_state(client_, &state));
    if (state.committed == state.posted) return;
    ::usleep(1000);
  }
  fail("what was posted isn't committed");
}

}  // namespace tarn::bench

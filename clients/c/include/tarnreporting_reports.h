// SPDX-License-Identifier: Apache-2.0
/* Reports: messages that an engine posts without knowing a key, one function each. docs/messages.md lists them.
 *
 *   tarnreporting_reports reports;
 *   tarnreporting_reports_declare(session, &reports);                          once
 *   tarnreporting_report_output_running(writer, &reports, 0.5, "Speaker");     in the audio thread
 *
 * Each posts one message as tarnreporting_post() does, with its promises and its results; those with _at post the time
 * of the event, in nanoseconds since 1970 UTC (0: the time of the call). A text that is null counts as empty. The
 * reports are gone with their session; each takes one of the client's shapes.
 *
 * Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this. */
#pragma once

#include <tarnreporting.h>

#ifdef __cplusplus
extern "C" {
#endif

/* clang-format off */

/* Which report is which, by its shape in tarnreporting_reports. */
enum {
  TARNREPORTING_REPORT_OUTPUT_RUNNING,
  TARNREPORTING_REPORT_OUTPUT_STOPPED,
  TARNREPORTING_REPORT_VOLUME_CHANGED,
  TARNREPORTING_REPORT_ROUTE_CHANGED,
  TARNREPORTING_REPORT_INPUT_RUNNING,
  TARNREPORTING_REPORT_CODEC_CHANGED,
  TARNREPORTING_REPORT_INPUT_STOPPED,
  TARNREPORTING_REPORT_OVERLOAD,
  TARNREPORTING_REPORT_ERROR,
  TARNREPORTING_REPORT_SESSION_DURATION,
  TARNREPORTING_REPORT_COUNT
};

/* The shapes of the reports of one session, which owns them: not to be used once the session ended. It never changes
 * once it is declared, so all threads may post with it. */
typedef struct tarnreporting_reports tarnreporting_reports;
struct tarnreporting_reports {
  tarnreporting_shape* shapes[TARNREPORTING_REPORT_COUNT];
};

/* A text that ends at its zero, as a value; null counts as empty. Longer than a message may hold it is refused when it
 * is posted. */
static inline tarnreporting_value tarnreporting_report_text(const char* text) {
  uint32_t length = 0;
  while (text != NULL && length < UINT32_MAX && text[length] != 0) {
    ++length;
  }
  return tarnreporting_text(text, length);
}

/* Of a rate in Hz, as messages have it: 48000.0. Writes up to 12 bytes to `room`, which must stay until the value is
 * posted. Without the C library's formatting, which may lock and allocate. */
static inline tarnreporting_value tarnreporting_report_hertz(uint32_t rate, char* room) {
  uint32_t digits = 1;
  uint32_t rest;
  uint32_t at;
  for (rest = rate; rest >= 10; rest /= 10) {
    ++digits;
  }
  for (at = digits; at > 0; --at) {
    room[at - 1] = "0123456789"[rate % 10];
    rate /= 10;
  }
  room[digits] = '.';
  room[digits + 1] = '0';
  return tarnreporting_text(room, digits + 2);
}

/* Declares the shapes of all reports for the session, once, and fills in `reports`, which the caller owns. Allocates
 * and may wait for a lock: not for real-time threads. TARNREPORTING_ARGUMENT for a null pointer, else what
 * tarnreporting_shape_declare() answers; when it fails in between, those before are declared and `reports` is not to be
 * used. */
static inline int tarnreporting_reports_declare(tarnreporting_session* session, tarnreporting_reports* reports) {
  static const struct {
    uint32_t category;
    uint32_t type;
    size_t key_count;
    tarnreporting_key keys[4];
  } rows[TARNREPORTING_REPORT_COUNT] = {
    {4, 1, 3, {{"session_output_running", TARNREPORTING_BOOLEAN}, {"KvSessionVolume", TARNREPORTING_DOUBLE},
               {"active_devices", TARNREPORTING_TEXT_VALUE}}},
    {4, 2, 1, {{"session_output_running", TARNREPORTING_BOOLEAN}}},
    {14, 0, 1, {{"KvSessionVolume", TARNREPORTING_DOUBLE}}},
    {10, 0, 1, {{"active_devices", TARNREPORTING_TEXT_VALUE}}},
    {3, 1, 4, {{"session_input_running", TARNREPORTING_BOOLEAN}, {"active_devices", TARNREPORTING_TEXT_VALUE},
               {"vp_config_primary_vocoder", TARNREPORTING_TEXT_VALUE},
               {"vp_config_primary_vocoderFs", TARNREPORTING_TEXT_VALUE}}},
    {3, 5, 2, {{"vp_config_primary_vocoder", TARNREPORTING_TEXT_VALUE},
               {"vp_config_primary_vocoderFs", TARNREPORTING_TEXT_VALUE}}},
    {3, 2, 1, {{"session_input_running", TARNREPORTING_BOOLEAN}}},
    {7, 6, 3, {{"issue_type", TARNREPORTING_TEXT_VALUE}, {"smallest_buffer_frame_size", TARNREPORTING_INTEGER},
               {"io_cycle", TARNREPORTING_INTEGER}}},
    {11, 6, 1, {{"issue_type", TARNREPORTING_TEXT_VALUE}}},
    {1, 2, 1, {{"session_duration", TARNREPORTING_DOUBLE}}},
  };
  size_t i;
  if (reports == NULL) return TARNREPORTING_ARGUMENT;
  for (i = 0; i < TARNREPORTING_REPORT_COUNT; ++i) {
    const tarnreporting_shape_options options = {sizeof options, rows[i].category, rows[i].type, rows[i].keys,
                                                 rows[i].key_count};
    const int result = tarnreporting_shape_declare(session, &options, &reports->shapes[i]);
    if (result != TARNREPORTING_OK) return result;
  }
  return TARNREPORTING_OK;
}

/* What all reports do: posts the values in the shape of this report, with the time of the event or, for 0, of the
 * call. For real-time threads. */
static inline int tarnreporting_report_post(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                            int report, uint64_t stamp_ns, const tarnreporting_value* values,
                                            size_t count) {
  if (reports == NULL) return TARNREPORTING_ARGUMENT;
  if (stamp_ns == 0) return tarnreporting_post(writer, reports->shapes[report], values, count);
  return tarnreporting_post_at(writer, reports->shapes[report], stamp_ns, values, count);
}

/* Posts Playback Start: session_output_running = true, KvSessionVolume = `volume`, active_devices = `route`. The
 * event was at `stamp_ns`. */
static inline int tarnreporting_report_output_running_at(tarnreporting_writer* writer,
                                                         const tarnreporting_reports* reports, uint64_t stamp_ns,
                                                         double volume, const char* route) {
  tarnreporting_value values[3];
  values[0] = tarnreporting_boolean(1);
  values[1] = tarnreporting_double(volume);
  values[2] = tarnreporting_report_text(route);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_OUTPUT_RUNNING, stamp_ns, values, 3);
}
/* Output runs from now on, at this volume (0 to 1), on this route. */
static inline int tarnreporting_report_output_running(tarnreporting_writer* writer,
                                                      const tarnreporting_reports* reports, double volume,
                                                      const char* route) {
  return tarnreporting_report_output_running_at(writer, reports, 0, volume, route);
}

/* Posts Playback Stop: session_output_running = false. The event was at `stamp_ns`. */
static inline int tarnreporting_report_output_stopped_at(tarnreporting_writer* writer,
                                                         const tarnreporting_reports* reports, uint64_t stamp_ns) {
  tarnreporting_value values[1];
  values[0] = tarnreporting_boolean(0);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_OUTPUT_STOPPED, stamp_ns, values, 1);
}
/* Output runs no more. */
static inline int tarnreporting_report_output_stopped(tarnreporting_writer* writer,
                                                      const tarnreporting_reports* reports) {
  return tarnreporting_report_output_stopped_at(writer, reports, 0);
}

/* Posts Volume Generic: KvSessionVolume = `volume`. The event was at `stamp_ns`. */
static inline int tarnreporting_report_volume_changed_at(tarnreporting_writer* writer,
                                                         const tarnreporting_reports* reports, uint64_t stamp_ns,
                                                         double volume) {
  tarnreporting_value values[1];
  values[0] = tarnreporting_double(volume);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_VOLUME_CHANGED, stamp_ns, values, 1);
}
/* The volume is this from now on, 0 to 1. */
static inline int tarnreporting_report_volume_changed(tarnreporting_writer* writer,
                                                      const tarnreporting_reports* reports, double volume) {
  return tarnreporting_report_volume_changed_at(writer, reports, 0, volume);
}

/* Posts RouteChange Generic: active_devices = `route`. The event was at `stamp_ns`. */
static inline int tarnreporting_report_route_changed_at(tarnreporting_writer* writer,
                                                        const tarnreporting_reports* reports, uint64_t stamp_ns,
                                                        const char* route) {
  tarnreporting_value values[1];
  values[0] = tarnreporting_report_text(route);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_ROUTE_CHANGED, stamp_ns, values, 1);
}
/* These devices play or record from now on. */
static inline int tarnreporting_report_route_changed(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                                     const char* route) {
  return tarnreporting_report_route_changed_at(writer, reports, 0, route);
}

/* Posts Input Start: session_input_running = true, active_devices = `route`, vp_config_primary_vocoder = `codec`,
 * vp_config_primary_vocoderFs = `rate`. The event was at `stamp_ns`. */
static inline int tarnreporting_report_input_running_at(tarnreporting_writer* writer,
                                                        const tarnreporting_reports* reports, uint64_t stamp_ns,
                                                        const char* route, const char* codec, uint32_t rate) {
  char room[12];
  tarnreporting_value values[4];
  values[0] = tarnreporting_boolean(1);
  values[1] = tarnreporting_report_text(route);
  values[2] = tarnreporting_report_text(codec);
  values[3] = tarnreporting_report_hertz(rate, room);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_INPUT_RUNNING, stamp_ns, values, 4);
}
/* Input runs from now on, on this route, with this voice codec at this sampling rate in Hz. */
static inline int tarnreporting_report_input_running(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                                     const char* route, const char* codec, uint32_t rate) {
  return tarnreporting_report_input_running_at(writer, reports, 0, route, codec, rate);
}

/* Posts Input Setup: vp_config_primary_vocoder = `codec`, vp_config_primary_vocoderFs = `rate`. The event was at
 * `stamp_ns`. */
static inline int tarnreporting_report_codec_changed_at(tarnreporting_writer* writer,
                                                        const tarnreporting_reports* reports, uint64_t stamp_ns,
                                                        const char* codec, uint32_t rate) {
  char room[12];
  tarnreporting_value values[2];
  values[0] = tarnreporting_report_text(codec);
  values[1] = tarnreporting_report_hertz(rate, room);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_CODEC_CHANGED, stamp_ns, values, 2);
}
/* The voice codec is this from now on, at this sampling rate in Hz. */
static inline int tarnreporting_report_codec_changed(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                                     const char* codec, uint32_t rate) {
  return tarnreporting_report_codec_changed_at(writer, reports, 0, codec, rate);
}

/* Posts Input Stop: session_input_running = false. The event was at `stamp_ns`. */
static inline int tarnreporting_report_input_stopped_at(tarnreporting_writer* writer,
                                                        const tarnreporting_reports* reports, uint64_t stamp_ns) {
  tarnreporting_value values[1];
  values[0] = tarnreporting_boolean(0);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_INPUT_STOPPED, stamp_ns, values, 1);
}
/* Input runs no more. */
static inline int tarnreporting_report_input_stopped(tarnreporting_writer* writer,
                                                     const tarnreporting_reports* reports) {
  return tarnreporting_report_input_stopped_at(writer, reports, 0);
}

/* Posts IO Error: issue_type = "overload", smallest_buffer_frame_size = `frames`, io_cycle = `cycle`. The event was
 * at `stamp_ns`. */
static inline int tarnreporting_report_overload_at(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                                   uint64_t stamp_ns, int64_t frames, int64_t cycle) {
  tarnreporting_value values[3];
  values[0] = tarnreporting_text("overload", 8);
  values[1] = tarnreporting_integer(frames);
  values[2] = tarnreporting_integer(cycle);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_OVERLOAD, stamp_ns, values, 3);
}
/* A cycle came too late, or a buffer ran empty: its size in frames, and which cycle it was. */
static inline int tarnreporting_report_overload(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                                int64_t frames, int64_t cycle) {
  return tarnreporting_report_overload_at(writer, reports, 0, frames, cycle);
}

/* Posts Error Error: issue_type = `what`. The event was at `stamp_ns`. */
static inline int tarnreporting_report_error_at(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                                uint64_t stamp_ns, const char* what) {
  tarnreporting_value values[1];
  values[0] = tarnreporting_report_text(what);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_ERROR, stamp_ns, values, 1);
}
/* Something else went wrong; what, in a word or two. */
static inline int tarnreporting_report_error(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                             const char* what) {
  return tarnreporting_report_error_at(writer, reports, 0, what);
}

/* Posts Generic Stop: session_duration = `seconds`. The event was at `stamp_ns`. */
static inline int tarnreporting_report_session_duration_at(tarnreporting_writer* writer,
                                                           const tarnreporting_reports* reports, uint64_t stamp_ns,
                                                           double seconds) {
  tarnreporting_value values[1];
  values[0] = tarnreporting_double(seconds);
  return tarnreporting_report_post(writer, reports, TARNREPORTING_REPORT_SESSION_DURATION, stamp_ns, values, 1);
}
/* What the session was for is over, and was active for so many seconds. */
static inline int tarnreporting_report_session_duration(tarnreporting_writer* writer,
                                                        const tarnreporting_reports* reports, double seconds) {
  return tarnreporting_report_session_duration_at(writer, reports, 0, seconds);
}

/* clang-format on */

#ifdef __cplusplus
}
#endif

// SPDX-License-Identifier: Apache-2.0
/* A program of somebody else: a message and a report, with no service there to take it. */
#include <stdio.h>
#include <tarnreporting.h>
#include <tarnreporting_messages.h>
#include <tarnreporting_reports.h>

int main(void) {
  const tarnreporting_key keys[] = {{TARN_KEY_KV_SESSION_VOLUME, TARNREPORTING_DOUBLE},
                                    {"muted", TARNREPORTING_BOOLEAN}};
  tarnreporting_session_options session_options = {0};
  tarnreporting_shape_options shape_options = {0};
  tarnreporting_state state = {0};
  tarnreporting_reports reports;
  tarnreporting_client* client;
  tarnreporting_session* session;
  tarnreporting_shape* shape;
  tarnreporting_writer* writer;
  tarnreporting_value values[2];
  uint64_t left = 0;
  session_options.size = sizeof session_options;
  session_options.service_type = TARN_SERVICE_LONG_FORM_AUDIO;
  session_options.application = "sys.oxbow.music";
  shape_options.size = sizeof shape_options;
  shape_options.category = TARN_CATEGORY_VOLUME;
  shape_options.type = TARN_TYPE_SIMPLE;
  shape_options.keys = keys;
  shape_options.key_count = 2;
  state.size = sizeof state;
  values[0] = tarnreporting_double(0.5);
  values[1] = tarnreporting_boolean(0);
  if (tarnreporting_client_open(NULL, &client) || tarnreporting_session_begin(client, &session_options, &session) ||
      tarnreporting_shape_declare(session, &shape_options, &shape) ||
      tarnreporting_writer_open(client, NULL, &writer) || tarnreporting_post(writer, shape, values, 2) ||
      tarnreporting_reports_declare(session, &reports) ||
      tarnreporting_report_output_running(writer, &reports, 0.5, "Speaker") ||
      tarnreporting_client_state(client, &state)) {
    return 1;
  }
  (void)tarnreporting_client_close(client, 10, &left);
  printf("posted %d, left %d\n", (int)state.posted, (int)left);
  return 0;
}

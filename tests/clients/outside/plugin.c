// SPDX-License-Identifier: Apache-2.0
/* A plug-in, which its host loads and unloads as it likes. */
#include <stddef.h>
#include <tarnreporting_reports.h>

int plugin_run(void);

int plugin_run(void) {
  tarnreporting_client* client;
  tarnreporting_session* session;
  tarnreporting_reports reports;
  tarnreporting_writer* writer;
  int result;
  if (tarnreporting_client_open(NULL, &client) || tarnreporting_session_begin(client, NULL, &session) ||
      tarnreporting_reports_declare(session, &reports) || tarnreporting_writer_open(client, NULL, &writer)) {
    return -1;
  }
  result = tarnreporting_report_output_running(writer, &reports, 0.5, "Speaker");
  (void)tarnreporting_client_close(client, 0, NULL);
  return result;
}

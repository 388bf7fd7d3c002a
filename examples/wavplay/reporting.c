// SPDX-License-Identifier: Apache-2.0
#include "reporting.h"

#include <string.h>
#include <tarnreporting_messages.h>

int reporting_open(struct reporting* report, const char* application) {
  tarnreporting_session_options options = {0};
  tarnreporting_session* session;
  options.size = sizeof options;
  options.service_type = TARN_SERVICE_LONG_FORM_AUDIO;
  options.application = application;
  memset(report, 0, sizeof *report);
  return tarnreporting_client_open(NULL, &report->client) == TARNREPORTING_OK &&
         tarnreporting_session_begin(report->client, &options, &session) == TARNREPORTING_OK &&
         tarnreporting_reports_declare(session, &report->reports) == TARNREPORTING_OK &&
         tarnreporting_writer_open(report->client, NULL, &report->writer) == TARNREPORTING_OK;
}

uint64_t reporting_close(struct reporting* report) {
  uint64_t left = 0;
  (void)tarnreporting_client_close(report->client, 1000, &left);
  return left;
}

void reporting_started(struct reporting* report, uint64_t at, double volume, const char* route) {
  (void)tarnreporting_report_output_running_at(report->writer, &report->reports, at, volume, route);
}

void reporting_volume(struct reporting* report, uint64_t at, double volume) {
  (void)tarnreporting_report_volume_changed_at(report->writer, &report->reports, at, volume);
}

void reporting_route(struct reporting* report, uint64_t at, const char* route) {
  (void)tarnreporting_report_route_changed_at(report->writer, &report->reports, at, route);
}

void reporting_underrun(struct reporting* report, uint64_t at, unsigned frames, uint64_t cycle) {
  (void)tarnreporting_report_overload_at(report->writer, &report->reports, at, frames, (int64_t)cycle);
}

void reporting_stopped(struct reporting* report, uint64_t at) {
  (void)tarnreporting_report_output_stopped_at(report->writer, &report->reports, at);
}

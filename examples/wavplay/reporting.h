// SPDX-License-Identifier: Apache-2.0
/* What the player tells the reporting service. All but the opening and the closing is for its real-time thread. */
#pragma once

#include <stdint.h>
#include <tarnreporting_reports.h>

struct reporting {
  tarnreporting_client* client;
  tarnreporting_writer* writer;
  tarnreporting_reports reports;
};

/* Whether it worked; a player that can't report plays all the same. */
int reporting_open(struct reporting* report, const char* application);
/* Waits at most a second for the service; how many messages it had not taken. */
uint64_t reporting_close(struct reporting* report);

/* Each at a moment in nanoseconds since 1970. */
void reporting_started(struct reporting* report, uint64_t at, double volume, const char* route);
void reporting_volume(struct reporting* report, uint64_t at, double volume);
void reporting_route(struct reporting* report, uint64_t at, const char* route);
void reporting_underrun(struct reporting* report, uint64_t at, unsigned frames, uint64_t cycle);
void reporting_stopped(struct reporting* report, uint64_t at);

// SPDX-License-Identifier: Apache-2.0
/* Where the frames go: a device of ALSA, or nowhere at the pace of a clock. */
#pragma once

#include <stdint.h>

struct output {
  void* device; /* null: the clock */
  unsigned rate;
  unsigned channels;
  uint64_t written; /* frames */
  uint64_t began;   /* when the first frame is played, in nanoseconds since 1970 */
};

/* "null" is the clock, any other name a device. Whether there is one; why not is told on standard error. */
int output_open(struct output* output, const char* name, unsigned rate, unsigned channels);
/* Plays so many frames and returns when they are played, or nearly so. Whether the device ran empty meanwhile. */
int output_write(struct output* output, const float* frames, unsigned count);
/* When the next frame is played, in nanoseconds since 1970. */
uint64_t output_time(const struct output* output);
/* Plays what is left. */
void output_close(struct output* output);

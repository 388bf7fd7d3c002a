// SPDX-License-Identifier: Apache-2.0
#define _POSIX_C_SOURCE 200809L
#include "output.h"

#include <stdio.h>
#include <string.h>
#include <time.h>

#ifdef WAVPLAY_ALSA
#include <alsa/asoundlib.h>

static void* open_device(const char* name, unsigned rate, unsigned channels) {
  const unsigned latency_us = 50000;
  snd_pcm_t* pcm = NULL;
  int error = snd_pcm_open(&pcm, name, SND_PCM_STREAM_PLAYBACK, 0);
  if (error == 0) {
    error = snd_pcm_set_params(pcm, SND_PCM_FORMAT_FLOAT, SND_PCM_ACCESS_RW_INTERLEAVED, channels, rate, 1, latency_us);
  }
  if (error == 0) return pcm;
  fprintf(stderr, "wavplay: %s: %s\n", name, snd_strerror(error));
  if (pcm != NULL) {
    snd_pcm_close(pcm);
  }
  return NULL;
}

static int write_device(void* device, unsigned channels, const float* frames, unsigned count) {
  int ran_empty = 0;
  while (count > 0) {
    snd_pcm_sframes_t done = snd_pcm_writei(device, frames, count);
    if (done < 0) {
      ran_empty = ran_empty || done == -EPIPE;
      if (snd_pcm_recover(device, (int)done, 1) < 0) break;
      done = 0;
    }
    frames += (size_t)done * channels;
    count -= (unsigned)done;
  }
  return ran_empty;
}

static void close_device(void* device) {
  snd_pcm_drain(device);
  snd_pcm_close(device);
}
#else
static void* open_device(const char* name, unsigned rate, unsigned channels) {
  (void)rate;
  (void)channels;
  fprintf(stderr, "wavplay: %s: built without ALSA, there is the output null alone\n", name);
  return NULL;
}

static int write_device(void* device, unsigned channels, const float* frames, unsigned count) {
  (void)device;
  (void)channels;
  (void)frames;
  (void)count;
  return 0;
}

static void close_device(void* device) {
  (void)device;
}
#endif

static const uint64_t second = 1000000000;

static uint64_t now(void) {
  struct timespec time;
  clock_gettime(CLOCK_REALTIME, &time);
  return (uint64_t)time.tv_sec * second + (uint64_t)time.tv_nsec;
}

int output_open(struct output* output, const char* name, unsigned rate, unsigned channels) {
  memset(output, 0, sizeof *output);
  output->rate = rate;
  output->channels = channels;
  if (strcmp(name, "null") != 0) {
    output->device = open_device(name, rate, channels);
    if (output->device == NULL) return 0;
  }
  output->began = now();
  return 1;
}

uint64_t output_time(const struct output* output) {
  if (output->device != NULL) return now();
  return output->began + output->written / output->rate * second +
         output->written % output->rate * second / output->rate;
}

int output_write(struct output* output, const float* frames, unsigned count) {
  output->written += count;
  if (output->device != NULL) return write_device(output->device, output->channels, frames, count);
  const uint64_t until = output_time(output);
  for (uint64_t at = now(); at < until; at = now()) {
    const struct timespec left = {0, (long)(until - at < second ? until - at : second - 1)};
    nanosleep(&left, NULL);
  }
  return 0;
}

void output_close(struct output* output) {
  if (output->device != NULL) {
    close_device(output->device);
  }
  output->device = NULL;
}

// SPDX-License-Identifier: Apache-2.0
/* wavplay: plays a sound file and reports what it does. One thread decodes into a ring of frames; the other one, with
 * real-time priority where the system allows it, plays them and reports: it waits for nothing but the output.
 *
 *   wavplay [--output NAME] [--volume V] [--route NAME] [--at SECONDS volume=V|route=NAME|stall=SECONDS]... FILE
 *
 * --output: null (the pace of a clock, heard by nobody) or a device of ALSA; default null
 * --at: at this second of the file the volume or the route changes, or the decoder stops for a while; in their order
 *
 * Prints one line of JSON: what was played.
 */
#define _POSIX_C_SOURCE 200809L
#include <pthread.h>
#include <sched.h>
#include <sndfile.h>
#include <stdatomic.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>

#include "output.h"
#include "reporting.h"

enum { MOST_CHANGES = 64, MOST_CHANNELS = 8, RING_FRAMES = 8192, PERIODS_A_SECOND = 100, MOST_PERIOD = 1920 };

struct change {
  double seconds;
  const char* what;
  const char* value;
};

struct player {
  const char* file;
  const char* output_name;
  const char* route;
  double volume;
  struct change changes[MOST_CHANGES];
  int change_count;

  SNDFILE* sound;
  SF_INFO info;
  struct output output;
  struct reporting report;
  float ring[RING_FRAMES * MOST_CHANNELS];
  atomic_ullong decoded; /* frames ever put in */
  atomic_ullong played;  /* frames ever taken out */
  atomic_bool at_end;
  uint64_t silence; /* frames that the decoder wasn't in time for */
  uint64_t underruns;
};

static void rest(double seconds) {
  const struct timespec time = {(time_t)seconds, (long)((seconds - (double)(time_t)seconds) * 1e9)};
  nanosleep(&time, NULL);
}

static void* decode(void* context) {
  struct player* player = context;
  const unsigned channels = (unsigned)player->info.channels;
  int next = 0;
  for (;;) {
    const uint64_t decoded = atomic_load(&player->decoded);
    for (; next < player->change_count; ++next) {
      if (player->changes[next].seconds * player->info.samplerate > (double)decoded) break;
      if (strcmp(player->changes[next].what, "stall") == 0) {
        rest(atof(player->changes[next].value));
      }
    }
    const uint64_t used = decoded - atomic_load(&player->played);
    const uint64_t at = decoded % RING_FRAMES;
    uint64_t room = RING_FRAMES - used;
    room = room < RING_FRAMES - at ? room : RING_FRAMES - at;
    room = room < 512 ? room : 512;
    if (room == 0) {
      rest(0.002);
      continue;
    }
    const sf_count_t got = sf_readf_float(player->sound, player->ring + at * channels, (sf_count_t)room);
    if (got <= 0) break;
    atomic_store(&player->decoded, decoded + (uint64_t)got);
  }
  atomic_store(&player->at_end, 1);
  return NULL;
}

static void apply_changes(struct player* player, int* next) {
  const uint64_t played = atomic_load(&player->played);
  for (; *next < player->change_count; ++*next) {
    const struct change* change = &player->changes[*next];
    if (change->seconds * player->info.samplerate > (double)played) return;
    if (strcmp(change->what, "volume") == 0) {
      player->volume = atof(change->value);
      reporting_volume(&player->report, output_time(&player->output), player->volume);
    } else if (strcmp(change->what, "route") == 0) {
      reporting_route(&player->report, output_time(&player->output), change->value);
    }
  }
}

/* The next frames, at the volume, then silence; how many frames there were. */
static unsigned take(struct player* player, float* period, unsigned wanted) {
  const unsigned channels = (unsigned)player->info.channels;
  const uint64_t played = atomic_load(&player->played);
  const uint64_t there = atomic_load(&player->decoded) - played;
  const unsigned count = there < wanted ? (unsigned)there : wanted;
  for (unsigned i = 0; i < wanted * channels; ++i) {
    const uint64_t at = (played * channels + i) % (RING_FRAMES * (uint64_t)channels);
    period[i] = i < count * channels ? player->ring[at] * (float)player->volume : 0;
  }
  atomic_store(&player->played, played + count);
  return count;
}

static void* play(void* context) {
  struct player* player = context;
  float period[MOST_PERIOD * MOST_CHANNELS];
  const unsigned size = (unsigned)player->info.samplerate / PERIODS_A_SECOND;
  int next = 0;
  reporting_started(&player->report, output_time(&player->output), player->volume, player->route);
  for (uint64_t cycle = 0;; ++cycle) {
    apply_changes(player, &next);
    const int last = atomic_load(&player->at_end);
    const unsigned count = take(player, period, size);
    if (count < size && !last) {
      reporting_underrun(&player->report, output_time(&player->output), size, cycle);
      ++player->underruns;
      player->silence += size - count;
    }
    if (last && count == 0) break;
    if (output_write(&player->output, period, last ? count : size)) {
      reporting_underrun(&player->report, output_time(&player->output), size, cycle);
      ++player->underruns;
    }
  }
  reporting_stopped(&player->report, output_time(&player->output));
  return NULL;
}

static int start_player(pthread_t* thread, struct player* player) {
  const struct sched_param priority = {10};
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setinheritsched(&attributes, PTHREAD_EXPLICIT_SCHED);
  pthread_attr_setschedpolicy(&attributes, SCHED_FIFO);
  pthread_attr_setschedparam(&attributes, &priority);
  int error = pthread_create(thread, &attributes, play, player);
  if (error != 0) {
    error = pthread_create(thread, NULL, play, player); /* as well as an ordinary thread can */
  }
  pthread_attr_destroy(&attributes);
  return error == 0;
}

static int usage(void) {
  fprintf(stderr,
          "usage: wavplay [--output NAME] [--volume V] [--route NAME]"
          " [--at SECONDS volume=V|route=NAME|stall=SECONDS]... FILE\n");
  return 64;
}

static int read_change(struct player* player, const char* seconds, char* what) {
  char* const equals = strchr(what, '=');
  if (equals == NULL || player->change_count == MOST_CHANGES) return 0;
  *equals = '\0';
  player->changes[player->change_count++] = (struct change){atof(seconds), what, equals + 1};
  return strcmp(what, "volume") == 0 || strcmp(what, "route") == 0 || strcmp(what, "stall") == 0;
}

static int read_words(struct player* player, int count, char** words) {
  for (int i = 1; i < count; ++i) {
    if (strcmp(words[i], "--output") == 0 && i + 1 < count) {
      player->output_name = words[++i];
    } else if (strcmp(words[i], "--volume") == 0 && i + 1 < count) {
      player->volume = atof(words[++i]);
    } else if (strcmp(words[i], "--route") == 0 && i + 1 < count) {
      player->route = words[++i];
    } else if (strcmp(words[i], "--at") == 0 && i + 2 < count) {
      if (!read_change(player, words[i + 1], words[i + 2])) return 0;
      i += 2;
    } else if (player->file == NULL && words[i][0] != '-') {
      player->file = words[i];
    } else {
      return 0;
    }
  }
  return player->file != NULL;
}

static int open_file(struct player* player) {
  player->sound = sf_open(player->file, SFM_READ, &player->info);
  if (player->sound == NULL) {
    fprintf(stderr, "wavplay: %s: %s\n", player->file, sf_strerror(NULL));
    return 0;
  }
  const int period = player->info.samplerate / PERIODS_A_SECOND;
  if (player->info.channels <= MOST_CHANNELS && period > 0 && period <= MOST_PERIOD) return 1;
  fprintf(stderr, "wavplay: %s: more channels or a higher rate than this player has room for\n", player->file);
  return 0;
}

int main(int count, char** words) {
  static struct player player = {.output_name = "null", .route = "Speaker", .volume = 1};
  pthread_t decoder;
  pthread_t thread;
  if (!read_words(&player, count, words)) return usage();
  if (!open_file(&player)) return 1;
  if (!reporting_open(&player.report, "org.example.wavplay")) {
    fprintf(stderr, "wavplay: nothing is reported\n");
  }
  if (pthread_create(&decoder, NULL, decode, &player) != 0) return 1;
  while (atomic_load(&player.decoded) < RING_FRAMES / 2 && !atomic_load(&player.at_end)) {
    rest(0.002);
  }
  if (!output_open(&player.output, player.output_name, (unsigned)player.info.samplerate,
                   (unsigned)player.info.channels) ||
      !start_player(&thread, &player)) {
    return 1;
  }
  pthread_join(decoder, NULL);
  pthread_join(thread, NULL);
  output_close(&player.output);
  sf_close(player.sound);
  const uint64_t left = reporting_close(&player.report);
  printf("{\"frames\": %llu, \"silence\": %llu, \"rate\": %d, \"underruns\": %llu, \"untaken\": %llu}\n",
         (unsigned long long)atomic_load(&player.played), (unsigned long long)player.silence, player.info.samplerate,
         (unsigned long long)player.underruns, (unsigned long long)left);
  return 0;
}

// SPDX-License-Identifier: Apache-2.0
// What a tracepoint of the same fields costs, for the figure of a post: prints the nanoseconds of half, of 999 of 1000
// and of all of so many tracepoints at the most, the clock's own part included, and whether somebody recorded them.
// run_traced.sh sees to that. With a pause of other than 0 microseconds the thread sleeps so long before each burst:
// the first call after a sleep finds the caches cold.
//
// usage: tarnbenchtracer COUNT BURST PAUSE
#define LTTNG_UST_TRACEPOINT_CREATE_PROBES
#define LTTNG_UST_TRACEPOINT_DEFINE
#include <sched.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <vector>

#include <TracerMessage.tp>

namespace {

bool readNumber(const char* word, std::size_t& number) {
  return std::from_chars(word, word + std::strlen(word), number).ec == std::errc();
}

}  // namespace

int main(int count, char** words) {
  std::size_t posts = 0;
  std::size_t burst = 0;
  std::size_t pause = 0;
  if (count != 4 || !readNumber(words[1], posts) || !readNumber(words[2], burst) || !readNumber(words[3], pause) ||
      posts == 0 || burst == 0) {
    return 64;
  }
  TracedMessage message{
      86400.5, 20000, "sys.oxbow.music.player", "BuiltInSpeaker", 48000, 512, 0, 0.5, 70000, "lossless", "9f2c1d7e", 0};
  const sched_param parameter{.sched_priority = 10};
  ::sched_setscheduler(0, SCHED_FIFO | SCHED_RESET_ON_FORK, &parameter);
  std::vector<double> samples(posts);
  for (double& sample : samples) {
    if (pause != 0 && static_cast<std::size_t>(&sample - samples.data()) % burst == 0) {
      ::usleep(static_cast<useconds_t>(pause));
    }
    const auto start = std::chrono::steady_clock::now();
    lttng_ust_tracepoint(tarnbench, message, &message);
    sample = std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now() - start).count();
    ++message.underrunCount;
  }
  std::sort(samples.begin(), samples.end());
  std::printf("%f %f %f %d\n", samples[samples.size() / 2], samples[samples.size() * 999 / 1000], samples.back(),
              lttng_ust_tracepoint_enabled(tarnbench, message) != 0 ? 1 : 0);
  return 0;
}

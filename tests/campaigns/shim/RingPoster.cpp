// SPDX-License-Identifier: Apache-2.0
// Posts numbered messages to rings, one thread each, in bursts with pauses between them, until it is killed or asked to
// end. Asked to end (SIGTERM) it closes, and says by its status whether any call ever answered something else than done
// or dropped, or the close left messages.
//
// usage: ring_poster SOCKET KEY RINGS SEED [RATE]
//   the messages of ring i have campaign_client KEY + i; RATE: so many a second and ring, one after the other
#include <tarnreporting.h>

#include <array>
#include <atomic>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <random>
#include <string_view>
#include <thread>
#include <vector>

namespace {

constexpr std::uint32_t kRingBytes = 65536;
constexpr std::int64_t kFirstNumber = 65536;
constexpr std::uint32_t kCloseMs = 60000;

std::atomic<bool> stopping{false};
std::atomic<int> oddResults{0};

void check(int result) {
  if (result != TARNREPORTING_OK && result != TARNREPORTING_DROPPED) {
    ++oddResults;
    std::fprintf(stderr, "ring_poster: %s\n", tarnreporting_result_text(result));
  }
}

void postOne(tarnreporting_writer* writer, const tarnreporting_shape* shape, std::int64_t key, std::int64_t& number) {
  const std::array<tarnreporting_value, 2> values{tarnreporting_integer(key), tarnreporting_integer(number)};
  const int result = tarnreporting_post(writer, shape, values.data(), values.size());
  check(result);
  number += result == TARNREPORTING_OK ? 1 : 0;
}

void post(tarnreporting_writer* writer, const tarnreporting_shape* shape, std::int64_t key, std::uint64_t seed) {
  std::mt19937_64 random(seed);
  std::int64_t number = kFirstNumber;
  while (!stopping) {
    for (std::uint64_t burst = 1 + random() % 200; burst > 0; --burst) {
      postOne(writer, shape, key, number);
    }
    std::this_thread::sleep_for(std::chrono::microseconds(random() % 4000));
  }
}

void postSteadily(tarnreporting_writer* writer, const tarnreporting_shape* shape, std::int64_t key,
                  std::uint64_t rate) {
  const std::chrono::nanoseconds pause(1000000000 / rate);
  auto due = std::chrono::steady_clock::now();
  std::int64_t number = kFirstNumber;
  while (!stopping) {
    postOne(writer, shape, key, number);
    std::this_thread::sleep_until(due += pause);
  }
}

std::uint64_t number(std::string_view word) {
  std::uint64_t value = 0;
  std::from_chars(word.data(), word.data() + word.size(), value);
  return value;
}

}  // namespace

int main(int count, char** words) {
  if (count != 5 && count != 6) return 64;
  const auto key = static_cast<std::int64_t>(number(words[2]));
  const std::uint64_t rings = number(words[3]);
  const std::uint64_t seed = number(words[4]);
  const std::uint64_t rate = count == 6 ? number(words[5]) : 0;
  std::signal(SIGTERM, [](int) { stopping = true; });
  tarnreporting_client_options options = {};
  options.size = sizeof options;
  options.socket_path = words[1];
  tarnreporting_client* client = nullptr;
  tarnreporting_session* session = nullptr;
  tarnreporting_shape* shape = nullptr;
  check(tarnreporting_client_open(&options, &client));
  check(tarnreporting_session_begin(client, nullptr, &session));
  // Playback, Start.
  const tarnreporting_key keys[] = {{"campaign_client", TARNREPORTING_INTEGER},
                                    {"campaign_number", TARNREPORTING_INTEGER}};
  const tarnreporting_shape_options shapeOptions = {sizeof shapeOptions, 4, 1, keys, 2};
  check(tarnreporting_shape_declare(session, &shapeOptions, &shape));
  std::vector<std::thread> threads;
  for (std::uint64_t ring = 0; ring < rings; ++ring) {
    const tarnreporting_writer_options writerOptions = {sizeof writerOptions, kRingBytes, 0};
    tarnreporting_writer* writer = nullptr;
    check(tarnreporting_writer_open(client, &writerOptions, &writer));
    const std::int64_t own = key + static_cast<std::int64_t>(ring);
    threads.push_back(rate != 0 ? std::thread(postSteadily, writer, shape, own, rate)
                                : std::thread(post, writer, shape, own, seed + ring));
  }
  std::puts("posting");
  std::fflush(stdout);
  for (std::thread& thread : threads) {
    thread.join();
  }
  std::uint64_t left = 0;
  check(tarnreporting_client_close(client, kCloseMs, &left));
  if (left != 0) {
    std::fprintf(stderr, "ring_poster: %llu messages are left\n", static_cast<unsigned long long>(left));
  }
  return oddResults == 0 && left == 0 ? 0 : 1;
}

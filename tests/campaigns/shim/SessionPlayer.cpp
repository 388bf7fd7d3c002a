// SPDX-License-Identifier: Apache-2.0
// Plays one short session after the other by the C++ interface, of some numbered messages each, until it is asked to
// end (SIGTERM). Its status says whether any call ever answered something else than done or dropped, or the close left
// messages.
//
// usage: session_player SOCKET KEY SEED RATE    messages have campaign_client KEY; RATE: so many a second
#include <tarnreporting.hpp>

#include <atomic>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <optional>
#include <random>
#include <string_view>
#include <thread>

namespace {

constexpr std::int64_t kFirstNumber = 65536;
constexpr std::uint32_t kRingBytes = 65536;
constexpr std::uint64_t kMostMessages = 400;
constexpr std::chrono::seconds kCloseTime(60);

std::atomic<bool> stopping{false};
int oddResults = 0;

void check(tarnreporting::Result result) {
  if (result.ok() || result.dropped()) return;
  ++oddResults;
  static_cast<void>(std::fprintf(stderr, "session_player: %s\n", result.text()));
}

class Player {
 public:
  Player(const char* socket, std::int64_t key, std::uint64_t seed, std::uint64_t rate)
      : client_(socket), key_(key), random_(seed), pause_(1000000000 / rate) {
    writer_.emplace(client_.writer(kRingBytes));
  }

  void playSession() {
    tarnreporting::Session session = client_.begin({0, "org.example.campaign"});
    // Playback, Start.
    const tarnreporting::Shape shape = session.shape(
        4, 1, {{"campaign_client", tarnreporting::Kind::Integer}, {"campaign_number", tarnreporting::Kind::Integer}});
    for (std::uint64_t left = random_() % kMostMessages; left > 0 && !stopping; --left) {
      const tarnreporting::Result result = writer_->post(shape, key_, number_);
      check(result);
      number_ += result.ok() ? 1 : 0;
      std::this_thread::sleep_until(due_ += pause_);
    }
    check(session.end());
  }

  // How many messages nobody took.
  std::uint64_t close() {
    check(writer_->close());
    return client_.close(kCloseTime);
  }

 private:
  tarnreporting::Client client_;
  std::optional<tarnreporting::Writer> writer_;
  std::int64_t key_;
  std::mt19937_64 random_;
  std::chrono::nanoseconds pause_;
  std::chrono::steady_clock::time_point due_ = std::chrono::steady_clock::now();
  std::int64_t number_ = kFirstNumber;
};

std::uint64_t number(std::string_view word) {
  std::uint64_t value = 0;
  std::from_chars(word.data(), word.data() + word.size(), value);
  return value;
}

}  // namespace

int main(int count, char** words) {
  if (count != 5 || number(words[4]) == 0) return 64;
  std::signal(SIGTERM, [](int) { stopping = true; });
  try {
    Player player(words[1], static_cast<std::int64_t>(number(words[2])), number(words[3]), number(words[4]));
    std::puts("posting");
    std::fflush(stdout);
    while (!stopping) {
      player.playSession();
    }
    return player.close() == 0 && oddResults == 0 ? 0 : 1;
  } catch (const tarnreporting::Error& error) {
    static_cast<void>(std::fprintf(stderr, "session_player: %s\n", error.what()));
    return 1;
  }
}

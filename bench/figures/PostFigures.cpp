// What posting to a shared ring costs the thread that posts, with the service alive and stopped, and what a message
// from a ring costs the service. The posting library is a child's, since it has a thread.
#include <sched.h>
#include <tarnreporting.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstring>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "bench/Measure.h"
#include "bench/Processes.h"
#include "bench/figures/Figures.h"
#include "clients/ring/RingProducer.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kPosts = 200'000;     // a round, of those that are timed
constexpr std::size_t kStreamed = 500'000;  // of those that are counted
constexpr std::size_t kBurst = 500;         // posts between two looks at whether the service has them
constexpr std::uint32_t kRingBytes = 262'144;
constexpr std::uint32_t kTimeoutMs = 10'000;
constexpr double kProcessorTarget = 0.7e-6;
constexpr double kRateTarget = 1.2e6;

void check(int result) {
  if (result != TARNREPORTING_OK) {
    fail(std::string("the posting library says: ") + tarnreporting_result_text(result));
  }
}

tarnreporting_value text(const char* value) {
  return tarnreporting_text(value, static_cast<std::uint32_t>(std::strlen(value)));
}

// The twelve keys of the message that the other figures use.
class Poster {
 public:
  explicit Poster(const std::string& socketPath) {
    tarnreporting_client_options options = {};
    options.size = sizeof options;
    options.socket_path = socketPath.c_str();
    check(tarnreporting_client_open(&options, &client_));
    tarnreporting_session* session = nullptr;
    check(tarnreporting_session_begin(client_, nullptr, &session));
    const std::array<tarnreporting_key, 12> keys{{{"systemuptime_sec", TARNREPORTING_DOUBLE},
                                                  {"processuptime_ms", TARNREPORTING_INTEGER},
                                                  {"client_application", TARNREPORTING_TEXT_VALUE},
                                                  {"audio_route", TARNREPORTING_TEXT_VALUE},
                                                  {"stream_sample_rate_hz", TARNREPORTING_DOUBLE},
                                                  {"buffer_frame_count", TARNREPORTING_INTEGER},
                                                  {"voice_processing", TARNREPORTING_BOOLEAN},
                                                  {"volume_scalar_value", TARNREPORTING_DOUBLE},
                                                  {"underrun_count", TARNREPORTING_INTEGER},
                                                  {"codec_name", TARNREPORTING_TEXT_VALUE},
                                                  {"session_token", TARNREPORTING_TEXT_VALUE},
                                                  {"muted", TARNREPORTING_BOOLEAN}}};
    const tarnreporting_shape_options shape = {sizeof shape, 4, 1, keys.data(), keys.size()};
    check(tarnreporting_shape_declare(session, &shape, &shape_));
    const tarnreporting_writer_options writer = {sizeof writer, kRingBytes, 0};
    check(tarnreporting_writer_open(client_, &writer, &writer_));
    values_ = {tarnreporting_double(86400.5),
               tarnreporting_integer(20000),
               text("sys.oxbow.music.player"),
               text("BuiltInSpeaker"),
               tarnreporting_double(48000),
               tarnreporting_integer(512),
               tarnreporting_boolean(0),
               tarnreporting_double(0.5),
               tarnreporting_integer(70000),
               text("lossless"),
               text("9f2c1d7e"),
               tarnreporting_boolean(0)};
  }
  Poster(const Poster&) = delete;
  Poster& operator=(const Poster&) = delete;
  ~Poster() { tarnreporting_client_close(client_, kTimeoutMs, nullptr); }

  int post(std::size_t number) {
    values_[8].as.integer = static_cast<std::int64_t>(number);
    return tarnreporting_post(writer_, shape_, values_.data(), values_.size());
  }
  void waitUntilTaken() { check(tarnreporting_client_flush(client_, kTimeoutMs)); }

 private:
  tarnreporting_client* client_ = nullptr;
  tarnreporting_shape* shape_ = nullptr;
  tarnreporting_writer* writer_ = nullptr;
  std::array<tarnreporting_value, 12> values_{};
};

// Where the system allows it the thread has real-time priority, as an audio thread would.
void becomeRealTime() {
  const sched_param parameter{.sched_priority = 10};
  ::sched_setscheduler(0, SCHED_FIFO | SCHED_RESET_ON_FORK, &parameter);
}

// Nanoseconds that a call takes, half, 999 of 1000 and all of the calls at the most; the clock's own part is left in.
// `before` is called before each and not counted.
template <class Call, class Before>
std::array<double, 3> spread(std::size_t count, Call call, Before before) {
  Samples samples(count);
  for (std::size_t i = 0; i < count; ++i) {
    before(i);
    const double start = nowSeconds();
    call(i);
    samples[i] = (nowSeconds() - start) * 1e9;
  }
  return {percentile(samples, 0.5), percentile(samples, 0.999), percentile(samples, 1)};
}

template <class Call>
std::array<double, 3> spread(std::size_t count, Call call) {
  return spread(count, call, [](std::size_t) {});
}

// The bytes of such a message into a ring that nobody reads and that is never full.
class BareRing {
 public:
  void post() {
    header_.taken = producer_.head();
    producer_.post(TARNRING_MESSAGE, sizeof message_,
                   [this](auto& content) { content.put(message_, sizeof message_); });
  }

 private:
  tarnring_header header_{};
  std::unique_ptr<std::byte[]> data_ = std::make_unique<std::byte[]>(kRingBytes);
  ring::RingProducer<> producer_{&header_, data_.get(), kRingBytes};
  char message_[208] = {};
};

enum Sample { kAlive = 0, kStopped = 3, kBare = 6, kClock = 9, kRate = 12, kProcessor, kSamples };

void put(std::vector<double>& results, Sample first, const std::array<double, 3>& figures) {
  std::copy(figures.begin(), figures.end(), results.begin() + first);
}

std::vector<double> measureAll(const Settings& settings, const ServiceProcess& service) {
  std::vector<double> results(kSamples);
  Poster poster(service.socketPath());
  for (std::size_t i = 0; i < kBurst; ++i) {
    poster.post(i);
  }
  poster.waitUntilTaken();
  const std::size_t streamed = settings.count(kStreamed);
  const double processorBefore = processorSeconds(service.id());
  const double start = nowSeconds();
  for (std::size_t i = 0; i < streamed; ++i) {
    while (poster.post(i) == TARNREPORTING_DROPPED) {
      ::sched_yield();
    }
  }
  poster.waitUntilTaken();
  results[kRate] = static_cast<double>(streamed) / (nowSeconds() - start);
  results[kProcessor] = (processorSeconds(service.id()) - processorBefore) / static_cast<double>(streamed);

  becomeRealTime();
  const std::size_t posts = settings.count(kPosts);
  put(results, kAlive,
      spread(
          posts, [&](std::size_t i) { keep(poster.post(i)); },
          [&](std::size_t i) {
            if (i % kBurst == 0) {
              poster.waitUntilTaken();
            }
          }));
  BareRing bare;
  put(results, kBare, spread(posts, [&](std::size_t) { bare.post(); }));
  put(results, kClock, spread(posts, [](std::size_t i) { keep(i); }));
  ::kill(service.id(), SIGSTOP);
  put(results, kStopped, spread(posts, [&](std::size_t i) { keep(poster.post(i)); }));
  ::kill(service.id(), SIGCONT);
  return results;
}

}  // namespace

void measurePost(const Settings& settings, Table& table) {
  std::vector<Samples> samples(kSamples);
  const ServiceProcess service(settings, {});
  for (int round = 0; round < settings.rounds; ++round) {
    const std::vector<double> results = measureInChild([&] { return measureAll(settings, service); });
    for (std::size_t i = 0; i < results.size(); ++i) {
      samples[i].push_back(results[i]);
    }
  }
  const auto figure = [&](int sample) { return median(samples[static_cast<std::size_t>(sample)]); };
  const char* const parts[] = {"median", "p99.9", "worst"};
  for (int part = 0; part < 3; ++part) {
    for (const auto& [name, sample] : {std::pair("service alive", kAlive), std::pair("service stopped", kStopped)}) {
      table.add({std::string("post of a message, ") + name + ", " + parts[part],
                 nanoseconds(figure(sample + part)),
                 "bare copy " + nanoseconds(figure(kBare + part)),
                 times(figure(sample + part) / figure(kBare + part)),
                 "",
                 {}});
    }
    table.add({std::string("the clock around each of them, ") + parts[part],
               nanoseconds(figure(kClock + part)),
               "",
               "",
               "",
               {}});
  }
  table.addWithTarget({"messages through a ring, nothing wanted", perSecond(figure(kRate)), "", "", ">= 1.2 M/s", {}},
                      figure(kRate), kRateTarget, true);
  table.addWithTarget({"processor time a message through a ring, nothing wanted",
                       microseconds(figure(kProcessor)),
                       "",
                       "",
                       "<= 0.7 us",
                       {}},
                      figure(kProcessor), kProcessorTarget);
}

}  // namespace tarn::bench
